// The plug-in as a file: what it exports, how it is found, and that it stays mapped.

#include "Tests/Support/ElfFile.h"
#include "Tests/Support/ProcessThreads.h"
#include "Tests/Support/ServiceUnderTest.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace VexaTouch::Testing {
namespace {

TEST(PluginFileTest, OnlyTheFactoryIsExported) {
    const ElfFile plugin(VEXATOUCH_PLUGIN_FILE);
    EXPECT_THAT(plugin.exportedSymbols(), testing::ElementsAre("VexaTouchHIDServiceFactory"));
}

TEST(PluginFileTest, ItIsNeverUnmapped) {
    const ElfFile plugin(VEXATOUCH_PLUGIN_FILE);
    EXPECT_TRUE(plugin.staysMapped());
    {
        const LoadedPlugin once(VEXATOUCH_PLUGIN_FILE);
    }
    void* const still = ::dlopen(VEXATOUCH_PLUGIN_FILE, RTLD_NOW | RTLD_NOLOAD);
    EXPECT_NE(still, nullptr);
    if (still) ::dlclose(still);
}

TEST(PluginFileTest, TheFactoryAnswersToItsTypeAlone) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    std::vector<vexa_identifier> others = {VEXA_PLUGIN_INTERFACE, VEXA_SERVICE_INTERFACE, {}};
    vexa_identifier near = VEXA_HID_SERVICE_PLUGIN_TYPE;
    for (std::uint8_t& byte : near.bytes) {
        byte ^= 0x80;
        others.push_back(near);
        byte ^= 0x80;
    }
    for (const vexa_identifier& other : others) EXPECT_EQ(plugin.make(other), nullptr);

    auto* const made =
        static_cast<vexa_plugin_interface**>(plugin.make(VEXA_HID_SERVICE_PLUGIN_TYPE));
    ASSERT_NE(made, nullptr);
    EXPECT_EQ((*made)->version, 1);
    EXPECT_EQ((*made)->revision, 0);
    // The host's reference is the only one.
    EXPECT_EQ((*made)->Release(made), 0U);
}

TEST(PluginFileTest, EachServiceIsItsOwn) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const ServiceUnderTest one(plugin.make());
    const ServiceUnderTest other(plugin.make());
    EXPECT_NE(one.plugin(), other.plugin());
    EXPECT_NE((*one.plugin())->_reserved, (*other.plugin())->_reserved);
    EXPECT_EQ(one.references(), 2U);
}

}  // namespace
}  // namespace VexaTouch::Testing
