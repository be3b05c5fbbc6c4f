#pragma once

#include "Platform/PropertyValue.h"
#include "Tests/Support/SeededRandom.h"
#include "Tests/Support/SessionGenerator.h"
#include "Tests/Support/Touch.h"

#include <cstdint>
#include <limits>
#include <string>
#include <vector>

namespace VexaTouch::Testing {

/// One thing that can happen to an algorithm.
struct Step {
    enum class Kind : std::uint8_t { Image, Reset, Setting, Copy };

    Kind kind = Kind::Image;
    Samples samples{};
    std::uint32_t frame = 0;
    std::uint32_t timeMs = 0;
    std::string key = {};  ///< of a setting, as the algorithm takes it
    Vexa::PropertyValue value = {};

    [[nodiscard]] std::string description() const {
        switch (kind) {
            case Kind::Reset:
                return "reset";
            case Kind::Copy:
                return "copy";
            case Kind::Setting:
                return "set " + key + " = " + value.description();
            case Kind::Image:
                break;
        }
        std::string text = "image " + std::to_string(frame) + " @" + std::to_string(timeMs) + "ms";
        for (std::size_t i = 0; i < samples.size(); ++i) {
            if (samples[i] != 0) {
                text += std::string(" ") + static_cast<char>('A' + i) + "=" +
                        std::to_string(samples[i]);
            }
        }
        return text;
    }
};

/// Makes sessions of anything that may happen, plausible or not: fingers, noise, extremes, values
/// at the very edge of a decision, clocks that jump and wrap, resets, settings of any type.
///
/// What happens comes in spells, so that touches last and settings stay long enough to matter.
class AnySession {
public:
    explicit AnySession(std::uint64_t seed)
        : random_(seed), fingers_(random_.next()), timeMs_(startTime()) {
        newSpell();
        // Settings may come before the first frame.
        settingsFirst_ = random_.oneIn(3) ? random_.between(1, 4) : 0;
    }

    Step next() {
        if (settingsFirst_ > 0) {
            --settingsFirst_;
            return setting();
        }
        if (--left_ <= 0) {
            newSpell();
        }
        if (random_.oneIn(settingEvery_)) {
            return setting();
        }
        if (random_.oneIn(400)) {
            return {.kind = Step::Kind::Reset};
        }
        if (random_.oneIn(300)) {
            return {.kind = Step::Kind::Copy};
        }
        Step step;
        step.samples = samples();
        step.timeMs = timeMs_;
        step.frame = random_.oneIn(50) ? static_cast<std::uint32_t>(random_.next()) : ++frame_;
        frame_ = step.frame;
        last_ = step.samples;
        tick();
        return step;
    }

private:
    enum class Spell : std::uint8_t {
        Nothing,
        Idle,
        Noise,
        Finger,
        FewPixels,
        KNeighbours,
        Fade,
        Edges,
        Extremes,
        Anything,
        Stuck,
    };

    std::uint32_t startTime() {
        switch (random_.between(0, 3)) {
            case 0:
                return 0;
            case 1:
                return static_cast<std::uint32_t>(random_.between(0, 5000));
            case 2:
                return 0U - static_cast<std::uint32_t>(random_.between(0, 5000));
            default:
                return static_cast<std::uint32_t>(random_.next());
        }
    }

    void newSpell() {
        spell_ = static_cast<Spell>(random_.between(0, 10));
        left_ = random_.oneIn(3) ? random_.between(1, 5) : random_.between(5, 120);
        step_ = random_.oneIn(4) ? random_.between(0, 2) : random_.between(3, 40);
        settingEvery_ = random_.oneIn(6) ? 5 : 150;
        const std::size_t pixels = 1 + random_.next() % 3;
        letters_.clear();
        while (letters_.size() < pixels) {
            letters_ += static_cast<char>('A' + random_.next() % kPixelCount);
        }
        strength_ = random_.between(60, 500);
        if (spell_ == Spell::Finger) {
            finger_ = random_.oneIn(2) ? fingers_.touching(static_cast<std::size_t>(left_) + 1)
                                       : fingers_.mixed(static_cast<std::size_t>(left_) + 1);
        }
    }

    void tick() {
        if (random_.oneIn(150)) {
            constexpr std::uint32_t kJumps[] = {0U - 1U, 0U - 20U, 499,        500,
                                                501,     1000,     0x7FFFFFFF, 0x80000000U};
            timeMs_ += kJumps[random_.next() % std::size(kJumps)];
        } else if (random_.oneIn(1500)) {
            timeMs_ = startTime();
        } else {
            timeMs_ += static_cast<std::uint32_t>(step_);
        }
    }

    Samples samples() {
        Samples samples{};
        const auto put = [&samples](char letter, int value) {
            samples[pixelIndex(letter)] =
                static_cast<std::int16_t>(std::clamp(value, -32768, 32767));
        };
        switch (spell_) {
            case Spell::Nothing:
                break;
            case Spell::Idle:
                for (auto& sample : samples) {
                    sample = static_cast<std::int16_t>(random_.between(-20, 20));
                }
                break;
            case Spell::Noise:
                for (auto& sample : samples) {
                    sample = static_cast<std::int16_t>(random_.between(-90, 90));
                }
                break;
            case Spell::Finger:
                samples = finger_[static_cast<std::size_t>(left_)].signedPixels;
                break;
            case Spell::FewPixels:
                for (const char letter : letters_) {
                    put(letter, strength_ + random_.between(-60, 60));
                }
                break;
            case Spell::KNeighbours:
                put('K', strength_ + random_.between(-40, 40));
                put(random_.oneIn(40)      ? 'J'
                    : letters_[0] % 2 == 0 ? 'M'
                                           : 'I',
                    strength_ * random_.between(8, 16) / 10);
                if (letters_.size() > 1) {
                    put(letters_[1], random_.between(0, strength_));
                }
                break;
            case Spell::Fade:
                // A hold that leaves one place for another.
                for (const char letter : letters_) {
                    const bool going = letter == letters_[0];
                    put(letter, going ? strength_ * left_ / 60 : strength_ * (60 - left_) / 60);
                }
                break;
            case Spell::Edges:
                for (auto& sample : samples) {
                    constexpr int kEdges[] = {0,   31,  32,  38,  39,  40,  41,  49,
                                              50,  51,  75,  76,  82,  83,  84,  104,
                                              107, 108, 110, 133, 199, 200, 201, -1};
                    sample = static_cast<std::int16_t>(random_.oneOf(kEdges));
                }
                break;
            case Spell::Extremes:
                for (auto& sample : samples) {
                    constexpr int kExtremes[] = {-32768, -32767, -1, 0, 1, 76, 16384, 32766, 32767};
                    sample = static_cast<std::int16_t>(random_.oneOf(kExtremes));
                }
                break;
            case Spell::Anything:
                for (auto& sample : samples) {
                    sample = static_cast<std::int16_t>(random_.next());
                }
                break;
            case Spell::Stuck:
                samples = last_;
                if (random_.oneIn(4)) {
                    samples[random_.next() % kPixelCount] =
                        static_cast<std::int16_t>(random_.between(-100, 400));
                }
                break;
        }
        return samples;
    }

    Step setting() {
        Step step{.kind = Step::Kind::Setting};
        switch (random_.between(0, 9)) {
            case 0:
            case 1:
                step.key = "ActivationThreshold";
                step.value = anyThreshold();
                break;
            case 2:
            case 3:
                step.key = "HoldTimeoutMilliseconds";
                step.value =
                    random_.oneIn(3) ? anyValue() : Vexa::PropertyValue(random_.between(0, 600));
                break;
            case 4:
                step.key = "EnableHoldSuppression";
                step.value = random_.oneIn(3) ? anyValue() : Vexa::PropertyValue(random_.oneIn(2));
                break;
            case 5:
                step.key = "EnableTapSuppression";
                step.value = random_.oneIn(3) ? anyValue() : Vexa::PropertyValue(random_.oneIn(2));
                break;
            case 6:
                step.key = "VirtualNormalizationFactors.";
                step.key += random_.oneIn(3) ? anyText() : std::to_string(random_.between(-2, 25));
                step.value = anyValue();
                break;
            case 7:
                if (random_.oneIn(10)) {
                    step.key = "ResetEventStats";
                    step.value = anyValue();
                    break;
                }
                [[fallthrough]];
            default: {
                static const std::vector<std::string> kOtherKeys = {
                    "EventStats",
                    "DebugInfo",
                    "",
                    ".",
                    "activationThreshold",
                    "ActivationThreshold.",
                    "ActivationThreshold ",
                    "Algs.ActivationThreshold",
                    "VirtualNormalizationFactors",
                    "VirtualNormalizationFactors3",
                    std::string("ActivationThreshold\0", 20)};
                step.key = random_.oneIn(2) ? random_.oneOf(kOtherKeys) : anyText();
                step.value = anyValue();
            }
        }
        return step;
    }

    std::string anyText() {
        static const std::vector<std::string> kTexts = {"",
                                                        "0",
                                                        "3",
                                                        "22",
                                                        "23",
                                                        "+7",
                                                        " 5",
                                                        "-1",
                                                        "5x",
                                                        "0x5",
                                                        "abc",
                                                        "1e1",
                                                        "1.9",
                                                        "2147483647",
                                                        "2147483648",
                                                        "4294967296",
                                                        "-4294967295",
                                                        "18446744073709551616",
                                                        "99999999999999999999999",
                                                        "007",
                                                        "\t\n4",
                                                        "-",
                                                        "+",
                                                        "4.4",
                                                        std::string("6\0"
                                                                    "7",
                                                                    3)};
        return random_.oneOf(kTexts);
    }

    Vexa::PropertyValue anyThreshold() {
        constexpr float kLimits[] = {0.0F,
                                     -0.0F,
                                     -200.0F,
                                     std::numeric_limits<float>::denorm_min(),
                                     std::numeric_limits<float>::max(),
                                     std::numeric_limits<float>::infinity(),
                                     -std::numeric_limits<float>::infinity(),
                                     std::numeric_limits<float>::quiet_NaN()};
        switch (random_.between(0, 3)) {
            case 0:
                return random_.oneOf(kLimits);
            case 1:
                return anyValue();
            default:
                return 200.0;  // where touches are felt
        }
    }

    Vexa::PropertyValue anyValue() {
        constexpr double kInfinity = std::numeric_limits<double>::infinity();
        constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
        static const std::vector<Vexa::PropertyValue> kValues = {
            Vexa::PropertyValue(),
            Vexa::PropertyValue::null(),
            true,
            false,
            0,
            1,
            -1,
            2,
            100,
            200,
            500,
            -200,
            std::int64_t{4294967295},
            std::int64_t{4294967296},
            std::numeric_limits<std::int64_t>::min(),
            std::numeric_limits<std::uint64_t>::max(),
            0.0,
            -0.0,
            0.5,
            -0.5,
            1e-45,
            1e-40,
            1e-10,
            1e10,
            1e39,
            -1e39,
            1e300,
            75.0,
            76.0,
            199.9,
            1.0F,
            150.0F,
            std::numeric_limits<float>::denorm_min(),
            std::numeric_limits<float>::max(),
            kInfinity,
            -kInfinity,
            kNan,
            "abc",
            "200",
            "",
            Vexa::PropertyValue::Bytes{1, 2},
            Vexa::PropertyValue::Array{200},
            Vexa::PropertyValue::Dictionary{{"ActivationThreshold", 200}}};
        switch (random_.between(0, 3)) {
            case 0:
                return random_.between(-1000.0, 1000.0);
            case 1:
                return random_.between(0, 1000);
            default:
                return random_.oneOf(kValues);
        }
    }

    SeededRandom random_;
    SessionGenerator fingers_;
    std::uint32_t timeMs_;
    std::uint32_t frame_ = 0;
    Spell spell_ = Spell::Nothing;
    int left_ = 0;
    int step_ = 10;
    int settingsFirst_ = 0;
    int settingEvery_ = 150;
    int strength_ = 300;
    std::string letters_;
    Samples last_{};
    SessionGenerator::Images finger_;
};

}  // namespace VexaTouch::Testing
