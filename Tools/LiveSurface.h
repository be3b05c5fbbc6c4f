#pragma once

#include "Pipeline/Pipeline.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/Mutex.h"
#include "Platform/PropertyValue.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/FrameView.h"
#include "Tools/Replay.h"
#include "Tools/ReportTap.h"
#include "Tools/SettingKeys.h"
#include "Tools/TerminalColor.h"

#include <cstddef>
#include <cstdint>
#include <deque>
#include <span>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// The surface of a device at work, to look at: copies of its reports go through a pipeline of its
/// own, so that looking never touches the service. When the looking thread does not keep up,
/// reports are left out of the picture.
///
/// One thread sends, one looks.
class LiveSurface {
public:
    /// `startNs` is the host time that times are counted from.
    LiveSurface(ColorDepth depth, std::size_t columns, std::uint64_t startNs,
                std::span<const Setting> settings);
    ~LiveSurface() = default;
    LiveSurface(const LiveSurface&) = delete;
    LiveSurface(LiveSurface&&) = delete;
    LiveSurface& operator=(const LiveSurface&) = delete;
    LiveSurface& operator=(LiveSurface&&) = delete;

    /// A report that the device sends. The sending thread; never blocks.
    void report(std::span<const std::uint8_t> bytes) noexcept;
    /// A setting that stands behind all reports so far. The sending thread.
    void state(const std::string& key, const Vexa::PropertyValue& value);

    /// Takes what has been sent by `nowNs` of host time; whether there was anything. The looking
    /// thread.
    bool update(std::uint64_t nowNs);
    /// The surface as it was updated last, FrameView::kLines lines; empty before the first report.
    [[nodiscard]] std::vector<std::string> lines() const;

private:
    struct PendingState {
        std::uint64_t reportsBefore = 0;
        Setting setting;
    };

    void installProbes();
    void take(std::span<const std::uint8_t> bytes);
    void applyStates();

    ReportTap tap_;
    std::uint64_t sent_ = 0;  // the sending thread's
    Vexa::Mutex lock_;
    std::deque<PendingState> states_ GUARDED_BY(lock_);

    Pipeline pipeline_;
    FrameView view_;
    std::uint64_t taken_ = 0;
    std::uint64_t nowNs_ = 0;
    PipelineRecording::Frame frame_;
    PlayedFrame played_;
    std::vector<EventRecord> events_;
};

}  // namespace VexaTouch::Tools
