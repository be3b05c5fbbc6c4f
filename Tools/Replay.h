#pragma once

#include "Algorithm/Algs.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/HostClock.h"
#include "Shared/InputReport.h"
#include "Tools/EventRecord.h"
#include "Tools/SettingKeys.h"

#include <cstdint>
#include <limits>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// What a played frame was to the pipeline.
enum class PlayedType : std::uint8_t { Image, Firmware, Invalid, State };

/// "image", "firmware", "invalid", "state".
std::string_view playedTypeName(PlayedType type) noexcept;

/// A frame that has just been played; valid until the next one is.
struct PlayedFrame {
    std::uint64_t index = 0;  ///< from 0, all frames of the recording counted
    const PipelineRecording::Frame* frame = nullptr;
    PlayedType type = PlayedType::State;
    InputReport::Image image{};             ///< of type Image only
    InputReport::FirmwareEvent firmware{};  ///< of type Firmware only
    std::span<const EventRecord> events;    ///< what the pipeline made of it
};

/// What a replay counts as it goes.
struct ReplayCounts {
    std::uint64_t frames = 0;  ///< of any type
    std::uint64_t images = 0;
    std::uint64_t firmwareEvents = 0;
    std::uint64_t invalidReports = 0;
    std::uint64_t states = 0;
    std::uint64_t events = 0;
};

/// Settings that are given to a replay. They are not part of the recording.
struct ReplaySettings {
    std::vector<Setting> list = {};
    /// They are given anew after each state frame, so that a recording cannot change them;
    /// otherwise they are given before the first frame and a state frame may change them.
    bool pinned = false;
};

/// A setting that was given and then changed to another value by the recording.
struct LostSetting {
    std::string key;          ///< as a pipeline takes it
    std::uint64_t index = 0;  ///< of the state frame

    friend bool operator==(const LostSetting&, const LostSetting&) = default;
};

/// Plays a recording through a pipeline frame by frame. Not thread safe, not movable.
class Replay {
public:
    static constexpr float kNoWaiting = std::numeric_limits<float>::infinity();

    explicit Replay(FrameList frames, ReplaySettings settings = {},
                    Vexa::HostClock& clock = Vexa::HostClock::system());
    ~Replay() = default;
    Replay(const Replay&) = delete;
    Replay& operator=(const Replay&) = delete;

    [[nodiscard]] bool canContinue() const noexcept { return recording_.playCanContinue(); }

    /// Plays the next frame at a factor of the recorded speed; kNoWaiting does not wait at all.
    /// Throws std::runtime_error "playback finished" when there is none.
    const PlayedFrame& next(float speed = kNoWaiting);

    /// The algorithm as it stands after the last frame.
    [[nodiscard]] const Algs& algs() const noexcept { return recording_.algs(); }
    [[nodiscard]] const FrameList& frames() const noexcept { return recording_.frames(); }
    [[nodiscard]] const ReplayCounts& counts() const noexcept { return counts_; }
    /// The first setting so far that did not hold, when they are not pinned.
    [[nodiscard]] const std::optional<LostSetting>& lostSetting() const noexcept { return lost_; }

private:
    void installProbes();
    void giveSettings(bool again);
    void lookAtState();

    ReplaySettings settings_;
    std::vector<Vexa::PropertyValue> inForce_;  ///< each setting as it reads back, once given
    std::optional<LostSetting> lost_;
    PipelineRecording recording_;
    FrameList::Iterator upcoming_;
    PlayedFrame played_;
    std::vector<EventRecord> events_;
    ReplayCounts counts_;
};

}  // namespace VexaTouch::Tools
