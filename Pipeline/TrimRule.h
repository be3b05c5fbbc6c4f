#pragma once

#include "Pipeline/RecordedFrame.h"

#include <cstddef>
#include <string_view>
#include <unordered_set>

namespace VexaTouch {

/// Which frames a trim keeps: the newest input reports up to a number and, for each state key, the
/// state frames that still matter, which are the newest of each key between two kept reports and
/// before the oldest one. Frames of any other type are kept.
///
/// Asked for each frame once, from the newest to the oldest. A kept frame's key must stay where it
/// is until the last one is asked for.
class TrimRule {
public:
    explicit TrimRule(std::size_t maxCount) noexcept : maxCount_(maxCount) {}

    bool operator()(const RecordedFrame& frame) {
        if (frame.type == RecordedFrame::Type::State) {
            return seenKeys_.insert(frame.key).second;
        }
        if (frame.type == RecordedFrame::Type::InputReport) {
            if (keptReports_ == maxCount_) {
                return false;
            }
            ++keptReports_;
            seenKeys_.clear();
        }
        return true;
    }

private:
    std::size_t maxCount_;
    std::size_t keptReports_ = 0;
    std::unordered_set<std::string_view> seenKeys_;  ///< views of kept frames' keys
};

}  // namespace VexaTouch
