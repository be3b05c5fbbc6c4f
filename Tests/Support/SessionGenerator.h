#pragma once

#include "Shared/InputReport.h"
#include "Tests/Support/SeededRandom.h"
#include "Tests/Support/Touch.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <vector>

namespace VexaTouch::Testing {

/// Makes plausible sessions: fingers are footprints over the real places of the pixels, with
/// approach, lift-off and sensor noise. The same seed makes the same frames.
class SessionGenerator {
public:
    explicit SessionGenerator(std::uint64_t seed) : random_(seed) {}

    using Images = std::vector<InputReport::Image>;

    /// Nothing but the sensor's own noise, within 20 counts.
    Images idle(std::size_t frames) {
        Images images;
        while (images.size() < frames) {
            append(images, {}, kIdleNoise);
        }
        return images;
    }

    /// Noise around the noise level, sometimes above it, seldom at the activation threshold.
    Images noisy(std::size_t frames) {
        Images images;
        while (images.size() < frames) {
            append(images, {}, 60);
        }
        return images;
    }

    /// A finger that stays, trembling a little.
    Images touching(std::size_t frames) {
        Images images;
        Finger finger = randomFinger();
        while (images.size() < frames) {
            finger.x += random_.between(-0.05, 0.05);
            finger.y += random_.between(-0.05, 0.05);
            append(images, footprint(finger), kIdleNoise);
        }
        return images;
    }

    /// A plausible mix of use: idle three frames in four, taps, holds, slides, a palm, noise.
    Images mixed(std::size_t frames) {
        Images images;
        std::size_t busy = 0;
        while (images.size() < frames) {
            const std::size_t before = images.size();
            gesture(images);
            busy += images.size() - before;
            // Rest until three in four frames were idle.
            while (images.size() < busy * 4 && images.size() < frames) {
                append(images, {}, kIdleNoise);
            }
        }
        images.resize(frames);
        return images;
    }

    std::uint32_t nowMs = 1000;
    std::uint32_t nextFrame = 1;
    std::uint32_t intervalMs = 8;

private:
    static constexpr int kIdleNoise = 20;

    struct Place {
        double x;
        double y;
    };
    struct Finger {
        double x = 0;
        double y = 0;
        double radius = 2;    ///< where the signal has fallen to a quarter
        double signal = 300;  ///< counts on the surface right below, before a pixel's gain
    };

    // Where the pixels lie on a surface of 12 by 12; some of them lie in two places.
    static constexpr std::array<std::array<Place, 2>, kPixelCount> kPlaces = {{
        {{{10.2, 2}, {1.0, 5}}},   // A
        {{{2.4, 2}, {11.6, 5}}},   // B
        {{{11.6, 7}, {2.4, 10}}},  // C
        {{{1.0, 7}, {10.2, 10}}},  // D
        {{{10.2, 4}, {2.4, 8}}},   // E
        {{{2.4, 4}, {10.2, 8}}},   // F
        {{{8.1, 0}, {8.1, 0}}},    // G
        {{{4.6, 0}, {4.6, 0}}},    // H
        {{{6.3, 1}, {6.3, 1}}},    // I
        {{{3.9, 3}, {8.8, 3}}},    // J
        {{{6.3, 6}, {6.3, 6}}},    // K
        {{{3.9, 9}, {8.8, 9}}},    // L
        {{{6.3, 11}, {6.3, 11}}},  // M
        {{{4.6, 12}, {4.6, 12}}},  // N
        {{{8.1, 12}, {8.1, 12}}},  // O
    }};

    static Samples footprint(const Finger& finger, double pressure = 1.0) {
        Samples samples{};
        for (std::size_t i = 0; i < kPixelCount; ++i) {
            double strongest = 0;
            for (const Place& place : kPlaces[i]) {
                const double dx = finger.x - place.x;
                const double dy = finger.y - place.y;
                const double fall = 1 + (dx * dx + dy * dy) / (finger.radius * finger.radius);
                strongest = std::max(strongest, finger.signal * pressure / (fall * fall));
            }
            samples[i] = static_cast<std::int16_t>(strongest);
        }
        return samples;
    }

    Finger randomFinger() {
        // On or near a pixel, so that each button is met.
        const Place& place = kPlaces[random_.next() % kPixelCount][random_.next() % 2];
        Finger finger;
        finger.x = place.x + random_.between(-0.8, 0.8);
        finger.y = place.y + random_.between(-0.8, 0.8);
        finger.radius = random_.between(1.6, 3.0);
        finger.signal = random_.between(220.0, 520.0);
        return finger;
    }

    void append(Images& images, const Samples& samples, int noise) {
        Samples noisy{};
        for (std::size_t i = 0; i < kPixelCount; ++i) {
            noisy[i] = static_cast<std::int16_t>(samples[i] + random_.between(-noise, noise));
        }
        images.push_back(image(noisy, nextFrame++, nowMs));
        nowMs += intervalMs;
    }

    /// A finger comes, stays, perhaps moves to another place, and goes.
    void press(Images& images, const Finger& from, const Finger& to, int frames) {
        constexpr int kEdge = 3;
        for (int i = 1; i <= kEdge; ++i) {
            append(images, footprint(from, i / (kEdge + 1.0)), kIdleNoise);
        }
        for (int i = 0; i < frames; ++i) {
            const double way = static_cast<double>(i) / frames;
            Finger finger = from;
            finger.x += (to.x - from.x) * way + random_.between(-0.05, 0.05);
            finger.y += (to.y - from.y) * way + random_.between(-0.05, 0.05);
            append(images, footprint(finger), kIdleNoise);
        }
        for (int i = kEdge; i >= 1; --i) {
            append(images, footprint(to, i / (kEdge + 1.0)), kIdleNoise);
        }
    }

    void gesture(Images& images) {
        const Finger finger = randomFinger();
        Finger target = finger;
        switch (random_.between(1, 10)) {
            case 1:
            case 2:
            case 3:
            case 4:
                press(images, finger, finger, random_.between(8, 30));
                break;
            case 5:
            case 6:
                press(images, finger, finger, random_.between(75, 190));
                break;
            case 7:
            case 8: {
                const Finger other = randomFinger();
                target.x = other.x;
                target.y = other.y;
                press(images, finger, target, random_.between(90, 200));
                break;
            }
            case 9: {
                Finger palm;
                palm.x = random_.between(3.0, 9.0);
                palm.y = random_.between(3.0, 9.0);
                palm.radius = random_.between(7.0, 12.0);
                palm.signal = random_.between(150.0, 400.0);
                press(images, palm, palm, random_.between(20, 120));
                break;
            }
            default:
                for (int i = random_.between(10, 60); i > 0; --i) {
                    append(images, {}, 60);
                }
        }
    }

    SeededRandom random_;
};

}  // namespace VexaTouch::Testing
