#include "Tools/RecordingRecovery.h"

#include "Pipeline/ContainerReader.h"
#include "Tools/HidRecorderReader.h"

#include <algorithm>
#include <exception>
#include <iterator>
#include <new>
#include <utility>

namespace VexaTouch::Tools {
namespace {

using Frame = PipelineRecording::Frame;

// Beginnings of a container, behind which a frame may stand, by version.
constexpr std::string_view kBeginVersion0 = R"({"Version":0,"Reports":[)";
constexpr std::string_view kBeginVersion1 = R"({"Version":1,"Frames":[)";

struct Attempt {
    FrameList frames;
    std::uint64_t refused = 0;             // whole elements that are no frames
    std::string fault;                     // of the document as a whole, empty when it is good
    std::string syntaxError;               // why the text could not be read on
    std::optional<std::uint64_t> stopped;  // where, counted from the beginning of the text
    std::optional<std::uint32_t> version;
};

// Reads the text as far as it goes, as if it stood behind `begin`.
Attempt readFrom(std::string_view begin, std::string_view text) {
    ContainerReader reader;
    if (reader.write(begin)) {
        reader.write(text);
    }
    Attempt attempt;
    try {
        attempt.frames = reader.finish();
    } catch (const std::bad_alloc&) {
        throw;
    } catch (const std::exception& error) {
        attempt.fault = error.what();
        attempt.refused = reader.refusedFrames();
        attempt.frames = reader.recover();
    }
    if (const auto offset = reader.errorOffset()) {
        attempt.stopped = *offset - std::min<std::uint64_t>(*offset, begin.size());
        attempt.syntaxError = reader.syntaxError();
    }
    attempt.version = reader.version();
    return attempt;
}

// Whether a frame stands at the beginning of the text. Reads little more than that element, or the
// search for a frame would read the rest of the text anew at each brace.
bool beginsWithFrame(std::string_view begin, std::string_view text) {
    constexpr std::size_t kFirstPiece = 64;
    ContainerReader reader;
    reader.write(begin);
    std::size_t piece = kFirstPiece;
    for (std::size_t read = 0; read < text.size(); read += piece, piece *= 2) {
        const bool isGood = reader.write(text.substr(read, piece));
        if (reader.wholeFrames() + reader.refusedFrames() > 0) {
            // Pieces end anywhere: one of the next elements may be the frame, which does as well.
            return reader.wholeFrames() > 0;
        }
        if (!isGood) {
            return false;
        }
    }
    return false;
}

// The rest of the text from the first object on that is a frame.
struct Resumed {
    std::uint64_t position;
    Attempt attempt;
};

// Takes up reading after a fault at `faultAt`. The object that was being read when the fault showed
// may have swallowed the beginning of a good one (a text without its closing quote), so the search
// begins at the last brace before the fault; what comes no further than the fault is that object
// itself, or one that has been read already.
std::optional<Resumed> resume(std::string_view text, std::uint64_t faultAt,
                              std::optional<std::uint32_t> version) {
    const auto brace = faultAt == 0 ? std::string_view::npos : text.rfind('{', faultAt - 1);
    for (auto position = brace == std::string_view::npos ? text.find('{') : brace;
         position != std::string_view::npos; position = text.find('{', position + 1)) {
        for (const std::string_view begin : {kBeginVersion1, kBeginVersion0}) {
            if (version && (*version == 0) != (begin == kBeginVersion0)) {
                continue;
            }
            if (!beginsWithFrame(begin, text.substr(position))) {
                continue;
            }
            Attempt attempt = readFrom(begin, text.substr(position));
            const bool further = !attempt.stopped || position + *attempt.stopped > faultAt;
            if (further && !attempt.frames.empty()) {
                return Resumed{position, std::move(attempt)};
            }
        }
    }
    return std::nullopt;
}

std::string elementsText(std::uint64_t refused) {
    return std::to_string(refused) +
           (refused == 1 ? " element is no frame" : " elements are no frames");
}

}  // namespace

RecordingRecovery recoverContainer(std::string_view text) {
    Attempt attempt = readFrom({}, text);
    RecordingRecovery recovery{
        .frames = std::move(attempt.frames), .version = attempt.version, .damages = {}};
    if (attempt.fault.empty()) {
        return recovery;
    }
    std::uint64_t refused = attempt.refused;
    if (!attempt.stopped) {
        recovery.damages.push_back(attempt.fault);
    }
    std::uint64_t position = 0;
    while (attempt.stopped) {
        position += *attempt.stopped;
        std::string damage = position >= text.size()
                                 ? "cut off after " + std::to_string(text.size()) + " bytes"
                                 : "no JSON at byte " + std::to_string(position);
        damage += " (" + attempt.syntaxError + ")";
        std::optional<Resumed> resumed = resume(text, position, recovery.version);
        if (!resumed) {
            recovery.damages.push_back(std::move(damage));
            break;
        }
        recovery.damages.push_back(damage + ", read on at byte " +
                                   std::to_string(resumed->position));
        position = resumed->position;
        attempt = std::move(resumed->attempt);
        refused += attempt.refused;
        recovery.frames.append(std::move(attempt.frames));
    }
    if (refused > 0) {
        recovery.damages.push_back(elementsText(refused));
    }
    return recovery;
}

RecordingRecovery recoverHidRecording(std::string_view text) {
    RecordingRecovery recovery;
    HidRecorderReader reader([&recovery](std::uint64_t line, std::string_view fault) {
        recovery.damages.push_back("line " + std::to_string(line) + ": " + std::string(fault));
    });
    reader.write(text);
    try {
        recovery.frames = reader.finish();
    } catch (const std::invalid_argument& error) {
        recovery.damages.emplace_back(error.what());
    }
    return recovery;
}

}  // namespace VexaTouch::Tools
