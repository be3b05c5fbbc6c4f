#include "Algorithm/VirtualImage.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

namespace VexaTouch {

namespace {

constexpr std::size_t pixelOfLetter(char letter) noexcept {
    return static_cast<std::size_t>(letter - 'A');
}

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

using PixelFloats = std::array<float, kPixelCount>;

/// One group, whose members are known when this is compiled. Member by member the strongest takes
/// over from the one before; the first of the strongest stays. One below noise never takes over.
template <std::size_t group>
void updateGroup(const PixelFloats& values, const PixelFloats& aboveNoise, std::int32_t& sum,
                 std::int32_t& strongest) {
    constexpr std::string_view letters = kPixelGroups[group].letters;
    float total = aboveNoise[pixelOfLetter(letters[0])];
    float most = total;
    [&]<std::size_t... next>(std::index_sequence<next...>) {
        ((total += aboveNoise[pixelOfLetter(letters[next + 1])],
          most = largerOrOld(aboveNoise[pixelOfLetter(letters[next + 1])], most)),
         ...);
    }(std::make_index_sequence<letters.size() - 1>());
    sum = static_cast<std::int32_t>(total);
    const float remembered = elementAt(values, static_cast<std::size_t>(strongest));
    if (most > largerOrOld(remembered, static_cast<float>(kNoiseLevel))) {
        const auto* first = std::ranges::find_if(
            letters, [&](char letter) { return aboveNoise[pixelOfLetter(letter)] == most; });
        strongest = static_cast<std::int32_t>(pixelOfLetter(*first));
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
    std::vector<std::int32_t> values(pixels.size());
    std::ranges::transform(pixels, values.begin(), &Pixel::_value);
    updateValuesRangeTested(values);
}

void VirtualImage::updateValues(std::span<const std::int32_t, kPixelCount> pixelValues) {
    if (_values.size() < kVirtualPixelCount || _maxPixelIndex.size() < kVirtualPixelCount) {
        updateValuesRangeTested(pixelValues);
        return;
    }
    // As floats, of which a machine takes the larger in one step.
    PixelFloats values{};
    PixelFloats aboveNoise{};
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        values[i] = static_cast<float>(pixelValues[i]);
        aboveNoise[i] = pixelValues[i] > kNoiseLevel ? values[i] : 0.0F;
    }
    if (std::ranges::all_of(aboveNoise, [](float value) { return value == 0.0F; })) {
        std::ranges::fill(_values, 0);
        return;
    }
    [&]<std::size_t... group>(std::index_sequence<group...>) {
        (updateGroup<group>(values, aboveNoise, _values[group], _maxPixelIndex[group]), ...);
    }(std::make_index_sequence<kVirtualPixelCount>());
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
