#include "Tools/FrameGaps.h"

#include "Shared/InputReport.h"

#include <utility>

namespace VexaTouch::Tools {

bool FrameGaps::see(std::span<const std::uint8_t> report) noexcept {
    const auto image = InputReport::Image::parse(report.data(), report.size());
    if (!image) {
        return false;
    }
    const auto before = std::exchange(last_, image->frameNumber);
    // 32-bit arithmetic: 0xFFFFFFFF is followed by 0.
    if (!before || image->frameNumber == *before + 1U) {
        return false;
    }
    const std::uint32_t missing = image->frameNumber - *before - 1U;
    if (missing <= kMostLost) {
        framesLost_.fetch_add(missing);
    }
    gaps_.fetch_add(1);
    return true;
}

}  // namespace VexaTouch::Tools
