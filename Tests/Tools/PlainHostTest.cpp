#include "Platform/Json.h"
#include "Shared/Util.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/EventRecord.h"
#include "Tools/RecordingFile.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

// The host in plain C gets the events of each example from the plug-in.

namespace VexaTouch::Tools {
namespace {

const std::filesystem::path kFolder = VEXA_SOURCE_DIR "/Examples";

/// The recording in the words of PlainHost.
std::string plainInput(const std::string& file) {
    Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    std::string text;
    for (const PipelineRecording::Frame& frame : readRecording(file, streams).frames) {
        if (frame.type == PipelineRecording::Frame::Type::State) {
            const bool isPlain =
                frame.value.isNumber() || frame.value.type() == Vexa::PropertyValue::Type::Boolean;
            text +=
                "Pipeline." + frame.key + " = " + (isPlain ? Vexa::writeJson(frame.value) : "null");
        } else if (frame.report.empty()) {
            text += '-';
        } else {
            text += Util::hexStringFromBytes(frame.report);
            text.pop_back();
        }
        text += '\n';
    }
    return text;
}

/// The members of each line of events that a host sees.
std::string expectedOutput(const std::string& file) {
    std::string text;
    for (const EventRecord& event : readExpectedEvents(file)) {
        text += '{';
        appendEventMembers(text, event);
        text += "}\n";
    }
    return text;
}

struct Ended {
    int status = -1;
    std::string out;
};

Ended runPlainHost(const std::string& input) {
    const std::string command =
        "'" VEXATOUCH_PLAIN_HOST "' '" VEXATOUCH_PLUGIN_FILE "' '" + input + "'";
    FILE* pipe = popen(command.c_str(), "r");
    Ended ended;
    if (pipe == nullptr) {
        return ended;
    }
    for (int c = std::fgetc(pipe); c != EOF; c = std::fgetc(pipe)) {
        ended.out += static_cast<char>(c);
    }
    ended.status = pclose(pipe);
    return ended;
}

class PlainHostTest : public testing::TestWithParam<std::string> {};

TEST_P(PlainHostTest, GetsTheEventsOfTheExample) {
    const Testing::TemporaryFolder folder;
    const std::string example = kFolder / GetParam();
    const Ended ended = runPlainHost(folder.file("input", plainInput(example + ".json")));
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.out, expectedOutput(example + ".events"));
}

std::vector<std::string> exampleNames() {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(kFolder)) {
        if (entry.path().extension() == ".events") {
            names.push_back(entry.path().stem());
        }
    }
    std::ranges::sort(names);
    return names;
}

INSTANTIATE_TEST_SUITE_P(Examples, PlainHostTest, testing::ValuesIn(exampleNames()),
                         [](const auto& test) {
                             std::string name = test.param;
                             std::ranges::replace(name, '-', '_');
                             return name;
                         });

TEST(PlainHostTest, RefusesWhatIsNoPlugin) {
    const Testing::TemporaryFolder folder;
    const std::string command =
        "'" VEXATOUCH_PLAIN_HOST "' '" + folder.file("none.so", "text") + "' /dev/null 2>/dev/null";
    EXPECT_NE(std::system(command.c_str()), 0);
}

}  // namespace
}  // namespace VexaTouch::Tools
