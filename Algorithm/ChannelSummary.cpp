#include "Algorithm/ChannelSummary.h"

#include <algorithm>
#include <stdexcept>

namespace VexaTouch {

ChannelSummary ChannelSummary::of(const std::vector<Pixel>& pixels,
                                  const std::vector<VirtualPixel>& virtualPixels) {
    if (pixels.size() != kPixelCount || virtualPixels.size() != kVirtualPixelCount) {
        throw std::out_of_range("there must be 15 pixels and 23 virtual pixels");
    }
    ChannelSummary summary;
    auto value = summary.values.begin();
    const auto look = [&](const Pixel& pixel) {
        *value++ = pixel._value;
        summary.anyAboveNoise |= pixel._isAboveNoise;
        summary.addActivity(pixel);
    };
    std::ranges::for_each(pixels, look);
    std::ranges::for_each(virtualPixels, look);
    summary.addValues(summary.values);
    summary.countNeverActive(pixels, virtualPixels);
    return summary;
}

void ChannelSummary::countNeverActive(std::span<const Pixel> pixels,
                                      std::span<const VirtualPixel> virtualPixels) noexcept {
    const auto neverActiveOf = [](const Pixel& pixel) {
        return static_cast<std::int32_t>(pixel._wasAboveNoise > pixel._wasActive);
    };
    neverActive = 0;
    for (const Pixel& pixel : pixels) {
        neverActive += neverActiveOf(pixel);
    }
    for (const VirtualPixel& pixel : virtualPixels) {
        neverActive += neverActiveOf(pixel);
    }
}

}  // namespace VexaTouch
