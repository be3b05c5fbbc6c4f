#include "Tools/SimulatedSurface.h"

#include "Shared/FeatureReport.h"
#include "Shared/InputReport.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tools/ReportTap.h"
#include "Tools/SurfaceSynthesizer.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Testing::descriptorCount;
using Testing::DeviceReader;
using ::testing::ElementsAre;
using Testing::FakeHostClock;
using ::testing::IsEmpty;
using Testing::reportsOf;
using Testing::threadCount;
using Testing::untimed;
using Testing::waitForThreads;

constexpr std::string_view kGestures =
    "tap vol+ 60ms\n"
    "set HoldTimeoutMilliseconds 300\n"
    "invalid\n"
    "firmware 3 01 a0\n"
    "invalid 07 00 ff\n"
    "hold play 400ms\n"
    "reset\n"
    "set EnableTapSuppression false\n";

SimulatedPlay inOneGo(std::string_view script) {
    return {.script = GestureScript::parse(script), .asFastAsTaken = true};
}

/// The whole reports of so many images, as a script makes them.
std::vector<std::vector<std::uint8_t>> images(std::size_t count) {
    return reportsOf(synthesize(GestureScript::parse("idle " + std::to_string(10 * count) + "ms")));
}

/// When each report left by the clock, counted from the first.
class Departures {
public:
    explicit Departures(FakeHostClock& clock) : clock_(clock) {}
    [[nodiscard]] DeviceHooks hooks() {
        return {.onSend = [this](auto) { ticks_.push_back(clock_.ticks); }};
    }
    [[nodiscard]] std::vector<std::uint64_t> milliseconds() const {
        std::vector<std::uint64_t> times;
        for (const std::uint64_t tick : ticks_) {
            times.push_back((tick - ticks_.front()) / 1'000'000);
        }
        return times;
    }

private:
    FakeHostClock& clock_;
    std::vector<std::uint64_t> ticks_;
};

TEST(SimulatedSurfaceTest, AScriptGivesTheBytesOfTheSynthesizerInItsOrder) {
    DeviceReader reader(std::make_shared<SimulatedSurface>(inOneGo(kGestures)));
    EXPECT_EQ(reader.play(), untimed(synthesize(GestureScript::parse(kGestures))));
}

TEST(SimulatedSurfaceTest, ASeedTakesThePlaceOfTheScriptsOwn) {
    SimulatedPlay play = inOneGo("seed 3\ntap play\n");
    play.seed = 77;
    DeviceReader reader(std::make_shared<SimulatedSurface>(play));
    EXPECT_EQ(reader.play(), untimed(synthesize(*play.script, 77)));
}

TEST(SimulatedSurfaceTest, EachOpeningPlaysTheSameFromTheStart) {
    DeviceReader reader(std::make_shared<SimulatedSurface>(inOneGo(kGestures)));
    const auto first = reader.play();
    EXPECT_EQ(reader.play(), first);
    reader.clear();
    reader.open();
    reader.readReports(3);
    reader.close();
    EXPECT_EQ(reader.play(), first);
}

TEST(SimulatedSurfaceTest, AnEndlessScriptGoesOnWithFrameNumbersAndClock) {
    SimulatedPlay play = inOneGo("tap vol- 50ms\nidle 30ms\n");
    play.endless = true;
    std::list<RecordedFrame> thrice;
    SurfaceSynthesizer synthesizer([&](auto frame) { thrice.push_back(std::move(frame)); });
    for (int i = 0; i < 3; ++i) synthesizer.perform(*play.script);

    DeviceReader reader(std::make_shared<SimulatedSurface>(play));
    reader.open();
    reader.readReports(thrice.size());
    reader.close();
    auto inputs = reader.inputs();
    inputs.resize(thrice.size());
    EXPECT_EQ(inputs, untimed(thrice));
}

TEST(SimulatedSurfaceTest, AnEndlessScriptWithoutReportsEnds) {
    SimulatedPlay play = inOneGo("strength 300\n");
    play.endless = true;
    DeviceReader reader(std::make_shared<SimulatedSurface>(play));
    EXPECT_THAT(reader.play(), IsEmpty());
}

TEST(SimulatedSurfaceTest, RandomGesturesAreThoseOfTheirSeedAndNeverEnd) {
    constexpr std::size_t kReports = 9000;  // more than a minute
    const auto surface =
        std::make_shared<SimulatedSurface>(SimulatedPlay{.seed = 42, .asFastAsTaken = true});
    EXPECT_EQ(surface->seed(), 42U);
    std::list<RecordedFrame> expected;
    SurfaceSynthesizer synthesizer([&](auto frame) { expected.push_back(std::move(frame)); }, 42);
    synthesizer.perform(GestureScript::parse(randomScript(42, 60'000)));
    synthesizer.perform(GestureScript::parse(randomScript(43, 60'000)));
    auto reports = reportsOf(expected);
    ASSERT_GT(reports.size(), kReports);

    DeviceReader reader(surface);
    reader.open();
    reader.readReports(kReports);
    reader.close();
    const auto inputs = reader.inputs();
    std::vector<RecordedFrame> same(untimed(expected));
    ASSERT_LE(inputs.size(), same.size());
    same.resize(inputs.size());
    EXPECT_EQ(inputs, same);
}

TEST(SimulatedSurfaceTest, WithoutASeedEachSurfaceDrawsItsOwn) {
    const SimulatedSurface a;
    const SimulatedSurface b;
    const SimulatedSurface c;
    EXPECT_FALSE(a.seed() == b.seed() && b.seed() == c.seed());
}

TEST(SimulatedSurfaceTest, ReportsLeaveAtTheScriptsTimes) {
    FakeHostClock clock;
    Departures departures(clock);
    SimulatedPlay play = inOneGo("rate 50\nidle 80ms\nrate 100\nidle 30ms\n");
    play.asFastAsTaken = false;
    DeviceReader reader(std::make_shared<SimulatedSurface>(play, SurfaceIdentity{}, clock),
                        departures.hooks());
    const auto frames = synthesize(*play.script);
    EXPECT_EQ(reader.play(), untimed(frames));
    std::vector<std::uint64_t> expected;
    for (const auto& frame : frames) {
        // The clock sleeps whole microseconds.
        const std::uint64_t ns = frame.timestamp - frames.front().timestamp;
        expected.push_back((ns + 999) / 1000 * 1000 / 1'000'000);
    }
    EXPECT_EQ(departures.milliseconds(), expected);
}

TEST(SimulatedSurfaceTest, ARateTakesThePlaceOfTheScriptsTimes) {
    FakeHostClock clock;
    Departures departures(clock);
    SimulatedPlay play = inOneGo("idle 60ms\n");
    play.asFastAsTaken = false;
    play.rate = 4.0;
    DeviceReader reader(std::make_shared<SimulatedSurface>(play, SurfaceIdentity{}, clock),
                        departures.hooks());
    EXPECT_EQ(reader.play().size(), 6U);
    EXPECT_THAT(departures.milliseconds(), ElementsAre(0, 250, 500, 750, 1000, 1250));
}

TEST(SimulatedSurfaceTest, AReaderThatDoesNotKeepUpLosesTheNewestReports) {
    FakeHostClock clock;
    SimulatedPlay play = inOneGo("idle 1000ms\n");
    play.asFastAsTaken = false;
    const auto surface = std::make_shared<SimulatedSurface>(play, SurfaceIdentity{}, clock);
    DeviceReader reader(surface);
    reader.open();
    while (surface->sent() + surface->dropped() < 100) std::this_thread::yield();
    EXPECT_EQ(surface->sent(), PlayedPace::kBacklog);
    EXPECT_EQ(surface->dropped(), 100U - PlayedPace::kBacklog);
    reader.readToEnd();
    auto expected = untimed(synthesize(*play.script));
    expected.resize(PlayedPace::kBacklog);
    EXPECT_EQ(reader.inputs(), expected);
    EXPECT_EQ(surface->handled(), PlayedPace::kBacklog);
}

std::optional<std::vector<std::uint8_t>> featureReport(const DeviceReader& reader, std::uint32_t id,
                                                       std::size_t room = 32) {
    std::vector<std::uint8_t> buffer(room);
    std::size_t length = room;
    if (reader.device().featureReport(id, buffer.data(), length) != VEXA_STATUS_SUCCESS) {
        return std::nullopt;
    }
    buffer.resize(length);
    return buffer;
}

TEST(SimulatedSurfaceTest, AnswersTheThreeFeatureReports) {
    using Bytes = std::vector<std::uint8_t>;
    SurfaceIdentity identity;
    identity.firmwareVersion = {0x12, 0x34};
    identity.factoryResetHoldDuration = 10'000;
    identity.criticalErrors = 0xDEADBEEF;
    DeviceReader reader(std::make_shared<SimulatedSurface>(inOneGo(kGestures), identity));
    EXPECT_EQ(featureReport(reader, 4), (Bytes{0x04, 0x12, 0x34}));
    EXPECT_EQ(featureReport(reader, 31), (Bytes{0x1F, 0x10, 0x27, 0x00, 0x00}));
    EXPECT_EQ(featureReport(reader, 63), (Bytes{0x3F, 0xEF, 0xBE, 0xAD, 0xDE}));
    // As much as there is room for.
    EXPECT_EQ(featureReport(reader, 31, 2), (Bytes{0x1F, 0x10}));
    EXPECT_EQ(featureReport(reader, 5), std::nullopt);
    EXPECT_EQ(featureReport(reader, 0x104), std::nullopt);
}

TEST(SimulatedSurfaceTest, OtherKindsOfReportsAreUnsupported) {
    SimulatedSurface surface(inOneGo(kGestures));
    std::array<std::uint8_t, 32> buffer{};
    std::size_t length = buffer.size();
    EXPECT_EQ(surface.getReport(VEXA_REPORT_INPUT, 4, buffer, length), VEXA_STATUS_UNSUPPORTED);
    EXPECT_EQ(surface.getReport(VEXA_REPORT_OUTPUT, 4, buffer, length), VEXA_STATUS_UNSUPPORTED);
}

TEST(SimulatedSurfaceTest, ItsOwnAnswersParse) {
    DeviceReader reader(std::make_shared<SimulatedSurface>(inOneGo(kGestures)));
    const auto version = featureReport(reader, 4).value();
    const auto parsed = FeatureReport::FirmwareVersion::parse(version.data(), version.size());
    ASSERT_TRUE(parsed);
    EXPECT_EQ(parsed->versionByte0, 1);
    EXPECT_EQ(parsed->versionByte1, 0);
}

TEST(SimulatedSurfaceTest, KeepsThePropertiesThatAreWritten) {
    DeviceReader reader(std::make_shared<SimulatedSurface>(inOneGo(kGestures)));
    const auto& device = reader.device();
    EXPECT_EQ(device.property("Product"), Vexa::PropertyValue("Vexa Touch Surface"));
    EXPECT_EQ(device.property("VendorID"), Vexa::PropertyValue(0x7E8A));
    EXPECT_EQ(device.property("MaxInputReportSize"), Vexa::PropertyValue(73));
    EXPECT_FALSE(device.property("Color"));
    EXPECT_TRUE(device.setProperty("Color", "grey"));
    EXPECT_TRUE(device.setProperty("Product", Vexa::PropertyValue::null()));
    EXPECT_EQ(device.property("Color"), Vexa::PropertyValue("grey"));
    EXPECT_EQ(device.property("Product"), Vexa::PropertyValue::null());
    EXPECT_FALSE(device.setProperty("Color", {}));
    EXPECT_FALSE(device.setProperty(7, "seven"));
    EXPECT_FALSE(device.property(7));
    EXPECT_EQ(device.property("Color"), Vexa::PropertyValue("grey"));
}

TEST(SimulatedSurfaceTest, ClosesAtAnyMomentAndLeavesNothingBehind) {
    // The run loop and its mode have descriptors of their own.
    DeviceReader(std::make_shared<SimulatedSurface>(inOneGo(kGestures))).open();
    const auto threads = threadCount();
    const auto descriptors = descriptorCount();
    const std::uint64_t seed = std::random_device()();
    SCOPED_TRACE("seed " + std::to_string(seed));
    std::mt19937_64 random(seed);
    for (int round = 0; round < 200; ++round) {
        // One report every 100 seconds, lossless in a hurry, or dropping in a hurry.
        SimulatedPlay play = inOneGo(kGestures);
        play.endless = true;
        play.asFastAsTaken = random() % 2 == 0;
        const bool isSlow = !play.asFastAsTaken && random() % 2 == 0;
        play.rate = isSlow ? 0.01 : 1e6;
        DeviceReader reader(std::make_shared<SimulatedSurface>(play));
        reader.open();
        reader.readReports(isSlow ? random() % 2 : random() % 100);
        if (random() % 2 == 0) reader.close();
    }
    EXPECT_TRUE(waitForThreads(threads));
    EXPECT_EQ(descriptorCount(), descriptors);
}

TEST(SimulatedSurfaceTest, UnpluggedTheDeviceIsGoneAndCanBePluggedInAgain) {
    SimulatedPlay play = inOneGo(kGestures);
    play.endless = true;
    const auto surface = std::make_shared<SimulatedSurface>(play);
    DeviceReader reader(surface);
    reader.open();
    reader.readReports(5);
    surface->unplug();
    surface->unplug();
    reader.readUntilGone();
    reader.close();
    surface->unplug();  // nothing to do

    // The same surface, as a new device.
    DeviceReader again(surface);
    again.open();
    again.readReports(5);
    EXPECT_TRUE(again.isPresent());
}

TEST(SimulatedSurfaceTest, UnplugsAtAnyMomentFromItsOwnThread) {
    for (std::uint64_t last = 1; last < 60; ++last) {
        SimulatedPlay play = inOneGo(kGestures);
        play.endless = true;
        const auto surface = std::make_shared<SimulatedSurface>(play);
        DeviceHooks hooks;
        hooks.onSend = [&surface = *surface, count = std::uint64_t{0}, last](auto) mutable {
            if (++count == last) surface.unplug();
        };
        DeviceReader reader(surface, hooks);
        reader.open();
        reader.readUntilGone();
        EXPECT_LE(reader.reportCount(), last);
    }
}

TEST(SimulatedSurfaceTest, OpensOnceAtATime) {
    SimulatedSurface surface(inOneGo("idle 10ms"));
    int first = -1;
    int second = -1;
    ASSERT_EQ(surface.open(0, first), VEXA_STATUS_SUCCESS);
    const FileDescriptor descriptor(first);
    EXPECT_EQ(surface.open(0, second), VEXA_STATUS_ALREADY_OPEN);
    EXPECT_EQ(second, -1);
    surface.close(0);
    surface.close(0);
}

TEST(SimulatedSurfaceTest, ReportsCanBeWatchedAsTheyLeave) {
    ReportTap tap;
    DeviceHooks hooks;
    hooks.onSend = [&tap](std::span<const std::uint8_t> report) { tap.put(report); };
    DeviceReader reader(std::make_shared<SimulatedSurface>(inOneGo("idle 200ms")), hooks);
    reader.play();
    std::vector<std::vector<std::uint8_t>> seen;
    EXPECT_EQ(tap.drain([&](auto report) { seen.emplace_back(report.begin(), report.end()); }),
              20U);
    EXPECT_EQ(seen, images(20));
    EXPECT_EQ(tap.drain([](auto) { FAIL(); }), 0U);
    EXPECT_EQ(tap.lost(), 0U);
}

}  // namespace
}  // namespace VexaTouch::Tools
