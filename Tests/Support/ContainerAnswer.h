#pragma once

#include "Pipeline/ContainerReader.h"
#include "Pipeline/FrameList.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/Json.h"
#include "Platform/PropertyValue.h"
#include "Tests/Support/RecordingFrames.h"

#include <cstdint>
#include <exception>
#include <ostream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <typeinfo>
#include <vector>

/// What reading a container gives, by whichever way it is read.
namespace VexaTouch::Testing {

/// Frames, or the exact type and text of the exception.
struct ContainerAnswer {
    FrameList frames = {};
    std::string fault = {};

    friend bool operator==(const ContainerAnswer&, const ContainerAnswer&) = default;
};

inline void PrintTo(const ContainerAnswer& answer, std::ostream* out) {
    *out << (answer.fault.empty() ? ::testing::PrintToString(answer.frames) : answer.fault);
}

inline ContainerAnswer invalidArgument(const std::string& text) {
    return {.fault = "invalid_argument: " + text};
}
inline ContainerAnswer runtimeError(const std::string& text) {
    return {.fault = "runtime_error: " + text};
}
inline ContainerAnswer migrationError(const std::string& text) {
    return runtimeError("migrateSerializedContainer failed: " + text);
}

template <typename Read>
ContainerAnswer answerOf(Read&& read) {
    try {
        return {.frames = read()};
    } catch (const std::exception& error) {
        if (typeid(error) == typeid(std::invalid_argument)) {
            return invalidArgument(error.what());
        }
        if (typeid(error) == typeid(std::runtime_error)) {
            return runtimeError(error.what());
        }
        return {.fault = std::string("neither: ") + error.what()};
    }
}

/// By the reader, in pieces of this length.
inline ContainerAnswer streamed(std::string_view text, std::size_t pieceLength = ~std::size_t{0}) {
    return answerOf([&] {
        ContainerReader reader;
        while (!text.empty()) {
            const std::string_view piece = text.substr(0, pieceLength);
            text.remove_prefix(piece.size());
            if (!reader.write(piece)) {
                break;
            }
        }
        return reader.finish();
    });
}

/// By the constructor.
inline ContainerAnswer constructed(std::string_view text) {
    return answerOf([&] { return PipelineRecording(text).frames(); });
}

/// Hexadecimal text by the standard library.
inline std::vector<std::uint8_t> literalBytesFromHexString(const std::string& text) {
    std::istringstream stream(text);
    std::vector<std::uint8_t> bytes;
    std::uint16_t value = 0;
    while (stream >> std::hex >> value) {
        if (value > 0xFF) {
            throw std::invalid_argument("invalid hex string");
        }
        bytes.push_back(static_cast<std::uint8_t>(value));
    }
    return bytes;
}

inline PipelineRecording::Frame frameOfTree(const Vexa::PropertyValue& element) {
    const Vexa::PropertyValue type = element.member("Type");
    if (!type.asString()) {
        throw std::invalid_argument("invalid frame type");
    }
    const Vexa::PropertyValue timestamp = element.member("Timestamp");
    if (!timestamp.isNumber()) {
        throw std::invalid_argument("invalid frame timestamp");
    }
    if (*type.asString() == "State") {
        const Vexa::PropertyValue key = element.member("Key");
        if (!key.asString()) {
            throw std::invalid_argument("invalid state key");
        }
        const Vexa::PropertyValue value = element.member("Value");
        if (!value) {
            throw std::invalid_argument("invalid state value class");
        }
        return stateFrame(timestamp.toUnsigned64(), std::string(*key.asString()), value);
    }
    if (*type.asString() == "InputReport") {
        const Vexa::PropertyValue report = element.member("Report");
        if (!report.asString()) {
            throw std::invalid_argument("invalid report");
        }
        return reportFrame(timestamp.toUnsigned64(),
                           literalBytesFromHexString(std::string(*report.asString())));
    }
    throw std::invalid_argument("invalid frame type");
}

/// By a tree of the whole text, its migration, and a walk over what that gives: slow and literal.
inline ContainerAnswer readByTree(std::string_view text) {
    return answerOf([&] {
        Vexa::PropertyValue container;
        try {
            container = PipelineRecording::migrateSerializedContainer(Vexa::readJson(text));
        } catch (const std::exception& error) {
            throw std::runtime_error(std::string("migrateSerializedContainer failed: ") +
                                     error.what());
        }
        const Vexa::PropertyValue elements = container.member("Frames");
        if (!elements.asArray()) {
            throw std::invalid_argument("invalid frames");
        }
        FrameList frames;
        for (const Vexa::PropertyValue element : *elements.asArray()) {
            frames.push_back(frameOfTree(element));
        }
        return frames;
    });
}

}  // namespace VexaTouch::Testing
