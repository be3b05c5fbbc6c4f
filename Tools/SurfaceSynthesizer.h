#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Tools/GestureScript.h"
#include "Tools/SeededNumbers.h"
#include "Tools/SurfaceLayout.h"

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>

namespace VexaTouch::Tools {

/// A finger (or palm) on the surface: a round footprint, strongest in its middle.
struct SurfaceContact {
    SurfacePlace place;
    std::uint32_t strength = kDefaultStrength;  ///< scaled value of a pad right under its middle
    std::uint32_t radius = kDefaultFinger;      ///< of the footprint, in surface units
};

/// How near a contact is: 0 is out of reach, kFullContact is pressed.
inline constexpr std::uint32_t kFullContact = 1U << 16U;

/// The scaled value that a contact gives each pixel, without noise. A pixel with two pads senses
/// the sum of both. `level` is 0 to kFullContact.
std::array<std::int32_t, kPixelCount> footprint(const SurfaceContact& contact,
                                                std::uint32_t level = kFullContact) noexcept;

/// The surface and its device, made up: turns gestures into the reports that the device would send
/// and, for settings, state frames, each with a host timestamp that never goes back.
///
/// All arithmetic is on integers, so that script and seed give the same bytes on every compiler and
/// machine. It reads no clock and no file. What a script cannot say (such as a release without a
/// press) has no effect. Not thread safe.
class SurfaceSynthesizer {
public:
    using Frame = PipelineRecording::Frame;
    /// Takes each frame as it comes; what it throws leaves the operation that made the frame.
    using Sink = std::function<void(Frame frame)>;

    /// With a `seed`, the script's own `seed` commands are ignored.
    explicit SurfaceSynthesizer(Sink sink, std::optional<std::uint64_t> seed = std::nullopt);

    void perform(const GestureCommand& command);
    void perform(const GestureScript& script);

private:
    void touch(const SurfaceContact& from, SurfacePlace to, std::uint32_t durationMs);
    void press(const SurfaceContact& contact);
    void move(SurfacePlace to, std::uint32_t durationMs);
    void release();
    void rest(std::uint32_t durationMs);
    void resetFirmware();

    [[nodiscard]] SurfaceContact finger(SurfacePlace place, std::uint64_t strength) const;
    /// The middle of image k of a stretch that begins now, in nanoseconds since its begin.
    [[nodiscard]] std::uint64_t middleOf(std::uint64_t image) const noexcept;

    void sendImage(const SurfaceContact* contact, std::uint32_t level);
    void sendReport(std::vector<std::uint8_t> report);
    void sendState(const std::string& key, const Vexa::PropertyValue& value);
    void send(Frame frame, std::uint64_t timestampNs);

    [[nodiscard]] std::uint32_t deviceMs() const noexcept;
    void setRate(std::uint32_t rate) noexcept;
    void setDeviceClock(std::uint32_t ms) noexcept;
    void wander();

    Sink sink_;
    std::optional<std::uint64_t> fixedSeed_;
    SeededNumbers random_;

    std::uint32_t strength_ = kDefaultStrength;
    std::uint32_t radius_ = kDefaultFinger;
    std::uint32_t approachMs_ = kDefaultApproachMs;
    std::uint32_t liftoffMs_ = kDefaultLiftoffMs;
    std::uint32_t gapMs_ = kDefaultGapMs;
    std::int32_t noise_ = static_cast<std::int32_t>(kDefaultNoise);
    std::int32_t drift_ = static_cast<std::int32_t>(kDefaultDrift);
    std::uint32_t rate_ = 0;      ///< images a second
    std::uint64_t periodNs_ = 0;  ///< from one image to the next

    std::optional<SurfaceContact> pressed_;
    std::array<std::int32_t, kPixelCount> zero_{};  ///< where each pixel's zero has wandered to
    std::uint64_t elapsedNs_ = 0;                   ///< of the next image, since the start
    std::uint64_t lastTimestampNs_ = 0;
    std::uint32_t clockBaseMs_ = 0;  ///< the device clock showed this...
    std::uint64_t clockBaseNs_ = 0;  ///< ...at this elapsed time
    std::uint32_t frameNumber_ = 0;
    std::uint32_t imagesUntilWander_ = 0;
};

/// All frames of a script.
FrameList synthesize(const GestureScript& script, std::optional<std::uint64_t> seed = std::nullopt);

/// A script of a plausible mixed session of about `durationMs`: taps, holds and slides on all three
/// buttons, palms, hovers, hurried and clumsy touches, settings, firmware events, invalid reports,
/// clock jumps and lost frames. The same seed gives the same text.
std::string randomScript(std::uint64_t seed, std::uint64_t durationMs);

}  // namespace VexaTouch::Tools
