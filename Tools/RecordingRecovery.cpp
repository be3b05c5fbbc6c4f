#include "Tools/RecordingRecovery.h"

#include "Pipeline/ContainerReader.h"
#include "Platform/JsonParser.h"
#include "Tools/HidRecorderReader.h"

#include <algorithm>
#include <cstddef>
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

// How the object at the beginning of a text goes on, as far as it is JSON.
struct Walk {
    std::optional<std::size_t> end;  // behind it, where it is whole
    // Braces and brackets of what is still open, outermost first.
    std::vector<std::size_t> open;
};

Walk walk(std::string_view text) {
    Walk walked;
    bool isInText = false;
    for (std::size_t at = 0; at < text.size(); ++at) {
        const char character = text[at];
        if (isInText) {
            at += character == '\\' ? 1U : 0U;
            isInText = character != '"';
        } else if (character == '"') {
            isInText = true;
        } else if (character == '{' || character == '[') {
            walked.open.push_back(at);
        } else if ((character == '}' || character == ']') && !walked.open.empty()) {
            walked.open.pop_back();
            if (walked.open.empty()) {
                walked.end = at + 1;
                break;
            }
        }
    }
    return walked;
}

// What an object is.
struct Probe {
    enum class Outcome : std::uint8_t { IsFrame, Refused, Broken };

    Outcome outcome;
    std::size_t end;  // behind the object, or where it is broken
};

// What stands at the beginning of the text. Reads little more than that element, or the search for
// a frame would read the rest of the text anew at each brace.
Probe probe(std::string_view begin, std::string_view text) {
    using Outcome = Probe::Outcome;
    constexpr std::size_t kFirstPiece = 64;
    ContainerReader reader;
    reader.write(begin);
    std::size_t piece = kFirstPiece;
    for (std::size_t read = 0; read < text.size(); read += piece, piece *= 2) {
        const bool isGood = reader.write(text.substr(read, piece));
        if (reader.wholeFrames() + reader.refusedFrames() > 0) {
            // Pieces end anywhere: what counts is the first element alone.
            const std::size_t end = walk(text).end.value_or(text.size());
            ContainerReader first;
            first.write(begin);
            first.write(text.substr(0, end));
            return {first.wholeFrames() > 0 ? Outcome::IsFrame : Outcome::Refused, end};
        }
        if (!isGood) {
            const std::uint64_t offset = reader.errorOffset().value_or(begin.size());
            return {Outcome::Broken, offset - std::min<std::uint64_t>(offset, begin.size())};
        }
    }
    return {Outcome::Broken, text.size()};
}

// Whether the text is a container with anything in it.
bool isContainer(std::string_view text) {
    ContainerReader reader;
    reader.write(text);
    return reader.wholeFrames() + reader.refusedFrames() > 0;
}

// Whether what stands before the text is more likely an element of an array than a member of an
// object that is broken.
bool isBehindElement(std::string_view text) {
    constexpr std::string_view kWhite = " \n\r\t";
    const std::size_t at = text.find_first_not_of(kWhite);
    if (at == std::string_view::npos || text[at] == ']') {
        return true;
    }
    const std::size_t next = text.find_first_not_of(kWhite, at + 1);
    return text[at] == ',' && (next == std::string_view::npos || text[next] != '"');
}

// The rest of the text from the first object on that is a frame.
struct Resumed {
    std::uint64_t position;
    Attempt attempt;
};

// Searches a text for where reading can be taken up again behind a fault.
class Search {
public:
    explicit Search(std::string_view text) : text_(text) {}

    // Takes up reading after a fault at `faultAt`. The object that was being read when the fault
    // showed may have swallowed the beginning of a good one (a text without its closing quote), so
    // the search begins at the last brace before the fault; what comes no further than the fault is
    // that object itself, or one that has been read already.
    std::optional<Resumed> resume(std::uint64_t faultAt, std::optional<std::uint32_t> version) {
        isBroken_.resize(text_.size());
        const auto brace = faultAt == 0 ? std::string_view::npos : text_.rfind('{', faultAt - 1);
        std::size_t position = brace == std::string_view::npos ? text_.find('{') : brace;
        while (position != std::string_view::npos) {
            std::size_t next = position + 1;
            if (!isBroken_[position]) {
                const std::string_view rest = text_.substr(position);
                bool isWhole = false;
                bool isElement = false;
                std::size_t brokenAt = 0;
                for (const std::string_view begin : {kBeginVersion1, kBeginVersion0}) {
                    if (version && (*version == 0) != (begin == kBeginVersion0)) {
                        continue;
                    }
                    const Probe probed = probe(begin, rest);
                    if (probed.outcome == Probe::Outcome::Broken) {
                        brokenAt = std::max(brokenAt, probed.end);
                        continue;
                    }
                    isWhole = true;
                    if (probed.outcome == Probe::Outcome::IsFrame) {
                        Attempt attempt = readFrom(begin, rest);
                        if (!attempt.stopped || position + *attempt.stopped > faultAt) {
                            return Resumed{position, std::move(attempt)};
                        }
                    }
                    isElement = probed.outcome == Probe::Outcome::Refused;
                    next = position + probed.end;
                }
                if (!isWhole) {
                    markBroken(position, brokenAt);
                }
                // A damaged beginning makes an element of the container itself.
                if (isElement && isContainer(text_.substr(position, next - position))) {
                    next = position + 1;
                } else if (isElement && next > faultAt && isBehindElement(text_.substr(next))) {
                    ++refused_;
                }
            }
            position = text_.find('{', next);
        }
        return std::nullopt;
    }

    // Whole elements that are no frames, which were passed over.
    [[nodiscard]] std::uint64_t refused() const noexcept { return refused_; }

private:
    // What an object has open where it is broken is broken there as well. But for the innermost
    // where only the nesting was too deep, which is less deep from there.
    void markBroken(std::size_t position, std::size_t length) {
        constexpr std::size_t kDeep = Vexa::kJsonMaxDepth - 8;
        const Walk walked = walk(text_.substr(position, length));
        std::size_t left = std::min(walked.open.size(), kDeep);
        for (const std::size_t at : walked.open) {
            if (left-- == 0) {
                break;
            }
            isBroken_[position + at] = true;
        }
    }

    std::string_view text_;
    std::vector<bool> isBroken_;  // by the place of a brace
    std::uint64_t refused_ = 0;
};

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
    Search search(text);
    while (attempt.stopped) {
        position += *attempt.stopped;
        std::string damage = position >= text.size()
                                 ? "cut off after " + std::to_string(text.size()) + " bytes"
                                 : "no JSON at byte " + std::to_string(position);
        damage += " (" + attempt.syntaxError + ")";
        std::optional<Resumed> resumed = search.resume(position, recovery.version);
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
    refused += search.refused();
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
