// Recordings of random sessions: written and read back, trimmed, replayed.
//
// VEXA_PROPERTY_SEED repeats a run.

#include "Pipeline/PipelineRecording.h"
#include "Platform/PropertyValue.h"
#include "Tests/Support/AnySession.h"
#include "Tests/Support/ContainerAnswer.h"
#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/PrintCounters.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/RecordingFrames.h"
#include "Tests/Support/SeededRandom.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <limits>
#include <list>
#include <optional>
#include <random>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using Frame = PipelineRecording::Frame;
using Frames = std::list<Frame>;
using Vexa::HidEvent;
using Vexa::PropertyValue;

std::uint64_t seedOfThisRun() {
    const char* text = std::getenv("VEXA_PROPERTY_SEED");
    const std::uint64_t seed =
        text != nullptr ? std::strtoull(text, nullptr, 10) : std::random_device{}();
    std::cout << "VEXA_PROPERTY_SEED=" << seed << '\n';
    return seed;
}

// Values and what becomes of them.

/// A text and what is read back when it was written.
struct Text {
    std::string text;
    std::string back;
};

/// A value and what is read back when it was written.
struct Value {
    PropertyValue value;
    PropertyValue back;
};

class AnyValues {
public:
    explicit AnyValues(SeededRandom& random, bool withExceptions)
        : random_(random), withExceptions_(withExceptions) {}

    Text text() {
        static const Text kTexts[] = {
            {"", ""},
            {"a", "a"},
            {"Algs.ActivationThreshold", "Algs.ActivationThreshold"},
            {"quote \" back \\ slash /", "quote \" back \\ slash /"},
            {std::string("zero \0 \x01 \x1F \x7F", 12), std::string("zero \0 \x01 \x1F \x7F", 12)},
            {"\xC3\xA9 \xE6\xBC\xA2 \xF0\x9F\x98\x80", "\xC3\xA9 \xE6\xBC\xA2 \xF0\x9F\x98\x80"},
            {"\xF4\x8F\xBF\xBF\xED\x9F\xBF", "\xF4\x8F\xBF\xBF\xED\x9F\xBF"},
        };
        // Not UTF-8: one U+FFFD for each maximal part.
        static const Text kBroken[] = {
            {"x\xFF", "x\xEF\xBF\xBD"},
            {"\xC3", "\xEF\xBF\xBD"},
            {"\xE6\xBC z", "\xEF\xBF\xBD z"},
            {"\xC0\x80", "\xEF\xBF\xBD\xEF\xBF\xBD"},
            {"\xED\xA0\x80", "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD"},
        };
        Text all;
        for (int parts = random_.between(0, 3); parts >= 0; --parts) {
            const Text& part = withExceptions_ && random_.oneIn(4) ? random_.oneOf(kBroken)
                                                                   : random_.oneOf(kTexts);
            // A separator, so that broken parts do not become one character.
            all.text += part.text + ".";
            all.back += part.back + ".";
        }
        return all;
    }

    Value value(int depth = 3) {
        switch (random_.between(0, depth > 0 ? 9 : 6)) {
            case 0:
                return same(PropertyValue::null());
            case 1:
                return same(random_.oneIn(2));
            case 2:
                return same(std::bit_cast<std::int64_t>(random_.next() >> random_.between(0, 63)));
            case 3:
                return same(random_.next() >> random_.between(0, 63));
            case 4:
                return number();
            case 5: {
                const Text both = text();
                return {both.text, both.back};
            }
            case 6:
                return withExceptions_ ? exception() : same(random_.between(-5, 5) / 2.0);
            case 7:
            case 8: {
                PropertyValue::Array values;
                PropertyValue::Array back;
                for (int i = random_.between(0, 4); i > 0; --i) {
                    Value element = value(depth - 1);
                    values.push_back(std::move(element.value));
                    back.push_back(std::move(element.back));
                }
                return {std::move(values), std::move(back)};
            }
            default: {
                PropertyValue::Dictionary values;
                PropertyValue::Dictionary back;
                for (int i = random_.between(0, 4); i > 0; --i) {
                    // Numbered, so that no two keys become the same.
                    const Text key = text();
                    const std::string number = std::to_string(i);
                    Value member = value(depth - 1);
                    values[key.text + number] = std::move(member.value);
                    back[key.back + number] = std::move(member.back);
                }
                return {std::move(values), std::move(back)};
            }
        }
    }

private:
    static Value same(PropertyValue value) { return {value, value}; }

    Value number() {
        const auto bits = random_.next();
        const auto anyDouble = std::bit_cast<double>(bits);
        if (!std::isfinite(anyDouble)) {
            return same(200.0);
        }
        const auto anyFloat = std::bit_cast<float>(static_cast<std::uint32_t>(bits));
        if (random_.oneIn(3) && std::isfinite(anyFloat)) {
            return {anyFloat, static_cast<double>(anyFloat)};
        }
        return same(random_.oneIn(3) ? random_.between(-100000, 100000) / 100.0 : anyDouble);
    }

    /// What has no JSON form.
    Value exception() {
        switch (random_.between(0, 3)) {
            case 0:
                return {PropertyValue::Bytes{0x00, 0x1F, 0xFF}, "00 1f ff "};
            case 1:
                return {std::numeric_limits<double>::quiet_NaN(), PropertyValue::null()};
            case 2:
                return {-std::numeric_limits<float>::infinity(), PropertyValue::null()};
            default:
                return {PropertyValue::Bytes{}, ""};
        }
    }

    SeededRandom& random_;
    bool withExceptions_;
};

std::uint64_t anyTimestamp(SeededRandom& random) {
    return random.next() >> random.between(0, 63);
}

std::vector<std::uint8_t> anyReport(SeededRandom& random) {
    std::vector<std::uint8_t> report(static_cast<std::size_t>(
        random.oneIn(50) ? random.between(0, 65'536) : random.between(0, 80)));
    for (std::uint8_t& byte : report) {
        byte = static_cast<std::uint8_t>(random.next());
    }
    return report;
}

struct WrittenAndBack {
    Frames frames;
    Frames back;
};

WrittenAndBack anyFrames(SeededRandom& random, bool withExceptions) {
    AnyValues values(random, withExceptions);
    WrittenAndBack all;
    for (int i = random.between(0, 30); i > 0; --i) {
        const std::uint64_t timestamp = anyTimestamp(random);
        if (random.oneIn(2)) {
            all.frames.push_back(reportFrame(timestamp, anyReport(random)));
            all.back.push_back(all.frames.back());
        } else {
            const Text key = values.text();
            const Value value = values.value();
            all.frames.push_back(stateFrame(timestamp, key.text, value.value));
            all.back.push_back(stateFrame(timestamp, key.back, value.back));
        }
    }
    return all;
}

TEST(RecordingPropertyTest, ARecordingWhoseValuesHaveAJsonFormIsTheSameWhenReadBack) {
    SeededRandom random(seedOfThisRun());
    std::size_t states = 0;
    for (int i = 0; i < 2000 && !HasFailure(); ++i) {
        const WrittenAndBack all = anyFrames(random, false);
        states += static_cast<std::size_t>(
            std::ranges::count(all.frames, Frame::Type::State, &Frame::type));
        const std::string text = PipelineRecording(all.frames).json();
        PipelineRecording back(text);
        EXPECT_EQ(back.frames(), all.back);
        EXPECT_EQ(back.json(), text);
        EXPECT_EQ(readByTree(text), ContainerAnswer{.frames = all.back});
    }
    EXPECT_GT(states, 10'000U);
}

TEST(RecordingPropertyTest, WhatHasNoJsonFormReadsBackAsItsReplacement) {
    SeededRandom random(seedOfThisRun());
    std::size_t changed = 0;
    for (int i = 0; i < 2000 && !HasFailure(); ++i) {
        const WrittenAndBack all = anyFrames(random, true);
        changed += all.frames == all.back ? 0U : 1U;
        const std::string text = PipelineRecording(all.frames).json();
        PipelineRecording back(text);
        EXPECT_EQ(back.frames(), all.back);
        // What was read back has a JSON form, hence stays. (Members of a dictionary whose names
        // were repaired may stand in another order once.)
        const std::string again = back.json();
        EXPECT_EQ(constructed(again).frames, all.back);
        EXPECT_EQ(PipelineRecording(again).json(), again);
    }
    EXPECT_GT(changed, 1000U);
}

TEST(RecordingPropertyTest, AMissingValueAnywhereIsWrittenAndRefusedOnReading) {
    SeededRandom random(seedOfThisRun());
    for (int i = 0; i < 300 && !HasFailure(); ++i) {
        Frames frames = anyFrames(random, true).frames;
        const auto at =
            std::next(frames.begin(), random.between(0, static_cast<int>(frames.size())));
        frames.insert(at, stateFrame(1, "Algs.ActivationThreshold", PropertyValue()));
        const std::string text = PipelineRecording(frames).json();
        EXPECT_EQ(constructed(text), invalidArgument("invalid state value class"));
    }
}

// Trimming.

/// Which frames the rules keep, by the rules alone: the newest `maxCount` reports; a state unless
/// a newer one of its key stands before the next kept report; whatever has another type.
Frames trimmedSlowly(const Frames& frames, std::size_t maxCount) {
    const std::vector<Frame> all(frames.begin(), frames.end());
    const auto isReport = [&](std::size_t i) { return all[i].type == Frame::Type::InputReport; };
    const auto isKeptReport = [&](std::size_t i) {
        std::size_t newer = 0;
        for (std::size_t j = i + 1; j < all.size(); ++j) {
            newer += isReport(j) ? 1U : 0U;
        }
        return isReport(i) && newer < maxCount;
    };
    const auto isSuperseded = [&](std::size_t i) {
        for (std::size_t j = i + 1; j < all.size() && !isKeptReport(j); ++j) {
            if (all[j].type == Frame::Type::State && all[j].key == all[i].key) {
                return true;
            }
        }
        return false;
    };
    Frames kept;
    for (std::size_t i = 0; i < all.size(); ++i) {
        const bool keep = isReport(i)                         ? isKeptReport(i)
                          : all[i].type == Frame::Type::State ? !isSuperseded(i)
                                                              : true;
        if (keep) {
            kept.push_back(all[i]);
        }
    }
    return kept;
}

/// Frames of few keys, each told from all others by its time.
Frames anyLine(SeededRandom& random) {
    Frames frames;
    const int reports = random.between(0, 10);
    const int keys = random.between(1, 5);
    for (int i = random.between(0, 40); i > 0; --i) {
        const auto timestamp = static_cast<std::uint64_t>(frames.size());
        if (random.between(1, 10) <= reports) {
            frames.push_back(reportFrame(timestamp, {7}));
        } else {
            frames.push_back(stateFrame(
                timestamp, std::string(1, static_cast<char>('a' + random.between(0, keys))),
                random.between(0, 3)));
            if (random.oneIn(20)) {
                frames.back().type = static_cast<Frame::Type>(random.between(2, 5));
            }
        }
    }
    return frames;
}

TEST(RecordingPropertyTest, TrimmingKeepsExactlyWhatTheRulesSay) {
    SeededRandom random(seedOfThisRun());
    std::size_t erased = 0;
    for (int i = 0; i < 20'000 && !HasFailure(); ++i) {
        const Frames before = anyLine(random);
        const auto maxCount = static_cast<std::size_t>(random.between(0, 12));
        const Frames expected = trimmedSlowly(before, maxCount);
        Frames after = before;
        PipelineRecording::trimFrames(after, maxCount);
        EXPECT_EQ(after, expected) << "cap " << maxCount;
        FrameList frames = before;
        PipelineRecording::trimFrames(frames, maxCount);
        EXPECT_EQ(frames, expected) << "cap " << maxCount;
        erased += before.size() - after.size();
    }
    EXPECT_GT(erased, 20'000U);
}

TEST(RecordingPropertyTest, ACappedRecordingIsTrimmedAsItGrows) {
    SeededRandom random(seedOfThisRun());
    for (int i = 0; i < 3'000 && !HasFailure(); ++i) {
        const auto cap = static_cast<std::size_t>(random.between(1, 8));
        PipelineRecording recording;
        recording.setMaxFrameCount(cap);
        Frames model;
        for (const Frame& frame : anyLine(random)) {
            recording.appendFrame(frame);
            model.push_back(frame);
            if (model.size() >= 2 * cap) {
                model = trimmedSlowly(model, cap);
            }
            ASSERT_EQ(recording.frames(), model) << "cap " << cap;
        }
    }
}

/// A trim while playing: the frames left are played on from the cursor, or nothing is.
TEST(RecordingPropertyTest, ATrimWhilePlayingEndsThePlaybackOrLetsItGoOn) {
    SeededRandom random(seedOfThisRun());
    int ended = 0;
    int wentOn = 0;
    for (int i = 0; i < 5'000 && !HasFailure(); ++i) {
        const Frames frames = anyLine(random);
        FakeHostClock clock;
        PipelineRecording recording(frames, clock);
        recording.playReset();
        std::size_t played = 0;
        const auto target = static_cast<std::size_t>(random.between(0, 40));
        for (; played < target && recording.playCanContinue(); ++played) {
            recording.playNextFrame(1.0F);
        }
        const auto cap = static_cast<std::size_t>(random.between(1, 10));
        recording.setMaxFrameCount(cap);
        EXPECT_EQ(recording.frames(), trimmedSlowly(frames, cap));
        // Those behind the cursor, if the frame under it is still there.
        std::optional<std::size_t> left = 0;
        if (played < frames.size()) {
            const std::uint64_t cursor =
                std::next(frames.begin(), static_cast<int>(played))->timestamp;
            const auto found = std::ranges::find(recording.frames(), cursor, &Frame::timestamp);
            left = static_cast<std::size_t>(std::distance(found, recording.frames().end()));
        }
        const bool isSpared = left > 0U;
        ++(isSpared ? wentOn : ended);
        EXPECT_EQ(recording.playCanContinue(), isSpared);
        std::size_t more = 0;
        for (; recording.playCanContinue(); ++more) {
            recording.playNextFrame(1.0F);
        }
        EXPECT_EQ(more, left);
    }
    EXPECT_GT(ended, 500);
    EXPECT_GT(wentOn, 500);
}

// Replay.

/// What a pipeline sent, with the time since its start.
class Sent {
public:
    void listenTo(Pipeline& pipeline, std::uint64_t start) {
        pipeline.hidEventsProbe = [this, start](const std::vector<HidEvent>& batch) {
            for (const HidEvent& event : batch) {
                const std::uint64_t stamp = event.timestamp();
                event.setTimestamp(stamp - start);
                all_.push_back(event.description());
                event.setTimestamp(stamp);
            }
        };
    }
    [[nodiscard]] const std::vector<std::string>& all() const { return all_; }

private:
    std::vector<std::string> all_;
};

/// Plays a recording from its start in a pipeline of its own.
struct Replayed {
    FakeHostClock clock;
    PipelineRecording recording;
    Sent sent;

    explicit Replayed(const FrameList& frames, std::uint64_t now) : recording(frames, clock) {
        clock.ticks = now;
        sent.listenTo(recording, now);
        recording.playReset();
        while (recording.playCanContinue()) {
            recording.playNextFrame(std::numeric_limits<float>::infinity());
        }
    }
};

TEST(RecordingPropertyTest, AnUnboundedLiveRecordingReplaysToTheSameEventsAndState) {
    const std::uint64_t seed = seedOfThisRun();
    SeededRandom random(seed);
    std::size_t events = 0;
    std::size_t written = 0;
    for (int i = 0; i < 60 && !HasFailure(); ++i) {
        FakeHostClock clock;
        clock.ticks = random.next() >> random.between(0, 40);
        const std::uint64_t start = clock.ticks;
        PipelineRecording live(clock);
        Sent sent;
        sent.listenTo(live, start);
        AnySession session(random.next());
        for (int steps = random.between(0, 1500); steps > 0; --steps) {
            Step step = session.next();
            std::vector<std::uint8_t> report;
            switch (step.kind) {
                case Step::Kind::Image:
                    report = imageReport(step.samples, step.frame, step.timeMs);
                    break;
                case Step::Kind::Reset:
                    report = firmwareReport(static_cast<std::uint8_t>(random.between(0, 1)));
                    break;
                case Step::Kind::Copy:
                    report = anyReport(random);
                    break;
                case Step::Kind::Setting:
                    live.setState((random.oneIn(8) ? "" : "Algs.") + step.key, step.value);
                    break;
            }
            if (step.kind != Step::Kind::Setting) {
                live.handleInputReport(report.data(), report.size());
            }
            clock.ticks += static_cast<std::uint64_t>(random.between(0, 20'000'000));
        }
        events += sent.all().size();

        const Replayed replayed(live.frames(), random.next());
        EXPECT_EQ(replayed.sent.all(), sent.all());
        EXPECT_EQ(firstDifference(replayed.recording.algs(), live.algs()), std::nullopt);
        EXPECT_EQ(replayed.recording.frames(), live.frames());

        // By way of a file, unless a value has no JSON form.
        const ContainerAnswer read = constructed(live.json());
        if (read.frames == live.frames()) {
            ++written;
            const Replayed again(read.frames, random.next());
            EXPECT_EQ(again.sent.all(), sent.all());
            EXPECT_EQ(firstDifference(again.recording.algs(), live.algs()), std::nullopt);
        }
    }
    EXPECT_GT(events, 500U);
    EXPECT_GT(written, 5U);
}

/// A live session with a fake clock that runs with the device's, ten ms a frame.
struct LiveSession {
    FakeHostClock clock;
    PipelineRecording recording{clock};
    FrameSequence device;
    std::vector<HidEvent> events;

    LiveSession() { listen(recording, events); }

    static void listen(PipelineRecording& recording, std::vector<HidEvent>& events) {
        recording.hidEventsProbe = [&events](const std::vector<HidEvent>& batch) {
            events.insert(events.end(), batch.begin(), batch.end());
        };
    }
    void feel(const Touch& touch) {
        for (const std::vector<std::uint8_t>& report : device.reports(touch)) {
            clock.ticks += 10'000'000;
            recording.handleInputReport(report.data(), report.size());
        }
    }
    /// The events of replaying the newest `count` reports, and the algorithm's state after it.
    std::pair<std::vector<HidEvent>, Algs> replayNewest(std::size_t count) const {
        PipelineRecording cut = recording;
        cut.setMaxFrameCount(count);
        FakeHostClock otherClock;
        PipelineRecording player(cut.json(), otherClock);
        std::vector<HidEvent> replayed;
        listen(player, replayed);
        player.playReset();
        while (player.playCanContinue()) {
            player.playNextFrame(1.0F);
        }
        return {replayed, player.algs()};
    }
};

const Touch kFinger = touch("A").at(350);  // region 1

TEST(TrimmedRecordingTest, ACutInMidTouchSeesTheTouchAsNewAndTheCountersStartAtZero) {
    LiveSession live;
    live.feel(kFinger.forMs(120));
    live.feel(nothing().forMs(500));
    live.feel(kFinger.forMs(700));
    live.feel(nothing().forMs(300));
    EXPECT_THAT(live.events,
                ElementsAre(MayBegin(1), Tap(1), MayBegin(1), HoldStart(1), HoldEnd(1)));
    const EventStats::Counters counters = live.recording.algs().eventStats()._stats;
    EXPECT_EQ(counters.numTaps, 1U);
    EXPECT_EQ(counters.numBeginHold, 1U);

    // The cut begins 300 ms before the finger lifts: a hold that was 400 ms old is a tap now.
    const auto [events, algs] = live.replayNewest(60);
    EXPECT_THAT(events, ElementsAre(AllOf(MayBegin(1), WithFrame(103)), Tap(1)));
    EventStats::Counters expected;
    expected.numTaps = 1;
    expected.numPlayPause = 1;
    EXPECT_EQ(algs.eventStats()._stats, expected);
}

TEST(TrimmedRecordingTest, ACutKeepsTheLatestSettings) {
    LiveSession live;
    live.recording.setState("Algs.ActivationThreshold", 150.0);
    live.recording.setState("Algs.HoldTimeoutMilliseconds", 900);
    live.feel(kFinger.forMs(120));
    live.recording.setState("Algs.HoldTimeoutMilliseconds", 200);
    live.feel(nothing().forMs(500));
    live.feel(kFinger.forMs(400));
    live.feel(nothing().forMs(300));
    const auto [events, algs] = live.replayNewest(80);
    EXPECT_THAT(events, ElementsAre(MayBegin(1), HoldStart(1), HoldEnd(1)));
    EXPECT_EQ(algs.handStats()._activationThreshold, 150.0F);
    EXPECT_EQ(algs.getState("HoldTimeoutMilliseconds"), PropertyValue(200));
}

TEST(TrimmedRecordingTest, ACutBetweenTouchesReplaysTheRestAsItWas) {
    LiveSession live;
    live.feel(kFinger.forMs(120));
    live.feel(nothing().forMs(1000));
    live.events.clear();
    live.feel(kFinger.forMs(700));
    live.feel(nothing().forMs(300));
    const auto [events, algs] = live.replayNewest(120);
    EXPECT_THAT(events, ElementsAre(MayBegin(1), HoldStart(1), HoldEnd(1)));
    ASSERT_EQ(live.events.size(), 3U);
    for (std::size_t i = 0; i < events.size(); ++i) {
        EXPECT_EQ(events[i].integerField(Vexa::HidEventField::DigitizerFrameNumber),
                  live.events[i].integerField(Vexa::HidEventField::DigitizerFrameNumber));
    }
}

}  // namespace
}  // namespace VexaTouch::Testing
