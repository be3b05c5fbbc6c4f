#include "Tools/CommandLine.h"

#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/CommandTable.h"
#include "Tools/CommandTexts.h"

#include "VexaVersion.h"

#include <gmock/gmock.h>

#include <sys/wait.h>

#include <cstdio>
#include <cstdlib>
#include <set>
#include <streambuf>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Testing::CommandResult;
using Testing::contentOf;
using ::testing::ElementsAreArray;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using Testing::linesOf;
using Testing::mixedSession;
using Testing::runCommand;
using ::testing::StartsWith;
using Testing::TemporaryFolder;

std::string allNames() {
    std::string names;
    for (const Command* command : commandTable()) {
        names += (names.empty() ? "" : ", ") + std::string(command->name);
    }
    return names;
}

TEST(CommandTableTest, EveryCommandIsDescribedWhole) {
    std::set<std::string_view> names;
    for (const Command* command : commandTable()) {
        EXPECT_TRUE(names.insert(command->name).second) << command->name;
        EXPECT_FALSE(command->summary.empty()) << command->name;
        EXPECT_FALSE(command->summary.ends_with('.')) << command->name;
        EXPECT_FALSE(command->description.empty()) << command->name;
        ASSERT_FALSE(command->examples.empty()) << command->name;
        for (const ExampleEntry& example : command->examples) {
            EXPECT_THAT(example.command, HasSubstr("vexatouch " + std::string(command->name)));
            EXPECT_FALSE(example.effect.ends_with('.')) << example.command;
        }
        std::set<int> codes;
        for (const ExitCodeEntry& code : command->exitCodes) {
            EXPECT_FALSE(code.meaning.empty());
            codes.insert(code.code);
        }
        EXPECT_EQ(codes, (std::set<int>{0, 1, 2})) << command->name;
        for (const OptionEntry& option : command->options) {
            EXPECT_TRUE(option.name.starts_with("--")) << option.name;
            EXPECT_FALSE(option.help.empty()) << option.name;
            EXPECT_FALSE(option.help.ends_with('.')) << option.name;
            EXPECT_EQ(option.kind == ValueKind::Choice, !option.choices.empty()) << option.name;
        }
        EXPECT_EQ(findCommand(command->name), command);
    }
    EXPECT_EQ(findCommand("repaly"), nullptr);
}

TEST(CommandLineTest, VersionIsTheBuilds) {
    EXPECT_EQ(runCommand({"--version"}),
              (CommandResult{0, "vexatouch " + std::string(versionText) + "\n", ""}));
}

TEST(CommandLineTest, HelpNamesEveryCommandAndGivesExamples) {
    const CommandResult result = runCommand({"--help"});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_EQ(result.error, "");
    EXPECT_EQ(runCommand({"-h"}), result);
    EXPECT_THAT(result.out, StartsWith("Usage: vexatouch COMMAND [ARGUMENT]...\n"));
    const std::string examples = result.out.substr(result.out.find("\nExamples:\n"));
    for (const Command* command : commandTable()) {
        EXPECT_THAT(result.out, HasSubstr("\n  " + std::string(command->name) + "  "));
        EXPECT_THAT(examples, HasSubstr("\n  vexatouch " + std::string(command->name)));
    }
}

TEST(CommandLineTest, HelpOfEveryCommandHoldsItsWholeEntry) {
    for (const Command* command : commandTable()) {
        const CommandResult result = runCommand({std::string(command->name), "--help"});
        EXPECT_EQ(result.exitCode, 0);
        EXPECT_EQ(result.error, "");
        EXPECT_THAT(result.out, StartsWith("Usage: vexatouch " + std::string(command->name)));
        for (const OptionEntry& option : command->options) {
            EXPECT_THAT(result.out, HasSubstr(std::string(option.name)));
        }
        for (const PositionalEntry& positional : command->positionals) {
            EXPECT_THAT(result.out, HasSubstr("\n  " + std::string(positional.name)));
        }
        const std::size_t examples = result.out.find("\nExamples:\n");
        ASSERT_NE(examples, std::string::npos) << command->name;
        for (const ExampleEntry& example : command->examples) {
            EXPECT_THAT(result.out.substr(examples), HasSubstr(std::string(example.command)));
        }
        EXPECT_EQ(runCommand({std::string(command->name), "-h"}), result);
    }
}

TEST(CommandLineTest, HelpWinsOverWhatIsMissing) {
    EXPECT_EQ(runCommand({"replay", "--json", "--help"}).exitCode, 0);
}

TEST(CommandLineTest, WithoutACommandItSaysWhichThereAre) {
    EXPECT_EQ(runCommand({}), (CommandResult{2, "",
                                             "vexatouch: a command is required: " + allNames() +
                                                 "\nTry 'vexatouch --help'.\n"}));
}

TEST(CommandLineTest, ACommandThatIsNotThereIsAUsageError) {
    EXPECT_EQ(runCommand({"repaly", "x.json"}),
              (CommandResult{2, "",
                             "vexatouch: there is no command 'repaly', only " + allNames() +
                                 "\nTry 'vexatouch --help'.\n"}));
}

TEST(CommandLineTest, WrongArgumentsAreUsageErrors) {
    const auto expectUsage = [](const std::vector<std::string>& arguments,
                                const std::string& reason) {
        EXPECT_EQ(runCommand(arguments), (CommandResult{2, "",
                                                        "vexatouch replay: " + reason +
                                                            "\nTry 'vexatouch replay --help'.\n"}));
    };
    expectUsage({"replay"}, "FILE is required");
    expectUsage({"replay", "a.json", "b.json"}, "one argument too many: b.json");
    expectUsage({"replay", "--sped", "1", "a.json"}, "there is no option --sped");
    expectUsage({"replay", "--sped=1", "a.json"}, "there is no option --sped");
    expectUsage({"replay", "-x", "a.json"}, "there is no option -x");
    expectUsage({"replay", "a.json", "--speed"}, "--speed: 1 required  missing");
    EXPECT_EQ(runCommand({"replay", "a.json", "--speed", "1", "--speed", "2"}).exitCode, 2);
    EXPECT_EQ(runCommand({"--nonsense"}),
              (CommandResult{
                  2, "", "vexatouch: there is no option --nonsense\nTry 'vexatouch --help'.\n"}));
    EXPECT_EQ(runCommand({"--version", "more"}),
              (CommandResult{2, "",
                             "vexatouch: one argument too many: more\nTry 'vexatouch --help'.\n"}));
}

TEST(CommandLineTest, AValueMayBeginWithAMinusOrStandInBrackets) {
    const TemporaryFolder folder;
    const std::string file = folder.file("session.json", mixedSession().text());
    EXPECT_EQ(runCommand({"replay", "--set", "ActivationThreshold=-5", file}).exitCode, 0);
    EXPECT_EQ(runCommand({"replay", "--set=ResetEventStats=[1,2]", file}).exitCode, 0);
    EXPECT_THAT(runCommand({"replay", "--speed", "-5", file}).error, HasSubstr("--speed -5: "));
    EXPECT_THAT(runCommand({"replay", "--set", "[1,2]", file}).error, HasSubstr("--set [1,2]: "));
    EXPECT_EQ(runCommand({"replay", "--", file}).exitCode, 0);
}

TEST(CommandLineTest, AskingForAnArgumentThatTheTableDoesNotHoldIsAMistake) {
    const Arguments arguments;
    EXPECT_THROW((void)arguments.given("--speed"), std::logic_error);
}

TEST(CommandLineTest, ResultsThatCannotBeWrittenAreAFailure) {
    struct Full : std::streambuf {
        int_type overflow(int_type) override { return traits_type::eof(); }
        int sync() override { return -1; }
    } full;
    std::istringstream in(mixedSession().text());
    std::ostream out(&full);
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
    const std::vector<std::string> arguments = {"replay", "-"};
    EXPECT_EQ(CommandLine::run(arguments, streams), 1);
    EXPECT_THAT(error.str(), HasSubstr("vexatouch replay: cannot write the results: "));
}

TEST(CommandLineTest, ManPagesCoverTheTable) {
    const TemporaryFolder folder;
    const std::string man = folder.path("man/man1");
    EXPECT_EQ(runCommand({"--generate-man", man}), (CommandResult{0, "", ""}));
    const std::string overview = contentOf(man + "/vexatouch.1");
    for (const Command* command : commandTable()) {
        const std::string name(command->name);
        EXPECT_THAT(overview, HasSubstr("vexatouch\\-" + name + "(1)"));
        const std::string page = contentOf(man + "/vexatouch-" + name + ".1");
        EXPECT_EQ(page, manPage(*command));
        EXPECT_THAT(page, StartsWith(".TH \"VEXATOUCH\\-"));
        for (const std::string section : {"NAME", "SYNOPSIS", "DESCRIPTION", "OPTIONS",
                                          "EXIT STATUS", "EXAMPLES", "SEE ALSO"}) {
            EXPECT_THAT(page, HasSubstr("\n.SH " + section + "\n")) << name;
        }
        for (const OptionEntry& option : command->options) {
            std::string escaped;
            for (const char c : option.name) {
                escaped += c == '-' ? std::string("\\-") : std::string(1, c);
            }
            EXPECT_THAT(page, HasSubstr(escaped));
        }
    }
}

TEST(CommandLineTest, ManPagesThatCannotBeWrittenAreAFailure) {
    const TemporaryFolder folder;
    const std::string file = folder.file("file", "");
    const CommandResult result = runCommand({"--generate-man", file + "/man"});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error, StartsWith("vexatouch: " + file + "/man: cannot make the folder: "));
}

/// What bash offers after these words, the last of which is being typed.
std::vector<std::string> offered(const TemporaryFolder& folder,
                                 const std::vector<std::string>& words) {
    std::string script = runCommand({"--generate-completion"}).out;
    script += "cd " + folder.path("") + "\nCOMP_WORDS=(";
    for (const std::string& word : words) {
        script += "'" + word + "' ";
    }
    script += ")\nCOMP_CWORD=" + std::to_string(words.size() - 1) +
              "\n_vexatouch\nprintf '%s\\n' \"${COMPREPLY[@]}\" > offered\n";
    const std::string command = "bash " + folder.file("completion.bash", script);
    EXPECT_EQ(std::system(command.c_str()), 0);
    return linesOf(contentOf(folder.path("offered")));
}

TEST(CommandLineTest, CompletionOffersCommandsOptionsChoicesAndFiles) {
    const TemporaryFolder folder;
    static_cast<void>(folder.file("session.json", ""));
    std::vector<std::string> commands = {"--help", "--version"};
    for (const Command* command : commandTable()) {
        commands.emplace_back(command->name);
    }
    EXPECT_THAT(offered(folder, {"vexatouch", ""}), ElementsAreArray(commands));
    for (const Command* command : commandTable()) {
        std::vector<std::string> options;
        for (const OptionEntry& option : command->options) {
            options.emplace_back(option.name);
        }
        options.emplace_back("--help");
        EXPECT_THAT(offered(folder, {"vexatouch", std::string(command->name), "--"}),
                    ElementsAreArray(options));
    }
    EXPECT_THAT(offered(folder, {"vexatouch", "replay", "--speed", "m"}),
                ElementsAreArray({"max"}));
    EXPECT_THAT(offered(folder, {"vexatouch", "replay", "--trace", "ses"}),
                ElementsAreArray({"session.json"}));
    EXPECT_THAT(offered(folder, {"vexatouch", "replay", "ses"}),
                ElementsAreArray({"session.json"}));
    static_cast<void>(folder.file("two words.json", ""));
    EXPECT_THAT(offered(folder, {"vexatouch", "replay", "two"}),
                ElementsAreArray({"two words.json"}));
    EXPECT_THAT(offered(folder, {"vexatouch", "replay", "--set", "Hold"}),
                ElementsAreArray({"HoldTimeoutMilliseconds="}));
}

#ifdef VEXATOUCH_PROGRAM

TEST(CommandLineTest, TheProgramItselfReadsPrintsAndExits) {
    const TemporaryFolder folder;
    const std::string file = folder.file("session.json", mixedSession().text());
    const std::string program = VEXATOUCH_PROGRAM;
    const auto shell = [&](const std::string& arguments) {
        const std::string command =
            program + " " + arguments + " > " + folder.path("out") + " 2> " + folder.path("error");
        const int status = std::system(command.c_str());
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    };
    EXPECT_EQ(shell("replay --json - < " + file), 0);
    EXPECT_EQ(contentOf(folder.path("out")), runCommand({"replay", "--json", file}).out);
    EXPECT_THAT(contentOf(folder.path("error")), StartsWith("standard input: 125 frames"));
    EXPECT_EQ(shell("replay " + folder.path("nowhere")), 1);
    EXPECT_EQ(contentOf(folder.path("out")), "");
    EXPECT_EQ(shell("replay --no-such-option " + file), 2);
    EXPECT_EQ(shell("replay --json " + file + " --trace /dev/full"), 1);
    EXPECT_THAT(contentOf(folder.path("error")),
                EndsWith("/dev/full: cannot write: No space left on device\n"));
    const std::string full =
        program + " replay --json " + file + " > /dev/full 2> " + folder.path("error");
    const int status = std::system(full.c_str());
    EXPECT_EQ(WEXITSTATUS(status), 1);
    EXPECT_THAT(contentOf(folder.path("error")),
                HasSubstr("vexatouch replay: cannot write the results: No space left on device\n"));
}

#endif

}  // namespace
}  // namespace VexaTouch::Tools
