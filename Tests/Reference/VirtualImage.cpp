#include "Tests/Reference/VirtualImage.h"

#include <cstddef>

namespace VexaTouch::Reference {

VirtualImage::VirtualImage()
    : _values(23, 0),
      _neighborPixelGroups({"ABE",  "ABF",  "ADEF", "AEGJ", "BCEF", "BFHJ", "CDE", "CDF",
                            "CELN", "DFLO", "EFK",  "EJK",  "EKL",  "FJK",  "FKL", "GHI",
                            "GIJ",  "HIJ",  "IJK",  "KLM",  "LMN",  "LMO",  "MNO"}),
      _maxPixelIndex({0, 0, 0, 0, 1, 1, 2, 2, 2, 3, 4, 4, 4, 5, 5, 6, 6, 7, 8, 10, 11, 11, 12}),
      _normalizationFactors({0.6667F, 0.4444F, 0.6667F, 0.5714F, 0.6667F, 0.5714F, 0.6667F, 0.4651F,
                             0.6667F, 0.6667F, 0.4F,    0.4F,    0.4F,    0.4F,    0.4F,    0.5714F,
                             0.4F,    0.4F,    0.4F,    0.4F,    0.4444F, 0.5714F, 0.6667F}) {}

void VirtualImage::updateValues(const std::vector<Pixel>& pixels) {
    for (std::int32_t& value : _values) {
        value = 0;
    }
    for (std::size_t i = 0; i < _neighborPixelGroups.size(); ++i) {
        for (const char letter : _neighborPixelGroups.at(i)) {
            const int p = letter - 'A';
            const std::int32_t v = pixels.at(static_cast<std::size_t>(p))._value;
            if (v >= 76) {
                _values.at(i) += v;
                const std::int32_t strongest = _maxPixelIndex.at(i);
                if (v > pixels.at(static_cast<std::size_t>(strongest))._value) {
                    _maxPixelIndex.at(i) = p;
                }
            }
        }
    }
}

}  // namespace VexaTouch::Reference
