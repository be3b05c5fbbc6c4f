#include "Host/HostFailure.h"
#include "Host/PluginLibrary.h"
#include "Host/PluginPlaces.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>
#include <vexa/abi.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <string>

namespace VexaTouch::Host {
namespace {

namespace fs = std::filesystem;

using ::testing::ElementsAre;
using ::testing::StartsWith;

constexpr const char* kPlugin = "libVexaTouchHIDService.so";

class PluginPlacesTest : public ::testing::Test {
protected:
    PluginPlacesTest() {
        std::string name = fs::temp_directory_path() / "vexatouch-test-XXXXXX";
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error("cannot make a temporary folder");
        }
        prefix = name;
    }
    ~PluginPlacesTest() override { fs::remove_all(prefix); }

    void makeFile(const fs::path& path, const std::string& text = {}) const {
        fs::create_directories(path.parent_path());
        std::ofstream(path) << text;
    }

    fs::path prefix;
    fs::path program() const { return prefix / "bin" / "vexatouch"; }
};

TEST_F(PluginPlacesTest, FirstBesideTheProgramThenTheLibraryFolders) {
    fs::create_directories(prefix / "lib" / "x86_64-linux-gnu");
    fs::create_directories(prefix / "lib" / "aarch64-linux-gnu");
    fs::create_directories(prefix / "lib" / "python3");
    const auto places = PluginPlaces::of(program(), std::nullopt);
    EXPECT_THAT(places.files,
                ElementsAre(prefix / "bin" / kPlugin, prefix / "lib" / "vexatouch" / kPlugin,
                            prefix / "lib64" / "vexatouch" / kPlugin,
                            prefix / "lib" / "aarch64-linux-gnu" / "vexatouch" / kPlugin,
                            prefix / "lib" / "x86_64-linux-gnu" / "vexatouch" / kPlugin));
    EXPECT_FALSE(places.overridden);
}

TEST_F(PluginPlacesTest, FirstPlaceThatHoldsAFileIsIt) {
    fs::create_directories(prefix / "bin" / kPlugin);  // a folder is none
    makeFile(prefix / "lib64" / "vexatouch" / kPlugin);
    EXPECT_EQ(PluginPlaces::of(program(), "").find(), prefix / "lib64" / "vexatouch" / kPlugin);
    makeFile(prefix / "lib" / "vexatouch" / kPlugin);
    EXPECT_EQ(PluginPlaces::of(program(), "").find(), prefix / "lib" / "vexatouch" / kPlugin);
}

TEST_F(PluginPlacesTest, NamedPlaceIsTheOnlyOne) {
    makeFile(prefix / "bin" / kPlugin);
    const auto places = PluginPlaces::of(program(), prefix / "other.so");
    EXPECT_THAT(places.files, ElementsAre(prefix / "other.so"));
    try {
        ADD_FAILURE() << "found " << places.find();
    } catch (const HostFailure& fault) {
        EXPECT_EQ(fault.what(), "there is no plug-in at " + (prefix / "other.so").string() +
                                    ", which VEXATOUCH_PLUGIN names");
    }
    makeFile(prefix / "other.so");
    EXPECT_EQ(places.find(), prefix / "other.so");
}

TEST_F(PluginPlacesTest, AllPlacesTriedAreToldWhenNoneHasIt) {
    try {
        ADD_FAILURE() << "found " << PluginPlaces::of(program(), std::nullopt).find();
    } catch (const HostFailure& fault) {
        EXPECT_EQ(fault.what(), "no plug-in found at " + (prefix / "bin" / kPlugin).string() +
                                    ", " + (prefix / "lib" / "vexatouch" / kPlugin).string() +
                                    ", " + (prefix / "lib64" / "vexatouch" / kPlugin).string() +
                                    "; VEXATOUCH_PLUGIN names another place");
    }
}

class PluginLibraryTest : public PluginPlacesTest {
protected:
    static std::string failureOf(const fs::path& file) {
        try {
            const PluginLibrary library(file);
        } catch (const HostFailure& fault) {
            return fault.what();
        }
        return "nothing";
    }
};

TEST_F(PluginLibraryTest, GivesTheFactoryOfAPlugin) {
    const PluginLibrary library(VEXATOUCH_SAMPLE_PLUGIN_FILE);
    EXPECT_NE(library.factory(), nullptr);
    EXPECT_EQ(library.file(), VEXATOUCH_SAMPLE_PLUGIN_FILE);
    EXPECT_EQ(library.factory()(nullptr, VEXA_PLUGIN_INTERFACE), nullptr);
}

TEST_F(PluginLibraryTest, MissingFileIsNamedOnce) {
    const std::string file = prefix / "none.so";
    EXPECT_EQ(failureOf(file), "cannot load the plug-in " + file +
                                   ": cannot open shared object file: No such file or directory");
}

TEST_F(PluginLibraryTest, WhatIsNoLibraryIsRefused) {
    makeFile(prefix / "text.so", "not a library");
    EXPECT_THAT(failureOf(prefix / "text.so"),
                StartsWith("cannot load the plug-in " + (prefix / "text.so").string() + ": "));
}

TEST_F(PluginLibraryTest, LibraryWithoutTheFactoryIsNoPlugin) {
    Dl_info platform{};
    ASSERT_NE(dladdr(reinterpret_cast<void*>(&vexa_abi_version), &platform), 0);
    const std::string file = fs::absolute(platform.dli_fname);
    EXPECT_EQ(failureOf(file), file + " is no plug-in: it exports no VexaTouchHIDServiceFactory");
}

}  // namespace
}  // namespace VexaTouch::Host
