#include "Algorithm/VirtualImage.h"

#include <algorithm>
#include <stdexcept>

namespace VexaTouch {

namespace {

constexpr std::size_t pixelOfLetter(char letter) noexcept {
    return static_cast<std::size_t>(letter - 'A');
}

/// No group has more members.
constexpr std::size_t kMostMembers = 4;

/// The members of each group in letter order; a place that is left over names a pixel that is not
/// there and always counts as 0.
constexpr std::size_t kNoPixel = kPixelCount;
using Members = std::array<std::uint8_t, kMostMembers>;
constexpr std::array<Members, kVirtualPixelCount> kGroupMembers = [] {
    std::array<Members, kVirtualPixelCount> groups{};
    for (std::size_t i = 0; i < groups.size(); ++i) {
        groups[i].fill(kNoPixel);
        std::ranges::transform(kPixelGroups[i].letters, groups[i].begin(), [](char letter) {
            return static_cast<std::uint8_t>(pixelOfLetter(letter));
        });
    }
    return groups;
}();

[[noreturn]] void throwOutOfRange() {
    throw std::out_of_range("a pixel or pixel group is missing");
}

/// Element of a list of any length.
template <typename List>
auto& elementAt(List& list, std::size_t index) {
    if (index >= list.size()) {
        throwOutOfRange();
    }
    return list[index];
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
    std::vector<std::int32_t> values(pixels.size());
    std::ranges::transform(pixels, values.begin(), &Pixel::_value);
    if (values.size() == kPixelCount) {
        updateValues(std::span<const std::int32_t, kPixelCount>(values));
    } else {
        updateValuesRangeTested(values);
    }
}

bool VirtualImage::updateValues(std::span<const std::int32_t, kPixelCount> pixelValues) {
    if (_values.size() < kVirtualPixelCount || _maxPixelIndex.size() < kVirtualPixelCount) {
        updateValuesRangeTested(pixelValues);
        return true;
    }
    std::array<std::int32_t, kPixelCount + 1> aboveNoise{};
    std::int32_t any = 0;
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        aboveNoise[i] = pixelValues[i] > kNoiseLevel ? pixelValues[i] : 0;
        any |= aboveNoise[i];
    }
    if (any == 0) {
        std::ranges::fill(_values, 0);
        return false;
    }
    for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
        const Members& members = kGroupMembers[i];
        const std::array<std::int32_t, kMostMembers> values = {
            aboveNoise[members[0]], aboveNoise[members[1]], aboveNoise[members[2]],
            aboveNoise[members[3]]};
        _values[i] = values[0] + values[1] + values[2] + values[3];
        const std::int32_t most =
            std::max(std::max(values[0], values[1]), std::max(values[2], values[3]));
        // Member by member the strongest takes over from the one before; the first of the
        // strongest stays. One below noise never takes over.
        const std::int32_t remembered =
            elementAt(pixelValues, static_cast<std::size_t>(_maxPixelIndex[i]));
        if (most > std::max(remembered, kNoiseLevel)) {
            const auto first = std::ranges::find(values, most) - values.begin();
            _maxPixelIndex[i] = members[static_cast<std::size_t>(first)];
        }
    }
    return true;
}

void VirtualImage::updateValuesRangeTested(std::span<const std::int32_t> pixelValues) {
    std::ranges::fill(_values, 0);
    for (std::size_t i = 0; i < _neighborPixelGroups.size(); ++i) {
        for (const char letter : _neighborPixelGroups[i]) {
            const std::size_t pixel = pixelOfLetter(letter);
            const std::int32_t value = elementAt(pixelValues, pixel);
            if (value <= kNoiseLevel) {
                continue;
            }
            elementAt(_values, i) += value;
            std::int32_t& strongest = elementAt(_maxPixelIndex, i);
            if (value > elementAt(pixelValues, static_cast<std::size_t>(strongest))) {
                strongest = static_cast<std::int32_t>(pixel);
            }
        }
    }
}

}  // namespace VexaTouch
