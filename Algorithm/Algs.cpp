#include "Algorithm/Algs.h"

#include <algorithm>
#include <array>
#include <bit>
#include <span>

namespace VexaTouch {

namespace {

constexpr std::uint32_t kHoldEventMask = 0x2;
constexpr std::uint32_t kTapEventMask = 0x20000;

Vexa::HidEvent createEvent(std::uint32_t eventMask, PixelRegion region, Vexa::HidEventPhase phase) {
    Vexa::DigitizerEventRecord record;
    record.transducerType = 2;
    record.eventMask = eventMask;
    // The receiver tells the regions apart by the vertical coordinate alone.
    record.y = static_cast<double>(static_cast<std::uint32_t>(region));
    const Vexa::HidEvent event = Vexa::HidEvent::digitizer(record);
    if (phase != Vexa::HidEventPhase::None) {
        event.setPhase(phase);
    }
    return event;
}

// Frames take the gains from the tables that the pixels are built with: `_normalizationFactor` is
// fixed at construction.

/// The gains that the virtual pixels are built with, for all of them at once.
constexpr std::array<float, kVirtualPixelCount> kGroupGains = [] {
    std::array<float, kVirtualPixelCount> gains{};
    std::ranges::transform(kPixelGroups, gains.begin(), &PixelGroup::normalizationFactor);
    return gains;
}();

/// Values and progress of many channels: a plain loop, which compilers turn into steps on several
/// channels at once.
template <std::size_t n>
void scale(const std::int16_t* samples, const std::array<float, n>& gains,
           float activationThreshold, std::span<std::int32_t, n> values,
           std::array<float, n>& progress) noexcept {
    for (std::size_t i = 0; i < n; ++i) {
        values[i] = scaledSample(samples[i], gains[i]);
        progress[i] = progressOf(values[i], activationThreshold);
    }
}

}  // namespace

Algs::Algs() {
    _touchPixels.reserve(kPixelCount);
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        _touchPixels.emplace_back(static_cast<int>(i), kPixelGains[i]);
    }
    const auto& groups = _virtual_image.neighborPixelGroups();
    _virtualPixels.reserve(groups.size());
    for (std::size_t i = 0; i < groups.size(); ++i) {
        _virtualPixels.emplace_back(groups[i], static_cast<signed char>(groups[i].front()),
                                    _virtual_image._normalizationFactors[i]);
    }
}

std::vector<Vexa::HidEvent> Algs::handleImage(const InputReport::Image& image) {
    std::vector<Vexa::HidEvent> events;
    processTouchFrame(image.signedPixels.data(), image.frameNumber, image.timestampMs, events);
    return events;
}

std::vector<Vexa::HidEvent> Algs::handleReset() {
    constexpr std::array<std::int16_t, kPixelCount> noTouch{};
    std::vector<Vexa::HidEvent> events;
    processTouchFrame(noTouch.data(), 0, 0, events);
    return events;
}

void Algs::processTouchFrame(const std::int16_t* samples, std::uint32_t frameNumber,
                             std::uint32_t timeMs, std::vector<Vexa::HidEvent>& events) {
    ChannelSummary channels;
    updatePixels(samples, channels);
    updateVirtualPixels(channels);
    _handStats.updateHandState(_touchPixels, _virtualPixels, channels, timeMs);
    decideEvent(frameNumber, events);
    _EventStats.update(_handStats);
    if (_log.isEnabled(Vexa::LogLevel::Debug)) {
        logFrame(samples, frameNumber, timeMs);
    }
}

void Algs::updatePixels(const std::int16_t* samples, ChannelSummary& channels) noexcept {
    const std::span<std::int32_t, kPixelCount> values =
        std::span(channels.values).first<kPixelCount>();
    std::array<float, kPixelCount> progress;
    scale<kPixelCount>(samples, kPixelGains, _handStats._activationThreshold, values, progress);
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        _touchPixels[i].takeProgress(values[i], progress[i]);
        channels.addActivity(_touchPixels[i]);
    }
    channels.addValues(values);
    channels.anyAboveNoise = channels.aboveNoise != 0;
}

void Algs::updateVirtualPixels(ChannelSummary& channels) {
    if (_virtualPixels.size() < kVirtualPixelCount ||
        _virtual_image._values.size() < kVirtualPixelCount ||
        _virtual_image._maxPixelIndex.size() < kVirtualPixelCount) {
        quietThresholdBits_.reset();
        _virtual_image.updateValues(std::span(channels.values).first<kPixelCount>());
        throwAtMissingVirtualPixel();
    }
    const float threshold = _handStats._activationThreshold;
    const auto thresholdBits = std::bit_cast<std::uint32_t>(threshold);
    const bool sameThreshold = quietThresholdBits_ == thresholdBits;
    const std::span<std::int32_t, kVirtualPixelCount> values =
        std::span(channels.values).last<kVirtualPixelCount>();
    if (!channels.anyAboveNoise && virtualPixelsQuiet_ && sameThreshold) {
        std::ranges::fill(values, 0);
        channels.largestValue = std::max(channels.largestValue, 0);
    } else {
        virtualPixelsQuiet_ = false;
        quietThresholdBits_ = thresholdBits;
        updateVirtualPixels(channels, values, sameThreshold);
    }
    if (channels.anyAboveNoise || channels.anyActive) {
        channels.countNeverActive(_touchPixels, _virtualPixels);
        neverActive_ = channels.neverActive;
    } else {
        channels.neverActive = neverActive_;
        virtualPixelsQuiet_ = true;
    }
}

void Algs::updateVirtualPixels(ChannelSummary& channels,
                               std::span<std::int32_t, kVirtualPixelCount> values,
                               bool sameThreshold) {
    _virtual_image.updateValues(std::span(channels.values).first<kPixelCount>());
    // The low 16 bits count: a strong group's sum deliberately wraps.
    std::array<std::int16_t, kVirtualPixelCount> samples;
    std::transform(_virtual_image._values.begin(),
                   _virtual_image._values.begin() + kVirtualPixelCount, samples.begin(),
                   [](std::int32_t sum) { return static_cast<std::int16_t>(sum); });
    std::array<float, kVirtualPixelCount> progress;
    scale<kVirtualPixelCount>(samples.data(), kGroupGains, _handStats._activationThreshold, values,
                              progress);
    for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
        VirtualPixel& pixel = _virtualPixels[i];
        const std::int32_t strongest = _virtual_image._maxPixelIndex[i];
        // One that is inactive at value 0 cannot change by another 0 at the same threshold.
        if (values[i] != 0 || pixel._value != 0 || pixel._isActive || !sameThreshold) {
            pixel.takeProgress(values[i], progress[i], strongest);
            channels.addActivity(pixel);
        } else {
            pixel._index = strongest;
        }
    }
    channels.addValues(values);
}

void Algs::throwAtMissingVirtualPixel() {
    for (std::size_t i = 0;; ++i) {
        const auto sample = static_cast<std::int16_t>(_virtual_image._values.at(i));
        _virtualPixels.at(i).updatePixelState(sample, _handStats._activationThreshold,
                                              _virtual_image._maxPixelIndex.at(i));
    }
}

void Algs::decideEvent(std::uint32_t frameNumber, std::vector<Vexa::HidEvent>& events) {
    const HandStats& hand = _handStats;
    const PixelRegion region = hand._activeRegion;
    const bool liftedOff = !hand._isTouching && hand._wasTouching;
    const auto dispatch = [&](const Vexa::HidEvent& event) {
        event.setIntegerField(Vexa::HidEventField::DigitizerFrameNumber, frameNumber);
        _lastDispatchedPhase = static_cast<std::uint16_t>(event.phase());
        events.push_back(event);
    };

    // The first row that holds decides; those that end a touch forget its statistics.
    if (hand._isTouching && !hand._wasTouching) {
        dispatch(createMayBeginEvent(region));
    } else if (hand._isHolding && !hand._wasHolding) {
        dispatch(createHoldStartEvent(region));
    } else if (hand._isHolding && region != hand._previousActiveRegion) {
        dispatch(createHoldChangeEvent(region));
    } else if (!hand._isHolding && hand._wasHolding) {
        Reset();
        dispatch(createHoldEndEvent(region));
    } else if (hand._isTap) {
        Reset();
        dispatch(createTapEvent(region));
    } else if (liftedOff) {
        Reset();
        // Only a touch of which nothing but its may-begin was seen is taken back.
        if (_lastDispatchedPhase == static_cast<std::uint16_t>(Vexa::HidEventPhase::MayBegin)) {
            dispatch(createCancelEvent());
        }
    }
}

void Algs::Reset() noexcept {
    for (Pixel& pixel : _touchPixels) {
        pixel.resetGlobalStats();
    }
    for (VirtualPixel& pixel : _virtualPixels) {
        pixel.resetGlobalStats();
    }
    _handStats.Reset();
    neverActive_ = 0;
}

Vexa::HidEvent Algs::createMayBeginEvent(PixelRegion region) {
    return createEvent(0, region, Vexa::HidEventPhase::MayBegin);
}

Vexa::HidEvent Algs::createHoldStartEvent(PixelRegion region) {
    return createEvent(kHoldEventMask, region, Vexa::HidEventPhase::Began);
}

Vexa::HidEvent Algs::createHoldChangeEvent(PixelRegion region) {
    return createEvent(kHoldEventMask, region, Vexa::HidEventPhase::Changed);
}

Vexa::HidEvent Algs::createHoldEndEvent(PixelRegion region) {
    return createEvent(kHoldEventMask, region, Vexa::HidEventPhase::Ended);
}

Vexa::HidEvent Algs::createTapEvent(PixelRegion region) {
    return createEvent(kTapEventMask, region, Vexa::HidEventPhase::None);
}

Vexa::HidEvent Algs::createCancelEvent() {
    return createEvent(0, kRegionNone, Vexa::HidEventPhase::Cancelled);
}

}  // namespace VexaTouch
