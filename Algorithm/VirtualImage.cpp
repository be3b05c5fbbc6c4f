#include "Algorithm/VirtualImage.h"

#include <algorithm>
#include <bit>

namespace VexaTouch {

namespace {

constexpr std::size_t pixelOfLetter(char letter) noexcept {
    return static_cast<std::size_t>(letter - 'A');
}

/// The pixel indices of a group as a bit mask: letters stand in ascending order in every group, so
/// walking the bits upward walks the letters.
constexpr std::array<std::uint32_t, kVirtualPixelCount> kGroupMasks = [] {
    std::array<std::uint32_t, kVirtualPixelCount> masks{};
    for (std::size_t i = 0; i < masks.size(); ++i) {
        for (const char letter : kPixelGroups[i].letters) {
            masks[i] |= 1U << pixelOfLetter(letter);
        }
    }
    return masks;
}();

static_assert(std::ranges::all_of(kPixelGroups, [](const PixelGroup& group) {
    return std::ranges::is_sorted(group.letters);
}));

/// Adds one member to its group's sum and lets it take over as the strongest.
void addMember(std::int32_t pixel, std::int32_t value, std::int32_t strongestValue,
               std::int32_t& sum, std::int32_t& strongest) noexcept {
    sum += value;
    if (value > strongestValue) {
        strongest = pixel;
    }
}

}  // namespace

VirtualImage::VirtualImage() : _values(kVirtualPixelCount, 0) {
    _neighborPixelGroups.reserve(kVirtualPixelCount);
    _maxPixelIndex.reserve(kVirtualPixelCount);
    _normalizationFactors.reserve(kVirtualPixelCount);
    for (const PixelGroup& group : kPixelGroups) {
        _neighborPixelGroups.emplace_back(group.letters);
        _maxPixelIndex.push_back(static_cast<std::int32_t>(pixelOfLetter(group.letters.front())));
        _normalizationFactors.push_back(group.normalizationFactor);
    }
}

void VirtualImage::updateValues(const std::vector<Pixel>& pixels) {
    if (pixels.size() < kPixelCount || _values.size() < kVirtualPixelCount ||
        _maxPixelIndex.size() < kVirtualPixelCount) {
        updateValuesRangeTested(pixels);
        return;
    }
    std::ranges::fill(_values, 0);
    std::uint32_t aboveNoise = 0;
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        aboveNoise |= static_cast<std::uint32_t>(pixels[i]._value > kNoiseLevel) << i;
    }
    if (aboveNoise == 0) {
        return;
    }
    for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
        for (std::uint32_t members = kGroupMasks[i] & aboveNoise; members != 0;
             members &= members - 1) {
            const int pixel = std::countr_zero(members);
            addMember(pixel, pixels[static_cast<std::size_t>(pixel)]._value,
                      pixels[static_cast<std::size_t>(_maxPixelIndex[i])]._value, _values[i],
                      _maxPixelIndex[i]);
        }
    }
}

void VirtualImage::updateValuesRangeTested(const std::vector<Pixel>& pixels) {
    std::ranges::fill(_values, 0);
    for (std::size_t i = 0; i < _neighborPixelGroups.size(); ++i) {
        for (const char letter : _neighborPixelGroups[i]) {
            const std::size_t pixel = pixelOfLetter(letter);
            const std::int32_t value = pixels.at(pixel)._value;
            if (value > kNoiseLevel) {
                const auto remembered = static_cast<std::size_t>(_maxPixelIndex.at(i));
                addMember(static_cast<std::int32_t>(pixel), value, pixels.at(remembered)._value,
                          _values.at(i), _maxPixelIndex.at(i));
            }
        }
    }
}

}  // namespace VexaTouch
