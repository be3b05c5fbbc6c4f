#pragma once

#include "Pipeline/PipelineRecording.h"

#include <cstdint>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch {

/// Reads a recording container piece by piece straight into frames, so that a text need never be in
/// memory as a whole. Not thread safe.
///
/// Whatever the order of members in the text, faults are reported in this order: a syntax error,
/// then what migration refuses, then what the frames lack; of equals the first in the text.
class ContainerReader {
public:
    ContainerReader();
    ~ContainerReader();
    ContainerReader(const ContainerReader&) = delete;
    ContainerReader& operator=(const ContainerReader&) = delete;

    /// Reads the next piece of the text. False once the text is malformed: reading on is pointless.
    bool write(std::string_view piece);

    /// Ends the text and gives its frames. Throws as PipelineRecording's constructor does.
    std::list<PipelineRecording::Frame> finish();

    /// Container version as read (low 32 bits), after finish.
    [[nodiscard]] std::uint32_t version() const noexcept;
    /// Where and what the first fault is, as far as known, after write gave false or finish threw:
    /// bytes read before a syntax error, and the position of the refused frame in its array.
    [[nodiscard]] std::optional<std::uint64_t> errorOffset() const noexcept;
    [[nodiscard]] std::optional<std::uint64_t> errorFrame() const noexcept;
    /// The reader's own words for a syntax error; empty when there was none.
    [[nodiscard]] std::string syntaxError() const;

    /// The whole frames read so far, also of a text that is damaged or cut off; leaves the reader
    /// spent. For recovery only: frames() of a good text come from finish.
    std::list<PipelineRecording::Frame> recover();

private:
    class Handler;
    std::unique_ptr<Handler> handler_;
};

}  // namespace VexaTouch
