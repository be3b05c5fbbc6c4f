#include "Tools/RecordingFile.h"

#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Tools/InputFile.h"
#include "Tools/OutputFile.h"
#include "Tools/Progress.h"

#include <exception>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

/// Feeds the whole source, or as much of it as is well formed; gives the bytes that were read.
std::uint64_t feed(ContainerReader& reader, InputFile& source, Streams& streams) {
    Progress progress(streams, "reading " + source.name(), source.size(), 16);
    std::uint64_t bytes = 0;
    for (std::string_view piece = source.next(); !piece.empty(); piece = source.next()) {
        bytes += piece.size();
        if (!reader.write(piece)) {
            break;
        }
        progress.update(bytes);
    }
    return bytes;
}

/// What is wrong with the text and where, around the reader's own words.
std::string faultText(const ContainerReader& reader, std::uint64_t bytes,
                      const std::exception& fault) {
    if (bytes == 0) {
        return std::string("is empty: ") + fault.what();
    }
    const std::string syntax = reader.syntaxError();
    if (!syntax.empty()) {
        const std::uint64_t offset = reader.errorOffset().value_or(bytes);
        const std::string where = offset >= bytes
                                      ? "cut off after " + std::to_string(bytes) + " bytes"
                                      : "no JSON at byte " + std::to_string(offset);
        return where + ": " + fault.what() + " (" + syntax + ")";
    }
    if (const auto frame = reader.errorFrame()) {
        return "frame " + std::to_string(*frame) + ": " + fault.what();
    }
    return fault.what();
}

}  // namespace

RecordingFile readRecording(const std::string& path, Streams& streams) {
    InputFile source(path, streams);
    ContainerReader reader;
    RecordingFile file;
    file.name = source.name();
    file.textBytes = feed(reader, source, streams);
    try {
        file.frames = reader.finish();
    } catch (const std::bad_alloc&) {
        throw;
    } catch (const std::exception& fault) {
        throw Failure(file.name + ": " + faultText(reader, file.textBytes, fault));
    }
    file.version = reader.version().value_or(0);
    return file;
}

void writeRecording(const FrameList& frames, const std::string& path, Streams& streams) {
    OutputFile file(path, streams, OutputFile::Content::Derivable);
    ContainerWriter writer([&file](std::string_view piece) { file.write(piece); });
    Progress progress(streams, "writing " + file.name(), frames.size());
    std::uint64_t written = 0;
    for (const PipelineRecording::Frame& frame : frames) {
        writer.write(frame);
        progress.update(++written);
    }
    writer.finish();
    file.commit();
}

}  // namespace VexaTouch::Tools
