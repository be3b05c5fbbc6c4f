#pragma once

#include "Pipeline/FrameList.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch {

/// Reads a recording container piece by piece straight into frames, so that neither a text nor a
/// tree of it need be in memory as a whole. Not thread safe.
///
/// Whatever the order of members in the text, faults come in this order: a syntax error, then what
/// migration refuses, then what the frames lack; of equals the first in the text. Of duplicate
/// members the last one stands.
class ContainerReader {
public:
    ContainerReader();
    ~ContainerReader();
    ContainerReader(const ContainerReader&) = delete;
    ContainerReader& operator=(const ContainerReader&) = delete;

    /// Reads the next piece of the text. False once the text is malformed: reading on is pointless.
    bool write(std::string_view piece);

    /// Ends the text and gives its frames. Throws as PipelineRecording's constructor does.
    FrameList finish();

    /// The version that the text names (its low 32 bits), as far as read.
    [[nodiscard]] std::optional<std::uint32_t> version() const noexcept;
    /// Bytes before a syntax error, after write gave false or finish threw for it.
    [[nodiscard]] std::optional<std::uint64_t> errorOffset() const noexcept;
    /// What the syntax error was, empty when there was none.
    [[nodiscard]] std::string syntaxError() const;
    /// Position of the refused frame in its array, from 0, after finish threw for a frame.
    [[nodiscard]] std::optional<std::uint64_t> errorFrame() const noexcept;

    /// For texts that are damaged or cut off: the whole, well-formed frames read so far, of
    /// whichever version. The reader is spent afterwards.
    FrameList recover();
    /// Whole, well-formed frames read so far, of whichever version.
    [[nodiscard]] std::uint64_t wholeFrames() const noexcept;
    /// Whole frames read so far that were refused.
    [[nodiscard]] std::uint64_t refusedFrames() const noexcept;

private:
    class Handler;
    struct State;
    std::unique_ptr<State> state_;
};

}  // namespace VexaTouch
