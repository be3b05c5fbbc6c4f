#pragma once

#include "Platform/HidEvent.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <ostream>

namespace Vexa {

inline void PrintTo(const HidEvent& event, std::ostream* out) {
    *out << event.description();
}

}  // namespace Vexa

namespace VexaTouch::Testing {

/// One whole event: every field but the time stamp and the frame number, which WithFrame and
/// StampedAt look at.
class EventMatcher {
public:
    using is_gtest_matcher = void;

    static EventMatcher digitizer(const char* name, std::uint32_t mask, int region,
                                  Vexa::HidEventPhase phase) {
        EventMatcher matcher;
        matcher.name_ = name;
        matcher.region_ = region;
        matcher.phase_ = phase;
        matcher.record_.transducerType = 2;
        matcher.record_.eventMask = mask;
        matcher.record_.y = region;
        return matcher;
    }
    static EventMatcher firmwareReset() { return {}; }

    bool MatchAndExplain(const Vexa::HidEvent& event,
                         ::testing::MatchResultListener* listener) const {
        if (event.phase() != phase_) {
            *listener << "whose phase is " << static_cast<int>(event.phase());
            return false;
        }
        if (isFirmwareReset()) {
            const auto record = event.vendorRecord();
            Vexa::VendorEventRecord expected;
            expected.timestamp = event.timestamp();
            expected.usagePage = 0xFF60;
            expected.usage = 2;
            return record == expected;
        }
        const auto record = event.digitizerRecord();
        Vexa::DigitizerEventRecord expected = record_;
        expected.timestamp = event.timestamp();
        return record == expected;
    }
    void DescribeTo(std::ostream* out) const {
        *out << "is " << name_;
        if (!isFirmwareReset()) {
            *out << " in region " << region_;
        }
    }
    void DescribeNegationTo(std::ostream* out) const {
        *out << "not that it ";
        DescribeTo(out);
    }

private:
    [[nodiscard]] bool isFirmwareReset() const { return record_.transducerType == 0; }

    const char* name_ = "firmware-reset";
    int region_ = 0;
    Vexa::HidEventPhase phase_ = Vexa::HidEventPhase::None;
    Vexa::DigitizerEventRecord record_;
};

inline EventMatcher MayBegin(int region) {
    return EventMatcher::digitizer("may-begin", 0, region, Vexa::HidEventPhase::MayBegin);
}
inline EventMatcher HoldStart(int region) {
    return EventMatcher::digitizer("hold-start", 2, region, Vexa::HidEventPhase::Began);
}
inline EventMatcher HoldChange(int region) {
    return EventMatcher::digitizer("hold-change", 2, region, Vexa::HidEventPhase::Changed);
}
inline EventMatcher HoldEnd(int region) {
    return EventMatcher::digitizer("hold-end", 2, region, Vexa::HidEventPhase::Ended);
}
inline EventMatcher Tap(int region) {
    return EventMatcher::digitizer("tap", 0x20000, region, Vexa::HidEventPhase::None);
}
inline EventMatcher Cancel() {
    return EventMatcher::digitizer("cancel", 0, 0, Vexa::HidEventPhase::Cancelled);
}
inline EventMatcher FirmwareReset() {
    return EventMatcher::firmwareReset();
}

MATCHER_P(WithFrame, frame, "has frame number " + ::testing::PrintToString(frame)) {
    return arg.integerField(Vexa::HidEventField::DigitizerFrameNumber) ==
           static_cast<std::int64_t>(frame);
}

MATCHER_P(StampedAt, ticks, "is stamped at " + ::testing::PrintToString(ticks) + " ticks") {
    return arg.timestamp() == static_cast<std::uint64_t>(ticks);
}

}  // namespace VexaTouch::Testing
