#include "Tools/ValidateCommand.h"

#include "Platform/Json.h"
#include "Platform/PropertyValue.h"
#include "Tests/Plugins/Defects.h"
#include "Tests/Support/Sanitized.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/Validate/PluginCheck.h"

#include <gmock/gmock.h>
#include <sys/wait.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdlib>
#include <iterator>
#include <map>
#include <ostream>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::AllOf;
using Testing::CommandResult;
using Testing::contentOf;
using ::testing::ElementsAreArray;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using Testing::kSanitized;
using Testing::linesOf;
using ::testing::MatchesRegex;
using Testing::runCommand;
using ::testing::StartsWith;
using Testing::TemporaryFolder;

std::vector<std::string> checkNames() {
    std::vector<std::string> names;
    for (const PluginCheck& check : pluginChecks()) {
        names.emplace_back(check.name);
    }
    return names;
}

TEST(ValidateCommandTest, ListNamesEveryCheck) {
    const CommandResult result = runCommand({"validate", "--list"});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_EQ(result.error, "");
    const std::vector<std::string> lines = linesOf(result.out);
    ASSERT_EQ(lines.size(), pluginChecks().size());
    for (std::size_t index = 0; index < lines.size(); ++index) {
        const PluginCheck& check = pluginChecks()[index];
        EXPECT_THAT(lines[index], StartsWith(std::string(check.name) + " "));
        EXPECT_THAT(lines[index], HasSubstr(std::string(check.summary)));
    }
    const std::vector<std::string> objects =
        linesOf(runCommand({"validate", "--list", "--json"}).out);
    ASSERT_EQ(objects.size(), pluginChecks().size());
    EXPECT_EQ(objects.front(),
              R"({"check":"load","summary":"is loaded soon, has a factory, and exports nothing )"
              R"(else","time_limit_s":20})");
}

TEST(ValidateCommandTest, TheListTakesNoOtherArgument) {
    EXPECT_EQ(runCommand({"validate", "--list", "--only", "nope"}),
              (CommandResult{2, "",
                             "vexatouch validate: --list lists all checks, --only has no place "
                             "there\nTry 'vexatouch validate --help'.\n"}));
    EXPECT_EQ(runCommand({"validate", "--list", "extra.so"}).exitCode, 2);
}

TEST(ValidateCommandTest, ChecksAreNamedOnceAndSaidInALine) {
    const std::vector<std::string> names = checkNames();
    EXPECT_EQ(std::set<std::string>(names.begin(), names.end()).size(), names.size());
    for (const PluginCheck& check : pluginChecks()) {
        EXPECT_THAT(std::string(check.name), MatchesRegex("[a-z-]+"));
        EXPECT_FALSE(check.summary.empty()) << check.name;
        EXPECT_FALSE(check.summary.ends_with('.')) << check.name;
        EXPECT_EQ(findPluginCheck(check.name), &check);
    }
    EXPECT_EQ(findPluginCheck("nothing"), nullptr);
}

TEST(ValidateCommandTest, AWrongCommandLineIsAUsageError) {
    const auto error = [](const std::vector<std::string>& arguments) {
        const CommandResult result = runCommand(arguments);
        EXPECT_EQ(result.exitCode, 2);
        EXPECT_EQ(result.out, "");
        return linesOf(result.error).front();
    };
    EXPECT_EQ(error({"validate"}), "vexatouch validate: PLUGIN is required");
    EXPECT_THAT(error({"validate", "x.so", "--only", "load,nothing"}),
                StartsWith("vexatouch validate: --only: there is no check 'nothing', only load, "));
    EXPECT_THAT(error({"validate", "x.so", "--only", ""}),
                StartsWith("vexatouch validate: --only: there is no check ''"));
    EXPECT_EQ(error({"validate", "x.so", "--seed", "-1"}),
              "vexatouch validate: --seed: expected a number from 0 to 18446744073709551615, found "
              "\"-1\"");
    EXPECT_EQ(error({"validate", "x.so", "--time-limit", "0"}),
              "vexatouch validate: --time-limit: expected a number from 1 to 86400, found \"0\"");
    EXPECT_EQ(error({"validate", "x.so", "--here"}),
              "vexatouch validate: --here goes with --only and one check");
    EXPECT_EQ(error({"validate", "x.so", "--here", "--only", "load,slots"}),
              "vexatouch validate: --here goes with --only and one check");
}

#if defined(VEXATOUCH_PROGRAM) && defined(VEXATOUCH_SAMPLE_PLUGINS)

std::string sample(std::string_view name) {
    return VEXATOUCH_SAMPLE_PLUGINS "/" + std::string(name) + ".so";
}

/// Runs the program itself, which starts itself for each check.
CommandResult validate(const std::string& plugin, const std::string& options = {}) {
    const TemporaryFolder folder;
    const std::string command = VEXATOUCH_PROGRAM " validate '" + plugin + "' " + options + " > " +
                                folder.path("out") + " 2> " + folder.path("error");
    const int status = std::system(command.c_str());
    return {.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1,
            .out = contentOf(folder.path("out")),
            .error = contentOf(folder.path("error"))};
}

struct Verdict {
    std::string result;
    std::string reason;
};

/// What was found by each check, in no order.
std::map<std::string, Verdict> verdicts(const CommandResult& result) {
    std::map<std::string, Verdict> all;
    for (const std::string& line : linesOf(result.out)) {
        const Vexa::PropertyValue object = Vexa::readJson(line);
        const auto text = [&](const char* key) {
            const auto found = object.member(key).asString();
            return found ? std::string(*found) : "no " + std::string(key);
        };
        EXPECT_TRUE(all.emplace(text("check"), Verdict{text("result"), text("reason")}).second)
            << line;
    }
    return all;
}

std::set<std::string> failures(const std::map<std::string, Verdict>& verdicts) {
    std::set<std::string> failed;
    for (const auto& [check, verdict] : verdicts) {
        if (verdict.result == "fail") {
            failed.insert(check);
        } else {
            EXPECT_EQ(verdict.result, "pass") << check << ": " << verdict.reason;
        }
    }
    return failed;
}

/// The line of one check with the time it took as #.
std::string untimed(const std::string& text) {
    return std::regex_replace(text, std::regex(" +[0-9]+\\.[0-9] ms"), " # ms");
}

TEST(ValidateCommandTest, ASoundPluginPassesEveryCheck) {
    const CommandResult result = validate(sample("Sound"), "--seed 1");
    EXPECT_EQ(result.exitCode, 0) << result;
    std::vector<std::string> expected;
    for (const std::string& name : checkNames()) {
        std::string padded = name;
        padded.resize(std::max<std::size_t>(name.size(), 18), ' ');
        expected.push_back("pass     " + padded.substr(0, padded.find_last_not_of(' ') + 1) +
                           " # ms");
    }
    EXPECT_THAT(linesOf(untimed(result.out)), ElementsAreArray(expected));
    const std::string count = std::to_string(pluginChecks().size());
    EXPECT_EQ(result.error,
              count + " checks: " + count + " passed, 0 with a warning, 0 failed (--seed 1)\n");
}

TEST(ValidateCommandTest, OnlyRunsTheChecksThatItNames) {
    const CommandResult result =
        validate(sample("Sound"), "--only slots,factory --only unplug --seed 7");
    EXPECT_EQ(result, (CommandResult{0, result.out,
                                     "3 checks: 3 passed, 0 with a warning, 0 failed (--seed "
                                     "7)\n"}));
    EXPECT_EQ(untimed(result.out),
              "pass     factory # ms\n"
              "pass     slots # ms\n"
              "pass     unplug # ms\n");
}

TEST(ValidateCommandTest, AFreshSeedIsPrinted) {
    EXPECT_THAT(validate(sample("Sound"), "--only slots").error,
                MatchesRegex("1 check: 1 passed, 0 with a warning, 0 failed "
                             "\\(--seed [0-9]+\\)\n"));
}

TEST(ValidateCommandTest, JsonHoldsAnObjectALine) {
    const CommandResult result = validate(sample("Sound"), "--json --only slots --seed 5");
    EXPECT_THAT(result.out, MatchesRegex("\\{\"check\":\"slots\",\"result\":\"pass\",\"reason\":"
                                         "\"\",\"seed\":5,\"duration_ms\":[0-9.]+\\}\n"));
}

TEST(ValidateCommandTest, HereRunsOneCheckInTheSameProcessAndTellsItsSteps) {
    const CommandResult result = validate(sample("Sound"), "--here --only slots --seed 5");
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_EQ(untimed(result.out), "pass     slots # ms\n");
    EXPECT_THAT(result.error, HasSubstr("\nvexatouch validate: slots: calling Start\n"));
    EXPECT_EQ(validate(sample("WrongVersion"), "--here --only slots").exitCode, 1);
}

TEST(ValidateCommandTest, ASignalIsToldWithItsNameAndWhereItCame) {
    const CommandResult crash =
        validate(sample("CrashesOnNullKey"), "--only null-keys,slots --seed 2");
    EXPECT_EQ(crash.exitCode, 1);
    if (!kSanitized) {
        EXPECT_EQ(untimed(crash.out),
                  "pass     slots # ms\n"
                  "fail     null-keys # ms  crashes: SIGSEGV, while reading with NULL as key\n");
    }
    EXPECT_THAT(crash.error,
                HasSubstr("2 checks: 1 passed, 0 with a warning, 1 failed (--seed 2)\n"));
    const CommandResult abort = validate(sample("AbortsOnSecondOpen"), "--only repeated-calls");
    EXPECT_EQ(untimed(abort.out),
              "fail     repeated-calls # ms  crashes: SIGABRT, while opening\n");
}

TEST(ValidateCommandTest, AHangIsToldWithWhereItCame) {
    const CommandResult result =
        validate(sample("HangsStoppedTwice"), "--only repeated-calls --time-limit 2");
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_EQ(untimed(result.out),
              "fail     repeated-calls # ms  hangs: not done after 2 s, while calling Stop\n");
}

TEST(ValidateCommandTest, APluginThatEndsTheProcessFails) {
    const CommandResult result = validate(sample("ExitsAfterManyStarts"), "--only cycles,factory");
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_EQ(untimed(result.out),
              "pass     factory # ms\n"
              "fail     cycles # ms  ends the process with exit code 0, while calling Start\n");
}

TEST(ValidateCommandTest, WhatAFailingPluginSaysIsShown) {
    const CommandResult result = validate(sample("ExitsAfterManyStarts"), "--only cycles --seed 3");
    EXPECT_EQ(result.error,
              "cycles: that is all\n1 check: 0 passed, 0 with a warning, 1 failed (--seed 3)\n");
}

TEST(ValidateCommandTest, TheSameSeedFindsTheSameReports) {
    const std::string options = "--only random-reports --here --seed ";
    const auto steps = [&](const std::string& seed) {
        return validate(sample("AbortsOnOddReport"), options + seed).error;
    };
    const std::string first = steps("11");
    EXPECT_THAT(first, HasSubstr("sending report "));
    EXPECT_EQ(steps("11"), first);
    EXPECT_NE(steps("12"), first);
}

TEST(ValidateCommandTest, MoreSymbolsThanTheFactoryAreAWarning) {
    const CommandResult result = validate(sample("ExportsMore"), "--only load");
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_EQ(untimed(result.out),
              "warning  load # ms  exports more than its factory: anotherFunction\n");
    EXPECT_THAT(result.error, StartsWith("1 check: 0 passed, 1 with a warning, 0 failed "));
}

TEST(ValidateCommandTest, LoadingSlowlyIsAWarning) {
    const CommandResult result = validate(sample("LoadsSlowly"), "--only load");
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_THAT(untimed(result.out), MatchesRegex("warning  load # ms  takes [0-9]+ ms to load\n"));
}

TEST(ValidateCommandTest, WhatIsNoPluginFailsToLoadAndNothingElseIsChecked) {
    const TemporaryFolder folder;
    const auto reason = [](const std::string& plugin) {
        const CommandResult result = validate(plugin, "--only slots,cycles --json");
        EXPECT_EQ(result.exitCode, 1) << plugin;
        EXPECT_THAT(result.error, HasSubstr(plugin + ": not loaded, so nothing else was "
                                                     "checked\n"));
        const auto found = verdicts(result);
        EXPECT_EQ(found.size(), 1U) << result;
        return found.contains("load") ? found.at("load").result + ": " + found.at("load").reason
                                      : "not checked";
    };
    const std::string nowhere = folder.path("nowhere.so");
    EXPECT_EQ(reason(nowhere), "fail: cannot be loaded: " + nowhere +
                                   ": cannot open shared object file: No such file or directory");
    const std::string text = folder.file("text.so", "This is no shared object.\n");
    EXPECT_THAT(reason(text), StartsWith("fail: cannot be loaded: " + text + ": "));
    EXPECT_THAT(reason(folder.path("")), StartsWith("fail: cannot be loaded: "));
    EXPECT_THAT(reason(sample("MissesSymbol")),
                AllOf(StartsWith("fail: cannot be loaded: "),
                      HasSubstr("vexa_function_of_another_release")));
    EXPECT_EQ(reason(sample("NoFactory")), "fail: exports no VexaTouchHIDServiceFactory");
    EXPECT_EQ(reason(sample("AnswersNothing")),
              "fail: the factory gives no service for the type of HID services");
}

TEST(ValidateCommandTest, AFileInThisFolderNeedsNoPath) {
    EXPECT_THAT(validate("nowhere.so").out, HasSubstr("./nowhere.so: cannot open shared object"));
}

struct Defect {
    std::string_view name;
    std::string_view check;
    std::string_view others;
};

#define VEXA_DEFECT(defect, check, others) Defect{#defect, check, others},
constexpr std::array kDefects = {VEXA_DEFECTS(VEXA_DEFECT)};
#undef VEXA_DEFECT

void PrintTo(const Defect& defect, std::ostream* stream) {
    *stream << defect.name;
}

/// The words of a text separated by spaces.
std::set<std::string> words(std::string_view text) {
    std::istringstream stream{std::string(text)};
    return {std::istream_iterator<std::string>(stream), {}};
}

class BrokenPluginTest : public ::testing::TestWithParam<Defect> {};

TEST_P(BrokenPluginTest, FailsTheCheckThatLooksForItsDefect) {
    const Defect& defect = GetParam();
    const std::string plugin = sample(defect.name);
    std::set<std::string> expected = words(defect.others);
    expected.emplace(defect.check);
    std::set<std::string> failed;
    std::string options = "--json --seed 1";
    if (defect.name.starts_with("Hangs")) {
        // What hangs would wait for its time limit; everything else may take as long as it needs.
        failed = failures(verdicts(
            validate(plugin, "--json --time-limit 2 --only " + std::string(defect.check))));
        options += " --only ";
        for (const std::string& name : checkNames()) {
            options += name == defect.check ? "" : name + ",";
        }
        options.pop_back();
    }
    const CommandResult result = validate(plugin, options);
    failed.merge(failures(verdicts(result)));
    EXPECT_TRUE(failed.contains(std::string(defect.check))) << result;
    if (!kSanitized && defect.others != "*") {
        // A sanitizer sees some defects in every check.
        std::erase_if(expected, [&](const std::string& check) {
            if (!check.starts_with('?')) {
                return false;
            }
            failed.erase(check.substr(1));
            return true;
        });
        EXPECT_EQ(failed, expected) << result;
    }
}

INSTANTIATE_TEST_SUITE_P(All, BrokenPluginTest, ::testing::ValuesIn(kDefects),
                         [](const auto& defect) { return std::string(defect.param.name); });

TEST(ValidateCommandTest, EveryCheckHasADefectThatItMustFind) {
    std::set<std::string_view> checked;
    for (const Defect& defect : kDefects) {
        EXPECT_NE(findPluginCheck(defect.check), nullptr) << defect.name;
        for (std::string other : words(defect.others == "*" ? "" : defect.others)) {
            other.erase(0, other.starts_with('?') ? 1 : 0);
            EXPECT_NE(findPluginCheck(other), nullptr) << defect.name << ": " << other;
        }
        checked.insert(defect.check);
    }
    for (const PluginCheck& check : pluginChecks()) {
        EXPECT_TRUE(checked.contains(check.name)) << check.name;
    }
}

#ifdef VEXATOUCH_PLUGIN_FILE

TEST(ValidateCommandTest, OurOwnPluginPassesEveryCheck) {
    const CommandResult result = validate(VEXATOUCH_PLUGIN_FILE, "--json");
    EXPECT_EQ(result.exitCode, 0) << result;
    const auto found = verdicts(result);
    EXPECT_EQ(found.size(), pluginChecks().size());
    EXPECT_THAT(failures(found), IsEmpty()) << result;
}

#endif

#endif

}  // namespace
}  // namespace VexaTouch::Tools
