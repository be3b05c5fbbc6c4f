#pragma once

#include "Algorithm/Algs.h"
#include "Tools/Replay.h"

#include <string>

namespace VexaTouch::Tools {

/// Makes the trace of a replay: for each played frame one JSON object on a line of its own, with
/// the algorithm's whole state as it stands after that frame, members by their own names. A float
/// is the shortest decimal that reads back to the same single-precision value; one that is not
/// finite is the string inf, -inf or nan.
class TraceText {
public:
    /// The line of a frame, its line feed included. It lives until the next call.
    const std::string& line(const PlayedFrame& played, const Algs& algs);

private:
    void appendStats(const EventStats& stats);

    std::string line_;
    // The counters change on few frames, their text is kept until they do.
    EventStats::Counters lastCounters_;
    std::string lastStats_;
};

}  // namespace VexaTouch::Tools
