#include "Tools/SurfaceSynthesizer.h"

#include <array>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {

namespace {

/// Writes a session line by line and keeps count of the time it takes.
class SessionWriter {
public:
    SessionWriter(std::uint64_t seed, std::uint64_t durationMs)
        : random_(seed), durationMs_(durationMs), text_("seed " + std::to_string(seed) + "\n") {}

    std::string write() {
        while (elapsedMs_ < durationMs_) {
            writeNext();
        }
        return std::move(text_);
    }

private:
    // Each draw is a statement of its own: the order of draws within one expression would be the
    // compiler's choice.
    void writeNext() {
        const std::uint32_t chance = random_.below(100);
        if (chance < 34) {
            touchAt("tap ", 60, random_.below(4) == 0 ? 520 : 240);
        } else if (chance < 50) {
            touchAt("hold ", 560, 1800);
        } else if (chance < 60) {
            const std::string from = place();
            touchAt("slide " + from + " ", 250, 1600);
        } else if (chance < 68) {
            longSlide();
        } else if (chance < 71) {
            touch("palm", milliseconds(200, 1200), true);
        } else if (chance < 75) {
            const std::string where = place();
            touch("hover " + where, milliseconds(100, 600), false);
        } else if (chance < 90) {
            line("idle", pass(milliseconds(100, 2500)));
        } else if (chance < 92) {
            blur();
        } else if (chance < 96) {
            changeHand();
        } else {
            disturb();
        }
    }

    /// A hold that begins at one place and goes on at others.
    void longSlide() {
        pass(approachMs_);
        line("press " + place());
        line("idle", pass(milliseconds(520, 900)));
        for (std::uint32_t moves = 1 + random_.below(3); moves > 0; --moves) {
            const std::string where = place();
            line("move " + where, pass(milliseconds(120, 600)));
            line("idle", pass(milliseconds(60, 300)));
        }
        pass(liftoffMs_ + kDefaultGapMs);
        line("release");
    }

    /// What the algorithm should take neither for a hold nor for a tap.
    void blur() {
        if (random_.below(2) == 0) {
            touch("hold C4", milliseconds(600, 1200), false);  // between the buttons
        } else {
            line("tap K " + std::to_string(pass(milliseconds(450, 500))) + "ms 220");  // too weak
            pass(kDefaultGapMs);
        }
    }

    /// Another finger, or the same in another mood.
    void changeHand() {
        switch (random_.below(6)) {
            case 0:
                line("strength " + number(220, 700));
                break;
            case 1:
                line("finger " + number(8, 16));
                break;
            case 2:
                line("approach", approachMs_ = milliseconds(0, 120));
                break;
            case 3:
                line("liftoff", liftoffMs_ = milliseconds(0, 120));
                break;
            case 4:
                line("noise " + number(0, 16));
                break;
            default:
                line("drift " + number(0, 8));
                break;
        }
    }

    /// What is not a touch: settings, firmware, the line to the device, the device's clock.
    void disturb() {
        static constexpr std::array<std::string_view, 8> kSettings = {
            "ActivationThreshold 200.0",   "ActivationThreshold 150.0",
            "ActivationThreshold 260",     "HoldTimeoutMilliseconds 500",
            "HoldTimeoutMilliseconds 300", "EnableTapSuppression true",
            "EnableHoldSuppression true",  "ResetEventStats null",
        };
        switch (random_.below(8)) {
            case 0:
                line("reset");
                break;
            case 1:
                line("firmware " + number(1, 255) + " 0102");
                break;
            case 2:
                line("invalid 07 " + std::to_string(random_.between(10, 99)));
                break;
            case 3:
                line("clock " + std::to_string(random_.next() >> 32U));
                break;
            case 4:
                line("frame " + std::to_string(random_.next() >> 32U));
                break;
            case 5:
                line("skip " + number(1, 40));
                break;
            default:
                line("set " + std::string(kSettings[random_.below(kSettings.size())]));
                break;
        }
    }

    void touchAt(const std::string& command, std::int32_t shortest, std::int32_t longest) {
        const std::string where = place();
        touch(command + where, milliseconds(shortest, longest), true);
    }

    void touch(const std::string& command, std::uint32_t durationMs, bool takesStrength) {
        const bool hasOwnStrength = takesStrength && random_.below(3) == 0;
        line(command + " " + std::to_string(pass(durationMs)) + "ms" +
             (hasOwnStrength ? " " + number(210, 800) : ""));
        pass(kDefaultGapMs);
    }

    std::string place() {
        const std::uint32_t chance = random_.below(10);
        if (chance < 6) {
            return std::string(kNamedPlaces[random_.below(kNamedPlaces.size())].name);
        }
        if (chance < 8) {
            return std::string(1, static_cast<char>('A' + random_.below(kPixelCount)));
        }
        std::string grid(1, static_cast<char>('A' + random_.below(kGridSize)));
        grid += static_cast<char>('1' + random_.below(kGridSize));
        return grid;
    }

    /// Whole tens, as a person would write them.
    std::uint32_t milliseconds(std::int32_t lowest, std::int32_t highest) {
        return static_cast<std::uint32_t>(random_.between(lowest / 10, highest / 10)) * 10U;
    }
    std::string number(std::int32_t lowest, std::int32_t highest) {
        return std::to_string(random_.between(lowest, highest));
    }
    std::uint32_t pass(std::uint32_t durationMs) {
        elapsedMs_ += durationMs;
        return durationMs;
    }
    void line(const std::string& text) { text_ += text + "\n"; }
    void line(const std::string& command, std::uint32_t durationMs) {
        line(command + " " + std::to_string(durationMs) + "ms");
    }

    SeededNumbers random_;
    std::uint64_t durationMs_;
    std::uint64_t elapsedMs_ = 0;
    std::uint32_t approachMs_ = kDefaultApproachMs;
    std::uint32_t liftoffMs_ = kDefaultLiftoffMs;
    std::string text_;
};

}  // namespace

std::string randomScript(std::uint64_t seed, std::uint64_t durationMs) {
    return SessionWriter(seed, durationMs).write();
}

}  // namespace VexaTouch::Tools
