#pragma once

#include "Pipeline/RecordedFrame.h"
#include "Platform/Json.h"

#include <functional>
#include <string>
#include <string_view>

namespace VexaTouch {

/// Writes a version-1 container frame by frame; the text goes to a sink in pieces of bounded size,
/// so that neither frames nor text need be in memory as a whole. Not thread safe.
class ContainerWriter {
public:
    /// Called with each piece; what it throws leaves the operation that wrote.
    using Sink = std::function<void(std::string_view piece)>;

    explicit ContainerWriter(Sink sink);
    /// Appends the whole document to `out`, which must outlive the writer.
    explicit ContainerWriter(std::string& out);
    ~ContainerWriter() = default;
    ContainerWriter(const ContainerWriter&) = delete;
    ContainerWriter& operator=(const ContainerWriter&) = delete;

    /// Appends one frame; a frame of an unknown type is skipped.
    void write(const RecordedFrame& frame);
    /// Closes the document. Nothing may be written afterwards.
    void finish();

private:
    void begin();
    void flush();

    Sink sink_;            // empty when the text goes to the caller's string
    std::string pending_;  // what the sink gets next
    std::string& text_;
    Vexa::JsonWriter json_;
};

}  // namespace VexaTouch
