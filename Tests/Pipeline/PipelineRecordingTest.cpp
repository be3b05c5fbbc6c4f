#include "Pipeline/PipelineRecording.h"

#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/RecordingFrames.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <atomic>
#include <cstdint>
#include <initializer_list>
#include <limits>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace Testing;
using Bytes = std::vector<std::uint8_t>;
using Frame = PipelineRecording::Frame;
using Frames = std::list<Frame>;
using Vexa::HidEvent;
using Vexa::PropertyValue;

const Touch kFinger = touch("A").at(350);  // region 1
constexpr std::uint64_t kMs = 1'000'000;   // nanoseconds, and ticks of this host

void send(PipelineRecording& recording, const Bytes& report) {
    recording.handleInputReport(report.data(), report.size());
}

/// A recording whose clock a test moves.
struct Recorded {
    FakeHostClock clock;
    PipelineRecording recording{clock};

    Recorded() { clock.ticks = 5'000 * kMs; }
    void report(const Bytes& bytes) { send(recording, bytes); }
};

/// The text of playNextFrame's exception, which must be of exactly this kind; empty when there is
/// none.
std::string playFault(PipelineRecording& recording, float speed = 1.0F) {
    try {
        recording.playNextFrame(speed);
    } catch (const std::runtime_error& error) {
        return error.what();
    }
    return {};
}

/// Plays on to the end.
void playOn(PipelineRecording& recording, float speed = 1.0F) {
    while (recording.playCanContinue()) {
        recording.playNextFrame(speed);
    }
}

// Recording.

TEST(RecordingTest, BeginsEmptyUnboundedAndIdle) {
    Recorded recorded;
    EXPECT_THAT(recorded.recording.frames(), IsEmpty());
    EXPECT_EQ(recorded.recording.maxFrameCount(), 0U);
    EXPECT_FALSE(recorded.recording.playCanContinue());
    EXPECT_EQ(recorded.recording.timeMach(), 0U);
    EXPECT_EQ(recorded.clock.reads, 0);
}

TEST(RecordingTest, KeepsEveryInputWithTheTimeOfOneClockRead) {
    Recorded recorded;
    recorded.clock.ticks = 1000;
    recorded.recording.setState("Algs.ActivationThreshold", 150.0);
    EXPECT_EQ(recorded.clock.reads, 1);
    EXPECT_EQ(recorded.recording.timeMach(), 1000U);
    recorded.clock.ticks = 2000;
    recorded.report(imageReport(kFinger, 1, 10));
    EXPECT_EQ(recorded.clock.reads, 2);
    EXPECT_EQ(recorded.recording.timeMach(), 2000U);
    EXPECT_EQ(recorded.recording.frames(),
              (Frames{stateFrame(1000, "Algs.ActivationThreshold", 150.0),
                      reportFrame(2000, imageReport(kFinger, 1, 10))}));
    // Both reached the algorithm, too.
    EXPECT_EQ(recorded.recording.algs().handStats()._activationThreshold, 150.0F);
    EXPECT_TRUE(recorded.recording.algs().handStats()._isTouching);
}

TEST(RecordingTest, ReadsOnAreNotRecorded) {
    Recorded recorded;
    EXPECT_EQ(recorded.recording.getState("Algs.HoldTimeoutMilliseconds"), PropertyValue(500));
    EXPECT_THAT(recorded.recording.frames(), IsEmpty());
    EXPECT_EQ(recorded.clock.reads, 0);
}

TEST(RecordingTest, KeepsKeysThatReachNobody) {
    Recorded recorded;
    recorded.recording.setState("ActivationThreshold", 150.0);
    recorded.recording.setState("", PropertyValue::null());
    recorded.recording.setState("Algs.Unknown", PropertyValue());
    EXPECT_EQ(recorded.recording.frames(),
              (Frames{stateFrame(recorded.clock.ticks, "ActivationThreshold", 150.0),
                      stateFrame(recorded.clock.ticks, "", PropertyValue::null()),
                      stateFrame(recorded.clock.ticks, "Algs.Unknown", PropertyValue())}));
    EXPECT_EQ(recorded.recording.algs().handStats()._activationThreshold, 200.0F);
}

TEST(RecordingTest, SharesTheValue) {
    Recorded recorded;
    const PropertyValue value = PropertyValue::Array{1, 2, 3};
    recorded.recording.setState("Key", value);
    EXPECT_EQ(recorded.recording.frames().front().value.handle(), value.handle());
}

TEST(RecordingTest, KeepsReportsOfAnyLengthAndContent) {
    Recorded recorded;
    Frames expected;
    int invalid = 0;
    recorded.recording.invalidInputReportProbe = [&](const std::uint8_t*, std::uint64_t) {
        ++invalid;
    };
    for (const std::size_t length : {0U, 1U, 9U, 10U, 72U, 73U, 74U, 512U, 65'535U, 65'536U}) {
        Bytes report(length);
        for (std::size_t i = 0; i < length; ++i) {
            report[i] = static_cast<std::uint8_t>(i + 3);  // no known id
        }
        recorded.report(report);
        expected.push_back(reportFrame(recorded.clock.ticks, report));
    }
    recorded.recording.handleInputReport(nullptr, 0);
    expected.push_back(reportFrame(recorded.clock.ticks, {}));
    EXPECT_EQ(recorded.recording.frames(), expected);
    EXPECT_EQ(invalid, 11);
}

TEST(RecordingTest, TheReportIsKeptBeforeItIsLookedAt) {
    Recorded recorded;
    std::size_t atProbe = 0;
    std::uint64_t timeAtProbe = 0;
    recorded.recording.inputReportProbe = [&](const std::uint8_t*, std::uint64_t) {
        atProbe = recorded.recording.frames().size();
        timeAtProbe = recorded.recording.timeMach();
    };
    recorded.report({7});
    EXPECT_EQ(atProbe, 1U);
    EXPECT_EQ(timeAtProbe, recorded.clock.ticks);
}

TEST(RecordingTest, TheStateIsKeptBeforeItIsLookedAt) {
    Recorded recorded;
    std::size_t atProbe = 0;
    recorded.recording.setStateProbe = [&](const std::string& key, const PropertyValue&) {
        EXPECT_EQ(key, "Algs.Key");
        atProbe = recorded.recording.frames().size();
    };
    recorded.recording.setState("Algs.Key", 1);
    EXPECT_EQ(atProbe, 1U);
}

TEST(RecordingTest, EventsAreStampedWithTheHostsTimeOfTheirReport) {
    Recorded recorded;
    std::vector<HidEvent> events;
    recorded.recording.hidEventsProbe = [&](const std::vector<HidEvent>& batch) {
        events.insert(events.end(), batch.begin(), batch.end());
    };
    recorded.clock.ticks = 70;
    recorded.report(imageReport(kFinger, 1, 10));
    recorded.clock.ticks = 90;
    recorded.report(firmwareReport(0));
    EXPECT_THAT(events,
                ElementsAre(AllOf(MayBegin(1), StampedAt(70)), AllOf(Cancel(), StampedAt(90)),
                            AllOf(FirmwareReset(), StampedAt(90))));
}

TEST(RecordingTest, TimeFromOutsideIsIgnored) {
    Recorded recorded;
    std::vector<std::uint64_t> times;
    recorded.recording.setTimeProbe = [&](std::uint64_t time) { times.push_back(time); };
    Pipeline& pipeline = recorded.recording;
    pipeline.setTime(123);
    EXPECT_EQ(recorded.recording.timeMach(), 0U);
    recorded.clock.ticks = 70;
    recorded.report({7});
    EXPECT_EQ(recorded.recording.timeMach(), 70U);
    pipeline.setTime(123);
    EXPECT_EQ(recorded.recording.timeMach(), 70U);
    EXPECT_THAT(times, ElementsAre(70));
    EXPECT_EQ(recorded.recording.frames().size(), 1U);
}

// Trimming.

/// Frames as a line: `a=1` is a state, `R1` a report, `?1` a frame of a type that nobody knows.
Frames line(std::initializer_list<const char*> words) {
    Frames frames;
    for (const std::string word : words) {
        if (word[0] == 'R') {
            frames.push_back(
                reportFrame(0, {static_cast<std::uint8_t>(std::stoi(word.substr(1)))}));
        } else if (word[0] == '?') {
            Frame frame = stateFrame(0, word, 1);
            frame.type = static_cast<Frame::Type>(7);
            frames.push_back(frame);
        } else {
            const std::size_t sign = word.find('=');
            frames.push_back(stateFrame(0, word.substr(0, sign), std::stoi(word.substr(sign + 1))));
        }
    }
    return frames;
}

struct TrimCase {
    const char* name;
    std::size_t maxCount;
    std::initializer_list<const char*> before;
    std::initializer_list<const char*> after;
};

class TrimTest : public ::testing::TestWithParam<TrimCase> {};

template <typename List>
void expectTrimmed(const TrimCase& trim) {
    List frames = line(trim.before);
    PipelineRecording::trimFrames(frames, trim.maxCount);
    EXPECT_EQ(frames, line(trim.after));
    // Trimming again finds nothing more.
    PipelineRecording::trimFrames(frames, trim.maxCount);
    EXPECT_EQ(frames, line(trim.after));
}

TEST_P(TrimTest, Keeps) {
    expectTrimmed<Frames>(GetParam());
}

TEST_P(TrimTest, KeepsTheSameOfABlockwiseList) {
    expectTrimmed<FrameList>(GetParam());
}

const TrimCase kTrimCases[] = {
    {"NothingOfNothing", 3, {}, {}},
    {"TheNewestReports", 3, {"R1", "R2", "R3", "R4", "R5", "R6"}, {"R4", "R5", "R6"}},
    {"AllReportsUpToTheCap", 3, {"R1", "R2", "R3"}, {"R1", "R2", "R3"}},
    {"TheNewestStateOfAStretch", 2, {"a=1", "R1", "a=2", "a=3", "R2", "R3"}, {"a=3", "R2", "R3"}},
    {"OneStateOfEachStretch", 2, {"a=1", "R1", "a=2", "R2"}, {"a=1", "R1", "a=2", "R2"}},
    {"EachKeyForItself",
     1,
     {"a=1", "b=1", "R1", "a=2", "c=1", "R2", "b=2"},
     {"b=1", "a=2", "c=1", "R2", "b=2"}},
    {"StatesBehindTheNewestReport", 1, {"R1", "a=1", "a=2", "b=1", "a=3"}, {"R1", "b=1", "a=3"}},
    {"StatesHoweverMany",
     1,
     {"a=1", "b=1", "c=1", "d=1", "R1"},
     {"a=1", "b=1", "c=1", "d=1", "R1"}},
    // An erased report does not empty the set of seen keys.
    {"OneStateBeforeTheOldestKeptReport",
     1,
     {"a=1", "R1", "a=2", "R2", "a=3", "R3"},
     {"a=3", "R3"}},
    {"OneStateOfAllWhenNoReportIsKept", 0, {"a=1", "R1", "b=1", "a=2", "R2"}, {"b=1", "a=2"}},
    {"AFrameOfUnknownType",
     1,
     {"?1", "a=1", "R1", "?2", "a=2", "?3", "R2", "?4"},
     {"?1", "?2", "a=2", "?3", "R2", "?4"}},
    {"KeysThatBeginAlike", 1, {"a=1", "ab=1", "a=2", "R1"}, {"ab=1", "a=2", "R1"}},
    {"AnEmptyKey", 1, {"=1", "=2", "R1"}, {"=2", "R1"}},
};

INSTANTIATE_TEST_SUITE_P(Recording, TrimTest, ::testing::ValuesIn(kTrimCases),
                         [](const auto& trim) { return std::string(trim.param.name); });

TEST(RecordingCapTest, TheListGrowsToTwiceTheCapAndIsCutToIt) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(3);
    EXPECT_EQ(recorded.recording.maxFrameCount(), 3U);
    std::vector<std::size_t> sizes;
    for (std::uint8_t i = 1; i <= 7; ++i) {
        recorded.report({i});
        sizes.push_back(recorded.recording.frames().size());
    }
    EXPECT_THAT(sizes, ElementsAre(1, 2, 3, 4, 5, 3, 4));
    const std::uint64_t now = recorded.clock.ticks;
    EXPECT_EQ(recorded.recording.frames(), (Frames{reportFrame(now, {4}), reportFrame(now, {5}),
                                                   reportFrame(now, {6}), reportFrame(now, {7})}));
}

TEST(RecordingCapTest, StatesCountForTheGrowthToo) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(2);
    recorded.recording.setState("a", 1);
    recorded.recording.setState("a", 2);
    recorded.recording.setState("b", 1);
    EXPECT_EQ(recorded.recording.frames().size(), 3U);
    recorded.recording.setState("a", 3);
    EXPECT_EQ(recorded.recording.frames(), (Frames{stateFrame(recorded.clock.ticks, "b", 1),
                                                   stateFrame(recorded.clock.ticks, "a", 3)}));
}

TEST(RecordingCapTest, DifferentKeysAreKeptBeyondTwiceTheCap) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(1);
    for (const char* key : {"a", "b", "c", "d", "e"}) {
        recorded.recording.setState(key, 1);
    }
    EXPECT_EQ(recorded.recording.frames().size(), 5U);
}

TEST(RecordingCapTest, ACapOfZeroNeverTrims) {
    Recorded recorded;
    for (int i = 0; i < 100; ++i) {
        recorded.report({7});
        recorded.recording.setState("a", i);
    }
    recorded.recording.setMaxFrameCount(0);
    EXPECT_EQ(recorded.recording.frames().size(), 200U);
    recorded.recording.json();
    EXPECT_EQ(recorded.recording.frames().size(), 200U);
}

TEST(RecordingCapTest, ANewCapTrimsAtOnce) {
    Recorded recorded;
    Frames expected;
    for (std::uint8_t i = 1; i <= 9; ++i) {
        recorded.report({i});
        if (i > 4) {
            expected.push_back(reportFrame(recorded.clock.ticks, {i}));
        }
    }
    recorded.recording.setMaxFrameCount(5);
    EXPECT_EQ(recorded.recording.frames(), expected);
    recorded.recording.setMaxFrameCount(0);  // does not bring anything back, or trim
    EXPECT_EQ(recorded.recording.frames(), expected);
    EXPECT_EQ(recorded.recording.maxFrameCount(), 0U);
}

TEST(RecordingCapTest, AHugeCapNeverTrims) {
    for (const std::size_t cap :
         {std::numeric_limits<std::size_t>::max(), std::numeric_limits<std::size_t>::max() / 2 + 1,
          std::numeric_limits<std::size_t>::max() / 2 + 2}) {
        Recorded recorded;
        recorded.recording.setMaxFrameCount(cap);
        EXPECT_EQ(recorded.recording.maxFrameCount(), cap);
        for (std::uint8_t i = 1; i <= 9; ++i) {
            recorded.recording.setState("a", i);
            recorded.report({i});
        }
        EXPECT_EQ(recorded.recording.frames().size(), 18U) << cap;
    }
}

TEST(RecordingCapTest, AppendedFramesAreTrimmedAsRecordedOnes) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(1);
    recorded.recording.appendFrame(reportFrame(1, {1}));
    recorded.recording.appendFrame(reportFrame(2, {2}));
    EXPECT_EQ(recorded.recording.frames(), (Frames{reportFrame(2, {2})}));
    EXPECT_EQ(recorded.clock.reads, 0);  // the frame has its own time
}

TEST(RecordingCapTest, WritingTrimsToTheCap) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(2);
    for (std::uint8_t i = 1; i <= 3; ++i) {
        recorded.report({i});
    }
    EXPECT_EQ(recorded.recording.frames().size(), 3U);
    recorded.recording.json();
    EXPECT_EQ(recorded.recording.frames(), (Frames{reportFrame(recorded.clock.ticks, {2}),
                                                   reportFrame(recorded.clock.ticks, {3})}));
}

// Playback.

/// A recording of these frames and what playing them does.
struct Playback {
    FakeHostClock clock;
    PipelineRecording recording;

    explicit Playback(Frames frames, std::uint64_t now = 777'000 * kMs)
        : recording(std::move(frames), clock) {
        clock.ticks = now;
    }
    /// The waits of playing all of it.
    std::vector<std::uint64_t> waits(float speed) {
        clock.sleeps.clear();
        recording.playReset();
        playOn(recording, speed);
        return clock.sleeps;
    }
};

const Frames kTenMsApart = {reportFrame(1000, {7}), reportFrame(1000 + 10 * kMs, {7})};

TEST(PlaybackWaitTest, ReportsComeAsFarApartAsTheyWereRecorded) {
    EXPECT_THAT(Playback(kTenMsApart).waits(1.0F), ElementsAre(10'000));
}

TEST(PlaybackWaitTest, ASpeedOfTwoHalvesTheWaits) {
    EXPECT_THAT(Playback(kTenMsApart).waits(2.0F), ElementsAre(5'000));
}

TEST(PlaybackWaitTest, ASpeedOfAHalfDoublesTheWaits) {
    EXPECT_THAT(Playback(kTenMsApart).waits(0.5F), ElementsAre(20'000));
}

TEST(PlaybackWaitTest, ASpeedThatIsNotAboveZeroIsOne) {
    constexpr float kInfinity = std::numeric_limits<float>::infinity();
    for (const float speed : {0.0F, -0.0F, -1.0F, -2.0F, -kInfinity,
                              std::numeric_limits<float>::quiet_NaN(), -1e-45F}) {
        EXPECT_THAT(Playback(kTenMsApart).waits(speed), ElementsAre(10'000)) << speed;
    }
}

TEST(PlaybackWaitTest, AnInfiniteSpeedNeverWaits) {
    EXPECT_THAT(Playback(kTenMsApart).waits(std::numeric_limits<float>::infinity()), IsEmpty());
    const Frames endless = {reportFrame(0, {7}), reportFrame(~std::uint64_t{0}, {7})};
    EXPECT_THAT(Playback(endless).waits(std::numeric_limits<float>::infinity()), IsEmpty());
}

TEST(PlaybackWaitTest, AWaitIsClampedBeforeItIsAnInteger) {
    constexpr std::uint64_t kLongest = std::uint64_t{1} << 63U;
    const Frames endless = {reportFrame(0, {7}), reportFrame(~std::uint64_t{0}, {7})};
    EXPECT_THAT(Playback(endless).waits(1e-4F), ElementsAre(kLongest));
    EXPECT_THAT(Playback(endless).waits(std::numeric_limits<float>::denorm_min()),
                ElementsAre(kLongest));
    EXPECT_THAT(Playback(kTenMsApart).waits(std::numeric_limits<float>::denorm_min()),
                ElementsAre(kLongest));
    // 2^64 ns at recorded speed are no problem yet.
    EXPECT_THAT(Playback(endless).waits(1.0F), ElementsAre(18'446'744'949'882'880U));
}

TEST(PlaybackWaitTest, AWaitIsCutToWholeMicroseconds) {
    EXPECT_THAT(Playback({reportFrame(0, {7}), reportFrame(1999, {7})}).waits(1.0F),
                ElementsAre(1));
    EXPECT_THAT(Playback({reportFrame(0, {7}), reportFrame(999, {7})}).waits(1.0F), IsEmpty());
    EXPECT_THAT(Playback({reportFrame(0, {7}), reportFrame(10'000, {7})}).waits(3.0F),
                ElementsAre(3));
}

TEST(PlaybackWaitTest, TheWaitIsASinglePrecisionNumber) {
    // Above 2^24 a float has no odd numbers.
    EXPECT_THAT(Playback({reportFrame(0, {7}), reportFrame(16'777'217'001, {7})}).waits(1.0F),
                ElementsAre(16'777'218));
    EXPECT_THAT(Playback({reportFrame(0, {7}), reportFrame(33'333'333'333, {7})}).waits(1.0F),
                ElementsAre(33'333'334));
}

TEST(PlaybackWaitTest, NothingWaitsForAnEarlierOrEqualTimestamp) {
    EXPECT_THAT(Playback({reportFrame(10 * kMs, {7}), reportFrame(10 * kMs, {7}),
                          reportFrame(4 * kMs, {7}), reportFrame(5 * kMs, {7})})
                    .waits(1.0F),
                ElementsAre(1000));  // since the last report, not since the latest
}

TEST(PlaybackWaitTest, StatesDoNotWaitAndNothingWaitsForTheFirstReport) {
    EXPECT_THAT(
        Playback({stateFrame(0, "a", 1), reportFrame(10 * kMs, {7}), stateFrame(15 * kMs, "a", 2),
                  reportFrame(30 * kMs, {7}), stateFrame(90 * kMs, "a", 3)})
            .waits(1.0F),
        ElementsAre(20'000));
}

TEST(PlaybackWaitTest, AFrameOfUnknownTypeDoesNotWait) {
    Frame unknown = reportFrame(15 * kMs, {7});
    unknown.type = static_cast<Frame::Type>(7);
    EXPECT_THAT(
        Playback({reportFrame(10 * kMs, {7}), unknown, reportFrame(30 * kMs, {7})}).waits(1.0F),
        ElementsAre(20'000));
}

TEST(PlaybackWaitTest, ANewStartForgetsTheLastReport) {
    Playback playback(kTenMsApart);
    EXPECT_THAT(playback.waits(1.0F), ElementsAre(10'000));
    EXPECT_THAT(playback.waits(1.0F), ElementsAre(10'000));
}

TEST(PlaybackTest, EachFrameGetsItsRecordedTimeSinceTheStart) {
    Playback playback({stateFrame(500, "Algs.a", 1), reportFrame(510, {7}), reportFrame(900, {8}),
                       reportFrame(400, {9})},
                      1'000'000);
    playback.recording.playReset();
    std::vector<std::uint64_t> times;
    while (playback.recording.playCanContinue()) {
        playback.recording.playNextFrame(1.0F);
        times.push_back(playback.recording.timeMach());
    }
    // The first exactly at the start; an earlier time than the first's wraps to before it.
    EXPECT_THAT(times, ElementsAre(1'000'000, 1'000'010, 1'000'400, 999'900));
}

TEST(PlaybackTest, TheTimeFollowsTheRecordingWhateverTheSpeed) {
    for (const float speed : {0.5F, 1.0F, 100.0F, std::numeric_limits<float>::infinity()}) {
        Playback playback(kTenMsApart, 5 * kMs);
        playback.waits(speed);
        EXPECT_EQ(playback.recording.timeMach(), 15 * kMs) << speed;
    }
}

TEST(PlaybackTest, OneClockReadStartsItAndNoneFollows) {
    Playback playback(kTenMsApart);
    playback.waits(1.0F);
    EXPECT_EQ(playback.clock.reads, 1);
}

TEST(PlaybackTest, FramesReachThePipelineAndAreNotRecordedAgain) {
    const Bytes report = imageReport(kFinger, 1, 10);
    const Frames frames = {stateFrame(0, "Algs.ActivationThreshold", 150.0), reportFrame(0, report),
                           reportFrame(0, {7, 7})};
    Playback playback(frames, 42);
    std::vector<std::string> seen;
    std::vector<HidEvent> events;
    playback.recording.setStateProbe = [&](const std::string& key, const PropertyValue& value) {
        seen.push_back(key + " = " + value.description());
    };
    playback.recording.inputReportProbe = [&](const std::uint8_t*, std::uint64_t length) {
        seen.push_back(std::to_string(length) + " bytes");
    };
    playback.recording.hidEventsProbe = [&](const std::vector<HidEvent>& batch) {
        events.insert(events.end(), batch.begin(), batch.end());
    };
    playback.recording.playReset();
    playOn(playback.recording);
    EXPECT_THAT(seen, ElementsAre("Algs.ActivationThreshold = 150.0", "73 bytes", "2 bytes"));
    EXPECT_THAT(events, ElementsAre(AllOf(MayBegin(1), WithFrame(1), StampedAt(42))));
    EXPECT_EQ(playback.recording.algs().handStats()._activationThreshold, 150.0F);
    EXPECT_EQ(playback.recording.frames(), frames);
}

TEST(PlaybackTest, AFrameOfUnknownTypeOnlySetsTheTime) {
    Frame unknown = stateFrame(30, "Algs.ActivationThreshold", 150.0);
    unknown.type = static_cast<Frame::Type>(7);
    unknown.report = imageReport(kFinger, 1, 10);
    Playback playback({stateFrame(10, "a", 1), unknown}, 100);
    int seen = 0;
    playback.recording.setStateProbe = [&](const std::string&, const PropertyValue&) { ++seen; };
    playback.recording.inputReportProbe = [&](const std::uint8_t*, std::uint64_t) { ++seen; };
    playback.recording.playReset();
    playOn(playback.recording);
    EXPECT_EQ(seen, 1);
    EXPECT_EQ(playback.recording.timeMach(), 120U);
    EXPECT_EQ(firstDifference(playback.recording.algs(), Algs()), std::nullopt);
}

TEST(PlaybackTest, IsFinishedBeforeItStartsAndBehindTheLastFrame) {
    Playback playback(kTenMsApart, 5);
    EXPECT_FALSE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "playback finished");
    playback.recording.playReset();
    EXPECT_TRUE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "");
    EXPECT_EQ(playFault(playback.recording), "");
    EXPECT_FALSE(playback.recording.playCanContinue());
    const std::uint64_t time = playback.recording.timeMach();
    EXPECT_EQ(playFault(playback.recording), "playback finished");
    EXPECT_EQ(playback.recording.frames(), kTenMsApart);
    EXPECT_EQ(playback.recording.timeMach(), time);
    playback.recording.playReset();
    EXPECT_TRUE(playback.recording.playCanContinue());
}

TEST(PlaybackTest, OfNothingIsFinishedAtOnce) {
    Playback playback({});
    playback.recording.playReset();
    EXPECT_FALSE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "playback finished");
}

TEST(PlaybackTest, ALiveReportEndsIt) {
    Playback playback(kTenMsApart);
    playback.recording.playReset();
    playback.recording.playNextFrame(1.0F);
    send(playback.recording, {9});
    EXPECT_FALSE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "playback finished");
    // It can be started again, and then plays the new frame too.
    playback.recording.playReset();
    int played = 0;
    for (; playback.recording.playCanContinue(); ++played) {
        playback.recording.playNextFrame(1.0F);
    }
    EXPECT_EQ(played, 3);
}

TEST(PlaybackTest, ALiveStateOrAnAppendedFrameEndsIt) {
    Playback playback(kTenMsApart);
    playback.recording.playReset();
    playback.recording.setState("a", 1);
    EXPECT_EQ(playFault(playback.recording), "playback finished");
    playback.recording.playReset();
    playback.recording.appendFrame(reportFrame(0, {1}));
    EXPECT_EQ(playFault(playback.recording), "playback finished");
}

TEST(PlaybackTest, AReadAndATimeFromOutsideDoNotEndIt) {
    Playback playback(kTenMsApart);
    playback.recording.playReset();
    EXPECT_TRUE(playback.recording.getState("Algs.EventStats"));
    static_cast<Pipeline&>(playback.recording).setTime(3);
    playback.recording.json();
    EXPECT_TRUE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "");
}

const Frames kFourReports = {reportFrame(0, {1}), reportFrame(1, {2}), reportFrame(2, {3}),
                             reportFrame(3, {4})};

/// The first bytes of the reports that are still played.
std::vector<int> rest(PipelineRecording& recording) {
    std::vector<int> played;
    recording.inputReportProbe = [&](const std::uint8_t* report, std::uint64_t) {
        played.push_back(report[0]);
    };
    playOn(recording);
    recording.inputReportProbe = nullptr;
    return played;
}

TEST(PlaybackTest, ATrimThatErasesTheNextFrameEndsIt) {
    Playback playback(kFourReports);
    playback.recording.playReset();
    playback.recording.playNextFrame(1.0F);
    playback.recording.setMaxFrameCount(2);  // of 3 and 4; 2 was next
    EXPECT_FALSE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "playback finished");
    playback.recording.playReset();
    EXPECT_THAT(rest(playback.recording), ElementsAre(3, 4));
}

TEST(PlaybackTest, ATrimThatSparesTheNextFrameLetsItGoOn) {
    Playback playback(kFourReports);
    playback.recording.playReset();
    playback.recording.playNextFrame(1.0F);
    playback.recording.playNextFrame(1.0F);
    playback.recording.setMaxFrameCount(2);
    EXPECT_TRUE(playback.recording.playCanContinue());
    EXPECT_THAT(rest(playback.recording), ElementsAre(3, 4));
}

TEST(PlaybackTest, ATrimAtTheEndLeavesItAtTheEnd) {
    Playback playback(kFourReports);
    playback.recording.playReset();
    playOn(playback.recording);
    playback.recording.setMaxFrameCount(1);
    EXPECT_FALSE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "playback finished");
}

TEST(PlaybackTest, ATrimFromAProbeSparesTheFrameBeingPlayed) {
    Recorded recorded;
    for (std::uint8_t i = 0; i < 6; ++i) {
        recorded.report({i});
    }
    std::vector<Bytes> invalid;
    recorded.recording.invalidInputReportProbe = [&](const std::uint8_t* report,
                                                     std::uint64_t length) {
        invalid.emplace_back(report, report + length);
    };
    recorded.recording.setTimeProbe = [&](std::uint64_t) {
        if (invalid.size() == 1) {
            recorded.recording.setMaxFrameCount(
                4);  // erases the first two, the second being played
        }
    };
    recorded.recording.playReset();
    playOn(recorded.recording, std::numeric_limits<float>::infinity());
    EXPECT_THAT(invalid, ElementsAre(Bytes{0}, Bytes{1}, Bytes{2}, Bytes{3}, Bytes{4}, Bytes{5}));
    EXPECT_EQ(recorded.recording.frames().size(), 4U);
}

TEST(PlaybackTest, ALiveReportFromAProbeEndsItAfterTheFrameBeingPlayed) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(2);
    recorded.report({1});
    recorded.report({2});
    recorded.report({3});
    std::vector<std::uint8_t> seen;
    recorded.recording.inputReportProbe = [&](const std::uint8_t* report, std::uint64_t) {
        seen.push_back(*report);
        if (*report == 1) {
            recorded.report({9});  // reaches twice the cap: the frame being played goes
            seen.push_back(*report);
        }
    };
    recorded.recording.playReset();
    recorded.recording.playNextFrame(1.0F);
    EXPECT_THAT(seen, ElementsAre(1, 9, 1));
    EXPECT_FALSE(recorded.recording.playCanContinue());
    EXPECT_EQ(recorded.recording.frames().size(), 2U);
}

TEST(PlaybackTest, TheTrimOfWritingCanEndItToo) {
    Playback playback({});
    playback.recording.setMaxFrameCount(3);
    for (std::uint8_t i = 1; i <= 4; ++i) {
        send(playback.recording, {i});
    }
    playback.recording.playReset();
    playback.recording.json();  // erases the first, which was next
    EXPECT_FALSE(playback.recording.playCanContinue());
    EXPECT_EQ(playFault(playback.recording), "playback finished");
    playback.recording.playReset();
    EXPECT_THAT(rest(playback.recording), ElementsAre(2, 3, 4));
}

// Copies.

TEST(RecordingCopyTest, IsARecordingOfItsOwn) {
    Recorded recorded;
    const PropertyValue value = PropertyValue::Array{1, 2};
    recorded.recording.setState("a", value);
    recorded.report({1});
    recorded.recording.setMaxFrameCount(1);
    PipelineRecording copy = recorded.recording;
    const Frames before = {stateFrame(recorded.clock.ticks, "a", value),
                           reportFrame(recorded.clock.ticks, {1})};
    EXPECT_EQ(copy.frames(), before);
    EXPECT_EQ(copy.maxFrameCount(), 1U);
    EXPECT_EQ(copy.frames().front().value.handle(), value.handle());
    EXPECT_EQ(firstDifference(copy.algs(), recorded.recording.algs()), std::nullopt);
    EXPECT_EQ(copy.timeMach(), recorded.recording.timeMach());
    copy.setMaxFrameCount(0);
    send(copy, {2});
    EXPECT_EQ(copy.frames().size(), 3U);
    EXPECT_EQ(recorded.recording.frames(), before);
    EXPECT_EQ(recorded.recording.maxFrameCount(), 1U);
}

/// The times of a recording's frames.
std::vector<std::uint64_t> timesOf(const PipelineRecording& recording) {
    std::vector<std::uint64_t> times;
    for (const Frame& frame : recording.frames()) {
        times.push_back(frame.timestamp);
    }
    return times;
}

TEST(RecordingCopyTest, NeitherNoticesWhatBecomesOfTheOther) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(100);
    for (int i = 0; i < 150; ++i) {
        ++recorded.clock.ticks;
        recorded.report({7});
    }
    const std::vector<std::uint64_t> before = timesOf(recorded.recording);
    PipelineRecording copy = recorded.recording;
    const PipelineRecording copyOfCopy = copy;
    for (int i = 0; i < 49; ++i) {
        ++recorded.clock.ticks;
        recorded.report({8});
    }
    EXPECT_EQ(timesOf(copy), before);
    ++recorded.clock.ticks;
    recorded.report({8});  // trims
    const std::vector<std::uint64_t> after = timesOf(recorded.recording);
    EXPECT_EQ(after.size(), 100U);
    EXPECT_EQ(after.back(), before.back() + 50);
    EXPECT_EQ(timesOf(copy), before);
    copy.setState("a", 1);
    copy.setMaxFrameCount(3);
    send(copy, {9});
    EXPECT_EQ(copy.frames().size(), 5U);
    EXPECT_EQ(copy.frames().back().report, Bytes{9});
    EXPECT_EQ(timesOf(recorded.recording), after);
    EXPECT_EQ(timesOf(copyOfCopy), before);
}

TEST(RecordingCopyTest, IsWrittenAsTheOriginalWas) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(100);
    for (std::uint8_t i = 0; i < 199; ++i) {
        if (i % 7 == 0) {
            recorded.recording.setState("key " + std::to_string(i % 3), i);
        } else {
            recorded.report({i});
        }
    }
    PipelineRecording copy = recorded.recording;
    PipelineRecording copyOfCopy = copy;
    const std::string text = recorded.recording.json();
    recorded.report({1});
    EXPECT_EQ(copyOfCopy.json(), text);
    EXPECT_EQ(copy.json(), text);
}

/// A trim while a copy is held has to leave the shared frames, and the playback goes on all the
/// same.
TEST(RecordingCopyTest, DoesNotChangeHowATrimAffectsThePlayback) {
    Playback playback(kFourReports);
    playback.recording.playReset();
    playback.recording.playNextFrame(1.0F);
    playback.recording.playNextFrame(1.0F);
    const PipelineRecording copy = playback.recording;
    playback.recording.setMaxFrameCount(2);
    EXPECT_TRUE(playback.recording.playCanContinue());
    EXPECT_THAT(rest(playback.recording), ElementsAre(3, 4));
    EXPECT_EQ(copy.frames(), kFourReports);
}

/// Run by the thread sanitizer as well.
TEST(RecordingCopyTest, IsWrittenWhileTheOriginalIsRecordedOn) {
    constexpr std::size_t kCap = 100;
    constexpr int kCopies = 200;
    FakeHostClock clock;
    PipelineRecording recording(clock);
    recording.setMaxFrameCount(kCap);
    std::mutex mutex;  // guards the recording; held by the reader for its copy alone
    std::atomic<bool> done = false;
    std::thread reader([&] {
        for (int i = 0; i < kCopies; ++i) {
            std::optional<PipelineRecording> copy;
            {
                const std::scoped_lock lock(mutex);
                copy.emplace(recording);
            }
            const PipelineRecording written(copy->json());
            const std::vector<std::uint64_t> times = timesOf(written);
            EXPECT_LE(times.size(), 2 * kCap);
            for (std::size_t k = 1; k < times.size(); ++k) {
                EXPECT_LE(times[k - 1], times[k]);
            }
            std::size_t reports = 0;
            std::uint64_t number = 0;
            for (const Frame& frame : written.frames()) {
                if (frame.type == Frame::Type::InputReport) {
                    // Every report, none missing between the oldest and the newest kept.
                    const std::uint64_t own = frame.report.at(1) + 256U * frame.report.at(2);
                    EXPECT_TRUE(reports == 0 || own == (number + 1) % 65'536) << own;
                    number = own;
                    ++reports;
                }
            }
            EXPECT_LE(reports, kCap);
        }
        done = true;
    });
    std::uint64_t number = 0;
    for (; !done || number < 10 * kCap; ++number) {
        const std::scoped_lock lock(mutex);
        ++clock.ticks;
        if (number % 5 == 0) {
            recording.setState("key " + std::to_string(number % 4), number);
        }
        send(recording, {7, static_cast<std::uint8_t>(number % 256),
                         static_cast<std::uint8_t>(number / 256 % 256)});
    }
    reader.join();
    EXPECT_EQ(recording.frames().back().timestamp, number);
}

TEST(RecordingCopyTest, WritingTheCopyTrimsOnlyTheCopy) {
    Recorded recorded;
    recorded.recording.setMaxFrameCount(2);
    for (std::uint8_t i = 1; i <= 3; ++i) {
        recorded.report({i});
    }
    PipelineRecording copy = recorded.recording;
    copy.json();
    EXPECT_EQ(copy.frames().size(), 2U);
    EXPECT_EQ(recorded.recording.frames().size(), 3U);
}

TEST(RecordingCopyTest, StartsIdle) {
    Playback playback(kFourReports);
    playback.recording.playReset();
    playback.recording.playNextFrame(1.0F);
    PipelineRecording copy = playback.recording;
    EXPECT_FALSE(copy.playCanContinue());
    EXPECT_EQ(playFault(copy), "playback finished");
    PipelineRecording assigned(playback.clock);
    assigned.playReset();
    assigned = playback.recording;
    EXPECT_EQ(assigned.frames(), kFourReports);
    EXPECT_FALSE(assigned.playCanContinue());
    copy.playReset();
    EXPECT_THAT(rest(copy), ElementsAre(1, 2, 3, 4));
    EXPECT_THAT(rest(playback.recording), ElementsAre(2, 3, 4));  // went on undisturbed
}

TEST(RecordingCopyTest, OutlivesTheOriginal) {
    auto original = std::make_unique<Playback>(kFourReports);
    original->recording.playReset();
    FakeHostClock clock;
    PipelineRecording copy(clock);
    copy = original->recording;
    EXPECT_EQ(copy.frames(), kFourReports);
    copy = PipelineRecording(clock);
    original.reset();
    EXPECT_THAT(copy.frames(), IsEmpty());
    send(copy, {1});
    EXPECT_EQ(copy.frames(), (Frames{reportFrame(0, {1})}));
}

TEST(RecordingCopyTest, AssigningARecordingToItselfChangesNothing) {
    Playback playback(kFourReports);
    const PipelineRecording& same = playback.recording;
    playback.recording = same;
    EXPECT_EQ(playback.recording.frames(), kFourReports);
}

TEST(RecordingCopyTest, AMovedRecordingStartsIdleAndTheOldOneTakesNewFrames) {
    Playback playback(kFourReports);
    playback.recording.setMaxFrameCount(9);
    playback.recording.playReset();
    PipelineRecording moved = std::move(playback.recording);
    EXPECT_EQ(moved.frames(), kFourReports);
    EXPECT_EQ(moved.maxFrameCount(), 9U);
    EXPECT_FALSE(moved.playCanContinue());
    EXPECT_FALSE(playback.recording.playCanContinue());  // NOLINT(bugprone-use-after-move)
    PipelineRecording assigned(playback.clock);
    assigned.playReset();
    assigned = std::move(moved);
    EXPECT_EQ(assigned.frames(), kFourReports);
    EXPECT_FALSE(assigned.playCanContinue());
}

}  // namespace
}  // namespace VexaTouch
