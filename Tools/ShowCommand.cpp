#include "Tools/ShowCommand.h"

#include "Shared/Util.h"
#include "Tools/Failure.h"
#include "Tools/FrameView.h"
#include "Tools/LiveScreen.h"
#include "Tools/OptionValues.h"
#include "Tools/RecordingFile.h"
#include "Tools/Replay.h"
#include "Tools/ReplayOptions.h"
#include "Tools/SettingKeys.h"
#include "Tools/TerminalColor.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <csignal>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "FILE", .help = "The recording; - reads standard input"},
}};

constexpr std::array<OptionEntry, 7> kOptions = {{
    {.name = "--frame",
     .valueName = "N|A:B",
     .help = "Print one frame, or the frames from A up to before B (either may be left out), and "
             "do not wait; frames are counted from 0 as replay does"},
    {.name = "--text",
     .help = "Print the images as plain numbers at their pixels' places, nothing else"},
    {.name = "--unsigned", .help = "With --text: the unsigned values instead of the signed ones"},
    {.name = "--speed",
     .valueName = "FACTOR",
     .help = "How fast to play: 1 as recorded, 0.1 ten times slower",
     .defaultValue = "1"},
    {.name = "--color",
     .valueName = "WHEN",
     .help = "Which colours to use: auto, never, 256 or truecolor",
     .defaultValue = "auto",
     .kind = ValueKind::Choice,
     .choices = "auto never 256 truecolor"},
    {.name = "--set",
     .valueName = "KEY=VALUE",
     .help = "Give the algorithm a setting before the first frame; the value is JSON. Settings of "
             "the recording itself may change it later",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = kSettingChoices},
    kPinOption,
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch show tap.json", "plays the recording in place"},
    {"vexatouch show tap.json --frame 37", "looks at one frame"},
    {"vexatouch show tap.json --frame 30:40 --color never | less", "reads ten frames"},
    {"vexatouch show tap.json --frame 37 --text", "prints the numbers of one image"},
}};

constexpr std::string_view kDescription =
    R"(Shows the surface as it was felt: each pixel at its place with its value, [in brackets] while it is active and (in parentheses) while it is above the noise, with the active region, the phase of the touch, the scores and the events of the frame. In colour the surface glows, blue below the activation threshold and yellow to red above it.

On a terminal the whole recording is played in place and in real time:

  space  stops and goes on
  .      goes on by one frame (also the right arrow)
  + -    plays faster, slower
  q      ends

Otherwise all frames are printed one after the other. A frame that is no image is shown over the surface as the last image left it; --text leaves it out. Colours are used on a terminal unless NO_COLOR is set.)";

// Frames from begin up to before end.
struct FrameRange {
    std::uint64_t begin = 0;
    std::uint64_t end = 0;
    bool single = false;
};

std::optional<std::uint64_t> numberFromText(std::string_view text) {
    std::uint64_t value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    return error == std::errc() && end == text.data() + text.size() ? std::optional(value)
                                                                    : std::nullopt;
}

FrameRange parseRange(const std::string& text, std::uint64_t count, const std::string& name) {
    const auto wrong = [&](const char* what) -> UsageError {
        return UsageError("--frame " + text + ": " + what);
    };
    const std::size_t colon = text.find(':');
    const std::string_view first = std::string_view(text).substr(0, colon);
    FrameRange range{.begin = 0, .end = count, .single = colon == std::string::npos};
    if (range.single || !first.empty()) {
        const auto begin = numberFromText(first);
        if (!begin) {
            throw wrong("not a frame number, nor A:B");
        }
        range.begin = *begin;
    }
    if (range.single) {
        range.end = range.begin == UINT64_MAX ? range.begin : range.begin + 1;
    } else if (const auto last = std::string_view(text).substr(colon + 1); !last.empty()) {
        const auto end = numberFromText(last);
        if (!end) {
            throw wrong("not a frame number, nor A:B");
        }
        if (*end <= range.begin) {
            throw wrong("the range is empty");
        }
        range.end = std::min(*end, count);
    }
    if (range.begin >= count) {
        throw Failure(name + ": there is no frame " + std::to_string(range.begin) +
                      ", the last one is " + std::to_string(count - 1));
    }
    return range;
}

float parseSpeed(const std::string& text) {
    float speed = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), speed);
    if (error != std::errc() || end != text.data() + text.size() || !(speed > 0)) {
        throw UsageError("--speed " + text + ": not a number above 0");
    }
    return speed;
}

void printTexts(Replay& replay, const FrameRange& range, bool showUnsigned, const std::string& name,
                Streams& streams) {
    std::uint64_t images = 0;
    while (replay.canContinue() && replay.counts().frames < range.end) {
        const PlayedFrame& played = replay.next();
        if (played.index < range.begin || played.type != PlayedType::Image) {
            continue;
        }
        streams.out << (images++ > 0 ? "\n" : "")
                    << Util::stringFromImage(played.image, showUnsigned);
    }
    if (images == 0) {
        throw Failure(name + ": " +
                      (range.single ? "frame " + std::to_string(range.begin) + " is no image"
                                    : std::string("no image among these frames")));
    }
}

void printFrames(Replay& replay, const FrameRange& range, ColorDepth depth, Streams& streams) {
    FrameView view(depth, streams.columns, replay.frames().front().timestamp,
                   replay.frames().size());
    while (replay.canContinue() && replay.counts().frames < range.end) {
        const PlayedFrame& played = replay.next();
        view.see(played);
        if (played.index < range.begin) {
            continue;
        }
        if (played.index > range.begin) {
            streams.out << '\n';
        }
        for (const std::string& line : view.lines(played, replay.algs())) {
            streams.out << line << '\n';
        }
    }
}

// Plays a recording in place until its end or until its watcher has seen enough.
class Player {
public:
    Player(Replay& replay, float speed, ColorDepth depth, Streams& streams)
        : replay_(replay),
          streams_(streams),
          startNs_(replay.frames().front().timestamp),
          view_(depth, streams.columns, startNs_, replay.frames().size()),
          depth_(depth),
          speed_(speed),
          screen_(streams),
          dueNs_(screen_.nowNs()) {
        for (const PipelineRecording::Frame& frame : replay.frames()) {
            if (frame.type == PipelineRecording::Frame::Type::InputReport) {
                lastNs_ = std::max(lastNs_, frame.timestamp);
            }
        }
    }

    void play() {
        while (replay_.canContinue() && !ended_) {
            const PlayedFrame& played = replay_.next();
            waitFor(*played.frame);
            if (ended_) {
                break;
            }
            remember(played);
        }
        draw();
    }

private:
    static constexpr std::uint64_t kDrawIntervalNs = 16'000'000;
    static constexpr std::uint64_t kPauseNs = 3'600'000'000'000;  // looked at again each hour
    static constexpr float kFastest = 64;
    static constexpr float kSlowest = 1.0F / 64;

    // Waits until it is the frame's turn: as long after the one before as it was recorded. What
    // has been played until then is drawn only if there is time, so that playing never falls back.
    void waitFor(const PipelineRecording::Frame& frame) {
        if (frame.type != PipelineRecording::Frame::Type::InputReport) {
            return;
        }
        if (lastReportNs_ && frame.timestamp > *lastReportNs_) {
            const double ns =
                static_cast<double>(frame.timestamp - *lastReportNs_) / static_cast<double>(speed_);
            constexpr double kLongest = 1e15;  // more than a week
            dueNs_ += static_cast<std::uint64_t>(std::min(ns, kLongest));
        }
        lastReportNs_ = frame.timestamp;
        if (const std::uint64_t now = screen_.nowNs();
            now < dueNs_ || now - drawnNs_ > kDrawIntervalNs) {
            draw();
        }
        do {
            handleKey(screen_.wait(paused_ ? screen_.nowNs() + kPauseNs : dueNs_));
            ended_ = ended_ || LiveScreen::interrupted() != 0;
        } while (!ended_ && !step_ && (paused_ || screen_.nowNs() < dueNs_));
        if (std::exchange(step_, false)) {
            dueNs_ = screen_.nowNs();
        }
    }

    void handleKey(char key) {
        switch (key) {
            case ' ':
                paused_ = !paused_;
                dueNs_ = screen_.nowNs();
                draw();
                break;
            case '.':
            case 'C':  // ends the sequence that the right arrow sends
                paused_ = true;
                step_ = true;
                break;
            case '+':
                speed_ = std::min(speed_ * 2, kFastest);
                draw();
                break;
            case '-':
                speed_ = std::max(speed_ / 2, kSlowest);
                draw();
                break;
            case 'q':
                ended_ = true;
                break;
            default:
                break;
        }
    }

    void remember(const PlayedFrame& played) {
        view_.see(played);
        lines_ = view_.lines(played, replay_.algs());
        timeNs_ = played.frame->timestamp;
        for (const EventRecord& event : played.events) {
            log_.push_back(view_.eventLine(event));
        }
        while (log_.size() > logLines()) {
            log_.pop_front();
        }
    }

    // As many events as there is room for under the view and above the last line.
    [[nodiscard]] std::size_t logLines() const {
        constexpr std::size_t kMost = 8;
        constexpr std::size_t kOthers = FrameView::kLines + 2;  // progress and cursor
        return streams_.rows > kOthers ? std::min<std::size_t>(streams_.rows - kOthers, kMost) : 0;
    }

    void draw() {
        if (lines_.empty()) {
            return;
        }
        std::vector<std::string> lines = lines_;
        lines.push_back(progressLine());
        for (const std::string& event : log_) {
            lines.push_back(event);
        }
        lines.resize(lines_.size() + 1 + logLines());
        // What does not fit above the cursor would scroll away instead of being drawn over.
        lines.resize(std::min<std::size_t>(lines.size(), std::max(streams_.rows, 2U) - 1));
        screen_.draw(lines);
        drawnNs_ = screen_.nowNs();
    }

    // "[=====>     ] 0.350 of 1.250 s"
    [[nodiscard]] std::string progressLine() const {
        constexpr std::size_t kWidth = 30;
        const double whole = static_cast<double>(lastNs_ - std::min(lastNs_, startNs_));
        const double done = static_cast<double>(timeNs_ - std::min(timeNs_, startNs_));
        const auto filled = static_cast<std::size_t>(
            whole > 0 ? std::min(1.0, done / whole) * static_cast<double>(kWidth) : kWidth);
        std::string line;
        appendFaint(line, depth_);
        line += '[' + std::string(filled, '=') + std::string(kWidth - filled, ' ') + "] " +
                secondsText(timeNs_, startNs_) + " of " + secondsText(lastNs_, startNs_);
        if (paused_) {
            line += "  stopped";
        } else if (speed_ != 1) {
            std::array<char, 32> text{};
            const auto end = std::to_chars(text.data(), text.data() + text.size(), speed_).ptr;
            line += "  x" + std::string(text.data(), end);
        }
        appendPlain(line, depth_);
        return line;
    }

    Replay& replay_;
    Streams& streams_;
    std::uint64_t startNs_;
    std::uint64_t lastNs_ = 0;
    FrameView view_;
    ColorDepth depth_;
    float speed_;
    LiveScreen screen_;
    std::uint64_t dueNs_;  // when the next report's turn is, on the screen's clock
    std::uint64_t drawnNs_ = 0;
    std::optional<std::uint64_t> lastReportNs_;
    std::uint64_t timeNs_ = 0;
    std::vector<std::string> lines_;
    std::deque<std::string> log_;
    bool paused_ = false;
    bool step_ = false;
    bool ended_ = false;
};

int runShow(const Arguments& arguments, Streams& streams) {
    ReplaySettings settings{.list = parseSettings(arguments.values("--set")),
                            .pinned = arguments.given(kPinOption.name)};
    const float speed = parseSpeed(arguments.value("--speed"));
    const ColorDepth depth = colorOption(arguments, "--color", streams);
    const bool text = arguments.given("--text");
    if (arguments.given("--unsigned") && !text) {
        throw UsageError("--unsigned needs --text");
    }
    RecordingFile file = readRecording(arguments.value("FILE"), streams);
    const std::uint64_t count = file.frames.size();
    if (count == 0) {
        throw Failure(file.name + ": holds no frame to show");
    }
    const bool whole = !arguments.given("--frame");
    const FrameRange range = whole ? FrameRange{.begin = 0, .end = count, .single = false}
                                   : parseRange(arguments.value("--frame"), count, file.name);
    Replay replay(std::exchange(file.frames, {}), std::move(settings));
    if (text) {
        printTexts(replay, range, arguments.given("--unsigned"), file.name, streams);
    } else if (!whole || !streams.outIsTerminal) {
        printFrames(replay, range, depth, streams);
    } else {
        Player(replay, speed, depth, streams).play();
    }
    warnOfLostSetting(replay, "show", "--set", streams);
    if (const int signal = LiveScreen::interrupted(); signal != 0) {
        // The terminal is tidy: now the signal does what it does to every program, so that the
        // shell knows why this one ended.
        std::raise(signal);
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command showCommand = {
    .name = "show",
    .summary = "Show the surface of a recording as a picture in the terminal",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runShow,
};

}  // namespace VexaTouch::Tools
