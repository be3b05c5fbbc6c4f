#include "Shared/Util.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/ProgramOnTerminal.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/TerminalColor.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <pty.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <numeric>
#include <optional>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::ElementsAre;
using ::testing::Not;

/// The environment that says what a terminal can do, as a test wants it.
class TerminalEnvironment {
public:
    TerminalEnvironment(const char* term, const char* colorTerm, const char* noColor) {
        set("TERM", term);
        set("COLORTERM", colorTerm);
        set("NO_COLOR", noColor);
    }
    ~TerminalEnvironment() {
        for (const auto& [name, value] : before_) {
            set(name.c_str(), value ? value->c_str() : nullptr, false);
        }
    }
    TerminalEnvironment(const TerminalEnvironment&) = delete;
    TerminalEnvironment& operator=(const TerminalEnvironment&) = delete;

private:
    void set(const char* name, const char* value, bool remember = true) {
        if (remember) {
            const char* old = std::getenv(name);
            before_.emplace_back(name,
                                 old == nullptr ? std::nullopt : std::optional<std::string>(old));
        }
        value == nullptr ? unsetenv(name) : setenv(name, value, 1);
    }

    std::vector<std::pair<std::string, std::optional<std::string>>> before_;
};

/// Plays what a program writes into a terminal that knows as much as the program uses.
class FakeTerminal {
public:
    void write(const std::string& text) {
        for (std::size_t at = 0; at < text.size(); ++at) {
            const char c = text[at];
            if (c == '\x1B') {
                const std::size_t end = text.find_first_of("hlmAK", at);
                ASSERT_NE(end, std::string::npos);
                act(text.substr(at + 2, end - at - 2), text[end]);
                at = end;
            } else if (c == '\r') {
                column_ = 0;
            } else if (c == '\n') {
                ++row_;
                mostRows_ = std::max(mostRows_, row_ + 1);
            } else {
                line().resize(std::max(line().size(), column_ + 1), ' ');
                line()[column_++] = c;
                mostColumns_ = std::max(mostColumns_, column_);
            }
        }
    }

    [[nodiscard]] const std::vector<std::string>& screen() const { return screen_; }
    [[nodiscard]] std::size_t row() const { return row_; }
    [[nodiscard]] std::size_t mostRows() const { return mostRows_; }
    [[nodiscard]] std::size_t mostColumns() const { return mostColumns_; }
    [[nodiscard]] bool cursorShown() const { return cursorShown_; }
    [[nodiscard]] int updates() const { return updates_; }

private:
    std::string& line() {
        screen_.resize(std::max(screen_.size(), row_ + 1));
        return screen_[row_];
    }

    void act(const std::string& parameters, char action) {
        if (action == 'A') {
            const auto up = static_cast<std::size_t>(std::stoul(parameters));
            ASSERT_LE(up, row_);
            row_ -= up;
        } else if (action == 'K') {
            line().resize(column_);
        } else if (parameters == "?25") {
            cursorShown_ = action == 'h';
        } else if (parameters == "?2026") {
            updates_ += action == 'h' ? 1 : 0;
        }
    }

    std::vector<std::string> screen_;
    std::size_t row_ = 0;
    std::size_t column_ = 0;
    std::size_t mostRows_ = 1;
    std::size_t mostColumns_ = 0;
    bool cursorShown_ = true;
    int updates_ = 0;
};

/// Runs show as on a terminal of that size, where time stands still but for its waiting.
struct TerminalRun {
    FakeHostClock clock;
    FakeTerminal terminal;
    CommandResult result;

    void run(std::vector<std::string> arguments, const std::string& input, unsigned columns,
             unsigned rows) {
        std::istringstream in(input);
        std::ostringstream out;
        std::ostringstream error;
        Tools::Streams streams{.in = in,
                               .out = out,
                               .error = error,
                               .outIsTerminal = true,
                               .columns = columns,
                               .rows = rows,
                               .clock = clock};
        arguments.insert(arguments.begin(), {"show", "-"});
        result.exitCode = Tools::CommandLine::run(arguments, streams);
        result.out = out.str();
        result.error = error.str();
        terminal.write(result.out);
    }
};

/// A tap on volume up whose lift-off is frame 4, and a setting.
RecordedSession tapSession() {
    RecordedSession session;
    session.feel(nothing())
        .feel(touch("H").at(350).with("I", 150).with("G", -30).with("E", 42).forMs(30))
        .feel(nothing())
        .set("Algs.HoldTimeoutMilliseconds", 300);
    return session;
}

const std::string kTouchPicture =
    "                    [H   350]            G   -30\n"
    "                              [I   222]\n"
    "         B     0                                     A     0\n"
    "                 J     0                     J     0\n"
    "         F     0                                    (E    80)\n"
    " A     0                                                     B     0\n"
    "                               K     0\n"
    " D     0                                                     C     0\n"
    "        (E    80)                                    F     0\n"
    "                 L     0                     L     0\n"
    "         C     0                                     D     0\n"
    "                               M     0\n"
    "                     N     0             O     0\n";

const std::string kIdlePicture =
    "                     H     0             G     0\n"
    "                               I     0\n"
    "         B     0                                     A     0\n"
    "                 J     0                     J     0\n"
    "         F     0                                     E     0\n"
    " A     0                                                     B     0\n"
    "                               K     0\n"
    " D     0                                                     C     0\n"
    "         E     0                                     F     0\n"
    "                 L     0                     L     0\n"
    "         C     0                                     D     0\n"
    "                               M     0\n"
    "                     N     0             O     0\n";

CommandResult success(std::string out) {
    return {.exitCode = 0, .out = std::move(out), .error = {}};
}

TEST(ShowCommand, OneFrameIsAPictureWithRegionPhaseScoreAndEvents) {
    EXPECT_EQ(runCommand({"show", "-", "--frame", "1"}, tapSession().text()),
              success("frame 1 of 6   0.010 s   image 2 at 10010 ms\n\n" + kTouchPicture +
                      "region  3 volume up or increment\n"
                      "phase   STARTTOUCH 0ms ActiveRegion=3\n"
                      "score   touch 2.71 (hold from 0.00)   tap 0.79\n"
                      "events  may-begin volume up or increment\n"));
}

TEST(ShowCommand, ARangeIsFrameAfterFrame) {
    EXPECT_EQ(runCommand({"show", "-", "--frame", "4:6"}, tapSession().text()),
              success("frame 4 of 6   0.040 s   image 5 at 10040 ms\n\n" + kIdlePicture +
                      "region  3 volume up or increment\n"
                      "phase   TAP 30ms ActiveRegion=3 BELOWNOISE\n"
                      "score   touch 0.00 (hold from 0.00)   tap 5.93\n"
                      "events  tap volume up\n"
                      "\n"
                      "frame 5 of 6   0.050 s   Algs.HoldTimeoutMilliseconds = 300\n\n" +
                      kIdlePicture +
                      "region  3 volume up or increment\n"
                      "phase   TAP 30ms ActiveRegion=3 BELOWNOISE\n"
                      "score   touch 0.00 (hold from 0.00)   tap 5.93\n"
                      "events\n"));
}

TEST(ShowCommand, EitherEndOfARangeMayBeLeftOut) {
    const std::string text = tapSession().text();
    const auto frames = [&](const std::string& range) {
        std::vector<std::string> headings;
        for (const std::string& line :
             linesOf(runCommand({"show", "-", "--frame", range}, text).out)) {
            if (line.starts_with("frame ")) {
                headings.push_back(line.substr(6, 1));
            }
        }
        return headings;
    };
    EXPECT_THAT(frames(":2"), ElementsAre("0", "1"));
    EXPECT_THAT(frames("4:"), ElementsAre("4", "5"));
    EXPECT_THAT(frames("4:99"), ElementsAre("4", "5"));
    EXPECT_THAT(frames(":"), ElementsAre("0", "1", "2", "3", "4", "5"));
}

TEST(ShowCommand, WithoutATerminalEveryFrameIsPrinted) {
    const std::string text = tapSession().text();
    EXPECT_EQ(runCommand({"show", "-"}, text), runCommand({"show", "-", "--frame", ":"}, text));
}

TEST(ShowCommand, FramesThatAreNoImagesSayWhatTheyAre) {
    RecordedSession session;
    session.report({1, 2, 3}).report(firmwareReport(7)).report(firmwareReport(0));
    session.set("esc\x1B[2J", "\x7F");
    std::vector<std::string> headings;
    for (const std::string& line : linesOf(runCommand({"show", "-"}, session.text()).out)) {
        if (line.starts_with("frame ")) {
            headings.push_back(line);
        }
    }
    EXPECT_THAT(headings, ElementsAre("frame 0 of 4   0.000 s   invalid report of 3 bytes",
                                      "frame 1 of 4   0.000 s   firmware event 7",
                                      "frame 2 of 4   0.000 s   firmware event 0 (reset)",
                                      "frame 3 of 4   0.000 s   esc?[2J = \"?\""));
}

TEST(ShowCommand, TextIsTheImageExactly) {
    const RecordedSession session = tapSession();
    const std::vector<std::uint8_t>& report = std::next(session.frames().begin())->report;
    const auto image = InputReport::Image::parse(report.data(), report.size());
    ASSERT_TRUE(image);
    EXPECT_EQ(runCommand({"show", "-", "--text", "--frame", "1"}, session.text()),
              success(Util::stringFromImage(*image, false)));
    EXPECT_EQ(runCommand({"show", "-", "--text", "--unsigned", "--frame", "1"}, session.text()),
              success(Util::stringFromImage(*image, true)));
}

TEST(ShowCommand, TextsOfARangeLeaveOutWhatIsNoImage) {
    const std::string text = tapSession().text();
    const auto one = [&](const std::string& frame) {
        return runCommand({"show", "-", "--text", "--frame", frame}, text).out;
    };
    EXPECT_EQ(one("3:"), one("3") + "\n" + one("4"));
    EXPECT_EQ(runCommand({"show", "-", "--text", "--frame", "5"}, text),
              (CommandResult{.exitCode = 1,
                             .out = {},
                             .error = "vexatouch show: standard input: frame 5 is no image\n"}));
    EXPECT_EQ(
        runCommand({"show", "-", "--text", "--frame", "5:9"}, text),
        (CommandResult{.exitCode = 1,
                       .out = {},
                       .error = "vexatouch show: standard input: no image among these frames\n"}));
}

TEST(ShowCommand, SettingsAreGivenBeforeTheFirstFrame) {
    const CommandResult result = runCommand(
        {"show", "-", "--frame", "1", "--set", "ActivationThreshold=1000"}, tapSession().text());
    EXPECT_THAT(result.out, ::testing::HasSubstr("(H   350)"));
    EXPECT_THAT(result.out, ::testing::HasSubstr("\nphase\n"));
}

TEST(ShowCommand, ColoursAreOnlyForTerminalsThatWantThem) {
    const std::string text = tapSession().text();
    const auto shown = [&] {
        TerminalRun run;
        run.run({"--frame", "1"}, text, 80, 24);
        return run.result.out;
    };
    const auto forced = [&](const std::string& when) {
        return runCommand({"show", "-", "--frame", "1", "--color", when}, text).out;
    };
    const std::string plain = forced("never");
    EXPECT_THAT(plain, Not(::testing::HasSubstr("\x1B")));
    {
        const TerminalEnvironment environment("xterm", "truecolor", nullptr);
        EXPECT_EQ(shown(), forced("truecolor"));
        EXPECT_EQ(runCommand({"show", "-", "--frame", "1"}, text).out, plain);
    }
    {
        const TerminalEnvironment environment("xterm", nullptr, nullptr);
        EXPECT_EQ(shown(), forced("256"));
    }
    {
        const TerminalEnvironment environment("xterm", "truecolor", "1");
        EXPECT_EQ(shown(), plain);
    }
    {
        const TerminalEnvironment environment("dumb", "truecolor", nullptr);
        EXPECT_EQ(shown(), plain);
    }
    EXPECT_THAT(forced("truecolor"), ::testing::HasSubstr("\x1B[48;2;"));
    EXPECT_THAT(forced("256"), ::testing::HasSubstr("\x1B[48;5;"));
}

/// The text without its colours.
std::string withoutColors(const std::string& text) {
    return std::regex_replace(text, std::regex("\x1B\\[[0-9;]*m"), "");
}

TEST(ShowCommand, ColoursChangeNothingElse) {
    const std::string text = tapSession().text();
    const auto shown = [&](const std::string& when) {
        std::vector<std::string> lines = linesOf(
            withoutColors(runCommand({"show", "-", "--frame", "1", "--color", when}, text).out));
        for (std::string& line : lines) {
            line.erase(line.find_last_not_of(' ') + 1);  // the glow reaches to the edge
        }
        return lines;
    };
    EXPECT_EQ(shown("truecolor"), shown("never"));
    EXPECT_EQ(shown("256"), shown("never"));
}

TEST(ShowCommand, ActivePixelsAreWarmAndOthersCold) {
    const std::string out =
        runCommand({"show", "-", "--frame", "1", "--color", "truecolor"}, tapSession().text()).out;
    // The colour under a pad's letter: the last one set before it.
    const auto colorBefore = [&](const std::string& label) {
        const std::size_t at = out.find(label);
        EXPECT_NE(at, std::string::npos) << label;
        const std::size_t set = out.rfind("\x1B[48;2;", at);
        int red = 0;
        int green = 0;
        int blue = 0;
        EXPECT_EQ(std::sscanf(out.c_str() + set, "\x1B[48;2;%d;%d;%d", &red, &green, &blue), 3);
        return red > blue ? "warm" : "cold";
    };
    EXPECT_EQ(colorBefore("50"), std::string("warm"));  // of H's 350
    EXPECT_EQ(colorBefore("80"), std::string("cold"));  // of E's 80
}

TEST(ShowCommand, NarrowTerminalsGetANarrowPicture) {
    TerminalRun run;
    const TerminalEnvironment environment(nullptr, nullptr, nullptr);
    run.run({"--frame", "1"}, tapSession().text(), 40, 24);
    EXPECT_EQ(run.result.out,
              "frame 1 of 6   0.010 s   image 2 at 1001\n\n"
              "          [H  350]   G  -30\n"
              "               [I  222]\n"
              "     B    0                A    0\n"
              "         J    0        J    0\n"
              "     F    0               (E   80)\n"
              " A    0                        B    0\n"
              "                K    0\n"
              " D    0                        C    0\n"
              "    (E   80)               F    0\n"
              "         L    0        L    0\n"
              "     C    0                D    0\n"
              "                M    0\n"
              "           N    0    O    0\n"
              "region  3 volume up or increment\n"
              "phase   STARTTOUCH 0ms ActiveRegion=3\n"
              "score   touch 2.71 (hold from 0.00)   ta\n"
              "events  may-begin volume up or increment\n");
}

TEST(ShowCommand, OnATerminalTheRecordingIsPlayedInPlaceInRealTime) {
    const TerminalEnvironment environment("xterm", nullptr, "1");
    TerminalRun run;
    run.run({}, mixedSession().text(), 80, 30);
    EXPECT_EQ(run.result.exitCode, 0);
    // 1.21 s from the first report to the last, in waits of 10 ms at most.
    EXPECT_EQ(std::accumulate(run.clock.sleeps.begin(), run.clock.sleeps.end(), std::uint64_t{0}) /
                  10'000,
              121U);
    EXPECT_EQ(run.terminal.updates(), 122);  // before each wait and at the end
    EXPECT_TRUE(run.terminal.cursorShown());
    // All of it stays within the terminal, and the cursor ends below it.
    EXPECT_EQ(run.terminal.mostRows(), 29U);
    EXPECT_LE(run.terminal.mostColumns(), 80U);
    EXPECT_EQ(run.terminal.row(), 28U);
    const std::vector<std::string>& screen = run.terminal.screen();
    ASSERT_EQ(screen.size(), 28U);
    EXPECT_EQ(screen[0], "frame 124 of 125   1.210 s   image 122 at 11210 ms");
    EXPECT_THAT(
        std::vector<std::string>(screen.begin() + 15, screen.end()),
        ElementsAre("region  2 volume down or decrement", "phase",
                    "score   touch 0.00 (hold from 0.00)   tap 3.45", "events",
                    "[==============================] 1.210 s of 1.210 s",
                    "     0.050 s  may-begin volume up or increment", "     0.170 s  tap volume up",
                    "     0.270 s  may-begin play/pause or voice-assistant call",
                    "     0.780 s  hold-start voice-assistant call",
                    "     0.870 s  hold-end voice-assistant call",
                    "     0.970 s  may-begin volume down or decrement", "     1.050 s  cancel",
                    "     1.050 s  firmware-reset"));
}

TEST(ShowCommand, ASpeedScalesTheWaits) {
    const TerminalEnvironment environment("xterm", nullptr, "1");
    TerminalRun run;
    run.run({"--speed", "10"}, mixedSession().text(), 80, 30);
    EXPECT_EQ(std::accumulate(run.clock.sleeps.begin(), run.clock.sleeps.end(), std::uint64_t{0}) /
                  10'000,
              12U);
}

TEST(ShowCommand, ASmallTerminalIsNeverScrolled) {
    const TerminalEnvironment environment("xterm", nullptr, "1");
    for (const unsigned rows : {2U, 5U, 20U, 22U, 24U}) {
        TerminalRun run;
        run.run({"--speed", "100"}, mixedSession().text(), 20, rows);
        EXPECT_LE(run.terminal.mostRows(), rows);
        EXPECT_TRUE(run.terminal.cursorShown());
    }
}

TEST(ShowCommand, BadInputIsNamed) {
    const std::string text = tapSession().text();
    const auto fault = [&](int exitCode, std::vector<std::string> options) {
        options.insert(options.begin(), {"show", "-"});
        const CommandResult result = runCommand(options, text);
        EXPECT_EQ(result.exitCode, exitCode);
        EXPECT_EQ(result.out, "");
        return linesOf(result.error).at(0);
    };
    EXPECT_EQ(fault(1, {"--frame", "6"}),
              "vexatouch show: standard input: there is no frame 6, the last one is 5");
    EXPECT_EQ(fault(1, {"--frame", "18446744073709551615"}),
              "vexatouch show: standard input: there is no frame 18446744073709551615, the last "
              "one is 5");
    EXPECT_EQ(fault(1, {"--frame", "7:9"}),
              "vexatouch show: standard input: there is no frame 7, the last one is 5");
    for (const std::string range : {"x", "1:x", "x:2", "-1", "1.5", "18446744073709551616"}) {
        EXPECT_EQ(fault(2, {"--frame=" + range}),
                  "vexatouch show: --frame " + range + ": not a frame number, nor A:B");
    }
    EXPECT_EQ(fault(2, {"--frame", "3:3"}), "vexatouch show: --frame 3:3: the range is empty");
    EXPECT_EQ(fault(2, {"--speed", "0"}), "vexatouch show: --speed 0: not a number above 0");
    EXPECT_EQ(fault(2, {"--speed", "fast"}), "vexatouch show: --speed fast: not a number above 0");
    EXPECT_EQ(fault(2, {"--color", "red"}),
              "vexatouch show: --color red: not auto, never, 256 or truecolor");
    EXPECT_EQ(fault(2, {"--unsigned"}), "vexatouch show: --unsigned needs --text");
    EXPECT_EQ(runCommand({"show", "-"}, containerText({})),
              (CommandResult{.exitCode = 1,
                             .out = {},
                             .error = "vexatouch show: standard input: holds no frame to show\n"}));
    EXPECT_EQ(runCommand({"show", "-"}, "").exitCode, 1);
}

/// An hour of nothing.
std::string longRecording(const TemporaryFolder& folder) {
    std::list<PipelineRecording::Frame> frames(2);
    frames.back().timestamp = 3'600'000'000'000;
    return folder.file("long.json", containerText(frames));
}

TEST(ShowCommand, ASettingThatTheRecordingTakesBackIsWarnedOf) {
    const TemporaryFolder folder;
    RecordedSession recorded;
    recorded.set("Algs.HoldTimeoutMilliseconds", 300).feel(nothing());
    const std::string file = folder.file("set.json", recorded.text());
    const std::vector<std::string> show = {"show", file, "--set", "HoldTimeoutMilliseconds=2000"};
    EXPECT_EQ(runCommand(show).error,
              "vexatouch show: --set Algs.HoldTimeoutMilliseconds held until frame 0 only, in "
              "which the recording sets it; with --pin it holds to the end\n");
    std::vector<std::string> pinned = show;
    pinned.emplace_back("--pin");
    EXPECT_EQ(runCommand(pinned).error, "");
}

TEST(ShowCommand, AnInterruptLeavesTheTerminalTidy) {
    const TemporaryFolder folder;
    ProgramOnTerminal program({"show", longRecording(folder)});
    ASSERT_TRUE(program.readUntil("events"));
    program.type("\x03");
    const int status = program.end();
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGINT) << status;
    EXPECT_TRUE(program.output().find("\x1B[?25h") != std::string::npos);
    EXPECT_LT(program.output().rfind("\x1B[?25l"), program.output().rfind("\x1B[?25h"));
    EXPECT_TRUE(program.keyboardIsAsBefore());
}

TEST(ShowCommand, KeysStopStepAndEnd) {
    const TemporaryFolder folder;
    ProgramOnTerminal program({"show", longRecording(folder)});
    ASSERT_TRUE(program.readUntil("frame 0 of 2"));
    program.type(" ");
    ASSERT_TRUE(program.readUntil("stopped"));
    program.type("+");
    program.type(".");
    const int stepped = program.end();  // the last frame is shown, then the recording is at its end
    EXPECT_TRUE(WIFEXITED(stepped) && WEXITSTATUS(stepped) == 0) << stepped;
    EXPECT_THAT(program.output(), ::testing::HasSubstr("frame 1 of 2"));
    EXPECT_TRUE(program.keyboardIsAsBefore());

    ProgramOnTerminal other({"show", longRecording(folder)});
    ASSERT_TRUE(other.readUntil("events"));
    other.type("q");
    const int ended = other.end();
    EXPECT_TRUE(WIFEXITED(ended) && WEXITSTATUS(ended) == 0) << ended;
    EXPECT_TRUE(other.keyboardIsAsBefore());
}

}  // namespace
}  // namespace VexaTouch::Testing
