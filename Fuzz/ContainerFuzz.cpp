// Any text is a container or is refused with one of the reader's texts: piece by piece as whole,
// streamed as by way of a parsed value and its migration. What was read is written and reads back
// the same; recovery gives at least what reading gives.

#include "Fuzz/FuzzInput.h"
#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/Json.h"
#include "Shared/Util.h"
#include "Tools/RecordingRecovery.h"

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

namespace {

using namespace VexaTouch;
using Fuzz::require;
using Vexa::PropertyValue;

/// Frames, or what was thrown: the text with a letter for its type.
struct Answer {
    FrameList frames;
    std::string fault;

    friend bool operator==(const Answer&, const Answer&) = default;
};

template <class Read>
Answer answerOf(Read&& read) {
    try {
        return {read(), {}};
    } catch (const std::invalid_argument& error) {
        return {{}, std::string("i: ") + error.what()};
    } catch (const std::runtime_error& error) {
        return {{}, std::string("r: ") + error.what()};
    }
}

/// The whole text in one piece (longest 0) or in pieces.
Answer streamed(std::string_view text, std::size_t longest) {
    ContainerReader reader;
    if (longest == 0) {
        reader.write(text);
    } else {
        Fuzz::inPieces(text, longest, [&](std::string_view piece) { return reader.write(piece); });
    }
    Answer answer = answerOf([&] { return reader.finish(); });
    require(reader.errorOffset().value_or(0) <= text.size(), "a fault lies within the text");
    require(reader.errorOffset().has_value() == !reader.syntaxError().empty(),
            "a syntax error has a place and a text");
    return answer;
}

PipelineRecording::Frame frameFromValue(const PropertyValue& element) {
    PipelineRecording::Frame frame;
    const PropertyValue type = element.member("Type");
    if (!type.asString()) {
        throw std::invalid_argument("invalid frame type");
    }
    const PropertyValue timestamp = element.member("Timestamp");
    if (!timestamp.isNumber()) {
        throw std::invalid_argument("invalid frame timestamp");
    }
    frame.timestamp = timestamp.toUnsigned64();
    if (*type.asString() == "State") {
        frame.type = PipelineRecording::Frame::Type::State;
        const PropertyValue key = element.member("Key");
        if (!key.asString()) {
            throw std::invalid_argument("invalid state key");
        }
        frame.key = std::string(*key.asString());
        frame.value = element.member("Value");
        if (!frame.value) {
            throw std::invalid_argument("invalid state value class");
        }
    } else if (*type.asString() == "InputReport") {
        const PropertyValue report = element.member("Report");
        if (!report.asString()) {
            throw std::invalid_argument("invalid report");
        }
        frame.report = Util::bytesFromHexString(*report.asString());
    } else {
        throw std::invalid_argument("invalid frame type");
    }
    return frame;
}

/// The long way: a tree of the whole text, its migration, its frames.
FrameList byValue(std::string_view text) {
    PropertyValue container;
    try {
        container = PipelineRecording::migrateSerializedContainer(Vexa::readJson(text));
    } catch (const std::exception& error) {
        throw std::runtime_error(std::string("migrateSerializedContainer failed: ") + error.what());
    }
    const PropertyValue elements = container.member("Frames");
    if (!elements.asArray()) {
        throw std::invalid_argument("invalid frames");
    }
    FrameList frames;
    for (const PropertyValue element : *elements.asArray()) {
        frames.push_back(frameFromValue(element));
    }
    return frames;
}

std::string written(const FrameList& frames) {
    std::string text;
    ContainerWriter writer([&text](std::string_view piece) { text += piece; });
    for (const PipelineRecording::Frame& frame : frames) {
        writer.write(frame);
    }
    writer.finish();
    return text;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    const Answer answer = streamed(text, 0);
    require(streamed(text, 1) == answer, "byte by byte as whole");
    require(streamed(text, 9) == answer, "in pieces as whole");
    require(answerOf([&] { return byValue(text); }) == answer, "streamed as by value");

    const Tools::RecordingRecovery recovery = Tools::recoverContainer(text);
    require(recovery.damages.empty() == answer.fault.empty(), "damage is what reading refuses");
    if (!answer.fault.empty()) {
        require(answer.frames.empty(), "a refused container has no frames");
        return 0;
    }
    require(recovery.frames == answer.frames, "recovery leaves a good container alone");
    // A number that overflowed has no JSON form and becomes null, once.
    const std::string once = written(answer.frames);
    const Answer back = streamed(once, 0);
    require(back.fault.empty() && back.frames.size() == answer.frames.size(),
            "what is written reads back");
    require(written(back.frames) == once, "written twice the same");
    return 0;
}
