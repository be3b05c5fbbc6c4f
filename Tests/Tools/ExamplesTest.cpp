#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Tools/EventRecord.h"
#include "Tools/Replay.h"
#include "Tools/SurfaceSynthesizer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <string>
#include <utility>
#include <vector>

// Every example is a script, the recording that it makes and the events that the recording gives.
// After a change that is meant, script/examples makes them anew.

namespace VexaTouch::Tools {

// How a difference is printed.
static void PrintTo(const EventRecord& event, std::ostream* stream) {
    *stream << eventJson(event);
}

namespace {

using testing::ElementsAreArray;
using testing::IsEmpty;

const std::filesystem::path kFolder = VEXA_SOURCE_DIR "/Examples";

std::string textOf(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    EXPECT_TRUE(file) << path;
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

/// Names of the examples: files of one kind without their extension.
std::vector<std::string> namesWith(std::string_view extension) {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(kFolder)) {
        if (entry.path().extension() == extension) {
            names.push_back(entry.path().stem().string());
        }
    }
    std::sort(names.begin(), names.end());
    return names;
}

struct Container {
    std::uint32_t version = 0;
    FrameList frames;
};

Container containerOf(const std::string& text) {
    ContainerReader reader;
    reader.write(text);
    Container container;
    container.frames = reader.finish();
    container.version = reader.version().value_or(UINT32_MAX);
    return container;
}

std::vector<EventRecord> eventsOf(const std::string& name) {
    Replay replay(containerOf(textOf(kFolder / (name + ".json"))).frames);
    std::vector<EventRecord> events;
    while (replay.canContinue()) {
        const PlayedFrame& played = replay.next();
        events.insert(events.end(), played.events.begin(), played.events.end());
    }
    return events;
}

class ExampleTest : public testing::TestWithParam<std::string> {};

TEST_P(ExampleTest, RecordingIsWhatItsScriptMakes) {
    const std::string recording = textOf(kFolder / (GetParam() + ".json"));
    const auto frames =
        synthesize(GestureScript::parse(textOf(kFolder / (GetParam() + ".gesture"))));
    const Container container = containerOf(recording);
    EXPECT_TRUE(container.frames == frames);
    if (container.version == 1) {
        std::string written;
        ContainerWriter writer([&written](std::string_view piece) { written += piece; });
        for (const auto& frame : frames) {
            writer.write(frame);
        }
        writer.finish();
        EXPECT_TRUE(recording == written) << "not the same bytes";
    }
    EXPECT_EQ(container.version, GetParam() == "version-0" ? 0U : 1U);
}

TEST_P(ExampleTest, ReplayGivesExactlyTheExpectedEvents) {
    EXPECT_THAT(eventsOf(GetParam()),
                ElementsAreArray(readExpectedEvents(kFolder / (GetParam() + ".events"))));
}

TEST_P(ExampleTest, EventsFileIsWhatReplayPrints) {
    std::string text;
    for (const EventRecord& event : eventsOf(GetParam())) {
        text += eventJson(event) + "\n";
    }
    EXPECT_EQ(textOf(kFolder / (GetParam() + ".events")), text);
}

INSTANTIATE_TEST_SUITE_P(All, ExampleTest, testing::ValuesIn(namesWith(".gesture")),
                         [](const auto& test) {
                             std::string name = test.param;
                             std::replace(name.begin(), name.end(), '-', '_');
                             return name;
                         });

TEST(ExamplesTest, EveryExampleHasScriptRecordingAndEvents) {
    EXPECT_EQ(namesWith(".gesture"), namesWith(".json"));
    EXPECT_EQ(namesWith(".gesture"), namesWith(".events"));
}

TEST(ExamplesTest, EveryKindOfEventOccursInEachRegionThatItCan) {
    std::set<std::pair<std::string, std::uint32_t>> seen;
    for (const std::string& name : namesWith(".gesture")) {
        for (const EventRecord& event : eventsOf(name)) {
            seen.emplace(eventKindName(event.kind), event.region);
        }
    }
    std::set<std::pair<std::string, std::uint32_t>> wanted = {{"cancel", 0}, {"firmware-reset", 0}};
    for (const char* kind : {"may-begin", "hold-start", "hold-change", "hold-end", "tap"}) {
        for (const std::uint32_t region : {1U, 2U, 3U}) {
            wanted.emplace(kind, region);
        }
    }
    EXPECT_EQ(seen, wanted);
}

TEST(ExamplesTest, NoiseAndHoverMakeNoEvents) {
    EXPECT_THAT(eventsOf("noise"), IsEmpty());
    EXPECT_THAT(eventsOf("hover"), IsEmpty());
}

TEST(ExamplesTest, TheMixedSessionHasABitOfEverything) {
    std::set<std::string> kinds;
    for (const EventRecord& event : eventsOf("mixed")) {
        kinds.emplace(eventKindName(event.kind));
    }
    EXPECT_EQ(kinds.size(), 7U);
    std::set<PlayedType> types;
    Replay replay(containerOf(textOf(kFolder / "mixed.json")).frames);
    while (replay.canContinue()) {
        types.insert(replay.next().type);
    }
    EXPECT_EQ(types.size(), 4U);
}

}  // namespace
}  // namespace VexaTouch::Tools
