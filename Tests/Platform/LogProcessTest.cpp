// The log in a process of its own: what the environment sets, where messages go by default, and
// what happens at the end.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fcntl.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

namespace Vexa {
namespace {

using testing::MatchesRegex;

constexpr const char* kTime =
    "[0-9][0-9][0-9][0-9]-[0-9][0-9]-[0-9][0-9] [0-9][0-9]:[0-9][0-9]:[0-9][0-9]"
    "\\.[0-9][0-9][0-9] ";

std::string contentOf(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// Runs LogProgram in a folder of its own, with its outputs in files.
class LogProcessTest : public testing::Test {
protected:
    void SetUp() override {
        std::string pattern = (std::filesystem::temp_directory_path() / "vexa-log-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        folder = pattern;
        out = folder / "out";
        error = folder / "error";
        journal = folder / "journal";
        std::ofstream(error).close();
    }
    void TearDown() override { std::filesystem::remove_all(folder); }

    /// Its exit status; standard error goes to `error` or, if given, to `errorDescriptor`.
    int run(std::vector<std::string> arguments, int errorDescriptor = -1) {
        std::vector<std::string> variables;
        for (char** variable = environ; *variable != nullptr; ++variable) {
            const std::string text = *variable;
            const std::string name = text.substr(0, text.find('='));
            if (name != "VEXATOUCH_LOG" && name != "JOURNAL_STREAM" &&
                !environment.contains(name)) {
                variables.push_back(text);
            }
        }
        for (const auto& [name, value] : environment) variables.push_back(name + "=" + value);
        arguments.insert(arguments.begin(), LOG_PROGRAM);
        std::istringstream emulator(PROGRAM_EMULATOR);
        arguments.insert(arguments.begin(), std::istream_iterator<std::string>(emulator), {});

        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, out.c_str(),
                                         O_WRONLY | O_CREAT | O_TRUNC, 0600);
        if (errorDescriptor >= 0) {
            posix_spawn_file_actions_adddup2(&actions, errorDescriptor, STDERR_FILENO);
        } else {
            posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, error.c_str(),
                                             O_WRONLY | O_TRUNC, 0600);
        }
        pid_t process = 0;
        const int result = posix_spawnp(&process, arguments.front().c_str(), &actions, nullptr,
                                        pointersTo(arguments).data(), pointersTo(variables).data());
        posix_spawn_file_actions_destroy(&actions);
        EXPECT_EQ(result, 0);
        int status = -1;
        EXPECT_EQ(waitpid(process, &status, 0), process);
        return status;
    }

    /// What systemd sets when `error` is a stream of the journal.
    void giveJournalStream() {
        struct stat file{};
        ASSERT_EQ(stat(error.c_str(), &file), 0);
        environment["JOURNAL_STREAM"] =
            std::to_string(file.st_dev) + ":" + std::to_string(file.st_ino);
    }
    void giveJournalLibrary() {
        environment["LD_LIBRARY_PATH"] = FAKE_SYSTEMD_FOLDER;
        environment["FAKE_JOURNAL"] = journal.string();
    }

    static std::vector<char*> pointersTo(std::vector<std::string>& texts) {
        std::vector<char*> pointers;
        for (std::string& text : texts) pointers.push_back(text.data());
        pointers.push_back(nullptr);
        return pointers;
    }

    std::filesystem::path folder;
    std::filesystem::path out;
    std::filesystem::path error;
    std::filesystem::path journal;
    std::map<std::string, std::string> environment;
};

TEST_F(LogProcessTest, WithoutTheVariableOnlyErrorsAreEnabled) {
    EXPECT_EQ(run({"levels"}), 0);
    EXPECT_EQ(contentOf(out), "HIDService=error\nPipeline=error\nRecording=error\nAlgs=error\n");
    EXPECT_EQ(contentOf(error), "");
}

TEST_F(LogProcessTest, TheVariableSetsOneLevelForAll) {
    environment["VEXATOUCH_LOG"] = "Debug";
    EXPECT_EQ(run({"levels"}), 0);
    EXPECT_EQ(contentOf(out), "HIDService=debug\nPipeline=debug\nRecording=debug\nAlgs=debug\n");
    EXPECT_EQ(contentOf(error), "");
}

TEST_F(LogProcessTest, TheVariableSetsSomeCategories) {
    environment["VEXATOUCH_LOG"] = "off, HIDService=debug,Algs = info,";
    EXPECT_EQ(run({"levels"}), 0);
    EXPECT_EQ(contentOf(out), "HIDService=debug\nPipeline=off\nRecording=off\nAlgs=info\n");
    EXPECT_EQ(contentOf(error), "");
}

TEST_F(LogProcessTest, UnknownPartsOfTheVariableAreSaidOnceAndIgnored) {
    environment["VEXATOUCH_LOG"] = "loud,Algs=debug,algs=info,Pipeline=,=off,Recording=info";
    EXPECT_EQ(run({"levels"}), 0);
    EXPECT_EQ(contentOf(out), "HIDService=error\nPipeline=error\nRecording=info\nAlgs=debug\n");
    EXPECT_EQ(contentOf(error),
              "VEXATOUCH_LOG: ignoring \"loud\", \"algs=info\", \"Pipeline=\", \"=off\"; it takes "
              "LEVEL or CATEGORY=LEVEL,... with the levels debug, info, error, off and the "
              "categories HIDService, Pipeline, Recording, Algs\n");
}

TEST_F(LogProcessTest, ALineHasTimeCategoryLevelAndText) {
    environment["VEXATOUCH_LOG"] = "debug";
    EXPECT_EQ(run({"write", "Recording", "info", "100% of {} kept"}), 0);
    EXPECT_THAT(contentOf(error),
                MatchesRegex(std::string(kTime) + "Recording info: 100% of \\{\\} kept\n"));
}

TEST_F(LogProcessTest, LineEndsAtTheEndOfATextAreLeftOut) {
    EXPECT_EQ(run({"write", "HIDService", "error", "two\nlines ***\n\n"}), 0);
    EXPECT_THAT(contentOf(error),
                MatchesRegex(std::string(kTime) + "HIDService error: two\nlines \\*\\*\\*\n"));
    EXPECT_EQ(run({"write", "HIDService", "error", "\n"}), 0);
    EXPECT_THAT(contentOf(error), MatchesRegex(std::string(kTime) + "HIDService error: \n"));
}

TEST_F(LogProcessTest, OnATerminalTheLevelIsInColor) {
    const int master = posix_openpt(O_RDWR | O_NOCTTY);
    ASSERT_GE(master, 0);
    ASSERT_EQ(grantpt(master), 0);
    ASSERT_EQ(unlockpt(master), 0);
    const int terminal = open(ptsname(master), O_RDWR | O_NOCTTY);
    ASSERT_GE(terminal, 0);
    const auto shown = [&] {
        EXPECT_EQ(run({"write", "Algs", "error", "text"}, terminal), 0);
        std::string text(512, '\0');
        const ssize_t length = read(master, text.data(), text.size());
        text.resize(length > 0 ? static_cast<std::size_t>(length) : 0);
        return text;
    };
    environment["NO_COLOR"] = "";
    EXPECT_THAT(shown(),
                MatchesRegex(std::string(kTime) + "Algs \033\\[1;31merror\033\\[m: text\r\n"));
    environment["NO_COLOR"] = "1";
    EXPECT_THAT(shown(), MatchesRegex(std::string(kTime) + "Algs error: text\r\n"));
    close(terminal);
    close(master);
}

TEST_F(LogProcessTest, TheJournalGetsMessagesWithTheirFields) {
    environment["VEXATOUCH_LOG"] = "debug";
    giveJournalStream();
    giveJournalLibrary();
    EXPECT_EQ(run({"write", "Algs", "debug", "two\nlines\n\n"}), 0);
    EXPECT_EQ(run({"write", "Pipeline", "info", "i"}), 0);
    EXPECT_EQ(run({"write", "HIDService", "error", "e"}), 0);
    EXPECT_EQ(contentOf(error), "");
    const std::string fields =
        std::regex_replace(contentOf(journal), std::regex("[0-9]+ TID=[0-9]+"), "TID");
    EXPECT_EQ(fields,
              "17 MESSAGE=two\nlines\n10 PRIORITY=7\n28 SYSLOG_IDENTIFIER=LogProgram\n"
              "23 VEXATOUCH_CATEGORY=Algs\nTID\n\n"
              "9 MESSAGE=i\n10 PRIORITY=6\n28 SYSLOG_IDENTIFIER=LogProgram\n"
              "27 VEXATOUCH_CATEGORY=Pipeline\nTID\n\n"
              "9 MESSAGE=e\n10 PRIORITY=3\n28 SYSLOG_IDENTIFIER=LogProgram\n"
              "29 VEXATOUCH_CATEGORY=HIDService\nTID\n\n");
}

TEST_F(LogProcessTest, TheJournalNamesTheThreadThatLogged) {
    giveJournalStream();
    giveJournalLibrary();
    EXPECT_EQ(run({"unblocked", "error", "2"}), 0);
    std::smatch match;
    const std::string fields = contentOf(journal);
    // Both from one thread, though another one sent them.
    EXPECT_TRUE(std::regex_search(
        fields, match,
        std::regex(
            "MESSAGE=message 0\n[^]*TID=([0-9]+)\n\n[^]*MESSAGE=message 1\n[^]*TID=\\1\n\n")))
        << fields;
}

TEST_F(LogProcessTest, WithoutTheJournalsLibraryMessagesGoToStandardError) {
    giveJournalStream();
    environment["LD_LIBRARY_PATH"] = BROKEN_SYSTEMD_FOLDER;
    EXPECT_EQ(run({"write", "Algs", "error", "text"}), 0);
    EXPECT_THAT(contentOf(error), MatchesRegex(std::string(kTime) + "Algs error: text\n"));
}

TEST_F(LogProcessTest, WhatTheJournalDoesNotTakeGoesToStandardError) {
    giveJournalStream();
    giveJournalLibrary();
    environment.erase("FAKE_JOURNAL");
    EXPECT_EQ(run({"write", "Algs", "error", "text"}), 0);
    EXPECT_THAT(contentOf(error), MatchesRegex(std::string(kTime) + "Algs error: text\n"));
}

TEST_F(LogProcessTest, AnotherFileThanTheJournalsStreamIsStandardError) {
    giveJournalLibrary();
    for (const char* const stream : {"1:1", "", "1", ":", "1:", "1:1x", "x"}) {
        environment["JOURNAL_STREAM"] = stream;
        EXPECT_EQ(run({"write", "Algs", "error", "text"}), 0);
        EXPECT_THAT(contentOf(error), MatchesRegex(std::string(kTime) + "Algs error: text\n"))
            << stream;
    }
    EXPECT_EQ(contentOf(journal), "");
}

TEST_F(LogProcessTest, WhatWaitsForTheSinkIsWrittenAtTheEnd) {
    environment["VEXATOUCH_LOG"] = "info";
    EXPECT_EQ(run({"unblocked", "info", "1000"}), 0);
    std::string expected;
    for (int i = 0; i < 1000; ++i) {
        expected += "HIDService info: message " + std::to_string(i) + "\n";
    }
    EXPECT_EQ(std::regex_replace(contentOf(error), std::regex(kTime), ""), expected);
}

TEST_F(LogProcessTest, ErrorsThatDifferInNumbersDoNotFillStandardError) {
    EXPECT_EQ(run({"unblocked", "error", "1000"}), 0);
    std::string expected;
    for (int i = 0; i < 20; ++i) {
        expected += "HIDService error: message " + std::to_string(i) + "\n";
    }
    expected += "HIDService error: 980 more like this left out, the last: message 999\n";
    EXPECT_EQ(std::regex_replace(contentOf(error), std::regex(kTime), ""), expected);
}

TEST_F(LogProcessTest, TheJournalGetsEveryError) {
    giveJournalStream();
    giveJournalLibrary();
    EXPECT_EQ(run({"unblocked", "error", "50"}), 0);
    const std::string fields = contentOf(journal);
    EXPECT_THAT(fields, testing::HasSubstr("MESSAGE=message 49\n"));
    EXPECT_EQ(contentOf(error), "");
}

TEST_F(LogProcessTest, AFullPipeDoesNotHoldTheEndUp) {
    int ends[2] = {-1, -1};
    ASSERT_EQ(pipe(ends), 0);
    // More than the pipe and the ring hold. Nobody reads.
    environment["VEXATOUCH_LOG"] = "info";
    EXPECT_EQ(run({"unblocked", "info", "10000"}, ends[1]), 0);
    close(ends[0]);
    close(ends[1]);
}

#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define VEXA_NO_THREADS_AFTER_FORK
#endif
#endif
#ifndef VEXA_NO_THREADS_AFTER_FORK
TEST_F(LogProcessTest, AForkedProcessWritesForItself) {
    // The leak checker does not know threads that stayed behind in the other process.
    environment["ASAN_OPTIONS"] = "detect_leaks=0";
    EXPECT_EQ(run({"forked"}), 0);
    EXPECT_EQ(std::regex_replace(contentOf(error), std::regex(kTime), ""),
              "HIDService error: message 0\nHIDService error: message 0\n"
              "HIDService error: message 1\nHIDService error: message 2\n");
}
#endif

TEST_F(LogProcessTest, ItsOwnThreadIsAnOrdinaryOne) {
    EXPECT_EQ(run({"scheduling"}), 0);
    EXPECT_EQ(contentOf(out), "ordinary\n");
}

TEST_F(LogProcessTest, AClosedPipeLosesMessagesOnly) {
    int ends[2] = {-1, -1};
    ASSERT_EQ(pipe(ends), 0);
    close(ends[0]);
    EXPECT_EQ(run({"unblocked", "error", "10"}, ends[1]), 0);
    close(ends[1]);
}

}  // namespace
}  // namespace Vexa
