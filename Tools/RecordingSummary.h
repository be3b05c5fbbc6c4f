#pragma once

#include "Pipeline/RecordedFrame.h"
#include "Platform/PropertyValue.h"
#include "Tools/FrameFeed.h"
#include "Tools/Replay.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// What a recording holds, gathered while it is replayed. Not thread safe.
class RecordingSummary {
public:
    /// Times between images on the device's clock, in ms: by nearest rank, steps backward left out.
    struct Intervals {
        std::uint32_t median = 0;
        std::uint32_t p99 = 0;
        std::uint32_t max = 0;
        std::uint64_t maxBeforeFrame = 0;  ///< index of the frame that ended the (first) largest
    };

    void add(const PlayedFrame& played, const Algs& algs);

    /// Recorded time from the earliest to the latest frame.
    [[nodiscard]] std::uint64_t durationNs() const noexcept;
    /// No value with fewer than two images in order.
    [[nodiscard]] std::optional<Intervals> intervals() const;
    /// Images whose number is not one more (in 32 bits) than that of the image before.
    [[nodiscard]] std::uint64_t disjointImages() const noexcept { return disjointImages_; }
    /// Steps of the device's clock from image to image that go backward or beyond one second.
    [[nodiscard]] std::uint64_t clockJumps() const noexcept { return clockJumps_; }
    /// What was not recorded because the file was not written quickly enough, and at how many
    /// places it is missing.
    [[nodiscard]] const FrameGap& lost() const noexcept { return lost_; }
    [[nodiscard]] std::uint64_t lossPlaces() const noexcept { return lossPlaces_; }
    /// The last value of each key that the recording sets.
    [[nodiscard]] const Vexa::PropertyValue::Dictionary& settings() const noexcept {
        return settings_;
    }
    /// Whether a finger is on the surface in the very first image.
    [[nodiscard]] bool beginsInMidTouch() const noexcept { return beginsInMidTouch_; }

private:
    void addState(const RecordedFrame& frame, bool isBehindLostReports);
    void addImage(const PlayedFrame& played, const Algs& algs);

    std::optional<std::uint64_t> earliestNs_;
    std::uint64_t latestNs_ = 0;
    std::optional<InputReport::Image> lastImage_;
    std::vector<std::uint32_t> intervals_;
    std::uint32_t maxInterval_ = 0;
    std::uint64_t maxBeforeFrame_ = 0;
    std::uint64_t disjointImages_ = 0;
    std::uint64_t clockJumps_ = 0;
    FrameGap lost_;
    bool isBehindLostReports_ = false;
    std::uint64_t lossPlaces_ = 0;
    Vexa::PropertyValue::Dictionary settings_;
    bool beginsInMidTouch_ = false;
};

}  // namespace VexaTouch::Tools
