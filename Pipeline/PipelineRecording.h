#pragma once

#include "Pipeline/FrameList.h"
#include "Pipeline/Pipeline.h"
#include "Pipeline/RecordedFrame.h"
#include "Platform/HostClock.h"
#include "Platform/PropertyValue.h"

#include <cstddef>
#include <cstdint>
#include <list>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch {

/// A pipeline that records every input it is given, keeps the recording bounded, can write it as a
/// JSON document and can replay it frame by frame into itself.
///
/// Not synchronised: the owner serialises all calls. Copyable; a copy starts with playback idle. It
/// shares the frames, which never change, and costs little however many there are; neither notices
/// what becomes of the other, also on another thread.
class PipelineRecording final : public Pipeline {
public:
    using Frame = RecordedFrame;

    /// An empty, unbounded recording that takes its time from `clock` (which must outlive it).
    explicit PipelineRecording(Vexa::HostClock& clock = Vexa::HostClock::system());

    /// Reads a recording from the bytes of a container, ready to be played.
    /// Throws std::invalid_argument or std::runtime_error with a short lowercase text on any fault
    /// ("json not supplied" when there is no argument).
    explicit PipelineRecording(std::optional<std::string_view> data,
                               Vexa::HostClock& clock = Vexa::HostClock::system());

    /// A recording of these frames, unbounded, ready to be played.
    explicit PipelineRecording(FrameList frames,
                               Vexa::HostClock& clock = Vexa::HostClock::system());

    PipelineRecording(const PipelineRecording& other);
    PipelineRecording& operator=(const PipelineRecording& other);
    PipelineRecording(PipelineRecording&& other) noexcept;
    PipelineRecording& operator=(PipelineRecording&& other) noexcept;
    ~PipelineRecording() = default;

    /// Ignored: time comes from the host clock when recording, from the frames when playing.
    void setTime(std::uint64_t ticks) noexcept override;
    /// Records the state change with the host's time, then forwards it.
    void setState(const std::string& key, Vexa::PropertyValue value) noexcept override;
    /// Records the report with the host's time, whatever it holds, then forwards it.
    void handleInputReport(const std::uint8_t* bytes, std::size_t length) noexcept override;

    /// Appends a frame and ends playback; trims once the list has reached twice the cap.
    void appendFrame(Frame frame);

    /// Keeps the newest `maxCount` input reports and, for each state key, the state frames that
    /// still matter: the newest of each key between two kept reports and before the oldest one.
    static void trimFrames(std::list<Frame>& frames, std::size_t maxCount);
    static void trimFrames(FrameList& frames, std::size_t maxCount);

    /// Sets how many input reports are kept, 0 for all; trims at once if not 0. A trim that erases
    /// the frame under the playback cursor ends the playback.
    void setMaxFrameCount(std::size_t count);
    [[nodiscard]] std::uint64_t maxFrameCount() const noexcept { return _maxFrameCount; }

    [[nodiscard]] const FrameList& frames() const noexcept { return _frames; }

    /// Starts or restarts playback from the first frame.
    void playReset();
    /// True while there is a frame to play.
    [[nodiscard]] bool playCanContinue() const noexcept;
    /// Plays one frame into this pipeline, waiting first (on the calling thread) as long as the
    /// recorded time between two input reports divided by `speed`. A speed that is not above 0
    /// counts as 1; infinity never waits. Throws std::runtime_error "playback finished" when there
    /// is nothing to play.
    void playNextFrame(float speed);

    /// The container of this recording, trimmed to the cap first, as indented JSON.
    std::string json();

    /// The version-1 form of a parsed container: the value itself when it is one already.
    /// Throws std::invalid_argument on any fault.
    static Vexa::PropertyValue migrateSerializedContainer(const Vexa::PropertyValue& container);

private:
    struct Playback {
        bool valid = false;
        FrameList::Iterator iterator;
        std::uint64_t startTimeMach = 0;                     ///< host ticks
        std::optional<std::uint64_t> lastInputReportTimeNs;  ///< recorded time
    };

    /// Trims; the cursor of a running playback goes along with its frame or ends with it.
    void trimToCap();
    void waitForFrame(const Frame& frame, float speed);

    FrameList _frames;  ///< oldest first
    std::uint64_t _maxFrameCount = 0;
    Playback _play;
    Vexa::HostClock* clock_;
};

}  // namespace VexaTouch
