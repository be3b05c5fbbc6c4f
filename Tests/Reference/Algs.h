#pragma once

#include "Platform/HidEvent.h"
#include "Platform/Log.h"
#include "Platform/PropertyValue.h"
#include "Shared/InputReport.h"
#include "Tests/Reference/EventStats.h"
#include "Tests/Reference/HandStats.h"
#include "Tests/Reference/Pixel.h"
#include "Tests/Reference/VirtualImage.h"
#include "Tests/Reference/VirtualPixel.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VexaTouch::Reference {

/// Has the same operations and accessors as VexaTouch::Algs.
class Algs {
public:
    Algs();

    std::vector<Vexa::HidEvent> handleImage(const InputReport::Image& image);
    std::vector<Vexa::HidEvent> handleReset();
    void processTouchFrame(const std::int16_t* samples, std::uint32_t frameNumber,
                           std::uint32_t timeMs, std::vector<Vexa::HidEvent>& events);
    void Reset();

    static Vexa::HidEvent createMayBeginEvent(PixelRegion region);
    static Vexa::HidEvent createHoldStartEvent(PixelRegion region);
    static Vexa::HidEvent createHoldChangeEvent(PixelRegion region);
    static Vexa::HidEvent createHoldEndEvent(PixelRegion region);
    static Vexa::HidEvent createTapEvent(PixelRegion region);
    static Vexa::HidEvent createCancelEvent();

    Vexa::PropertyValue getState(const std::string& key) const;
    void setState(const std::string& key, Vexa::PropertyValue value);

    std::string touchStateDescription(const std::int16_t* samples, unsigned int timeMs) const;
    std::string virtualStateDescription(const std::int16_t* samples, unsigned int timeMs) const;

    const std::vector<Pixel>& touchPixels() const { return _touchPixels; }
    const std::vector<VirtualPixel>& virtualPixels() const { return _virtualPixels; }
    const VirtualImage& virtualImage() const { return _virtual_image; }
    const HandStats& handStats() const { return _handStats; }
    const EventStats& eventStats() const { return _EventStats; }
    std::uint16_t lastDispatchedPhase() const { return _lastDispatchedPhase; }

protected:
    Vexa::Log _log{Vexa::LogCategory::Algs};
    std::vector<Pixel> _touchPixels;
    VirtualImage _virtual_image;
    std::vector<VirtualPixel> _virtualPixels;
    HandStats _handStats;
    EventStats _EventStats;
    std::uint16_t _lastDispatchedPhase = 0;

private:
    void logFrame(const std::int16_t* samples, std::uint32_t frameNumber, std::uint32_t timeMs);
    std::string prefixText() const;
    std::string phaseText(unsigned int timeMs) const;
};

}  // namespace VexaTouch::Reference
