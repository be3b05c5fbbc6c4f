#pragma once

#include "Platform/HostClock.h"
#include "Tools/GestureScript.h"
#include "Tools/PlayedDevice.h"
#include "Tools/SurfaceAnswers.h"

#include <cstdint>
#include <optional>

namespace VexaTouch::Tools {

/// How a simulated surface plays.
struct SimulatedPlay {
    /// The gestures; without, random ones are made up, endlessly.
    std::optional<GestureScript> script = {};
    /// Of the random numbers. With a script: instead of the script's own.
    std::optional<std::uint64_t> seed = {};
    /// The script begins anew when it is over: device clock and frame numbers go on.
    bool endless = false;
    /// Reports a second; otherwise they leave at the times that the script gives them, 100 images a
    /// second unless it says else.
    std::optional<double> rate = {};
    /// As fast as reports are taken, none dropped; for tests and measurements.
    bool asFastAsTaken = false;
};

/// The frames of a script, once or over and over; then device clock and frame numbers go on. A
/// `seed` takes the place of the script's own.
PlayedDevice::FrameSource gestureSource(GestureScript script,
                                        std::optional<std::uint64_t> seed = {},
                                        bool endless = false);

/// A live surface with nothing attached: plays gestures in real time. A reader that does not keep
/// up loses reports, the newest ones. The bytes are those of SurfaceSynthesizer: the same script
/// and seed give the same reports in each opening.
class SimulatedSurface final : public PlayedDevice {
public:
    /// Without script and seed, the seed is drawn from the system.
    explicit SimulatedSurface(SimulatedPlay play = {}, SurfaceIdentity identity = {},
                              Vexa::HostClock& clock = Vexa::HostClock::system());

    /// That of the random gestures; kDefaultSeed for a script that was given none.
    [[nodiscard]] std::uint64_t seed() const noexcept { return seed_; }

private:
    SimulatedSurface(std::uint64_t seed, SimulatedPlay& play, SurfaceIdentity identity,
                     Vexa::HostClock& clock);

    std::uint64_t seed_;
};

}  // namespace VexaTouch::Tools
