#include "Algorithm/ChannelSummary.h"

#include <algorithm>
#include <limits>
#include <stdexcept>

namespace VexaTouch {

ChannelSummary ChannelSummary::of(const std::vector<Pixel>& pixels,
                                  const std::vector<VirtualPixel>& virtualPixels) {
    if (pixels.size() != kPixelCount || virtualPixels.size() != kVirtualPixelCount) {
        throw std::out_of_range("there must be 15 pixels and 23 virtual pixels");
    }
    ChannelSummary summary;
    summary.largestValue = std::numeric_limits<std::int32_t>::min();
    auto value = summary.values.begin();
    const auto look = [&](const Pixel& channel) {
        *value++ = channel._value;
        summary.largestValue = std::max(summary.largestValue, channel._value);
        summary.aboveNoise += channel._isAboveNoise ? 1 : 0;
        summary.neverActive += channel._wasAboveNoise && !channel._wasActive ? 1 : 0;
        summary.anyActive |= channel._isActive;
    };
    std::ranges::for_each(pixels, look);
    std::ranges::for_each(virtualPixels, look);
    return summary;
}

}  // namespace VexaTouch
