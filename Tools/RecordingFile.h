#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Tools/Failure.h"
#include "Tools/Streams.h"

#include <cstdint>
#include <string>

namespace VexaTouch::Tools {

/// A recording as it was read from a file.
struct RecordingFile {
    std::string name;  ///< for messages: the path, or "standard input"
    FrameList frames;
    std::uint32_t version = 0;    ///< of the container
    std::uint64_t textBytes = 0;  ///< size of the text that was read
};

/// Reads a recording from a path, or from the input stream for "-", piece by piece: the text is
/// never in memory as a whole. Throws Failure with one line that names the file, what was wrong and
/// where.
RecordingFile readRecording(const std::string& path, Streams& streams);

/// Writes a version-1 container to a path, or to the result stream for "-". The file appears whole
/// or not at all. Throws Failure.
void writeRecording(const FrameList& frames, const std::string& path, Streams& streams);

}  // namespace VexaTouch::Tools
