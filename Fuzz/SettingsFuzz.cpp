// Lines of KEY=VALUE, in any text: each is a setting or is refused as the command line refuses it.
// Whatever is set by whatever key, the algorithm keeps to its literal reading, reads back the same,
// and goes on processing frames; a recording of it reads back.

#include "Fuzz/FuzzInput.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/Json.h"
#include "Tests/Reference/Algs.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tests/Support/Touch.h"
#include "Tools/Failure.h"
#include "Tools/SettingKeys.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace {

using namespace VexaTouch;
using Fuzz::FuzzInput;
using Fuzz::require;
using Vexa::PropertyValue;

constexpr std::size_t kMostLines = 50;

void checkRefusal(std::string_view line) {
    try {
        const Tools::Setting setting = Tools::parseSetting(line);
        require(setting.key.starts_with("Algs."), "a setting is the algorithm's");
        require(setting.value == Vexa::readJson(line.substr(line.find('=') + 1)),
                "a setting has the value that was written");
    } catch (const Tools::UsageError& error) {
        require(error.what()[0] != '\0', "a refusal says why");
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    FuzzInput input(data, size);
    PipelineRecording recording;
    Reference::Algs reference;
    std::uint32_t frameNumber = 0;
    for (std::size_t i = 0; i < kMostLines && !input.atEnd(); ++i) {
        const std::string_view line = input.takeText('\n');
        checkRefusal(line);

        const std::string key(line.substr(0, line.find('=')));
        const PropertyValue value =
            Vexa::readJson(line.substr(std::min(line.size(), key.size() + 1)));
        recording.setState("Algs." + key, value);
        recording.setState(key, value);
        reference.setState(key, value);
        if (key.starts_with("Algs.")) {
            reference.setState(key.substr(5), value);
        }
        require(recording.getState("Algs." + key) == reference.getState(key),
                "a state reads as in the literal reading");

        const bool touches = i % 3 != 2;
        ++frameNumber;
        const auto report =
            Testing::imageReport(touches ? Testing::touch("AHN").at(350) : Testing::nothing(),
                                 frameNumber, 200 * frameNumber);
        recording.handleInputReport(report.data(), report.size());
        if (const auto image = InputReport::Image::parse(report.data(), report.size())) {
            reference.handleImage(*image);
        }
        const auto difference = Testing::firstDifference(recording.algs(), reference);
        require(!difference.has_value(), difference.value_or(""));
    }
    const std::string text = recording.json();
    bool allHaveValues = true;
    for (const PipelineRecording::Frame& frame : recording.frames()) {
        allHaveValues &= frame.type == PipelineRecording::Frame::Type::InputReport || frame.value;
    }
    if (allHaveValues) {
        require(PipelineRecording(text).json() == text, "what is written reads back");
    }
    return 0;
}
