#include "Algorithm/Algs.h"
#include "Tests/Reference/Algs.h"
#include "Tests/Support/AnySession.h"
#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/StateSnapshot.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <concepts>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <limits>
#include <map>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

/// The algorithm against its literal reading: whatever happens, every field of the state is the
/// same to the bit after every step, and so is every event.
///
/// VEXA_PROPERTY_FRAMES sets how many random frames are played (200000), VEXA_PROPERTY_SEED repeats
/// a run.
namespace VexaTouch::Testing {
namespace {

std::uint64_t numberFromEnvironment(const char* name, std::uint64_t otherwise) {
    const char* text = std::getenv(name);
    return text == nullptr ? otherwise : std::strtoull(text, nullptr, 10);
}

std::string text(const std::vector<Vexa::HidEvent>& events) {
    std::string all;
    for (const Vexa::HidEvent& event : events) {
        all.append("[").append(event.description()).append("]");
    }
    return all;
}

/// The algorithm and its literal reading, side by side.
class Twins {
public:
    /// What differs after this step, if anything.
    std::optional<std::string> play(const Step& step) {
        std::vector<Vexa::HidEvent> events;
        std::vector<Vexa::HidEvent> literalEvents;
        switch (step.kind) {
            case Step::Kind::Image: {
                const InputReport::Image frame = image(step.samples, step.frame, step.timeMs);
                events = algs.handleImage(frame);
                literalEvents = literal.handleImage(frame);
                break;
            }
            case Step::Kind::Reset:
                events = algs.handleReset();
                literalEvents = literal.handleReset();
                break;
            case Step::Kind::Setting:
                algs.setState(step.key, step.value);
                literal.setState(step.key, step.value);
                if (!(algs.getState(step.key) == literal.getState(step.key))) {
                    return "getState(" + step.key + "): " + algs.getState(step.key).description() +
                           " and " + literal.getState(step.key).description();
                }
                break;
            case Step::Kind::Copy: {
                const Algs copy = algs;
                algs = copy;
                const Reference::Algs literalCopy = literal;
                literal = literalCopy;
                break;
            }
        }
        if (!events.empty() || !literalEvents.empty()) {
            if (text(events) != text(literalEvents)) {
                return "events: " + text(events) + " and " + text(literalEvents);
            }
            // Texts are compared where something happened; that is seldom.
            if (std::optional<std::string> difference = describeDifference(step)) {
                return difference;
            }
        }
        return firstDifference(algs, literal);
    }

    Algs algs;
    Reference::Algs literal;

private:
    std::optional<std::string> describeDifference(const Step& step) const {
        const std::int16_t* samples = step.samples.data();
        const std::string touch = algs.touchStateDescription(samples, step.timeMs);
        const std::string literalTouch = literal.touchStateDescription(samples, step.timeMs);
        if (touch != literalTouch) {
            return touch + "\nand\n" + literalTouch;
        }
        const std::string virtuals = algs.virtualStateDescription(samples, step.timeMs);
        const std::string literalVirtuals = literal.virtualStateDescription(samples, step.timeMs);
        if (virtuals != literalVirtuals) {
            return virtuals + "\nand\n" + literalVirtuals;
        }
        return std::nullopt;
    }
};

std::optional<std::string> firstComplaint(const std::vector<Step>& session) {
    Twins twins;
    for (const Step& step : session) {
        if (std::optional<std::string> complaint = twins.play(step)) {
            return complaint;
        }
    }
    return std::nullopt;
}

/// The smallest part of a session that still shows a difference.
std::vector<Step> minimized(std::vector<Step> session) {
    for (std::size_t chunk = session.size() / 2; chunk > 0; chunk /= 2) {
        for (std::size_t at = 0; at + chunk <= session.size();) {
            std::vector<Step> shorter = session;
            shorter.erase(shorter.begin() + static_cast<std::ptrdiff_t>(at),
                          shorter.begin() + static_cast<std::ptrdiff_t>(at + chunk));
            if (firstComplaint(shorter)) {
                session = std::move(shorter);
            } else {
                at += chunk;
            }
        }
    }
    for (std::size_t i = 0; i < session.size(); ++i) {
        for (std::size_t pixel = 0; pixel < kPixelCount; ++pixel) {
            const std::int16_t old = session[i].samples[pixel];
            session[i].samples[pixel] = 0;
            if (old != 0 && !firstComplaint(session)) {
                session[i].samples[pixel] = old;
            }
        }
    }
    return session;
}

std::string report(std::vector<Step> session) {
    session = minimized(std::move(session));
    std::string all = "after these " + std::to_string(session.size()) +
                      " steps the algorithm and its literal reading differ:\n";
    for (const Step& step : session) {
        all += "  " + step.description() + "\n";
    }
    return all + "  " + firstComplaint(session).value_or("(no difference when repeated)");
}

TEST(ReferenceProperty, EveryFieldOfEveryFrameEqualsTheLiteralReading) {
    const std::uint64_t seed = numberFromEnvironment("VEXA_PROPERTY_SEED", std::random_device{}());
    const std::uint64_t frames = numberFromEnvironment("VEXA_PROPERTY_FRAMES", 200'000);
    RecordProperty("seed", std::to_string(seed));
    std::cout << "seed " << seed << ", " << frames << " frames\n";

    SeededRandom random(seed);
    std::vector<Step> session;
    std::map<std::string, std::uint64_t, std::less<>> counts;
    for (std::uint64_t played = 0; played < frames; played += session.size()) {
        AnySession steps(random.next());
        // Many short sessions, since the first frames have cases of their own.
        const int length =
            random.between(1, 4) > 1 ? random.between(5, 60) : random.between(500, 3000);
        session.clear();
        Twins twins;
        for (int i = 0; i < length; ++i) {
            session.push_back(steps.next());
            if (twins.play(session.back())) {
                FAIL() << report(std::move(session));
            }
        }
        forEachCounter(twins.algs.eventStats()._stats,
                       [&counts](std::string_view name, std::uint64_t count) {
                           counts.try_emplace(std::string(name)).first->second += count;
                       });
    }
    EXPECT_EQ(counts.size(), 24U);
    if (frames >= 2'000'000) {
        // The sessions reach whatever can be counted. A tenth of these frames now and then misses
        // what is rarest.
        for (const auto& [name, count] : counts) {
            EXPECT_GT(count, 0U) << name;
        }
    }
}

TEST(ReferenceProperty, PlausibleSessionsEqualTheLiteralReading) {
    const std::uint64_t seed = numberFromEnvironment("VEXA_PROPERTY_SEED", std::random_device{}());
    std::cout << "seed " << seed << "\n";
    SessionGenerator generator(seed);
    const std::uint64_t frames = numberFromEnvironment("VEXA_PROPERTY_FRAMES", 200'000) / 4;
    Twins twins;
    std::vector<Step> session;
    for (const InputReport::Image& frame : generator.mixed(frames)) {
        session.push_back({.samples = frame.signedPixels,
                           .frame = frame.frameNumber,
                           .timeMs = frame.timestampMs});
        if (twins.play(session.back())) {
            FAIL() << report(std::move(session));
        }
    }
    EXPECT_GT(twins.algs.eventStats()._stats.numTaps, 0U);
    EXPECT_GT(twins.algs.eventStats()._stats.numEndHold, 0U);
}

// States that no session of frames reaches, so that rules which look dead hold as well.

/// Writes the same random content into both fields.
struct SameContent {
    SeededRandom& random;

    bool boolean() const { return random.oneIn(2); }
    float number() const {
        constexpr float kNumbers[] = {0.0F,
                                      -0.0F,
                                      1.0F,
                                      -1.0F,
                                      0.3F,
                                      -50.0F,
                                      57.25F,
                                      100.0F,
                                      200.0F,
                                      1e-45F,
                                      std::numeric_limits<float>::infinity(),
                                      -std::numeric_limits<float>::infinity(),
                                      std::numeric_limits<float>::quiet_NaN()};
        return random.oneOf(kNumbers);
    }
    /// Of a level that cannot be negative.
    float level() const {
        return random.oneIn(3) ? 0.0F : static_cast<float>(random.between(0.0, 4.0));
    }
    std::uint32_t time() const {
        return random.oneIn(8) ? static_cast<std::uint32_t>(random.next())
                               : static_cast<std::uint32_t>(random.between(0, 3000));
    }

    template <typename A, typename B>
    void fillPixel(A& a, B& b, int index) const {
        a._value = b._value = random.oneIn(3) ? 0 : random.between(-100, 900);
        a._progress = b._progress = random.oneIn(6) ? number() : level();
        a._peakProgress = b._peakProgress = number();
        a._valleyProgress = b._valleyProgress = number();
        a._isActive = b._isActive = random.oneIn(4);
        // A pixel's own flags always agree with its value and with each other.
        a._isAboveNoise = b._isAboveNoise = a._value > 75;
        a._wasAboveNoise = b._wasAboveNoise = a._isAboveNoise || random.oneIn(2);
        a._wasActive = b._wasActive = a._isActive || random.oneIn(4);
        a._maxProgressAboveNoise = b._maxProgressAboveNoise =
            random.oneIn(3) ? static_cast<float>(random.between(0, 3)) : level();
        a._index = b._index = index;
    }

    template <typename A, typename B>
    void fillHand(A& a, B& b) const {
        std::vector<double> contents;
        forEachHandStatsField(a, [&](std::string_view name, auto& field) {
            using Field = std::remove_reference_t<decltype(field)>;
            if constexpr (requires { field.size(); }) {
                for (float& element : field) {
                    element = level();
                    contents.push_back(element);
                }
            } else {
                if constexpr (std::same_as<Field, bool>) {
                    field = boolean();
                } else if constexpr (std::same_as<Field, float>) {
                    field = name == "_y_cutoff"              ? 7.389056F
                            : name == "_peak_pixel_progress" ? level()
                                                             : number();
                } else if constexpr (std::same_as<Field, std::uint32_t>) {
                    field = time();
                } else if (name == "_peak_pixel_index") {
                    field = random.oneIn(2) ? 10 : random.between(0, 14);
                } else {
                    field = random.between(0, 3);
                }
                contents.push_back(static_cast<double>(field));
            }
        });
        std::size_t i = 0;
        forEachHandStatsField(b, [&](std::string_view, auto& field) {
            if constexpr (requires { field.size(); }) {
                for (float& element : field) {
                    element = static_cast<float>(contents[i++]);
                }
            } else {
                field = static_cast<std::remove_reference_t<decltype(field)>>(contents[i++]);
            }
        });
    }
};

/// Every field of a hand as "name=bits".
template <typename Hand>
std::vector<std::string> handFields(const Hand& hand) {
    std::vector<std::string> all;
    forEachHandStatsField(hand, [&all](std::string_view name, const auto& field) {
        const auto add = [&](const auto& value) {
            all.push_back(std::string(name) + "=" + std::to_string(fieldBits(value)));
        };
        if constexpr (requires { field.size(); }) {
            for (const float element : field) {
                add(element);
            }
        } else {
            add(field);
        }
    });
    return all;
}

TEST(ReferenceProperty, AHandInAnyStateGoesTheWayOfTheLiteralReading) {
    const std::uint64_t seed = numberFromEnvironment("VEXA_PROPERTY_SEED", std::random_device{}());
    std::cout << "seed " << seed << "\n";
    SeededRandom random(seed);
    const SameContent same{random};
    Algs algs;
    Reference::Algs literal;
    std::vector<Pixel> pixels = algs.touchPixels();
    std::vector<VirtualPixel> virtualPixels = algs.virtualPixels();
    std::vector<Reference::Pixel> literalPixels = literal.touchPixels();
    std::vector<Reference::VirtualPixel> literalVirtualPixels = literal.virtualPixels();
    HandStats hand;
    Reference::HandStats literalHand;
    const std::uint64_t frames = numberFromEnvironment("VEXA_PROPERTY_FRAMES", 200'000) / 10;
    for (std::uint64_t frame = 0; frame < frames; ++frame) {
        for (std::size_t i = 0; i < pixels.size(); ++i) {
            same.fillPixel(pixels[i], literalPixels[i], static_cast<int>(i));
        }
        for (std::size_t i = 0; i < virtualPixels.size(); ++i) {
            same.fillPixel(virtualPixels[i], literalVirtualPixels[i], random.between(0, 14));
        }
        same.fillHand(hand, literalHand);
        const std::uint32_t timeMs = same.time();
        switch (random.between(0, 6)) {
            case 0: {
                const int index = random.between(0, 14);
                if (random.oneIn(8)) {
                    // A pixel of no region.
                    const auto at = static_cast<std::size_t>(index);
                    pixels[at]._index = literalPixels[at]._index = 15;
                }
                ASSERT_EQ(hand.changeActiveRegion(pixels, index),
                          literalHand.changeActiveRegion(literalPixels, index));
                break;
            }
            case 1:
                ASSERT_EQ(
                    hand.updateActiveRegion(pixels, virtualPixels, timeMs),
                    literalHand.updateActiveRegion(literalPixels, literalVirtualPixels, timeMs));
                break;
            case 2:
                hand.decayTouchScore(timeMs);
                literalHand.decayTouchScore(timeMs);
                break;
            case 3:
                hand.updateTapRejection(pixels, virtualPixels);
                literalHand.updateTapRejection(literalPixels, literalVirtualPixels);
                break;
            case 4:
                hand.updateTouchScore(pixels, virtualPixels, timeMs);
                literalHand.updateTouchScore(literalPixels, literalVirtualPixels, timeMs);
                break;
            default:
                hand.updateHandState(pixels, virtualPixels, timeMs);
                literalHand.updateHandState(literalPixels, literalVirtualPixels, timeMs);
        }
        ASSERT_EQ(handFields(hand), handFields(literalHand)) << "seed " << seed;
    }
}

TEST(ReferenceProperty, CountersOfAnyFlagsEqualTheLiteralReading) {
    const std::uint64_t seed = numberFromEnvironment("VEXA_PROPERTY_SEED", std::random_device{}());
    std::cout << "seed " << seed << "\n";
    SeededRandom random(seed);
    const SameContent same{random};
    HandStats hand;
    Reference::HandStats literalHand;
    EventStats stats;
    Reference::EventStats literalStats;
    for (int frame = 0; frame < 20'000; ++frame) {
        same.fillHand(hand, literalHand);
        hand._activeRegion = literalHand._activeRegion = random.between(-1, 5);
        stats.update(hand);
        literalStats.update(literalHand);
        ASSERT_EQ(stats.statsDictionary(), literalStats.statsDictionary()) << "seed " << seed;
    }
    forEachCounter(stats._stats, [](std::string_view name, std::uint64_t count) {
        EXPECT_GT(count, 0U) << name;
    });
}

RC_GTEST_PROP(ReferenceProperty, AnyImagesAndSettingsEqualTheLiteralReading, ()) {
    const auto sample =
        rc::gen::weightedOneOf<std::int16_t>({{4, rc::gen::just(std::int16_t{0})},
                                              {3, rc::gen::inRange<std::int16_t>(0, 400)},
                                              {1, rc::gen::arbitrary<std::int16_t>()},
                                              {1, rc::gen::element<std::int16_t>(-32768, 32767)}});
    const auto count = *rc::gen::inRange(0, 40);
    std::uint32_t timeMs = *rc::gen::arbitrary<std::uint32_t>();
    std::vector<Step> session;
    for (int i = 0; i < count; ++i) {
        Step step;
        if (*rc::gen::inRange(0, 8) == 0) {
            step.kind = Step::Kind::Setting;
            step.key = *rc::gen::element<std::string>(
                "ActivationThreshold", "HoldTimeoutMilliseconds", "EnableHoldSuppression",
                "EnableTapSuppression", "ResetEventStats", "VirtualNormalizationFactors.4");
            step.value = *rc::gen::arbitrary<double>();
        } else {
            step.samples = *rc::gen::container<Samples>(sample);
            step.timeMs = timeMs;
            timeMs += *rc::gen::inRange<std::uint32_t>(0, 300);
        }
        session.push_back(step);
    }
    const std::optional<std::string> complaint = firstComplaint(session);
    if (complaint) {
        RC_FAIL(*complaint);
    }
}

}  // namespace
}  // namespace VexaTouch::Testing
