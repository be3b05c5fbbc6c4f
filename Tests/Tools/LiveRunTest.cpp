#include "Tools/LiveRun.h"

#include "Host/Keyboard.h"
#include "Host/PluginLibrary.h"
#include "Host/SharedKeyboard.h"
#include "Platform/HostClock.h"
#include "Platform/TraceListener.h"
#include "Tests/Support/FakeKeyboard.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/EventRecord.h"
#include "Tools/Failure.h"
#include "Tools/FrameGaps.h"
#include "Tools/PlayedDevice.h"
#include "Tools/RecordedDevice.h"
#include "Tools/RecordingFile.h"
#include "Tools/SignalWatch.h"
#include "Tools/WakeUp.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <future>
#include <limits>
#include <memory>
#include <set>
#include <span>
#include <sstream>
#include <streambuf>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;
using Tools::EventKind;
using Tools::EventRecord;
using Tools::PlayedDevice;

const std::filesystem::path kExamples = VEXA_SOURCE_DIR "/Examples";
constexpr double kAsFastAsTaken = std::numeric_limits<double>::infinity();

/// What the keys of a gesture are called in the text of a fake keyboard.
std::string_view tapKey(std::uint32_t region) {
    return std::vector<std::string_view>{"", "KEY_PLAYPAUSE", "KEY_VOLUMEDOWN", "KEY_VOLUMEUP"}.at(
        region);
}
std::string_view holdKey(std::uint32_t region) {
    return std::vector<std::string_view>{"", "KEY_ASSISTANT", "KEY_VOLUMEDOWN", "KEY_VOLUMEUP"}.at(
        region);
}

/// What these events must type, a hold that never ends released at the end.
std::string expectedKeys(const std::vector<EventRecord>& events) {
    std::string text;
    std::string_view held;
    for (const EventRecord& event : events) {
        const std::string_view holds =
            event.kind == EventKind::HoldStart || event.kind == EventKind::HoldChange
                ? holdKey(event.region)
                : std::string_view();
        std::string packet;
        if (!held.empty() && held != holds) {
            packet += '-' + std::string(held) + ' ';
        }
        if (!holds.empty() && held != holds) {
            packet += '+' + std::string(holds) + ' ';
        }
        held = holds;
        text += packet + (packet.empty() ? "" : "| ");
        if (event.kind == EventKind::Tap && event.region != 0) {
            const std::string key(tapKey(event.region));
            text += '+' + key + " | -" + key + " | ";
        }
    }
    return held.empty() ? text : text + '-' + std::string(held) + " | ";
}

class LiveRunTest : public ::testing::Test {
protected:
    LiveRunTest() { setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1); }
    ~LiveRunTest() override {
        unsetenv("VEXATOUCH_PLUGIN");
        EXPECT_EQ(typed.wrong, "");
        EXPECT_TRUE(typed.down.empty());
        EXPECT_FALSE(typed.unseen);
    }

    std::vector<PlayedDevice::Frame> framesOf(const std::string& name) {
        const auto list = Tools::readRecording(kExamples / (name + ".json"), streams).frames;
        return {list.begin(), list.end()};
    }
    static std::shared_ptr<PlayedDevice> deviceThat(PlayedDevice::FrameSource plays) {
        return std::make_shared<PlayedDevice>(std::move(plays),
                                              Tools::PlayedPace{.speed = kAsFastAsTaken},
                                              Tools::SurfaceIdentity{}, Vexa::HostClock::system());
    }
    /// Throws as LiveRun does.
    void run(const std::shared_ptr<PlayedDevice>& device, const Host::KeyMap& map = {}) {
        const Tools::WakeUp wake;
        Tools::SignalWatch signals(wake);
        const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
        Tools::LiveRun live(library, device,
                            {.json = true, .keyboard = keyboard.get(), .keyMap = map}, signals,
                            wake, streams);
        live.run();
    }
    void play(const std::string& name, const Host::KeyMap& map = {}) {
        run(deviceThat(Tools::recordingSource(
                Tools::readRecording(kExamples / (name + ".json"), streams).frames)),
            map);
    }

    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Tools::Streams streams{.in = in, .out = out, .error = error};
    TypedKeys typed;
    std::unique_ptr<Host::SharedKeyboard> keyboard = FakeKeyboard::shared(typed);
};

TEST_F(LiveRunTest, EveryExampleTypesItsKeysAndLeavesNoneDown) {
    std::set<EventKind> kinds;
    for (const auto& entry : std::filesystem::directory_iterator(kExamples)) {
        if (entry.path().extension() != ".events") {
            continue;
        }
        SCOPED_TRACE(entry.path());
        const std::vector<EventRecord> events = Tools::readExpectedEvents(entry.path());
        for (const EventRecord& event : events) {
            kinds.insert(event.kind);
        }
        play(entry.path().stem());
        EXPECT_EQ(std::exchange(typed.text, {}), expectedKeys(events));
        EXPECT_TRUE(typed.down.empty());
    }
    EXPECT_THAT(kinds, SizeIs(7));
    EXPECT_THAT(error.str(), Not(HasSubstr("key")));
}

TEST_F(LiveRunTest, ChangedKeysAreTyped) {
    Host::KeyMap map;
    for (const std::string change : {"tap:1=KEY_NEXTSONG", "tap:2=none", "tap:3=none",
                                     "hold:1=none", "hold:2=none", "hold:3=none"}) {
        map.assign(change);
    }
    play("mixed", map);
    std::string expected;
    for (const EventRecord& event : Tools::readExpectedEvents(kExamples / "mixed.events")) {
        if (event.kind == EventKind::Tap && event.region == 1) {
            expected += "+KEY_NEXTSONG | -KEY_NEXTSONG | ";
        }
    }
    EXPECT_NE(expected, "");
    EXPECT_EQ(typed.text, expected);
}

/// Plays what leads to the first hold, waits until that was handled, and goes on with `then`.
PlayedDevice::FrameSource upToTheFirstHold(std::vector<PlayedDevice::Frame> frames,
                                           std::function<void()> then) {
    const auto events = Tools::readExpectedEvents(kExamples / "holds.events");
    const auto start = std::ranges::find(events, EventKind::HoldStart, &EventRecord::kind);
    frames.resize(start->index + 1);
    // A setting has its turn when all reports before it have been handled.
    PlayedDevice::Frame setting;
    setting.type = PlayedDevice::Frame::Type::State;
    setting.key = "Nothing";
    setting.value = Vexa::PropertyValue::null();
    frames.push_back(setting);
    return
        [frames = std::move(frames), then = std::move(then)](const PlayedDevice::FrameSink& sink) {
            for (const auto& frame : frames) {
                sink(frame);
            }
            then();
        };
}

TEST_F(LiveRunTest, EndInAHoldReleasesItsKey) {
    run(deviceThat(upToTheFirstHold(framesOf("holds"), [] {})));
    EXPECT_EQ(typed.take(), "+KEY_ASSISTANT | -KEY_ASSISTANT |");
}

TEST_F(LiveRunTest, UnplugInAHoldReleasesItsKey) {
    PlayedDevice* unplugged = nullptr;
    const auto device =
        deviceThat(upToTheFirstHold(framesOf("holds"), [&unplugged] { unplugged->unplug(); }));
    unplugged = device.get();
    EXPECT_THROW(run(device), Tools::Failure);
    EXPECT_EQ(typed.take(), "+KEY_ASSISTANT | -KEY_ASSISTANT |");
}

/// Results that nobody reads: the first write ends when `until` is ready, or after so long that a
/// test has failed.
class UnreadOutput final : public std::streambuf {
public:
    explicit UnreadOutput(std::future<void> until) : until_(std::move(until)) {}

    void waitUntilStuck() const { stuckNow_.wait(); }
    /// Whether it was ready.
    [[nodiscard]] bool wentOn() const { return wentOn_; }
    [[nodiscard]] const std::string& text() const { return text_; }

protected:
    int_type overflow(int_type character) override {
        const char byte = traits_type::to_char_type(character);
        xsputn(&byte, 1);
        return character;
    }
    std::streamsize xsputn(const char* text, std::streamsize length) override {
        if (text_.empty()) {
            stuck_.set_value();
            wentOn_ = until_.wait_for(std::chrono::minutes(1)) == std::future_status::ready;
        }
        text_.append(text, static_cast<std::size_t>(length));
        return length;
    }

private:
    std::future<void> until_;
    std::promise<void> stuck_;
    std::shared_future<void> stuckNow_ = stuck_.get_future().share();
    bool wentOn_ = false;
    std::string text_;
};

/// A keyboard that tells of the first release.
class ReleaseToldOf final : public Host::Keyboard {
public:
    explicit ReleaseToldOf(std::promise<void>& released) : released_(released) {}

    [[nodiscard]] std::error_code press(Host::KeyCode) noexcept override { return {}; }
    [[nodiscard]] std::error_code release(Host::KeyCode) noexcept override {
        if (!std::exchange(told_, true)) {
            released_.set_value();
        }
        return {};
    }
    [[nodiscard]] std::error_code synchronise() noexcept override { return {}; }

private:
    std::promise<void>& released_;
    bool told_ = false;
};

struct UnreadRun {
    bool keyWasReleased = false;  ///< while the output was stuck
    std::string out;
    std::string failure;
};

/// Runs up to the first hold, and when the output is stuck does what `end` does.
UnreadRun runUnread(const std::vector<PlayedDevice::Frame>& frames, Tools::Streams like,
                    const std::function<void(PlayedDevice&, const PlayedDevice::FrameSink&)>& end) {
    std::promise<void> released;
    UnreadOutput unread(released.get_future());
    std::ostream results(&unread);
    Tools::Streams streams{.in = like.in, .out = results, .error = like.error};
    const auto keyboard =
        std::make_unique<Host::SharedKeyboard>(std::make_unique<ReleaseToldOf>(released));
    PlayedDevice* played = nullptr;
    const auto hold = upToTheFirstHold(frames, [] {});
    const auto device = std::make_shared<PlayedDevice>(
        [&](const PlayedDevice::FrameSink& sink) {
            hold(sink);
            unread.waitUntilStuck();
            end(*played, sink);
        },
        Tools::PlayedPace{.speed = kAsFastAsTaken}, Tools::SurfaceIdentity{},
        Vexa::HostClock::system());
    played = device.get();
    const Tools::WakeUp wake;
    Tools::SignalWatch signals(wake);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    Tools::LiveRun live(library, device, {.json = true, .keyboard = keyboard.get()}, signals, wake,
                        streams);
    UnreadRun result;
    try {
        live.run();
    } catch (const Tools::Failure& failure) {
        result.failure = failure.what();
    }
    result.keyWasReleased = unread.wentOn();
    result.out = unread.text();
    return result;
}

TEST_F(LiveRunTest, UnplugReleasesTheKeyWhileNobodyReadsTheOutput) {
    const UnreadRun result =
        runUnread(framesOf("holds"), streams,
                  [](PlayedDevice& device, const PlayedDevice::FrameSink&) { device.unplug(); });
    EXPECT_TRUE(result.keyWasReleased);
    EXPECT_EQ(result.failure, "the device was unplugged");
    EXPECT_THAT(result.out, HasSubstr("hold-start"));
}

TEST_F(LiveRunTest, SignalReleasesTheKeyWhileNobodyReadsTheOutput) {
    PlayedDevice::Frame setting;
    setting.type = PlayedDevice::Frame::Type::State;
    setting.key = "Nothing";
    setting.value = Vexa::PropertyValue::null();
    const UnreadRun result = runUnread(framesOf("holds"), streams,
                                       [&](PlayedDevice&, const PlayedDevice::FrameSink& sink) {
                                           kill(getpid(), SIGTERM);
                                           for (;;) {
                                               sink(setting);  // throws when the device is closed
                                           }
                                       });
    EXPECT_TRUE(result.keyWasReleased);
    EXPECT_EQ(result.failure, "");
    EXPECT_THAT(result.out, HasSubstr("hold-start"));
}

/// A device that takes its time to close, as one of the kernel does while a request is waited for:
/// until `released`, or so long that a test has failed.
class SlowToClose final : public PlayedDevice {
public:
    SlowToClose(FrameSource plays, std::future<void> released)
        : PlayedDevice(std::move(plays), Tools::PlayedPace{.speed = kAsFastAsTaken},
                       Tools::SurfaceIdentity{}, Vexa::HostClock::system()),
          released_(std::move(released)) {}

    void close(std::uint32_t options) noexcept override {
        wasReleased_ = released_.wait_for(std::chrono::minutes(1)) == std::future_status::ready;
        PlayedDevice::close(options);
    }
    /// Whether the key was up before it had closed.
    [[nodiscard]] bool wasReleased() const { return wasReleased_; }

private:
    std::future<void> released_;
    bool wasReleased_ = false;
};

TEST_F(LiveRunTest, KeyIsReleasedBeforeTheDeviceIsWaitedFor) {
    for (const bool unplugs : {false, true}) {
        std::promise<void> released;
        keyboard =
            std::make_unique<Host::SharedKeyboard>(std::make_unique<ReleaseToldOf>(released));
        SlowToClose* played = nullptr;
        const auto device = std::make_shared<SlowToClose>(upToTheFirstHold(framesOf("holds"),
                                                                           [&] {
                                                                               if (unplugs) {
                                                                                   played->unplug();
                                                                               }
                                                                           }),
                                                          released.get_future());
        played = device.get();
        if (unplugs) {
            EXPECT_THROW(run(device), Tools::Failure);
        } else {
            run(device);
        }
        EXPECT_TRUE(device->wasReleased()) << unplugs;
    }
}

/// Messages, and word of the first line that tells of gaps.
class MessagesToldOf final : public std::stringbuf {
public:
    explicit MessagesToldOf(std::promise<void>& told) : told_(told) {}

protected:
    int sync() override {
        if (view().find(": so far ") != std::string::npos && !std::exchange(isTold_, true)) {
            told_.set_value();
        }
        return 0;
    }

private:
    std::promise<void>& told_;
    bool isTold_ = false;
};

/// A device whose service gets the first image after a gap when `told`, or after so long that a
/// test has failed.
class SlowAfterAGap final : public PlayedDevice {
public:
    SlowAfterAGap(FrameSource plays, std::future<void> told)
        : PlayedDevice(std::move(plays), Tools::PlayedPace{.speed = kAsFastAsTaken},
                       Tools::SurfaceIdentity{}, Vexa::HostClock::system()),
          told_(std::move(told)) {}

    void reportArrived(std::span<const std::uint8_t> report,
                       std::uint64_t timestamp) noexcept override {
        PlayedDevice::reportArrived(report, timestamp);
        if (gaps_.see(report) && gaps_.gaps() == 1) {
            told_.wait_for(std::chrono::minutes(1));
        }
    }

private:
    std::future<void> told_;
    Tools::FrameGaps gaps_;
};

TEST_F(LiveRunTest, AGapThatTheServiceHasNotCountedYetIsToldOf) {
    std::promise<void> told;
    MessagesToldOf messages(told);
    std::ostream errors(&messages);
    Tools::Streams toldOf{.in = in, .out = out, .error = errors};
    const auto frames = framesOf("disjoint-frames");
    const auto device = std::make_shared<SlowAfterAGap>(
        [&](const PlayedDevice::FrameSink& sink) {
            for (const auto& frame : frames) {
                sink(frame);
            }
        },
        told.get_future());
    const Tools::WakeUp wake;
    Tools::SignalWatch signals(wake);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    Tools::LiveRun live(library, device, {.json = true}, signals, wake, toldOf);
    live.run();
    EXPECT_THAT(messages.str(),
                ::testing::StartsWith("vexatouch run: so far 1 gap, 3 frames lost\n"));
}

TEST_F(LiveRunTest, EventsBeyondTheRoomAreCountedAndTheRunFails) {
    std::promise<void> enough;
    UnreadOutput unread(enough.get_future());
    std::ostream results(&unread);
    Tools::Streams slow{.in = in, .out = results, .error = error};
    // At the beginning of the tenth event nine have come: at most three were taken before the
    // output was stuck, and three more have room.
    const Vexa::TraceListener listener([&, events = 0](std::uint32_t code, auto) mutable {
        if (code == VEXA_TRACE_EVENT && ++events == 10) {
            enough.set_value();
        }
    });
    const auto frames = framesOf("taps");
    const auto device = deviceThat([&](const PlayedDevice::FrameSink& sink) {
        for (const auto& frame : frames) {
            sink(frame);
        }
    });
    const Tools::WakeUp wake;
    Tools::SignalWatch signals(wake);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    Tools::LiveRun live(library, device, {.json = true, .eventRoom = 3}, signals, wake, slow);
    std::string failure;
    try {
        live.run();
    } catch (const Tools::Failure& caught) {
        failure = caught.what();
    }
    const std::size_t printed = linesOf(unread.text()).size();
    const std::size_t all = Tools::readExpectedEvents(kExamples / "taps.events").size();
    EXPECT_TRUE(unread.wentOn());
    EXPECT_LT(printed, all);
    EXPECT_EQ(failure, std::to_string(all - printed) +
                           " events could not be printed, because those before were not read "
                           "quickly enough");
    EXPECT_THAT(error.str(), HasSubstr(' ' + std::to_string(printed) + " events; latency"));
    EXPECT_THAT(error.str(), HasSubstr("; " + std::to_string(all - printed) + " events lost\n"));
}

TEST_F(LiveRunTest, KeyboardThatIsTakenAwayIsToldOfOnceAndTheRunGoesOn) {
    typed.good = 2;
    play("taps");
    EXPECT_EQ(typed.take(), "+KEY_PLAYPAUSE |");
    EXPECT_TRUE(typed.gone);
    const std::string text =
        "vexatouch run: the keyboard is gone, no more keys are sent: No such device\n";
    EXPECT_THAT(error.str(), HasSubstr(text));
    EXPECT_EQ(error.str().find(text), error.str().rfind(text));
    EXPECT_THAT(linesOf(out.str()),
                SizeIs(Tools::readExpectedEvents(kExamples / "taps.events").size()));
}

}  // namespace
}  // namespace VexaTouch::Testing
