#pragma once

#include "Pipeline/PipelineRecording.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Reads the text format of the Linux HID tools' recorder, piece by piece, into frames: the events
/// of the first device in the text, and what HidRecorderWriter put into comments. Lines of other
/// kinds are ignored. Not thread safe.
class HidRecorderReader {
public:
    /// Called for a line that could not be read: its number from 1 and what is wrong with it.
    using FaultHandler = std::function<void(std::uint64_t line, std::string_view fault)>;

    /// Without a handler the first faulty line throws; with one it is reported and left out.
    explicit HidRecorderReader(FaultHandler onFault = {});

    /// Reads the next piece of the text. Throws std::invalid_argument "line 12: what is wrong".
    void write(std::string_view piece);

    /// Ends the text and gives its frames; the reader is then spent. Throws as write does, and
    /// std::invalid_argument when the text holds no line of the format at all.
    FrameList finish();

    /// Events of further devices, which were left out.
    [[nodiscard]] std::uint64_t otherDevicesEvents() const noexcept { return otherEvents_; }

private:
    void readLine(std::string_view line, bool whole);
    void readEvent(std::string_view text);
    void readComment(std::string_view text, bool whole);
    void readState(std::string_view text);
    void readDevice(std::string_view text);

    FaultHandler onFault_;
    FrameList frames_;
    std::string pending_;  // the beginning of a line whose end has not come yet
    std::uint64_t lineNumber_ = 0;
    std::uint64_t start_ = 0;        // recorded time of the events' zero, in ns
    std::uint64_t nanoseconds_ = 0;  // of the next event
    std::optional<std::uint64_t> firstDevice_;
    bool otherDevice_ = false;  // the lines of another device than the first are being read
    bool recognised_ = false;   // at least one line was of this format
    std::uint64_t otherEvents_ = 0;
};

}  // namespace VexaTouch::Tools
