// Any text is a script or is refused in one printable line that names a line of it; a script makes
// frames whose time goes forward, whose images are images, and that a pipeline takes.

#include "Fuzz/FuzzInput.h"
#include "Pipeline/Pipeline.h"
#include "Tools/GestureScript.h"
#include "Tools/SurfaceSynthesizer.h"

#include <algorithm>
#include <cstdint>
#include <string>
#include <string_view>

namespace {

using namespace VexaTouch;
using namespace VexaTouch::Tools;
using VexaTouch::Fuzz::require;
using Frame = PipelineRecording::Frame;

// Enough to reach every command of a script that a person would write.
constexpr std::uint64_t kMostFrames = 3000;

struct EnoughFrames {};

void checkError(const GestureScriptError& error, std::string_view text) {
    const std::string_view message = error.what();
    const auto lines = 1 + static_cast<std::size_t>(std::count(text.begin(), text.end(), '\n'));
    require(error.line() >= 1 && error.line() <= lines, "an error names a line of the script");
    require(
        std::all_of(message.begin(), message.end(), [](char c) { return c >= ' ' && c <= '~'; }),
        "an error is one printable line");
    require(message.size() < 500, "an error is short");
}

void play(const GestureScript& script) {
    Pipeline pipeline;
    std::uint64_t frames = 0;
    std::uint64_t last = 0;
    SurfaceSynthesizer synthesizer([&](const Frame& frame) {
        require(frame.timestamp > last, "time goes forward");
        last = frame.timestamp;
        pipeline.setTime(frame.timestamp);
        if (frame.type == Frame::Type::State) {
            require(frame.key.starts_with("Algs."), "settings go to the algorithm");
            pipeline.setState(frame.key, frame.value);
        } else {
            pipeline.handleInputReport(frame.report.data(), frame.report.size());
        }
        if (++frames == kMostFrames) {
            throw EnoughFrames();
        }
    });
    require(script.frames <= kMaximumScriptFrames, "a script is bounded");
    try {
        synthesizer.perform(script);
        require(frames == script.frames, "a script makes as many frames as it was checked for");
    } catch (const EnoughFrames&) {
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    try {
        play(GestureScript::parse(text));
    } catch (const GestureScriptError& error) {
        checkError(error, text);
    }
    return 0;
}
