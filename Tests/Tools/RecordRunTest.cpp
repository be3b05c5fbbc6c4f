#include "Tools/RecordRun.h"

#include "Host/HostFailure.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tools/DeliveredEvent.h"
#include "Tools/Failure.h"
#include "Tools/RecordedDevice.h"
#include "Tools/RecordingFile.h"
#include "Tools/Replay.h"
#include "Tools/SurfaceSynthesizer.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <future>
#include <random>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Testing::containerText;
using ::testing::IsEmpty;
using Testing::linesOf;
using ::testing::Not;
using Testing::runCommand;
using Testing::TemporaryFolder;
using Testing::untimed;

const std::filesystem::path kExamples = VEXA_SOURCE_DIR "/Examples";
constexpr const char* kVariable = "VEXATOUCH_PLUGIN";

/// The part of an event that is the same live and replayed: from its frame number on.
std::string essence(const std::string& json) {
    return json.substr(json.find("\"frame\":"));
}

std::vector<std::string> replayed(const std::string& file) {
    const Testing::CommandResult result = runCommand({"replay", "--json", file});
    EXPECT_EQ(result.exitCode, 0) << result;
    std::vector<std::string> events;
    for (const std::string& line : linesOf(result.out)) {
        events.push_back(essence(line));
    }
    return events;
}

class RecordRunTest : public ::testing::Test {
protected:
    RecordRunTest() { setenv(kVariable, VEXATOUCH_PLUGIN_FILE, 1); }
    ~RecordRunTest() override { unsetenv(kVariable); }

    FrameList framesIn(const std::string& file) { return readRecording(file, streams).frames; }

    struct Recorded {
        RecordSummary summary;
        std::vector<std::string> events;  ///< as they were delivered
    };
    Recorded record(const std::shared_ptr<PlayedDevice>& device, RecordRunOptions options,
                    std::unique_ptr<AppendTarget> target) {
        Recorded recorded;
        RecordRun run(
            library, device, std::move(options),
            [&recorded](const Vexa::HidEvent& event) {
                recorded.events.push_back(
                    essence(deliveredEventJson(DeliveredEvent::of(event, 0, 0))));
            },
            signals, wake, streams);
        RecordingStream stream(std::move(target), "session.json");
        recorded.summary = run.run(stream);
        return recorded;
    }
    Recorded record(const std::string& device, const std::string& file,
                    RecordRunOptions options = {}) {
        return record(
            std::make_shared<RecordedDevice>(framesIn(device), RecordedDevice::kAsFastAsTaken),
            std::move(options), openAppendTarget(file, false, streams));
    }

    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
    WakeUp wake;
    SignalWatch signals{wake};
    Host::PluginLibrary library =
        (setenv(kVariable, VEXATOUCH_PLUGIN_FILE, 1), Host::PluginLibrary::loadDefault());
};

class RecordedExampleTest : public RecordRunTest,
                            public ::testing::WithParamInterface<std::string> {};

TEST_P(RecordedExampleTest, LiveEqualsReplayAndEveryInputIsThere) {
    const std::string example = kExamples / (GetParam() + ".json");
    const std::string file = folder.path("session.json");
    const Recorded live = record(example, file);
    EXPECT_EQ(live.events, replayed(file));
    EXPECT_EQ(live.events, replayed(example));
    std::vector<RecordedFrame> kept = untimed(framesIn(file));
    const std::size_t inForce = pipelineSettingKeys().size();
    ASSERT_GT(kept.size(), inForce);
    kept.erase(kept.begin(), kept.begin() + static_cast<std::ptrdiff_t>(inForce));
    EXPECT_EQ(kept, untimed(framesIn(example)));
    EXPECT_EQ(live.summary.lost, FrameGap{});
}

std::vector<std::string> exampleNames() {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(kExamples)) {
        if (entry.path().extension() == ".json") {
            names.push_back(entry.path().stem());
        }
    }
    std::ranges::sort(names);
    return names;
}

INSTANTIATE_TEST_SUITE_P(All, RecordedExampleTest, ::testing::ValuesIn(exampleNames()),
                         [](const auto& test) {
                             std::string name = test.param;
                             std::ranges::replace(name, '-', '_');
                             return name;
                         });

TEST_F(RecordRunTest, RandomSessionsLongerThanTheServicesOwnRecordingAreWhole) {
    constexpr std::uint64_t kDurationMs = 40'000;
    const std::uint64_t first = std::random_device()();
    for (std::uint64_t seed = first; seed < first + 3; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        const std::string script = folder.file("random.gesture", randomScript(seed, kDurationMs));
        const std::string session = folder.path("played" + std::to_string(seed) + ".json");
        const std::string file = folder.path("session" + std::to_string(seed) + ".json");
        ASSERT_EQ(runCommand({"synth", script, "-o", session}).exitCode, 0);
        const std::vector<std::string> settings = {
            "HoldTimeoutMilliseconds=" + std::to_string(200 + seed % 400),
            "ActivationThreshold=" + std::to_string(120 + seed % 200) + ".5",
            "VirtualNormalizationFactors.3=0.123"};
        const Recorded live = record(session, file, {.settings = parseSettings(settings)});
        EXPECT_EQ(live.events, replayed(file));
        EXPECT_THAT(live.events, Not(IsEmpty()));
        EXPECT_EQ(Testing::reportsOf(framesIn(file)), Testing::reportsOf(framesIn(session)));
        EXPECT_GT(live.summary.reports, 2 * 1350U);
    }
}

TEST_F(RecordRunTest, CountEndsAfterSoManyReports) {
    const std::string example = kExamples / "taps.json";
    const std::string file = folder.path("session.json");
    EXPECT_EQ(record(example, file, {.count = 20}).summary.reports, 20U);
    const auto reports = Testing::reportsOf(framesIn(file));
    auto all = Testing::reportsOf(framesIn(example));
    all.resize(20);
    EXPECT_EQ(reports, all);
}

/// Lets the first write, the recording's beginning, through; the next waits for `go`.
class SlowTarget final : public AppendTarget {
public:
    SlowTarget(std::string& content, std::shared_future<void> go)
        : content_(content), go_(std::move(go)) {}

    [[nodiscard]] bool isRewritable() const noexcept override { return true; }
    Result write(std::uint64_t offset, std::string_view text) noexcept override {
        if (offset != 0) {
            go_.wait();
        }
        content_.resize(offset);
        content_ += text;
        return {.written = text.size(), .error = 0};
    }
    int cut(std::uint64_t) noexcept override { return 0; }
    int sync() noexcept override { return 0; }
    int close() noexcept override { return 0; }

private:
    std::string& content_;
    std::shared_future<void> go_;
};

TEST_F(RecordRunTest, ServiceGoesOnBeforeADiskThatDoesNotAndTheHoleIsToldInItsPlace) {
    const std::string example = kExamples / "mixed.json";
    const std::vector<std::string> events = replayed(example);
    std::promise<void> go;
    std::string content;
    const auto frames = framesIn(example);
    // The disk answers when all has been handled: a state frame's turn comes then.
    const auto device = std::make_shared<PlayedDevice>(
        [&](const PlayedDevice::FrameSink& sink) {
            for (const RecordedFrame& frame : frames) {
                sink(frame);
            }
            RecordedFrame last;
            last.type = RecordedFrame::Type::State;
            last.key = "Last";
            last.value = true;
            sink(last);
            go.set_value();
        },
        PlayedPace{.speed = RecordedDevice::kAsFastAsTaken, .lossless = true}, SurfaceIdentity{},
        Vexa::HostClock::system());
    const Recorded live = record(device, {.feedBytes = FrameFeed::kFewestBytes, .holdBack = false},
                                 std::make_unique<SlowTarget>(content, go.get_future().share()));
    EXPECT_EQ(live.events, events);
    EXPECT_GT(live.summary.lost.reports, 0U);
    EXPECT_EQ(live.summary.reports + live.summary.lost.reports, Testing::reportsOf(frames).size());
    const FrameList kept = framesIn(folder.file("session.json", content));
    // At its place: passed over there, what was kept is what was played.
    const auto played = Testing::reportsOf(frames);
    std::uint64_t next = 0;
    std::uint64_t told = 0;
    for (const RecordedFrame& frame : kept) {
        if (frame.key == "Recording.LostReports") {
            told += frame.value.toUnsigned64();
            next += frame.value.toUnsigned64();
        } else if (frame.type == RecordedFrame::Type::InputReport) {
            ASSERT_LT(next, played.size());
            EXPECT_EQ(frame.report, played[next++]);
        }
    }
    EXPECT_EQ(told, live.summary.lost.reports);
    EXPECT_EQ(next, played.size());
}

TEST_F(RecordRunTest, UnpluggedDeviceLeavesAWholeFile) {
    const auto frames = framesIn(kExamples / "taps.json");
    PlayedDevice* unplugged = nullptr;
    const auto device = std::make_shared<PlayedDevice>(
        [&](const PlayedDevice::FrameSink& sink) {
            std::size_t left = frames.size() / 2;
            for (const RecordedFrame& frame : frames) {
                sink(frame);
                if (--left == 0) {
                    unplugged->unplug();
                }
            }
        },
        PlayedPace{.speed = RecordedDevice::kAsFastAsTaken, .lossless = true}, SurfaceIdentity{},
        Vexa::HostClock::system());
    unplugged = device.get();
    const std::string file = folder.path("session.json");
    try {
        record(device, {}, openAppendTarget(file, false, streams));
        ADD_FAILURE() << "the run does not say that the device is gone";
    } catch (const Failure& failure) {
        EXPECT_STREQ(failure.what(), "the device was unplugged");
    }
    const auto played = Testing::reportsOf(frames);
    const auto kept = Testing::reportsOf(framesIn(file));
    ASSERT_GE(played.size(), kept.size());
    EXPECT_EQ(kept, decltype(kept)(played.begin(),
                                   played.begin() + static_cast<std::ptrdiff_t>(kept.size())));
    EXPECT_EQ(kept.size(), device->sent());
    EXPECT_THAT(kept, Not(IsEmpty()));
}

TEST_F(RecordRunTest, UnpluggedDeviceThatSentNothingLeavesWhatWasThere) {
    const std::string old = folder.file("old.json", "precious");
    for (const std::string& file : {old, folder.path("new.json")}) {
        PlayedDevice* unplugged = nullptr;
        const auto device = std::make_shared<PlayedDevice>(
            [&](const PlayedDevice::FrameSink&) { unplugged->unplug(); },
            PlayedPace{.speed = RecordedDevice::kAsFastAsTaken, .lossless = true},
            SurfaceIdentity{}, Vexa::HostClock::system());
        unplugged = device.get();
        try {
            record(device, {}, openAppendTarget(file, true, streams));
            ADD_FAILURE() << "the run does not say that the device is gone";
        } catch (const Failure& failure) {
            EXPECT_EQ(failure.what(),
                      std::string("the device was unplugged; no report was recorded") +
                          (file == old ? ", session.json is as it was" : ""));
        }
    }
    EXPECT_EQ(Testing::contentOf(old), "precious");
    EXPECT_THAT(folder.names(), ::testing::ElementsAre("old.json"));
}

/// It cannot be opened.
class ClosedDevice final : public PlayedDevice {
public:
    ClosedDevice()
        : PlayedDevice([](const FrameSink&) {}, {}, SurfaceIdentity{}, Vexa::HostClock::system()) {}
    vexa_status open(std::uint32_t, int&) noexcept override { return VEXA_STATUS_GONE; }
};

TEST_F(RecordRunTest, DeviceThatDoesNotOpenLeavesWhatWasThere) {
    const std::string old = folder.file("old.json", "precious");
    for (const std::string& file : {old, folder.path("new.json")}) {
        EXPECT_THROW(
            record(std::make_shared<ClosedDevice>(), {}, openAppendTarget(file, true, streams)),
            Host::HostFailure);
    }
    EXPECT_EQ(Testing::contentOf(old), "precious");
    EXPECT_THAT(folder.names(), ::testing::ElementsAre("old.json"));
}

}  // namespace
}  // namespace VexaTouch::Tools
