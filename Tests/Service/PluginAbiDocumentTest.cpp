// docs/plugin-abi.md is the manual of the interface; what it says is what is.

#include "Service/PropertyKeys.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <vexa/vexa.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>

namespace VexaTouch {
namespace {

using testing::HasSubstr;

std::string contentOf(const std::string& file) {
    std::ifstream stream(std::string(VEXA_SOURCE_DIR "/") + file, std::ios::binary);
    if (!stream) throw std::runtime_error("cannot read " + file);
    return {std::istreambuf_iterator<char>(stream), {}};
}

std::string manual() {
    return contentOf("docs/plugin-abi.md");
}

std::string row(std::size_t offset, std::string_view slot) {
    return "| " + std::to_string(offset) + " | `" + std::string(slot) + "`";
}

std::string hexadecimal(const vexa_identifier& identifier) {
    std::string text;
    for (std::size_t i = 0; i < sizeof identifier.bytes; ++i) {
        std::array<char, 4> digits{};
        std::snprintf(digits.data(), digits.size(), "%02X", identifier.bytes[i]);
        if (i != 0 && i % 4 == 0) text += ' ';
        text += digits.data();
    }
    return text;
}

TEST(PluginAbiDocumentTest, SlotsStandWhereTheyAre) {
    const std::string text = manual();
#define VEXA_SLOT(table, slot) EXPECT_THAT(text, HasSubstr(row(offsetof(table, slot), #slot)))
    VEXA_SLOT(vexa_plugin_interface, _reserved);
    VEXA_SLOT(vexa_plugin_interface, QueryInterface);
    VEXA_SLOT(vexa_plugin_interface, AddRef);
    VEXA_SLOT(vexa_plugin_interface, Release);
    VEXA_SLOT(vexa_plugin_interface, version);
    VEXA_SLOT(vexa_plugin_interface, revision);
    VEXA_SLOT(vexa_plugin_interface, Probe);
    VEXA_SLOT(vexa_plugin_interface, Start);
    VEXA_SLOT(vexa_plugin_interface, Stop);
    VEXA_SLOT(vexa_service_interface, open);
    VEXA_SLOT(vexa_service_interface, close);
    VEXA_SLOT(vexa_service_interface, copyProperty);
    VEXA_SLOT(vexa_service_interface, setProperty);
    VEXA_SLOT(vexa_service_interface, setEventCallback);
    VEXA_SLOT(vexa_service_interface, scheduleWithDispatchQueue);
    VEXA_SLOT(vexa_service_interface, unscheduleFromDispatchQueue);
    VEXA_SLOT(vexa_service_interface, copyEvent);
    VEXA_SLOT(vexa_service_interface, setOutputEvent);
#undef VEXA_SLOT
}

TEST(PluginAbiDocumentTest, IdentifiersAreThoseOfTheHeader) {
    const std::string text = manual();
    for (const vexa_identifier& identifier :
         {VEXA_HID_SERVICE_PLUGIN_TYPE, VEXA_PLUGIN_INTERFACE, VEXA_SERVICE_INTERFACE}) {
        EXPECT_THAT(text, HasSubstr("| `" + hexadecimal(identifier) + "` |"));
    }
}

TEST(PluginAbiDocumentTest, EachKeyHasItsRow) {
    const std::string text = manual();
    for (const std::string_view key :
         {PropertyKey::kVersion, PropertyKey::kRecording, PropertyKey::kDisjointImageCount,
          PropertyKey::kFirmwareVersion, PropertyKey::kFactoryResetHoldDuration,
          PropertyKey::kCriticalErrors, PropertyKey::kServicePluginDebug}) {
        EXPECT_THAT(text, HasSubstr("| `" + std::string(key) + "` | yes | |"));
    }
}

TEST(PluginAbiDocumentTest, EachTextOfTheServiceIsThere) {
    const std::string text = manual();
    std::size_t texts = 0;
    for (const char* file :
         {"Service/VexaTouchHIDService.cpp", "Service/VexaTouchHIDServiceInput.cpp",
          "Service/VexaTouchHIDServiceProperties.cpp", "Service/EventDelivery.cpp"}) {
        const std::string source = contentOf(file);
        for (const std::string_view call :
             {"logOperation(", "logFormat(", "_log.write(", "log.write("}) {
            for (std::size_t at = source.find(call); at != std::string::npos;
                 at = source.find(call, at + 1)) {
                const std::size_t begin = source.find('"', at) + 1;
                if (begin == 0 || begin > source.find(';', at)) continue;  // a declaration
                const std::size_t end = source.find_first_of("\"\\", begin);
                EXPECT_THAT(text, HasSubstr(source.substr(begin, end - begin))) << file;
                ++texts;
            }
        }
    }
    EXPECT_GT(texts, 25U);
}

TEST(PluginAbiDocumentTest, TheSmallestHostIsTheOneThatRuns) {
    EXPECT_THAT(manual(),
                HasSubstr("```c\n" + contentOf("Tests/Programs/SmallestHost.c") + "```\n"));
}

TEST(PluginAbiDocumentTest, TheSmallestHostGetsItsEvent) {
    const std::string command = SMALLEST_HOST " " VEXATOUCH_PLUGIN_FILE " 2>/dev/null";
    FILE* const output = ::popen(command.c_str(), "r");
    ASSERT_NE(output, nullptr);
    std::string text;
    std::array<char, 256> part{};
    while (std::fgets(part.data(), part.size(), output)) text += part.data();
    EXPECT_EQ(::pclose(output), 0);
    EXPECT_EQ(text, "type 1, phase 0\n");
}

}  // namespace
}  // namespace VexaTouch
