#pragma once

#include "Shared/InputReport.h"

#include <array>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <vector>

/// The words in which tests speak: touches of named pixels, reports, events.
namespace VexaTouch::Testing {

/// Raw signed values of the pixels "A" to "O" in one frame.
using Samples = std::array<std::int16_t, kPixelCount>;

inline std::size_t pixelIndex(char letter) {
    return static_cast<std::size_t>(letter - 'A');
}

/// What the surface feels, for one frame or for a while: `touch("AB").at(350).forMs(120)`.
class Touch {
public:
    Touch() = default;
    explicit Touch(std::string_view letters) : letters_(letters) {}
    explicit Touch(const Samples& samples) : samples_(samples) {}

    /// The raw value of the pixels that touch() named.
    [[nodiscard]] Touch at(int sample) const { return with(letters_, sample); }
    /// The raw value of other pixels.
    [[nodiscard]] Touch with(std::string_view letters, int sample) const {
        Touch touch = *this;
        for (const char letter : letters) {
            touch.samples_.at(pixelIndex(letter)) = static_cast<std::int16_t>(sample);
        }
        return touch;
    }
    /// How long it is felt; one frame if never said.
    [[nodiscard]] Touch forMs(std::uint32_t milliseconds) const {
        Touch touch = *this;
        touch.durationMs_ = milliseconds;
        return touch;
    }

    [[nodiscard]] const Samples& samples() const { return samples_; }
    /// 0 for one frame.
    [[nodiscard]] std::uint32_t durationMs() const { return durationMs_; }

private:
    std::string_view letters_;
    Samples samples_{};
    std::uint32_t durationMs_ = 0;
};

inline Touch touch(std::string_view letters) {
    return Touch(letters);
}
inline Touch nothing() {
    return Touch();
}
inline Touch everything(int sample) {
    return touch("ABCDEFGHIJKLMNO").at(sample);
}

/// An image report as the device sends it: 73 bytes.
inline std::vector<std::uint8_t> imageReport(
    const Samples& samples, std::uint32_t frameNumber, std::uint32_t timestampMs,
    const std::array<std::uint16_t, kPixelCount>& unsignedPixels = {}) {
    std::vector<std::uint8_t> bytes = {InputReport::Image::reportId};
    const auto little = [&bytes](std::uint32_t value, int size) {
        for (int i = 0; i < size; ++i) {
            bytes.push_back(static_cast<std::uint8_t>(value >> (8 * i)));
        }
    };
    little(frameNumber, 4);
    little(timestampMs, 4);
    little(0, 4);
    for (const std::uint16_t value : unsignedPixels) {
        little(value, 2);
    }
    for (const std::int16_t value : samples) {
        little(static_cast<std::uint16_t>(value), 2);
    }
    return bytes;
}
inline std::vector<std::uint8_t> imageReport(const Touch& touch, std::uint32_t frameNumber,
                                             std::uint32_t timestampMs) {
    return imageReport(touch.samples(), frameNumber, timestampMs);
}

/// A firmware event report: 10 bytes. Code 0 says that the firmware has reset.
inline std::vector<std::uint8_t> firmwareReport(std::uint8_t code,
                                                const std::array<std::uint8_t, 8>& data = {}) {
    std::vector<std::uint8_t> bytes = {InputReport::FirmwareEvent::reportId, code};
    bytes.insert(bytes.end(), data.begin(), data.end());
    return bytes;
}

/// The image that the device's bytes make.
inline InputReport::Image image(const Samples& samples, std::uint32_t frameNumber,
                                std::uint32_t timestampMs) {
    const std::vector<std::uint8_t> bytes = imageReport(samples, frameNumber, timestampMs);
    return InputReport::Image::parse(bytes.data(), bytes.size()).value();
}

/// Makes the frames of touches, one every intervalMs of the device's clock. A touch of 120 ms at
/// 10 ms a frame makes twelve frames; what follows begins 120 ms after its beginning.
class FrameSequence {
public:
    std::uint32_t nowMs = 10'000;
    std::uint32_t nextFrame = 1;
    std::uint32_t intervalMs = 10;

    template <typename Visit>
    void play(const Touch& touch, Visit&& visit) {
        std::uint32_t left = touch.durationMs() == 0 ? intervalMs : touch.durationMs();
        while (left > 0) {
            visit(touch.samples(), nextFrame++, nowMs);
            const std::uint32_t step = left < intervalMs ? left : intervalMs;
            nowMs += step;
            left -= step;
        }
    }

    /// The image reports of a touch, as bytes.
    std::vector<std::vector<std::uint8_t>> reports(const Touch& touch) {
        std::vector<std::vector<std::uint8_t>> all;
        play(touch, [&](const Samples& samples, std::uint32_t frame, std::uint32_t timeMs) {
            all.push_back(imageReport(samples, frame, timeMs));
        });
        return all;
    }
};

}  // namespace VexaTouch::Testing
