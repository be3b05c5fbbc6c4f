#include "Tools/RecordedDevice.h"

#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/RecordingFile.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <future>
#include <iterator>
#include <limits>
#include <list>
#include <memory>
#include <random>
#include <sstream>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Frames = std::list<RecordedFrame>;

using Testing::descriptorCount;
using Testing::DeviceReader;
using ::testing::ElementsAre;
using Testing::FakeHostClock;
using Testing::mixedSession;
using ::testing::SizeIs;
using Testing::threadCount;
using Testing::untimed;
using Testing::waitForThreads;

constexpr double kMax = RecordedDevice::kAsFastAsTaken;

RecordedFrame report(std::uint64_t ms, std::vector<std::uint8_t> bytes) {
    RecordedFrame frame;
    frame.timestamp = ms * 1'000'000;
    frame.report = std::move(bytes);
    return frame;
}

RecordedFrame state(std::uint64_t ms, std::string key, Vexa::PropertyValue value) {
    RecordedFrame frame;
    frame.type = RecordedFrame::Type::State;
    frame.timestamp = ms * 1'000'000;
    frame.key = std::move(key);
    frame.value = std::move(value);
    return frame;
}

FrameList example(const std::string& name) {
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
    return readRecording(std::string(VEXA_SOURCE_DIR) + "/Examples/" + name + ".json", streams)
        .frames;
}

TEST(RecordedDeviceTest, EveryInputComesOutOnceInItsOrder) {
    for (const char* name : {"mixed", "settings", "invalid-reports", "reset-in-touch", "holds"}) {
        SCOPED_TRACE(name);
        const FrameList frames = example(name);
        DeviceReader reader(std::make_shared<RecordedDevice>(frames, kMax));
        EXPECT_EQ(reader.play(), untimed(frames));
        EXPECT_EQ(reader.play(), untimed(frames));
    }
}

TEST(RecordedDeviceTest, EmptyReportsAreReportsLikeOthers) {
    const Frames frames = {report(0, {}),
                           report(1, {7}),
                           report(2, {}),
                           report(3, {}),
                           state(4, "Algs.ActivationThreshold", 3),
                           report(5, {})};
    const auto device = std::make_shared<RecordedDevice>(frames, kMax);
    DeviceReader reader(device);
    EXPECT_EQ(reader.play(), untimed(frames));
    EXPECT_TRUE(reader.isPresent());
    EXPECT_EQ(device->handled(), 5U);
}

TEST(RecordedDeviceTest, NothingIsLostBeforeASlowReader) {
    Frames frames;
    for (std::uint64_t i = 0; i < 20'000; ++i) {
        std::vector<std::uint8_t> bytes(i % 200);
        for (std::size_t k = 0; k < bytes.size(); ++k) {
            bytes[k] = static_cast<std::uint8_t>(i + k);
        }
        frames.push_back(report(i, std::move(bytes)));
    }
    const auto device = std::make_shared<RecordedDevice>(frames, kMax);
    DeviceReader reader(device);
    EXPECT_EQ(reader.play(), untimed(frames));
    EXPECT_EQ(device->sent(), 20'000U);
    EXPECT_EQ(device->handled(), 20'000U);
    EXPECT_EQ(device->dropped(), 0U);
}

TEST(RecordedDeviceTest, ReportsAreCutWhereNoReaderReadsOn) {
    std::vector<std::uint8_t> bytes(PlayedDevice::kLongestReport + 1000, 0x5A);
    std::vector<std::uint8_t> cut(PlayedDevice::kLongestReport, 0x5A);
    DeviceReader reader(
        std::make_shared<RecordedDevice>(Frames{report(0, bytes), report(1, {1})}, kMax));
    EXPECT_EQ(reader.play(), untimed({report(0, cut), report(1, {1})}));
}

TEST(RecordedDeviceTest, AStateFrameWaitsForEarlierReportsAndHoldsUpLaterOnes) {
    Frames frames;
    for (std::uint64_t i = 0; i < 400; ++i) {
        frames.push_back(i % 5 == 4 ? state(i, "Algs.HoldTimeoutMilliseconds", i)
                                    : report(i, {static_cast<std::uint8_t>(i)}));
    }
    const auto device = std::make_shared<RecordedDevice>(frames, kMax);
    std::vector<std::pair<std::uint64_t, std::uint64_t>> counts;
    DeviceHooks hooks;
    hooks.onStateFrame = [&](const std::string&, const Vexa::PropertyValue&) {
        counts.emplace_back(device->sent(), device->handled());
    };
    DeviceReader reader(device, hooks);
    EXPECT_EQ(reader.play(), untimed(frames));
    ASSERT_THAT(counts, SizeIs(80));
    for (std::size_t i = 0; i < counts.size(); ++i) {
        EXPECT_EQ(counts[i], std::pair(4 * (i + 1), 4 * (i + 1)));
    }
}

TEST(RecordedDeviceTest, WithoutAHookStateFramesArePassedOver) {
    RecordedDevice device({state(0, "a", 1), report(1, {9}), state(2, "b", 2)}, kMax);
    std::promise<void> finished;
    device.setHooks({.onFinished = [&] { finished.set_value(); },
                     .onSend = [&](auto) { device.reportHandled(); }});
    int descriptor = -1;
    ASSERT_EQ(device.open(0, descriptor), VEXA_STATUS_SUCCESS);
    const FileDescriptor owned(descriptor);
    finished.get_future().wait();
    EXPECT_EQ(device.sent(), 1U);
}

/// Milliseconds at which the reports leave.
std::vector<std::uint64_t> departures(const FrameList& frames, double speed) {
    FakeHostClock clock;
    clock.ticks = 77'000'000;
    std::vector<std::uint64_t> times;
    DeviceHooks hooks;
    hooks.onSend = [&](auto) { times.push_back(clock.ticks / 1'000'000 - 77); };
    DeviceReader reader(std::make_shared<RecordedDevice>(frames, speed, SurfaceIdentity{}, clock),
                        hooks);
    EXPECT_EQ(reader.play(), untimed(frames));
    return times;
}

const Frames kTimed = {report(5000, {1}), state(5010, "key", 1), report(5020, {2}),
                       report(5020, {3}), report(5140, {4})};

TEST(RecordedDeviceTest, ReportsLeaveAtTheirRecordedTimes) {
    EXPECT_THAT(departures(kTimed, 1.0), ElementsAre(0, 20, 20, 140));
}

TEST(RecordedDeviceTest, ASpeedDividesTheTimesBetweenReports) {
    EXPECT_THAT(departures(kTimed, 2.0), ElementsAre(0, 10, 10, 70));
    EXPECT_THAT(departures(kTimed, 0.5), ElementsAre(0, 40, 40, 280));
}

TEST(RecordedDeviceTest, AsFastAsTakenNeverAsksTheClock) {
    EXPECT_THAT(departures(kTimed, kMax), ElementsAre(0, 0, 0, 0));
}

TEST(RecordedDeviceTest, NoTimePassesWhereTheRecordedTimeGoesBack) {
    EXPECT_THAT(
        departures({report(100, {1}), report(150, {2}), report(20, {3}), report(30, {4})}, 1.0),
        ElementsAre(0, 50, 50, 60));
}

TEST(RecordedDeviceTest, ARecordingWithoutFramesIsOverAtOnce) {
    DeviceReader reader(std::make_shared<RecordedDevice>(Frames{}));
    EXPECT_THAT(reader.play(), SizeIs(0));
}

TEST(RecordedDeviceTest, FinishedMeansHandledAndTheDeviceStaysPluggedIn) {
    const auto device = std::make_shared<RecordedDevice>(mixedSession().frames(), kMax);
    std::uint64_t handled = 0;
    DeviceHooks hooks;
    hooks.onFinished = [&] { handled = device->handled(); };
    DeviceReader reader(device, hooks);
    reader.open();
    reader.readToEnd();
    EXPECT_EQ(handled, 124U);
    EXPECT_TRUE(reader.isPresent());
}

TEST(RecordedDeviceTest, ClosesWithinTheLongestRestAndLeavesNothingBehind) {
    // The run loop and its mode have descriptors of their own.
    DeviceReader(std::make_shared<RecordedDevice>(Frames{report(0, {1})}, kMax)).open();
    const auto threads = threadCount();
    const auto descriptors = descriptorCount();
    const std::uint64_t seed = std::random_device()();
    SCOPED_TRACE("seed " + std::to_string(seed));
    std::mt19937_64 random(seed);
    Frames frames;
    for (std::uint64_t i = 0; i < 50; ++i) frames.push_back(report(0, {1}));
    // Centuries, at any speed; and then the end of time.
    frames.push_back(report(std::uint64_t{1} << 43U, {2}));
    RecordedFrame last = report(0, {3});
    last.timestamp = std::numeric_limits<std::uint64_t>::max();
    frames.push_back(last);
    for (int round = 0; round < 200; ++round) {
        DeviceReader reader(
            std::make_shared<RecordedDevice>(frames, random() % 2 == 0 ? 1.0 : 1e-9));
        reader.open();
        reader.readReports(random() % 51);
        if (random() % 2 == 0) reader.close();
    }
    EXPECT_TRUE(waitForThreads(threads));
    EXPECT_EQ(descriptorCount(), descriptors);
}

TEST(RecordedDeviceTest, ClosesWhileItWaitsForReportsToBeHandledOrForRoom) {
    for (const bool hasState : {true, false}) {
        Frames frames;
        for (std::uint64_t i = 0; i < 5000; ++i) frames.push_back(report(i, {1, 2, 3}));
        if (hasState) frames.insert(std::next(frames.begin()), state(0, "key", 1));
        const auto device = std::make_shared<RecordedDevice>(frames, kMax);
        DeviceReader reader(device);
        reader.open();
        while (device->sent() == 0) std::this_thread::yield();
        reader.close();
        EXPECT_LT(device->sent(), 5000U);
        EXPECT_THAT(reader.inputs(), SizeIs(0));
    }
}

TEST(RecordedDeviceTest, AnswersLikeASurface) {
    DeviceReader reader(std::make_shared<RecordedDevice>(Frames{}));
    std::vector<std::uint8_t> buffer(32);
    std::size_t length = buffer.size();
    EXPECT_EQ(reader.device().featureReport(31, buffer.data(), length), VEXA_STATUS_SUCCESS);
    buffer.resize(length);
    EXPECT_THAT(buffer, ElementsAre(0x1F, 0x10, 0x27, 0x00, 0x00));
    EXPECT_EQ(reader.device().property("Transport"), Vexa::PropertyValue("Virtual"));
}

}  // namespace
}  // namespace VexaTouch::Tools
