#include "Tools/RecordingSummary.h"

#include "Tools/RecordKeeper.h"

#include <algorithm>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::uint32_t kLongestStepMs = 1000;

// The smallest value that at least `percent` of all are not above.
std::uint32_t nearestRank(std::vector<std::uint32_t>& values, std::uint64_t percent) {
    const std::uint64_t rank = (values.size() * percent + 99) / 100;
    const auto place = values.begin() + static_cast<std::ptrdiff_t>(rank - 1);
    std::nth_element(values.begin(), place, values.end());
    return *place;
}

}  // namespace

void RecordingSummary::add(const PlayedFrame& played, const Algs& algs) {
    const std::uint64_t timeNs = played.frame->timestamp;
    earliestNs_ = std::min(earliestNs_.value_or(timeNs), timeNs);
    latestNs_ = std::max(latestNs_, timeNs);
    const bool wasLostReports = std::exchange(isBehindLostReports_, false);
    if (played.type == PlayedType::State) {
        addState(*played.frame, wasLostReports);
    } else if (played.type == PlayedType::Image) {
        addImage(played, algs);
    }
}

void RecordingSummary::addState(const RecordedFrame& frame, bool isBehindLostReports) {
    if (frame.key == kLostReportsKey) {
        lost_.reports += frame.value.toUnsigned64();
        ++lossPlaces_;
        isBehindLostReports_ = true;
    } else if (frame.key == kLostSettingsKey) {
        lost_.settings += frame.value.toUnsigned64();
        // Of one gap both are told, one behind the other.
        lossPlaces_ += isBehindLostReports ? 0 : 1;
    } else {
        settings_[frame.key] = frame.value;
    }
}

std::uint64_t RecordingSummary::durationNs() const noexcept {
    return latestNs_ - earliestNs_.value_or(latestNs_);
}

std::optional<RecordingSummary::Intervals> RecordingSummary::intervals() const {
    if (intervals_.empty()) {
        return std::nullopt;
    }
    std::vector<std::uint32_t> values = intervals_;
    return Intervals{.median = nearestRank(values, 50),
                     .p99 = nearestRank(values, 99),
                     .max = maxInterval_,
                     .maxBeforeFrame = maxBeforeFrame_};
}

void RecordingSummary::addImage(const PlayedFrame& played, const Algs& algs) {
    const InputReport::Image& image = played.image;
    if (!lastImage_) {
        beginsInMidTouch_ = algs.handStats()._isTouching;
    } else {
        disjointImages_ += image.frameNumber != lastImage_->frameNumber + 1 ? 1 : 0;
        // The clock wraps: a step is the difference in 32 bits, backward when it is negative.
        const std::uint32_t step = image.timestampMs - lastImage_->timestampMs;
        const bool backward = static_cast<std::int32_t>(step) < 0;
        clockJumps_ += backward || step > kLongestStepMs ? 1 : 0;
        if (!backward) {
            if (intervals_.empty() || step > maxInterval_) {
                maxInterval_ = step;
                maxBeforeFrame_ = played.index;
            }
            intervals_.push_back(step);
        }
    }
    lastImage_ = image;
}

}  // namespace VexaTouch::Tools
