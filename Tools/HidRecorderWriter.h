#pragma once

#include "Pipeline/PipelineRecording.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Writes a recording in the text format of the Linux HID tools' recorder, so that their replayer
/// and their decoder can be used on it. What the format has no line for travels in comments that
/// begin with "# vexatouch: ", and HidRecorderReader brings it back. Not thread safe.
class HidRecorderWriter {
public:
    /// Called with each piece; what it throws leaves the operation that wrote.
    using Sink = std::function<void(std::string_view piece)>;

    explicit HidRecorderWriter(Sink sink);

    /// Appends one frame; a frame of an unknown type is skipped.
    void write(const PipelineRecording::Frame& frame);
    /// Ends the text. Nothing may be written afterwards.
    void finish();

private:
    void writeHeader();
    void writeState(const PipelineRecording::Frame& frame);
    void writeReport(const PipelineRecording::Frame& frame);
    void flush();

    Sink sink_;
    std::string text_;
    std::optional<std::uint64_t> start_;  // recorded time, in ns, of the events' zero
};

}  // namespace VexaTouch::Tools
