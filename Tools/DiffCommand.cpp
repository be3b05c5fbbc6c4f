#include "Tools/DiffCommand.h"

#include "Platform/Json.h"
#include "Tools/Failure.h"
#include "Tools/Progress.h"
#include "Tools/RecordingFile.h"
#include "Tools/Replay.h"
#include "Tools/ReplayOptions.h"
#include "Tools/StateSnapshot.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <span>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 2> kPositionals = {{
    {.name = "A", .help = "The recording; - reads standard input"},
    {.name = "B",
     .help = "The recording to compare with; left out, it is A again with other settings",
     .required = false},
}};

constexpr std::array<OptionEntry, 4> kOptions = {{
    {.name = "--set-a",
     .valueName = "KEY=VALUE",
     .help = "Give the replay of A a setting before its first frame, as replay --set does",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = kSettingChoices},
    {.name = "--set-b",
     .valueName = "KEY=VALUE",
     .help = "The same for the replay of B",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = kSettingChoices},
    kPinOption,
    {.name = "--json", .help = "Print one JSON object"},
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "the replays are the same on every frame"},
    {kExitFailure, "they differ, or a recording cannot be read (then standard error says so)"},
    {kExitUsage, "the command line is wrong, an unknown setting included"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch diff session.json --set-b ActivationThreshold=150",
     "Shows what another threshold changes, from the first frame on"},
    {"vexatouch diff --set-a HoldTimeoutMilliseconds=300 --set-b HoldTimeoutMilliseconds=700 "
     "session.json",
     "Compares two settings with each other"},
    {"vexatouch diff before.json after.json", "Compares two recordings frame by frame"},
}};

constexpr std::string_view kDescription =
    "Replays A and B side by side and compares, frame by frame, what each frame was, its events "
    "and every field of the algorithm's state after it. Printed are the first frame that differs "
    "with its fields that do, then for each field the number of frames on which it differs. "
    "Frames are paired by their place in the recording. A setting that --set-a or "
    "--set-b gives is not compared itself.\n"
    "\n"
    "Fields are named as in the output of replay --trace: pixels[A]._progress, "
    "virtual[ABE]._value, hand._isTouching, stats.numTaps, events; presence counts the frames that "
    "only "
    "one recording has.";

constexpr std::string_view kEventsField = "events";
constexpr std::string_view kMissingField = "presence";

/// Fields of the first frame that differs that are printed for a person; --json has them all.
constexpr std::size_t kFieldsShown = 12;

/// Where the algorithm keeps a setting. That what was set differs is no news, so these fields are
/// not compared when the settings to compare are given.
struct SettingField {
    std::string_view key;
    std::string_view field;
};

constexpr std::array<SettingField, 4> kSettingFields = {{
    {"Algs.ActivationThreshold", "hand._activationThreshold"},
    {"Algs.HoldTimeoutMilliseconds", "hand._hold_timeout_ms"},
    {"Algs.EnableHoldSuppression", "hand._enableHoldSuppression"},
    {"Algs.EnableTapSuppression", "hand._enableTapSuppression"},
}};

struct FieldDifference {
    std::string field;
    std::string a;
    std::string b;
};

/// What two replays differ in.
struct Comparison {
    std::uint64_t framesA = 0;
    std::uint64_t framesB = 0;
    std::uint64_t framesDifferent = 0;
    std::uint64_t firstIndex = 0;                               ///< of the first frame that differs
    std::vector<FieldDifference> first;                         ///< its fields
    std::vector<std::pair<std::string, std::uint64_t>> counts;  ///< frames by field, those above 0
};

std::string eventsText(std::span<const EventRecord> events) {
    std::string text = "[";
    for (const EventRecord& event : events) {
        text += text.size() > 1 ? "," : "";
        appendEventJson(text, event);
    }
    return text + "]";
}

/// Plays one side; the snapshot is that of its last frame.
class Side {
public:
    Side(FrameList frames, ReplaySettings settings)
        : replay_(std::move(frames), std::move(settings)) {}

    /// False when the recording has ended.
    bool advance() {
        played_ = replay_.canContinue() ? &replay_.next() : nullptr;
        if (played_ == nullptr) {
            return false;
        }
        snapshot_.take(*played_, replay_.algs());
        return true;
    }

    [[nodiscard]] std::span<const EventRecord> events() const { return played_->events; }
    [[nodiscard]] const StateSnapshot& snapshot() const noexcept { return snapshot_; }
    [[nodiscard]] const Replay& replay() const noexcept { return replay_; }
    [[nodiscard]] std::uint64_t frameCount() const noexcept { return replay_.frames().size(); }

private:
    Replay replay_;
    const PlayedFrame* played_ = nullptr;
    StateSnapshot snapshot_;
};

/// For each field whether it is compared.
std::vector<bool> comparedFields(std::span<const Setting> settingsA,
                                 std::span<const Setting> settingsB) {
    std::vector<bool> compared(StateSnapshot::fieldCount(), true);
    for (std::size_t field = 0; field < compared.size(); ++field) {
        const auto found = std::ranges::find(kSettingFields, StateSnapshot::fieldName(field),
                                             &SettingField::field);
        if (found != kSettingFields.end()) {
            const auto isGiven = [&](const Setting& setting) { return setting.key == found->key; };
            compared[field] = std::ranges::none_of(settingsA, isGiven) &&
                              std::ranges::none_of(settingsB, isGiven);
        }
    }
    return compared;
}

Comparison compare(Side& a, Side& b, const std::vector<bool>& compared, Streams& streams) {
    Comparison result{
        .framesA = a.frameCount(), .framesB = b.frameCount(), .first = {}, .counts = {}};
    std::vector<std::uint64_t> counts(StateSnapshot::fieldCount(), 0);
    std::uint64_t eventCount = 0;
    const std::uint64_t both = std::min(result.framesA, result.framesB);
    Progress progress(streams, "comparing", both);
    for (std::uint64_t index = 0; index < both; ++index) {
        a.advance();
        b.advance();
        bool different = false;
        const bool isFirst = result.framesDifferent == 0;
        a.snapshot().forEachDifference(b.snapshot(), [&](std::size_t field) {
            if (!compared[field]) {
                return;
            }
            different = true;
            ++counts[field];
            if (isFirst) {
                result.first.push_back({StateSnapshot::fieldName(field),
                                        a.snapshot().fieldText(field),
                                        b.snapshot().fieldText(field)});
            }
        });
        if (!std::ranges::equal(a.events(), b.events())) {
            different = true;
            ++eventCount;
            if (isFirst) {
                result.first.push_back(
                    {std::string(kEventsField), eventsText(a.events()), eventsText(b.events())});
            }
        }
        if (different && isFirst) {
            result.firstIndex = index;
        }
        result.framesDifferent += different ? 1 : 0;
        progress.update(index);
    }
    const std::uint64_t unpaired = std::max(result.framesA, result.framesB) - both;
    if (unpaired > 0 && result.framesDifferent == 0) {
        result.firstIndex = both;
        const std::string shorter = "no frame";
        const std::string longer = "a frame";
        result.first.push_back({std::string(kMissingField),
                                result.framesA > both ? longer : shorter,
                                result.framesB > both ? longer : shorter});
    }
    result.framesDifferent += unpaired;
    for (std::size_t field = 0; field < counts.size(); ++field) {
        if (counts[field] > 0) {
            result.counts.emplace_back(StateSnapshot::fieldName(field), counts[field]);
        }
    }
    if (eventCount > 0) {
        result.counts.emplace_back(kEventsField, eventCount);
    }
    if (unpaired > 0) {
        result.counts.emplace_back(kMissingField, unpaired);
    }
    return result;
}

void printText(const Comparison& comparison, Streams& streams) {
    if (comparison.framesDifferent == 0) {
        return;
    }
    std::size_t width = 0;
    for (const auto& [field, count] : comparison.counts) {
        width = std::max(width, field.size());
    }
    for (const FieldDifference& difference : comparison.first) {
        width = std::max(width, difference.field.size());
    }
    const auto padded = [width](std::string field) {
        field.resize(width, ' ');
        return field;
    };
    streams.out << "First difference at frame index " << comparison.firstIndex << ":\n";
    const std::size_t shown = std::min(comparison.first.size(), kFieldsShown);
    for (const FieldDifference& difference : std::span(comparison.first).first(shown)) {
        streams.out << "  " << padded(difference.field) << "  " << difference.a << " | "
                    << difference.b << '\n';
    }
    if (shown < comparison.first.size()) {
        streams.out << "  and " << comparison.first.size() - shown
                    << " more fields of that frame\n";
    }
    streams.out << "Frames that differ, by field:\n";
    for (const auto& [field, count] : comparison.counts) {
        streams.out << "  " << padded(field) << "  " << count << '\n';
    }
}

void printJson(const Comparison& comparison, Streams& streams) {
    std::string text;
    Vexa::JsonWriter json(text, Vexa::JsonWriter::Style::Compact);
    json.beginObject();
    json.key("frames_a");
    json.number(comparison.framesA);
    json.key("frames_b");
    json.number(comparison.framesB);
    json.key("frames_different");
    json.number(comparison.framesDifferent);
    json.key("first");
    if (comparison.framesDifferent == 0) {
        json.null();
    } else {
        json.beginObject();
        json.key("index");
        json.number(comparison.firstIndex);
        json.key("fields");
        json.beginObject();
        for (const FieldDifference& difference : comparison.first) {
            json.key(difference.field);
            json.beginArray();
            // A text that is no JSON stands for a frame that is not there.
            const auto write = [&json](const std::string& value) {
                const Vexa::PropertyValue read = Vexa::readJson(value);
                json.value(read ? read : Vexa::PropertyValue(value));
            };
            write(difference.a);
            write(difference.b);
            json.endArray();
        }
        json.endObject();
        json.endObject();
    }
    json.key("counts");
    json.beginObject();
    for (const auto& [field, count] : comparison.counts) {
        json.key(field);
        json.number(count);
    }
    json.endObject();
    json.endObject();
    streams.out << text << '\n';
}

RecordingFile readSide(const std::string& path, Streams& streams) {
    RecordingFile file = readRecording(path, streams);
    if (file.frames.empty()) {
        throw Failure(file.name + ": holds no frame to replay");
    }
    return file;
}

int runDiff(const Arguments& arguments, Streams& streams) {
    const std::vector<Setting> settingsA = parseSettings(arguments.values("--set-a"), "--set-a");
    const std::vector<Setting> settingsB = parseSettings(arguments.values("--set-b"), "--set-b");
    if (!arguments.given("B") && settingsA.empty() && settingsB.empty()) {
        throw UsageError("nothing to compare A with: give B, --set-a or --set-b");
    }
    if (arguments.value("A") == "-" && arguments.value("B") == "-") {
        throw UsageError("only one recording can come from standard input");
    }
    RecordingFile fileA = readSide(arguments.value("A"), streams);
    FrameList framesB =
        arguments.given("B") ? readSide(arguments.value("B"), streams).frames : fileA.frames;
    const bool pinned = arguments.given(kPinOption.name);
    Side a(std::move(fileA.frames), {.list = settingsA, .pinned = pinned});
    Side b(std::move(framesB), {.list = settingsB, .pinned = pinned});
    const Comparison comparison = compare(a, b, comparedFields(settingsA, settingsB), streams);
    if (arguments.given("--json")) {
        printJson(comparison, streams);
    } else {
        printText(comparison, streams);
    }
    streams.out.flush();
    streams.error << comparison.framesDifferent << " of "
                  << std::max(comparison.framesA, comparison.framesB) << " frames differ\n";
    warnOfLostSetting(a.replay(), "diff", "--set-a", streams);
    warnOfLostSetting(b.replay(), "diff", "--set-b", streams);
    return comparison.framesDifferent == 0 ? kExitSuccess : kExitFailure;
}

}  // namespace

constinit const Command diffCommand = {
    .name = "diff",
    .summary = "Compare two replays frame by frame and field by field",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runDiff,
};

}  // namespace VexaTouch::Tools
