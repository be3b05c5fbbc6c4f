#pragma once

#include "Pipeline/RecordedFrame.h"
#include "Tools/FrameFeed.h"
#include "Tools/RecordingStream.h"
#include "Tools/Streams.h"

#include <chrono>
#include <cstdint>
#include <optional>

namespace VexaTouch::Tools {

/// Keys of the state frames in which a recording says what it lacks at their place. A pipeline
/// passes over them.
inline constexpr const char* kLostReportsKey = "Recording.LostReports";
inline constexpr const char* kLostSettingsKey = "Recording.LostSettings";

/// What a recording holds when it ends.
struct RecordSummary {
    std::uint64_t reports = 0;
    std::uint64_t settings = 0;
    FrameGap lost;  ///< because the file was not written quickly enough
};

/// Puts what comes out of a feed into a stream, up to a number of input reports, and shows on a
/// terminal how far it is. One thread.
class RecordKeeper {
public:
    using Time = std::chrono::steady_clock::time_point;

    /// Both must outlive it. The time that is shown begins now.
    RecordKeeper(RecordingStream& stream, std::optional<std::uint64_t> count, Streams& streams);

    /// Counts a frame and adds it to the stream, unless it is full. It is written by the stream's
    /// flush.
    void take(const RecordedFrame& frame);
    /// The file itself says what it lacks.
    void take(const FrameGap& gap);
    /// Whether it takes no more.
    [[nodiscard]] bool isFull() const noexcept { return count_ && summary_.reports >= *count_; }
    [[nodiscard]] const RecordSummary& summary() const noexcept { return summary_; }

    /// On a terminal, at most ten times a second.
    void drawProgress();
    /// On a terminal, before anything else is said there.
    void eraseProgress();
    /// The answer to SIGUSR1.
    void tellHowMuchThereIs();
    /// When there is something to be drawn again; nothing where there is no terminal.
    [[nodiscard]] std::optional<Time> progressDue() const noexcept;

private:
    void addLost(const char* key, std::uint64_t count);

    RecordingStream& stream_;
    const std::optional<std::uint64_t> count_;
    Streams& streams_;
    const Time start_ = std::chrono::steady_clock::now();
    Time nextDraw_;
    RecordSummary summary_;
    std::uint64_t latestNs_ = 0;
};

}  // namespace VexaTouch::Tools
