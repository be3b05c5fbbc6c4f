#pragma once

#include "Algorithm/Algs.h"
#include "Platform/HidEvent.h"
#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/Touch.h"

#include <cstdint>
#include <initializer_list>
#include <vector>

namespace VexaTouch::Testing {

/// A surface that feels touches and an algorithm that answers with events.
template <typename Algorithm>
class BasicSurface {
public:
    Algorithm algs;
    FrameSequence clock;

    /// The events of these touches, felt one after the other.
    std::vector<Vexa::HidEvent> feel(std::initializer_list<Touch> touches) {
        std::vector<Vexa::HidEvent> events;
        for (const Touch& touch : touches) {
            clock.play(
                touch, [&](const Samples& samples, std::uint32_t frame, std::uint32_t timeMs) {
                    for (Vexa::HidEvent& event : algs.handleImage(image(samples, frame, timeMs))) {
                        events.push_back(std::move(event));
                    }
                });
        }
        return events;
    }
    std::vector<Vexa::HidEvent> feel(const Touch& touch) { return feel({touch}); }

    [[nodiscard]] const auto& hand() const { return algs.handStats(); }
    [[nodiscard]] auto counters() const { return algs.eventStats()._stats; }
};

using Surface = BasicSurface<Algs>;

/// Ends a session: with nothing touching, two seconds bring no further event.
template <typename Algorithm>
void expectNothingElseHappens(BasicSurface<Algorithm>& surface) {
    EXPECT_THAT(surface.feel(nothing().forMs(2000)), ::testing::IsEmpty());
    EXPECT_FALSE(surface.hand()._isTouching);
    EXPECT_FALSE(surface.hand()._isHolding);
}

}  // namespace VexaTouch::Testing
