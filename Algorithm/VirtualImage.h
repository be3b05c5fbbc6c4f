#pragma once

#include "Algorithm/Pixel.h"

#include <array>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch {

/// One group of neighbouring pixels and the gain of its virtual pixel.
struct PixelGroup {
    std::string_view letters;
    float normalizationFactor;
};

inline constexpr std::size_t kVirtualPixelCount = 23;

/// The groups. Their positions are fixed: others read 18 ("IJK") and 19 ("KLM") by position.
inline constexpr std::array<PixelGroup, kVirtualPixelCount> kPixelGroups = {{
    {"ABE", 0.6667F},  {"ABF", 0.4444F}, {"ADEF", 0.6667F}, {"AEGJ", 0.5714F}, {"BCEF", 0.6667F},
    {"BFHJ", 0.5714F}, {"CDE", 0.6667F}, {"CDF", 0.4651F},  {"CELN", 0.6667F}, {"DFLO", 0.6667F},
    {"EFK", 0.4F},     {"EJK", 0.4F},    {"EKL", 0.4F},     {"FJK", 0.4F},     {"FKL", 0.4F},
    {"GHI", 0.5714F},  {"GIJ", 0.4F},    {"HIJ", 0.4F},     {"IJK", 0.4F},     {"KLM", 0.4F},
    {"LMN", 0.4444F},  {"LMO", 0.5714F}, {"MNO", 0.6667F},
}};
inline constexpr std::size_t kGroupIJK = 18;
inline constexpr std::size_t kGroupKLM = 19;

/// The image of the pixel groups: per group the sum of its members above noise, and which member
/// is the strongest. All four vectors have one element a group.
class VirtualImage {
public:
    VirtualImage();

    /// One frame's update, after all pixels had theirs. A member replaces the remembered strongest
    /// one only if it is above noise and strictly stronger in this very frame.
    /// Throws std::out_of_range, leaving the update half done, when `pixels` lacks a member of a
    /// group or a vector is shorter than the list of groups.
    void updateValues(const std::vector<Pixel>& pixels);
    /// The same from the pixels' `_value` alone, each within +-2^22, where floats are exact sums.
    void updateValues(std::span<const std::int32_t, kPixelCount> pixelValues);

    /// The member letters of each group. They never change after construction.
    [[nodiscard]] const std::vector<std::string>& neighborPixelGroups() const noexcept {
        return _neighborPixelGroups;
    }

    std::vector<std::int32_t> _values;  ///< sum of the members' `_value` above noise
private:
    std::vector<std::string> _neighborPixelGroups;
    void updateValuesRangeTested(std::span<const std::int32_t> pixelValues);

public:
    std::vector<std::int32_t> _maxPixelIndex;  ///< strongest member when last compared, 0 to 14
    std::vector<float> _normalizationFactors;  ///< gain that a virtual pixel is built with
};

}  // namespace VexaTouch
