#pragma once

#include "Pipeline/ContainerWriter.h"
#include "Pipeline/RecordedFrame.h"
#include "Tools/AppendTarget.h"
#include "Tools/Failure.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// Writes a recording frame by frame for as long as it takes, in constant memory.
///
/// A regular file is a whole container at every moment between two writes: each write goes over the
/// closing brackets and ends with new ones, in one call of the system. So the file can be copied,
/// replayed and looked at while it grows, and needs no repair when the program is killed. Where a
/// write itself is cut (the machine ends, the kernel gives up in the middle), all frames but those
/// of that write are there, and `convert --recover` restores them. What cannot be written over (a
/// pipe) gets its closing brackets at the end.
///
/// When the disk is full, or a write fails otherwise, the file is brought back to the last frame
/// that has room together with the brackets. A file that gets no report leaves what was there
/// before: settings alone are not worth an old recording. Only finish() keeps it all the same. One
/// thread.
class RecordingStream {
public:
    using Clock = std::chrono::steady_clock;

    /// `name` is for messages. Without `syncEvery` the system decides when the file is safe from
    /// the machine's end; with it that is seen to so often, as long as there is something new.
    /// Writes the beginning. Throws Failure.
    RecordingStream(std::unique_ptr<AppendTarget> target, std::string name,
                    std::optional<std::chrono::nanoseconds> syncEvery = std::nullopt);
    /// What was written stays as it is, if there is a report among it.
    ~RecordingStream();
    RecordingStream(const RecordingStream&) = delete;
    RecordingStream(RecordingStream&&) = delete;
    RecordingStream& operator=(const RecordingStream&) = delete;
    RecordingStream& operator=(RecordingStream&&) = delete;

    /// Takes a frame for the next flush.
    void add(const RecordedFrame& frame);
    /// Writes the frames that were added, all in one call, and sees to their safety if that is due.
    /// Throws Failure, which says why, and how many frames are safe; nothing can be written
    /// afterwards.
    void flush();
    /// When flush is to be called although there is no frame.
    [[nodiscard]] std::optional<Clock::time_point> syncDue() const noexcept;
    /// Flushes and closes; the file is safe from the machine's end then. Once. Throws Failure.
    void finish();
    /// Ends the recording of a source that failed: finishes it if there is a report, or if what was
    /// written cannot be taken back; otherwise leaves everything as it was before. Gives what is to
    /// be thrown for it: the fault, and that nothing was kept where that is so. Throws Failure.
    [[nodiscard]] Failure finishAfter(const std::string& fault);

    /// Frames that are written.
    [[nodiscard]] std::uint64_t frames() const noexcept { return frames_; }
    /// Bytes of the file.
    [[nodiscard]] std::uint64_t bytes() const noexcept { return end_ + closingBytes(); }
    [[nodiscard]] const std::string& name() const noexcept { return name_; }
    /// Whether the file stays as far as it is written.
    [[nodiscard]] bool isKept() const noexcept { return isKept_ || !target_->isRewritable(); }
    /// What is where by now, for one who asks while it goes on.
    [[nodiscard]] std::string whereItIs() const;
    [[nodiscard]] bool isFinished() const noexcept { return isFinished_; }

private:
    [[nodiscard]] std::string_view closing() const noexcept;
    [[nodiscard]] std::uint64_t closingBytes() const noexcept;
    void write(bool withClosing);
    [[nodiscard]] bool holdsReport() const noexcept;
    void keepTarget();
    void saveWhatFits(std::size_t written) noexcept;
    void syncIfDue();
    /// Sees to the safety of what is there.
    [[noreturn]] void fail(int error);
    /// What was written is there, but not known to survive the machine's end.
    [[noreturn]] void failUnconfirmed(int error);
    [[nodiscard]] std::string framesText() const;
    [[nodiscard]] std::string themText() const;
    [[nodiscard]] std::string nothingKeptText() const;

    std::unique_ptr<AppendTarget> target_;
    const std::string name_;
    const std::optional<std::chrono::nanoseconds> syncEvery_;
    std::string text_;                          // what the next flush writes
    ContainerWriter writer_;                    // into text_
    std::vector<std::size_t> ends_;             // of the frames in text_
    std::uint64_t end_ = 0;                     // of the last frame in the file
    std::uint64_t frames_ = 0;                  // in the file
    std::optional<std::uint64_t> firstReport_;  // its place among the frames, from 0
    bool isDead_ = false;
    bool isKept_ = false;
    bool isFinished_ = false;
    bool isNew_ = false;  // something was written since the last sync
    Clock::time_point nextSync_;
};

}  // namespace VexaTouch::Tools
