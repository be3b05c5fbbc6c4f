#pragma once

#include "Algorithm/Algs.h"
#include "Tools/Replay.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Writes a replay as comma-separated values (RFC 4180): a header line, then a row for each played
/// frame. Pixel values are those of the report; flags, region and scores are the algorithm's after
/// the frame, in frames of any type. What a frame of some type does not have stays empty.
class CsvExport {
public:
    /// Called with each piece; what it throws leaves the operation that wrote.
    using Sink = std::function<void(std::string_view piece)>;

    explicit CsvExport(Sink sink);

    void write(const PlayedFrame& played, const Algs& algs);
    /// Ends the text. Nothing may be written afterwards.
    void finish();

private:
    void flush();

    Sink sink_;
    std::string text_;
    std::optional<std::uint64_t> startNs_;  // recorded time of the first frame
};

}  // namespace VexaTouch::Tools
