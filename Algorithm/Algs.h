#pragma once

#include "Algorithm/ChannelSummary.h"
#include "Algorithm/EventStats.h"
#include "Algorithm/HandStats.h"
#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualImage.h"
#include "Algorithm/VirtualPixel.h"
#include "Platform/HidEvent.h"
#include "Platform/Log.h"
#include "Platform/PropertyValue.h"
#include "Shared/InputReport.h"

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace VexaTouch {

/// The touch gesture algorithm of one sensor: touch images in, at most one gesture event a frame
/// out. It keeps no clock of its own: every timer is the difference of two image timestamps.
/// Copyable; not thread safe.
class Algs {
public:
    Algs();

    /// One sensing frame. Returns its event, if any. Throws std::out_of_range when the vectors of
    /// the virtual image do not match (a broken invariant; the frame is then half processed).
    std::vector<Vexa::HidEvent> handleImage(const InputReport::Image& image);

    /// The firmware has reset: an ordinary frame of zeros with frame number 0 and time 0, so that a
    /// touch in progress ends. Returns and throws as handleImage.
    std::vector<Vexa::HidEvent> handleReset();

    /// The per-frame step: `samples` are kPixelCount raw values, `timeMs` the device's clock.
    /// Appends at most one event to `events`. Throws as handleImage.
    void processTouchFrame(const std::int16_t* samples, std::uint32_t frameNumber,
                           std::uint32_t timeMs, std::vector<Vexa::HidEvent>& events);

    /// Clears the per-touch statistics of channels and hand; flags, times, regions, settings and
    /// counters stay.
    void Reset() noexcept;

    static Vexa::HidEvent createMayBeginEvent(PixelRegion region);
    static Vexa::HidEvent createHoldStartEvent(PixelRegion region);
    static Vexa::HidEvent createHoldChangeEvent(PixelRegion region);
    static Vexa::HidEvent createHoldEndEvent(PixelRegion region);
    static Vexa::HidEvent createTapEvent(PixelRegion region);
    static Vexa::HidEvent createCancelEvent();

    /// The value of a state key, or no value for an unknown key. See StateKeys.h for the keys.
    [[nodiscard]] Vexa::PropertyValue getState(const std::string& key) const;
    /// Sets a state key; takes effect at the next frame. Lenient: unknown keys are ignored, a value
    /// that is no number counts as 0.
    void setState(const std::string& key, const Vexa::PropertyValue& value);

    /// One line on the 15 pixels after a frame: `samples` are the frame's raw values.
    [[nodiscard]] std::string touchStateDescription(const std::int16_t* samples,
                                                    unsigned int timeMs) const;
    /// One line on the 23 virtual pixels after a frame; `samples` is not used.
    [[nodiscard]] std::string virtualStateDescription(const std::int16_t* samples,
                                                      unsigned int timeMs) const;

    /// What the touch is doing, such as "HOLDING 812ms ActiveRegion=2"; empty when nothing is.
    [[nodiscard]] std::string phaseDescription(unsigned int timeMs) const;

    [[nodiscard]] const std::vector<Pixel>& touchPixels() const noexcept { return _touchPixels; }
    [[nodiscard]] const std::vector<VirtualPixel>& virtualPixels() const noexcept {
        return _virtualPixels;
    }
    [[nodiscard]] const VirtualImage& virtualImage() const noexcept { return _virtual_image; }
    [[nodiscard]] const HandStats& handStats() const noexcept { return _handStats; }
    [[nodiscard]] const EventStats& eventStats() const noexcept { return _EventStats; }
    /// Phase code of the last event that was returned; 0 before the first.
    [[nodiscard]] std::uint16_t lastDispatchedPhase() const noexcept {
        return _lastDispatchedPhase;
    }

protected:
    Vexa::Log _log{Vexa::LogCategory::Algs};
    std::vector<Pixel> _touchPixels;
    VirtualImage _virtual_image;
    std::vector<VirtualPixel> _virtualPixels;
    HandStats _handStats;
    EventStats _EventStats;
    std::uint16_t _lastDispatchedPhase = 0;

private:
    void updatePixels(const std::int16_t* samples, ChannelSummary& channels) noexcept;
    void updateVirtualPixels(ChannelSummary& channels);
    void updateVirtualPixels(ChannelSummary& channels,
                             std::span<std::int32_t, kVirtualPixelCount> values,
                             bool sameThreshold);
    /// Updates the virtual pixels up to the one that lacks an element, and throws.
    [[noreturn]] void throwAtMissingVirtualPixel();
    void decideEvent(std::uint32_t frameNumber, std::vector<Vexa::HidEvent>& events);
    void logFrame(const std::int16_t* samples, std::uint32_t frameNumber,
                  std::uint32_t timeMs) const;
    [[nodiscard]] std::string describeFrame(const std::string& channels, unsigned int timeMs) const;

    // After a frame without any channel above noise or active, another one at the same threshold
    // leaves all virtual pixels as they are. Most frames are of this kind.
    bool virtualPixelsQuiet_ = false;
    std::optional<std::uint32_t> quietThresholdBits_;
    // ChannelSummary::neverActive, which only frames above noise and resets change.
    std::int32_t neverActive_ = 0;
};

}  // namespace VexaTouch
