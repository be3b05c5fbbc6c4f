// What libvexaplatform shows to the outside: its headers in plain C, and its symbols.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <vexa/abi.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <regex>
#include <set>
#include <sstream>
#include <string>

/// VexaInC.c: the line of the first expectation that was not met, or 0.
extern "C" int vexa_in_c(void);

namespace Vexa {
namespace {

/// What a command prints; it must succeed.
std::string output(const std::string& command) {
    std::FILE* const pipe = ::popen(command.c_str(), "r");
    if (!pipe) {
        ADD_FAILURE() << "cannot run " << command;
        return {};
    }
    std::string text;
    char part[4096];
    while (const std::size_t count = std::fread(part, 1, sizeof part, pipe)) {
        text.append(part, count);
    }
    EXPECT_EQ(::pclose(pipe), 0) << command;
    return text;
}

/// The names of all symbols that the library defines for others, without their version.
std::set<std::string> exportedNames() {
    std::istringstream lines(
        output(VEXA_NM " -D --defined-only --format=posix '" VEXA_PLATFORM "'"));
    std::set<std::string> names;
    for (std::string line; std::getline(lines, line);) {
        names.insert(line.substr(0, line.find_first_of("@ ")));
    }
    names.erase("VEXA_1");  // the version itself
    return names;
}

/// The names of all functions that the public headers declare.
std::set<std::string> declaredNames() {
    std::set<std::string> names;
    for (const auto& header :
         std::filesystem::directory_iterator(VEXA_SOURCE_DIR "/Platform/include/vexa")) {
        std::ifstream file(header.path());
        const std::string text(std::istreambuf_iterator<char>(file), {});
        const std::regex declaration(R"(VEXA_API\b[^();]*\b(vexa_\w+)\()");
        for (std::sregex_iterator it(text.begin(), text.end(), declaration), end; it != end; ++it) {
            names.insert((*it)[1]);
        }
    }
    return names;
}

TEST(PublicInterfaceTest, TheHeadersServeAPlainCProgram) {
    EXPECT_EQ(vexa_in_c(), 0) << "the line in VexaInC.c";
}

TEST(PublicInterfaceTest, TheLibraryExportsItsInterfaceAndNothingElse) {
    const std::set<std::string> declared = declaredNames();
    EXPECT_THAT(declared, testing::IsSupersetOf({"vexa_abi_version", "vexa_value_retain",
                                                 "vexa_event_create_digitizer"}));
    EXPECT_EQ(exportedNames(), declared);
}

TEST(PublicInterfaceTest, EveryEnumerationMayHoldCodesThatAreNotKnown) {
    const std::regex enumeration(R"(\benum (\w+)( VEXA_ENUM)? \{)");
    std::set<std::string> sized;
    std::set<std::string> unsized;
    for (const auto& header :
         std::filesystem::directory_iterator(VEXA_SOURCE_DIR "/Platform/include/vexa")) {
        std::ifstream file(header.path());
        const std::string text(std::istreambuf_iterator<char>(file), {});
        for (std::sregex_iterator it(text.begin(), text.end(), enumeration), end; it != end; ++it) {
            ((*it)[2].matched ? sized : unsized).insert((*it)[1]);
        }
    }
    EXPECT_THAT(sized, testing::IsSupersetOf({"vexa_log_level", "vexa_value_type"}));
    EXPECT_THAT(unsized, testing::IsEmpty());
}

TEST(PublicInterfaceTest, AProgramIsServedByItsOwnMajorVersion) {
    EXPECT_EQ(vexa_abi_version(), VEXA_ABI_VERSION);
    EXPECT_TRUE(vexa_abi_serves(VEXA_ABI_VERSION));
    EXPECT_TRUE(vexa_abi_serves(VEXA_ABI_MAJOR << 16));
    EXPECT_FALSE(vexa_abi_serves(VEXA_ABI_VERSION + 1));
    EXPECT_FALSE(vexa_abi_serves(VEXA_ABI_VERSION + 0x10000u));
    EXPECT_FALSE(vexa_abi_serves(VEXA_ABI_VERSION - 0x10000u));
    EXPECT_FALSE(vexa_abi_serves(0));
}

}  // namespace
}  // namespace Vexa
