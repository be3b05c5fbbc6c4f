// Any text is a HID recording or is refused with the number of a line: piece by piece as whole.
// What was read is written and reads back the same, and a faulty line costs nothing but itself.

#include "Fuzz/FuzzInput.h"
#include "Tools/HidRecorderReader.h"
#include "Tools/HidRecorderWriter.h"

#include <algorithm>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>

namespace {

using namespace VexaTouch;
using Fuzz::require;
using Tools::HidRecorderReader;

struct Answer {
    FrameList frames;
    std::string fault;

    friend bool operator==(const Answer&, const Answer&) = default;
};

Answer read(std::string_view text, std::size_t longest) {
    HidRecorderReader reader;
    try {
        Fuzz::inPieces(text, longest, [&](std::string_view piece) {
            reader.write(piece);
            return true;
        });
        return {reader.finish(), {}};
    } catch (const std::invalid_argument& error) {
        return {{}, error.what()};
    }
}

std::string written(const FrameList& frames) {
    std::string text;
    Tools::HidRecorderWriter writer([&text](std::string_view piece) { text += piece; });
    for (const PipelineRecording::Frame& frame : frames) {
        writer.write(frame);
    }
    writer.finish();
    return text;
}

void checkFault(std::string_view fault) {
    require(fault == "no line of a HID recording" || fault.starts_with("line "),
            "a fault names its line");
    require(std::ranges::all_of(fault, [](char c) { return c >= ' ' && c <= '~'; }),
            "a fault is one printable line");
    require(fault.size() < 200, "a fault is short");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    const Answer answer = read(text, text.size() + 1);
    require(read(text, 1) == answer, "byte by byte as whole");
    require(read(text, 9) == answer, "in pieces as whole");

    std::uint64_t faults = 0;
    std::uint64_t lastLine = 0;
    HidRecorderReader tolerant([&](std::uint64_t line, std::string_view fault) {
        require(line > lastLine, "faults come in order");
        lastLine = line;
        require(!fault.empty(), "a fault says what");
        ++faults;
    });
    tolerant.write(text);
    FrameList kept;
    try {
        kept = tolerant.finish();
    } catch (const std::invalid_argument&) {
        ++faults;
    }
    require((faults == 0) == answer.fault.empty(), "a fault is what reading refuses");
    const std::string once = written(kept);
    require(written(read(once, once.size()).frames) == once, "written twice the same");
    if (answer.fault.empty()) {
        require(kept == answer.frames, "a good recording is read alike");
    } else {
        checkFault(answer.fault);
    }
    return 0;
}
