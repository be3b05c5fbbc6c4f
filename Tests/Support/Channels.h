#pragma once

#include "Algorithm/Algs.h"
#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualImage.h"
#include "Algorithm/VirtualPixel.h"
#include "Tests/Support/Touch.h"

#include <cstddef>
#include <cstdint>
#include <vector>

namespace VexaTouch::Testing {

/// The channels of a surface by themselves, without a hand that looks at them.
struct Channels {
    std::vector<Pixel> pixels = Algs().touchPixels();
    VirtualImage virtualImage;
    std::vector<VirtualPixel> virtualPixels = Algs().virtualPixels();

    void feel(const Touch& touch, float activationThreshold = 200.0F) {
        for (std::size_t i = 0; i < pixels.size(); ++i) {
            pixels[i].updatePixelState(touch.samples()[i], activationThreshold);
        }
        virtualImage.updateValues(pixels);
        for (std::size_t i = 0; i < virtualPixels.size(); ++i) {
            virtualPixels[i].updatePixelState(static_cast<std::int16_t>(virtualImage._values[i]),
                                              activationThreshold, virtualImage._maxPixelIndex[i]);
        }
    }
    [[nodiscard]] Pixel& pixel(char letter) { return pixels[pixelIndex(letter)]; }
};

}  // namespace VexaTouch::Testing
