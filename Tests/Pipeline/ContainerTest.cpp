#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Pipeline/PipelineRecording.h"
#include "Tests/Support/ContainerAnswer.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/RecordingFrames.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstdint>
#include <limits>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch {
namespace {

using namespace std::string_literals;
using namespace Testing;
using Bytes = std::vector<std::uint8_t>;
using Frame = PipelineRecording::Frame;
using Frames = FrameList;
using Vexa::PropertyValue;

/// What every way of reading gives; that they agree is tested on the way.
ContainerAnswer read(std::string_view text) {
    const ContainerAnswer answer = streamed(text);
    EXPECT_EQ(streamed(text, 1), answer) << "byte by byte: " << text;
    EXPECT_EQ(streamed(text, 7), answer) << "in pieces: " << text;
    EXPECT_EQ(constructed(text), answer) << "by the constructor: " << text;
    EXPECT_EQ(readByTree(text), answer) << "by way of a tree: " << text;
    return answer;
}

ContainerAnswer frames(Frames all) {
    return {.frames = std::move(all)};
}

/// A version-1 container of these frame objects.
std::string container(const std::string& elements) {
    return R"({"Version":1,"Frames":[)" + elements + "]}";
}
/// A version-0 container of these report objects.
std::string oldContainer(const std::string& elements) {
    return R"({"Version":0,"Reports":[)" + elements + "]}";
}

const std::string kReport = R"({"Type":"InputReport","Timestamp":5,"Report":"07 08 "})";
const std::string kState = R"({"Type":"State","Timestamp":6,"Key":"a","Value":0.5})";
const Frame kReportFrame = reportFrame(5, {7, 8});
const Frame kStateFrame = stateFrame(6, "a", 0.5);

std::string written(Frames all) {
    return PipelineRecording(std::move(all)).json();
}

// Writing.

TEST(ContainerWriteTest, NoFramesAreAnEmptyArray) {
    EXPECT_EQ(written({}), "{\n  \"Version\": 1,\n  \"Frames\": []\n}\n");
}

TEST(ContainerWriteTest, AReportAndAStateAsText) {
    EXPECT_EQ(written({stateFrame(1'000'000, "Algs.ActivationThreshold", 0.5),
                       reportFrame(9'000'000, {0x01, 0xAB, 0x00})}),
              R"({
  "Version": 1,
  "Frames": [
    {
      "Type": "State",
      "Timestamp": 1000000,
      "Key": "Algs.ActivationThreshold",
      "Value": 0.5
    },
    {
      "Type": "InputReport",
      "Timestamp": 9000000,
      "Report": "01 ab 00 "
    }
  ]
}
)");
}

TEST(ContainerWriteTest, AStateWithoutAValueHasNoSuchMemberAndIsRefusedOnReading) {
    const std::string text = written({stateFrame(1, "a", PropertyValue())});
    EXPECT_EQ(text, R"({
  "Version": 1,
  "Frames": [
    {
      "Type": "State",
      "Timestamp": 1,
      "Key": "a"
    }
  ]
}
)");
    EXPECT_EQ(read(text), invalidArgument("invalid state value class"));
}

TEST(ContainerWriteTest, NullIsAValueLikeAnyOther) {
    const Frames all = {stateFrame(1, "a", PropertyValue::null())};
    const std::string text = written(all);
    EXPECT_THAT(text, ::testing::HasSubstr("\"Value\": null\n"));
    EXPECT_EQ(read(text), frames(all));
}

TEST(ContainerWriteTest, AFrameOfUnknownTypeIsSkipped) {
    Frame unknown = kStateFrame;
    unknown.type = static_cast<Frame::Type>(7);
    EXPECT_EQ(written({unknown, kReportFrame, unknown, kStateFrame}),
              written({kReportFrame, kStateFrame}));
}

TEST(ContainerWriteTest, FramesOfEveryKindReadBack) {
    using namespace std::string_literals;
    const Frames all = {
        reportFrame(0, {}),
        reportFrame(~std::uint64_t{0}, imageReport(touch("A").at(350), 1, 10)),
        reportFrame(1, Bytes(65'536, 0xFF)),
        stateFrame(2, "", ""),
        stateFrame(3, "quote \" back \\ slash / line \n zero \0 é 漢 😀"s, "é\"\\\n"s),
        stateFrame(4, "a", true),
        stateFrame(5, "a", std::numeric_limits<std::uint64_t>::max()),
        stateFrame(6, "a", std::numeric_limits<std::int64_t>::min()),
        stateFrame(7, "a", 200.0),
        stateFrame(8, "a", -0.0),
        stateFrame(9, "a", 5e-324),
        stateFrame(10, "a", PropertyValue::Array{1, PropertyValue::Array{}, 2.5, "x"}),
        stateFrame(11, "a",
                   PropertyValue::Dictionary{{"", PropertyValue::null()},
                                             {"Type", PropertyValue::Dictionary{}}}),
    };
    const std::string text = written(all);
    EXPECT_EQ(read(text), frames(all));
    EXPECT_EQ(written(read(text).frames), text);
}

TEST(ContainerWriteTest, ASingleIsWrittenWithItsExactValue) {
    EXPECT_EQ(read(written({stateFrame(1, "a", 0.1F)})),
              frames({stateFrame(1, "a", static_cast<double>(0.1F))}));
}

TEST(ContainerWriteTest, WhatHasNoJsonFormIsStillWritten) {
    EXPECT_EQ(
        read(written({stateFrame(1, "bytes", PropertyValue::Bytes{1, 0xAB}),
                      stateFrame(2, "number", std::numeric_limits<double>::infinity()),
                      stateFrame(3, "number", std::numeric_limits<float>::quiet_NaN()),
                      stateFrame(4, "text", "a\xFFz"), stateFrame(5, "key \xC3", 1)})),
        frames({stateFrame(1, "bytes", "01 ab "), stateFrame(2, "number", PropertyValue::null()),
                stateFrame(3, "number", PropertyValue::null()),
                stateFrame(4, "text", "a\xEF\xBF\xBDz"), stateFrame(5, "key \xEF\xBF\xBD", 1)}));
}

TEST(ContainerWriteTest, APiecewiseWriterWritesWhatTheRecordingWrites) {
    Frames all;
    for (std::uint64_t i = 0; i < 2000; ++i) {
        all.push_back(reportFrame(i, Bytes(73, static_cast<std::uint8_t>(i))));
    }
    std::string text;
    std::size_t pieces = 0;
    std::size_t longest = 0;
    ContainerWriter writer([&](std::string_view piece) {
        text += piece;
        ++pieces;
        longest = std::max(longest, piece.size());
    });
    for (const Frame& frame : all) {
        writer.write(frame);
    }
    writer.finish();
    EXPECT_EQ(text, written(all));
    EXPECT_GT(pieces, 5U);
    EXPECT_LT(longest, 100'000U);
}

TEST(ContainerWriteTest, WhatASinkThrowsLeavesTheWriter) {
    ContainerWriter writer([](std::string_view) { throw std::runtime_error("disk full"); });
    EXPECT_THROW(writer.finish(), std::runtime_error);
}

TEST(ContainerWriteTest, ACappedRecordingIsTrimmedBeforeItIsWritten) {
    FakeHostClock clock;
    PipelineRecording recording(clock);
    recording.setMaxFrameCount(2);
    for (std::uint8_t i = 1; i <= 3; ++i) {
        recording.handleInputReport(&i, 1);
    }
    const PipelineRecording back(recording.json(), clock);
    EXPECT_EQ(back.frames(), (Frames{reportFrame(0, {2}), reportFrame(0, {3})}));
    EXPECT_EQ(back.maxFrameCount(), 0U);
}

// Reading.

TEST(ContainerReadTest, ARecordingReadBackIsReadyToBePlayed) {
    FakeHostClock clock;
    PipelineRecording recording(container(kState + "," + kReport), clock);
    EXPECT_EQ(recording.frames(), (Frames{kStateFrame, kReportFrame}));
    EXPECT_EQ(recording.maxFrameCount(), 0U);
    EXPECT_EQ(recording.timeMach(), 0U);
    EXPECT_FALSE(recording.playCanContinue());
    recording.playReset();
    recording.playNextFrame(1.0F);
    recording.playNextFrame(1.0F);
    EXPECT_FALSE(recording.playCanContinue());
}

TEST(ContainerReadTest, AnAbsentArgumentIsNotAnEmptyText) {
    EXPECT_EQ(answerOf([] { return PipelineRecording(std::nullopt).frames(); }),
              invalidArgument("json not supplied"));
    EXPECT_EQ(answerOf([] { return PipelineRecording(std::string_view()).frames(); }),
              migrationError("invalid container"));
    EXPECT_EQ(read(""), migrationError("invalid container"));
}

TEST(ContainerReadTest, WhatIsNoJsonIsNoContainer) {
    for (const char* text :
         {" \n", "{", "}", "nonsense", R"({"Version":1,"Frames":[)",
          R"({"Version":1,"Frames":[]}})", R"({"Version":1,"Frames":[],})",
          R"({"Version":01,"Frames":[]})", "{'Version':1}",
          "\xEF\xBB\xBF{\"Version\":1,\"Frames\":[]}", "{\"Version\":1,\"Frames\":[]}\xFF",
          "{\"\xC3\":1,\"Version\":1,\"Frames\":[]}", "{\"Version\":NaN,\"Frames\":[]}"}) {
        EXPECT_EQ(read(text), migrationError("invalid container")) << text;
    }
    EXPECT_EQ(read(std::string_view("{\"Version\":1,\"Frames\":[]}\0", 26)),
              migrationError("invalid container"));
}

TEST(ContainerReadTest, WhatIsNoObjectIsNoContainer) {
    for (const char* text :
         {"[]", "null", "1", "1.5", "\"Version\"", "true", R"([{"Version":1}])"}) {
        EXPECT_EQ(read(text), migrationError("invalid container")) << text;
    }
}

TEST(ContainerReadTest, TheVersionMustBeANumber) {
    for (const char* version : {"\"1\"", "true", "false", "null", "[1]", "{}", "\"\""}) {
        EXPECT_EQ(read(std::string(R"({"Version":)") + version + R"(,"Frames":[]})"),
                  migrationError("invalid version"))
            << version;
    }
    EXPECT_EQ(read("{}"), migrationError("invalid version"));
    EXPECT_EQ(read(R"({"Frames":[]})"), migrationError("invalid version"));
    EXPECT_EQ(read(R"({"version":1,"Frames":[]})"), migrationError("invalid version"));
    EXPECT_EQ(read(R"({"Version ":1,"Frames":[]})"), migrationError("invalid version"));
}

TEST(ContainerReadTest, TheVersionsLowHalfCounts) {
    struct Case {
        const char* number;
        const char* version;  // "1" and "0" are read
    };
    for (const Case& each : {Case{"1", "1"},
                             {"1.0", "1"},
                             {"1.9", "1"},
                             {"1e0", "1"},
                             {"4294967297", "1"},
                             {"4294967297.5", "1"},
                             {"9223372036854775809", "1"},
                             {"-4294967295", "1"},
                             {"0", "0"},
                             {"-0", "0"},
                             {"-0.0", "0"},
                             {"0.9", "0"},
                             {"-0.9", "0"},
                             {"4294967296", "0"},
                             {"-4294967296", "0"},
                             {"9223372036854775808", "0"},
                             {"2", "2"},
                             {"-1", "4294967295"},
                             {"-1.9", "4294967295"},
                             {"4294967295", "4294967295"},
                             {"4294967298", "2"},
                             {"18446744073709551615", "4294967295"},
                             {"18446744073709551616", "4294967295"},
                             {"1e300", "4294967295"},
                             {"1e999", "4294967295"},
                             {"-1e300", "0"},
                             {"-1e999", "0"}}) {
        const std::string text = std::string(R"({"Version":)") + each.number + R"(,"Frames":[)" +
                                 kReport + R"(],"Reports":[{"Timestamp":1,"ReportData":"01"}]})";
        const std::string version = each.version;
        EXPECT_EQ(read(text), version == "1" ? frames({kReportFrame})
                              : version == "0"
                                  ? frames({reportFrame(1, {1})})
                                  : migrationError("invalid container version: " + version))
            << each.number;
    }
}

TEST(ContainerReadTest, FramesMustBeAnArray) {
    EXPECT_EQ(read(R"({"Version":1})"), invalidArgument("invalid frames"));
    EXPECT_EQ(read(R"({"Version":1,"Reports":[]})"), invalidArgument("invalid frames"));
    for (const char* value : {"{}", "null", "1", "\"\"", "true", R"({"0":{}})"}) {
        EXPECT_EQ(read(std::string(R"({"Version":1,"Frames":)") + value + "}"),
                  invalidArgument("invalid frames"))
            << value;
    }
    EXPECT_EQ(read(container("")), frames({}));
}

TEST(ContainerReadTest, AnElementThatIsNoObjectHasNoType) {
    for (const char* element : {"null", "1", "true", "\"State\"", "[]", R"(["Type","State"])",
                                "[{\"Type\":\"InputReport\"}]", "{}"}) {
        EXPECT_EQ(read(container(element)), invalidArgument("invalid frame type")) << element;
        EXPECT_EQ(read(container(kReport + "," + element)), invalidArgument("invalid frame type"));
    }
}

struct FaultCase {
    const char* frame;
    const char* fault;
};

TEST(ContainerReadTest, EachFaultOfAFrameHasItsText) {
    for (const FaultCase& each : {
             FaultCase{R"({"Timestamp":1,"Report":""})", "invalid frame type"},
             {R"({"Type":1,"Timestamp":1,"Report":""})", "invalid frame type"},
             {R"({"Type":null,"Timestamp":1,"Report":""})", "invalid frame type"},
             {R"({"Type":["State"],"Timestamp":1,"Report":""})", "invalid frame type"},
             {R"({"Type":{"Type":"State"},"Timestamp":1})", "invalid frame type"},
             {R"({"Type":"Other","Timestamp":1,"Report":""})", "invalid frame type"},
             {R"({"Type":"","Timestamp":1,"Report":""})", "invalid frame type"},
             {R"({"Type":"state","Timestamp":1,"Key":"a","Value":1})", "invalid frame type"},
             {R"({"Type":"State\u0000","Timestamp":1,"Key":"a","Value":1})", "invalid frame type"},
             // The timestamp comes before the type's name.
             {R"({"Type":"Other"})", "invalid frame timestamp"},
             {R"({"Type":"State"})", "invalid frame timestamp"},
             {R"({"Type":"InputReport","Timestamp":"1","Report":""})", "invalid frame timestamp"},
             {R"({"Type":"InputReport","Timestamp":true,"Report":""})", "invalid frame timestamp"},
             {R"({"Type":"InputReport","Timestamp":null,"Report":""})", "invalid frame timestamp"},
             {R"({"Type":"InputReport","Timestamp":[1],"Report":""})", "invalid frame timestamp"},
             {R"({"Type":"InputReport","Timestamp":{},"Report":""})", "invalid frame timestamp"},
             {R"({"Type":"State","Timestamp":1})", "invalid state key"},
             {R"({"Type":"State","Timestamp":1,"Value":1})", "invalid state key"},
             {R"({"Type":"State","Timestamp":1,"Key":1,"Value":1})", "invalid state key"},
             {R"({"Type":"State","Timestamp":1,"Key":null,"Value":1})", "invalid state key"},
             {R"({"Type":"State","Timestamp":1,"Key":["a"],"Value":1})", "invalid state key"},
             {R"({"Type":"State","Timestamp":1,"Key":"a"})", "invalid state value class"},
             {R"({"Type":"State","Timestamp":1,"Key":"a","value":1})", "invalid state value class"},
             {R"({"Type":"InputReport","Timestamp":1})", "invalid report"},
             {R"({"Type":"InputReport","Timestamp":1,"Report":1})", "invalid report"},
             {R"({"Type":"InputReport","Timestamp":1,"Report":null})", "invalid report"},
             {R"({"Type":"InputReport","Timestamp":1,"Report":["01"]})", "invalid report"},
             {R"({"Type":"InputReport","Timestamp":1,"ReportData":"01"})", "invalid report"},
             {R"({"Type":"InputReport","Timestamp":1,"Report":"100"})", "invalid hex string"},
             {R"({"Type":"InputReport","Timestamp":1,"Report":"01 -1"})", "invalid hex string"},
         }) {
        EXPECT_EQ(read(container(each.frame)), invalidArgument(each.fault)) << each.frame;
        EXPECT_EQ(read(container(kState + "," + each.frame + "," + kReport)),
                  invalidArgument(each.fault))
            << each.frame;
    }
}

TEST(ContainerReadTest, TheFirstFrameAtFaultIsNamed) {
    EXPECT_EQ(read(container(kState + R"(,{"Type":"State","Timestamp":1,"Key":"a"},)" + kReport +
                             R"(,{"Type":"Other","Timestamp":1})")),
              invalidArgument("invalid state value class"));
}

TEST(ContainerReadTest, OnlyTheTypesOwnMembersMatter) {
    EXPECT_EQ(
        read(container(R"({"Type":"State","Timestamp":6,"Key":"a","Value":0.5,"Report":"100"})")),
        frames({kStateFrame}));
    EXPECT_EQ(
        read(container(
            R"({"Type":"InputReport","Timestamp":5,"Report":"7 8","Key":1,"Value":{"a":[1]}})")),
        frames({kReportFrame}));
}

TEST(ContainerReadTest, ATimestampIsReadAsAnUnsignedNumber) {
    struct Case {
        const char* number;
        std::uint64_t timestamp;
    };
    constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
    for (const Case& each : {Case{"0", 0},
                             {"-0.0", 0},
                             {"1.9", 1},
                             {"0.999", 0},
                             {"1e3", 1000},
                             {"18446744073709551615", kMax},
                             {"18446744073709551616", kMax},
                             {"1e300", kMax},
                             {"1e999", kMax},
                             {"-1", kMax},
                             {"-1.5", kMax},
                             {"-9223372036854775808", std::uint64_t{1} << 63U},
                             {"-9223372036854775809", std::uint64_t{1} << 63U},
                             {"-1e300", std::uint64_t{1} << 63U},
                             {"9223372036854775808", std::uint64_t{1} << 63U}}) {
        EXPECT_EQ(read(container(std::string(R"({"Type":"InputReport","Timestamp":)") +
                                 each.number + R"(,"Report":""})")),
                  frames({reportFrame(each.timestamp, {})}))
            << each.number;
    }
}

TEST(ContainerReadTest, AReportEndsQuietlyWhereItIsNoHexText) {
    EXPECT_EQ(read(container(R"({"Type":"InputReport","Timestamp":5,"Report":"07 08 zz 100"})")),
              frames({kReportFrame}));
    EXPECT_EQ(read(container(R"({"Type":"InputReport","Timestamp":5,"Report":"07\t0x8,9"})")),
              frames({kReportFrame}));
    EXPECT_EQ(read(container(R"({"Type":"InputReport","Timestamp":5,"Report":"7 8 \u0000 9"})")),
              frames({kReportFrame}));
    EXPECT_EQ(read(container(R"({"Type":"InputReport","Timestamp":5,"Report":"7 8 10000 9"})")),
              frames({kReportFrame}));
}

TEST(ContainerReadTest, EveryKindOfValueIsKept) {
    const auto value = [](const std::string& text) {
        return read(container(R"({"Type":"State","Timestamp":6,"Key":"a","Value":)" + text + "}"));
    };
    const auto kept = [](PropertyValue expected) {
        return frames({stateFrame(6, "a", std::move(expected))});
    };
    EXPECT_EQ(value("null"), kept(PropertyValue::null()));
    EXPECT_EQ(value("true"), kept(true));
    EXPECT_EQ(value("-5"), kept(-5));
    EXPECT_EQ(value("200.0"), kept(200.0));
    EXPECT_EQ(value("\"\\u00e9\""), kept("é"));
    EXPECT_EQ(value("[]"), kept(PropertyValue::Array{}));
    EXPECT_EQ(value(R"({"Type":1,"b":[{"Key":null}]})"),
              kept(PropertyValue::Dictionary{{"Type", 1},
                                             {"b", PropertyValue::Array{PropertyValue::Dictionary{
                                                       {"Key", PropertyValue::null()}}}}}));
}

TEST(ContainerReadTest, ValuesNestAsDeepAsTextsAreRead) {
    const auto nested = [](std::size_t depth) {
        return container(R"({"Type":"State","Timestamp":6,"Key":"a","Value":)" +
                         std::string(depth, '[') + std::string(depth, ']') + "}");
    };
    PropertyValue value = PropertyValue::Array{};
    for (int i = 1; i < 509; ++i) {
        value = PropertyValue::Array{value};
    }
    // The container, its frames and the frame are three levels.
    EXPECT_EQ(read(nested(509)), frames({stateFrame(6, "a", value)}));
    EXPECT_EQ(read(nested(510)), migrationError("invalid container"));
    EXPECT_EQ(read(nested(100'000)), migrationError("invalid container"));
}

TEST(ContainerReadTest, MembersComeInAnyOrder) {
    EXPECT_EQ(read(R"({"Frames":[{"Report":"07 08 ","Timestamp":5,"Type":"InputReport"},
                                 {"Value":0.5,"Key":"a","Type":"State","Timestamp":6}],
                       "Version":1})"),
              frames({kReportFrame, kStateFrame}));
    EXPECT_EQ(read(R"({"Reports":[{"ReportData":"07 08 ","Timestamp":5}],"Version":0})"),
              frames({kReportFrame}));
}

TEST(ContainerReadTest, UnknownMembersAreSkipped) {
    EXPECT_EQ(read(R"({"Comment":{"Version":2,"Frames":1,"deep":[[{"Type":[]}]]},"Version":1,
                       "Reports":5,"Extra":[1,[2],{"Frames":[]}],
                       "Frames":[{"Note":{"Type":"Other","Report":["100"]},"Type":"InputReport",
                                  "Timestamp":5,"More":["Timestamp",{"Timestamp":9}],
                                  "Report":"07 08 "}],"Last":null})"),
              frames({kReportFrame}));
}

TEST(ContainerReadTest, OfDuplicateMembersTheLastOneStands) {
    EXPECT_EQ(read(R"({"Version":2,"Frames":[{}],"Version":1,"Frames":[)" + kReport + "]}"),
              frames({kReportFrame}));
    EXPECT_EQ(read(R"({"Frames":[)" + kReport + R"(],"Version":1,"Frames":[]})"), frames({}));
    EXPECT_EQ(read(R"({"Frames":[)" + kReport + R"(],"Version":1,"Frames":null})"),
              invalidArgument("invalid frames"));
    EXPECT_EQ(read(R"({"Frames":null,"Version":1,"Frames":[)" + kReport + "]}"),
              frames({kReportFrame}));
    EXPECT_EQ(read(R"({"Version":1,"Frames":[],"Version":"1"})"),
              migrationError("invalid version"));
    EXPECT_EQ(read(R"({"Version":[1],"Frames":[],"Version":1})"), frames({}));
    EXPECT_EQ(
        read(R"({"Version":0,"Reports":[{}],"Reports":[{"Timestamp":5,"ReportData":"7 8"}]})"),
        frames({kReportFrame}));
    EXPECT_EQ(read(R"({"Version":0,"Reports":[{}],"Reports":3})"), frames({}));
    EXPECT_EQ(read(container(R"({"Type":"State","Timestamp":null,"Report":5,"Report":"100",
                                 "Report":"07 08","Timestamp":5,"Type":"InputReport"})")),
              frames({kReportFrame}));
    EXPECT_EQ(
        read(container(R"({"Type":"InputReport","Timestamp":5,"Report":"7","Report":"100"})")),
        invalidArgument("invalid hex string"));
    EXPECT_EQ(read(container(R"({"Type":"InputReport","Timestamp":5,"Report":"100","Report":5})")),
              invalidArgument("invalid report"));
    EXPECT_EQ(
        read(container(R"({"Type":"InputReport","Timestamp":5,"Timestamp":"5","Report":""})")),
        invalidArgument("invalid frame timestamp"));
    EXPECT_EQ(read(container(R"({"Type":"State","Type":{},"Timestamp":5,"Key":"a","Value":1})")),
              invalidArgument("invalid frame type"));
    EXPECT_EQ(read(container(R"({"Type":"State","Timestamp":6,"Key":1,"Key":"a",
                                 "Value":[{"b":1}],"Value":0.5})")),
              frames({kStateFrame}));
}

TEST(ContainerReadTest, NamesMayBeEscaped) {
    EXPECT_EQ(read(R"({"\u0056ersion":1,"Fr\u0061mes":[{"Ty\u0070e":"\u0053tate",
                       "Timestamp":6,"\u004bey":"\u0061","V\u0061lue":0.5}]})"),
              frames({kStateFrame}));
}

TEST(ContainerReadTest, LongNamesAndTextsAreNotMistaken) {
    const std::string longText(100'000, 'x');
    EXPECT_EQ(read("{\"" + longText + "\":\"" + longText + "\"," + container(kReport).substr(1)),
              frames({kReportFrame}));
    EXPECT_EQ(read(container(R"({"Type":"State","Timestamp":6,"Key":")" + longText +
                             R"(","Value":")" + longText + "\"}")),
              frames({stateFrame(6, longText, longText)}));
    EXPECT_EQ(read(container(R"({"Type":")" + longText + R"(","Timestamp":6})")),
              invalidArgument("invalid frame type"));
}

// Version 0.

TEST(ContainerMigrationTest, ReportsBecomeInputReports) {
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5,"ReportData":"07 08 "},)"
                                R"({"Timestamp":9,"ReportData":""})")),
              frames({kReportFrame, reportFrame(9, {})}));
}

TEST(ContainerMigrationTest, WithoutAnArrayOfReportsThereAreNoFrames) {
    EXPECT_EQ(read(R"({"Version":0})"), frames({}));
    EXPECT_EQ(read(R"({"Version":0,"Frames":[1,2]})"), frames({}));
    for (const char* value : {"null", "1", "\"\"", "{}", R"({"a":{}})", "true", "[]"}) {
        EXPECT_EQ(read(std::string(R"({"Version":0,"Reports":)") + value + "}"), frames({}))
            << value;
    }
}

TEST(ContainerMigrationTest, WhatIsMissingIsNamed) {
    EXPECT_EQ(read(oldContainer(R"({"ReportData":"07"})")),
              migrationError("frame lacks Timestamp"));
    EXPECT_EQ(read(oldContainer("{}")), migrationError("frame lacks Timestamp"));
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5})")), migrationError("frame lacks ReportData"));
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5,"Report":"07"})")),
              migrationError("frame lacks ReportData"));
    for (const char* element : {"null", "1", "\"Timestamp\"", "[]", "[1]", "true"}) {
        EXPECT_EQ(read(oldContainer(element)), migrationError("frame lacks Timestamp")) << element;
    }
}

TEST(ContainerMigrationTest, TheFirstElementAtFaultIsNamed) {
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5,"ReportData":"7"},{"Timestamp":5},{})")),
              migrationError("frame lacks ReportData"));
    EXPECT_EQ(read(oldContainer(R"({},{"Timestamp":5})")), migrationError("frame lacks Timestamp"));
}

TEST(ContainerMigrationTest, TypesAreTestedOnlyWhenTheFramesAreRead) {
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":"5","ReportData":"7"})")),
              invalidArgument("invalid frame timestamp"));
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":null,"ReportData":null})")),
              invalidArgument("invalid frame timestamp"));
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5,"ReportData":7})")),
              invalidArgument("invalid report"));
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5,"ReportData":{"a":[1]}})")),
              invalidArgument("invalid report"));
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":5,"ReportData":"100"})")),
              invalidArgument("invalid hex string"));
}

TEST(ContainerMigrationTest, AMissingMemberAnywhereComesBeforeAWrongOne) {
    EXPECT_EQ(read(oldContainer(R"({"Timestamp":"5","ReportData":"7"},{"Timestamp":5})")),
              migrationError("frame lacks ReportData"));
}

TEST(ContainerMigrationTest, AnOldElementsTypeIsOfNoMatter) {
    EXPECT_EQ(read(oldContainer(R"({"Type":"State","Timestamp":5,"ReportData":"7 8","Key":"a",)"
                                R"("Value":1,"Report":"100"})")),
              frames({kReportFrame}));
}

TEST(ContainerMigrationTest, ItsOwnDoorTakesAValueAndGivesOne) {
    const PropertyValue old = PropertyValue::Dictionary{
        {"Version", 0},
        {"Reports", PropertyValue::Array{PropertyValue::Dictionary{
                        {"Timestamp", PropertyValue::null()}, {"ReportData", 5}}}}};
    EXPECT_EQ(
        PipelineRecording::migrateSerializedContainer(old),
        PropertyValue(PropertyValue::Dictionary{
            {"Version", 1},
            {"Frames",
             PropertyValue::Array{PropertyValue::Dictionary{
                 {"Type", "InputReport"}, {"Timestamp", PropertyValue::null()}, {"Report", 5}}}}}));
}

TEST(ContainerMigrationTest, ItsOwnDoorGivesTheSameValueOfVersionOne) {
    for (const PropertyValue& version :
         {PropertyValue(1), PropertyValue(1.5), PropertyValue(4294967297)}) {
        const PropertyValue value = PropertyValue::Dictionary{{"Version", version}, {"Other", 2}};
        EXPECT_EQ(PipelineRecording::migrateSerializedContainer(value).handle(), value.handle());
    }
}

TEST(ContainerMigrationTest, ItsOwnDoorThrowsTheBareText) {
    const auto fault = [](const PropertyValue& value) {
        return answerOf([&] {
            PipelineRecording::migrateSerializedContainer(value);
            return Frames{};
        });
    };
    EXPECT_EQ(fault(PropertyValue()), invalidArgument("invalid container"));
    EXPECT_EQ(fault(PropertyValue::Array{}), invalidArgument("invalid container"));
    EXPECT_EQ(fault(PropertyValue::Dictionary{}), invalidArgument("invalid version"));
    EXPECT_EQ(fault(PropertyValue::Dictionary{{"Version", true}}),
              invalidArgument("invalid version"));
    EXPECT_EQ(fault(PropertyValue::Dictionary{{"Version", 7}}),
              invalidArgument("invalid container version: 7"));
    const auto old = [](PropertyValue::Dictionary element) {
        return PropertyValue::Dictionary{{"Version", 0},
                                         {"Reports", PropertyValue::Array{std::move(element)}}};
    };
    EXPECT_EQ(fault(old({})), invalidArgument("frame lacks Timestamp"));
    EXPECT_EQ(fault(old({{"Timestamp", 5}})), invalidArgument("frame lacks ReportData"));
}

// Which fault comes first.

TEST(ContainerFaultOrderTest, ASyntaxErrorAnywhereComesFirst) {
    EXPECT_EQ(read(R"({"Version":2,"Frames":[{}]} x)"), migrationError("invalid container"));
    EXPECT_EQ(read(R"({"Version":0,"Reports":[{}],)"), migrationError("invalid container"));
    EXPECT_EQ(read(container(R"({"Type":"InputReport","Timestamp":1,"Report":"100"})") + "]"),
              migrationError("invalid container"));
}

TEST(ContainerFaultOrderTest, ABadVersionBehindBadFramesComesFirst) {
    EXPECT_EQ(read(R"({"Frames":[{}],"Version":2})"),
              migrationError("invalid container version: 2"));
    EXPECT_EQ(read(R"({"Frames":[{}]})"), migrationError("invalid version"));
    EXPECT_EQ(read(R"({"Reports":[{}],"Version":"0"})"), migrationError("invalid version"));
    EXPECT_EQ(read(R"({"Frames":5,"Version":"0"})"), migrationError("invalid version"));
}

TEST(ContainerFaultOrderTest, FaultsOfTheOtherVersionsArrayDoNotCount) {
    EXPECT_EQ(read(R"({"Reports":[{}],"Frames":[],"Version":1})"), frames({}));
    EXPECT_EQ(read(R"({"Frames":[{}],"Reports":[],"Version":0})"), frames({}));
}

// Where the fault is.

struct Place {
    std::optional<std::uint64_t> byte;
    std::optional<std::uint64_t> frame;

    friend bool operator==(const Place&, const Place&) = default;
};

void PrintTo(const Place& place, std::ostream* out) {
    *out << "byte " << ::testing::PrintToString(place.byte) << ", frame "
         << ::testing::PrintToString(place.frame);
}

Place placeOfFault(std::string_view text) {
    ContainerReader reader;
    reader.write(text);
    const ContainerAnswer answer = answerOf([&] { return reader.finish(); });
    EXPECT_EQ(answer.fault.empty(),
              !reader.errorFrame() && !reader.errorOffset() && answer == frames(answer.frames))
        << text;
    EXPECT_EQ(reader.syntaxError().empty(), !reader.errorOffset()) << text;
    return {reader.errorOffset(), reader.errorFrame()};
}

TEST(ContainerFaultPlaceTest, ASyntaxErrorHasAByte) {
    const std::string good = container(kReport);
    EXPECT_EQ(placeOfFault(good + "x"), (Place{good.size(), {}}));
    EXPECT_EQ(placeOfFault(good.substr(0, 20)), (Place{20, {}}));
}

TEST(ContainerFaultPlaceTest, ARefusedFrameHasItsPosition) {
    EXPECT_EQ(placeOfFault(container(kReport + "," + kState + ",1," + kReport)), (Place{{}, 2}));
    EXPECT_EQ(placeOfFault(container("{},{}")), (Place{{}, 0}));
    EXPECT_EQ(placeOfFault(oldContainer(R"({"Timestamp":1,"ReportData":""},{"Timestamp":1})")),
              (Place{{}, 1}));
    EXPECT_EQ(placeOfFault(oldContainer(R"({"Timestamp":1,"ReportData":""},)"
                                        R"({"Timestamp":1,"ReportData":5})")),
              (Place{{}, 1}));
}

TEST(ContainerFaultPlaceTest, AGoodContainerHasNone) {
    EXPECT_EQ(placeOfFault(container(kReport)), Place());
}

TEST(ContainerFaultPlaceTest, ReadingOnBehindASyntaxErrorIsRefused) {
    ContainerReader reader;
    EXPECT_TRUE(reader.write(R"({"Version":1,)"));
    EXPECT_FALSE(reader.write("}"));
    EXPECT_FALSE(reader.write(R"("Frames":[]})"));
    EXPECT_EQ(reader.errorOffset(), 13U);
    EXPECT_EQ(answerOf([&] { return reader.finish(); }), migrationError("invalid container"));
    EXPECT_EQ(reader.errorOffset(), 13U);
}

TEST(ContainerFaultPlaceTest, TheVersionIsKnownOnceItIsRead) {
    ContainerReader reader;
    EXPECT_EQ(reader.version(), std::nullopt);
    reader.write(R"({"Version":4294967298,)");
    EXPECT_EQ(reader.version(), 2U);
    reader.write(R"("Version":null,)");
    EXPECT_EQ(reader.version(), std::nullopt);
}

// Recovery.

struct Recovered {
    Frames frames;
    std::uint64_t refused;

    friend bool operator==(const Recovered&, const Recovered&) = default;
};

void PrintTo(const Recovered& recovered, std::ostream* out) {
    *out << ::testing::PrintToString(recovered.frames) << " without " << recovered.refused;
}

Recovered recover(std::string_view text) {
    ContainerReader reader;
    reader.write(text);
    answerOf([&] { return reader.finish(); });
    const std::uint64_t refused = reader.refusedFrames();
    return {reader.recover(), refused};
}

TEST(ContainerRecoveryTest, EveryWholeFrameOfACutOffTextIsKept) {
    const std::string text = container(kReport + "," + kState + "," + kReport);
    const std::size_t start = text.find('[');
    for (std::size_t length = 0; length < text.size(); ++length) {
        const std::string_view cut = std::string_view(text).substr(0, length);
        Frames expected;
        if (length > start + kReport.size()) {
            expected.push_back(kReportFrame);
        }
        if (length > start + kReport.size() + kState.size() + 1) {
            expected.push_back(kStateFrame);
        }
        if (length > start + 2 * kReport.size() + kState.size() + 2) {
            expected.push_back(kReportFrame);
        }
        EXPECT_EQ(recover(cut), (Recovered{expected, 0})) << cut;
    }
}

TEST(ContainerRecoveryTest, RefusedFramesAreCounted) {
    EXPECT_EQ(recover(container(R"({},)" + kReport + R"(,[[]],{"Type":"Other"},)" + kState)),
              (Recovered{{kReportFrame, kStateFrame}, 3}));
}

TEST(ContainerRecoveryTest, FramesBeforeASyntaxErrorAreKept) {
    EXPECT_EQ(recover(container(kReport + "," + kState + ",}")),
              (Recovered{{kReportFrame, kStateFrame}, 0}));
}

TEST(ContainerRecoveryTest, OldReportsAreKeptToo) {
    const std::string reports = R"([{"Timestamp":5,"ReportData":"7 8"},{"Timestamp":5},)";
    EXPECT_EQ(recover(R"({"Version":0,"Reports":)" + reports), (Recovered{{kReportFrame}, 1}));
    // Whose version has not been read yet.
    EXPECT_EQ(recover(R"({"Reports":)" + reports), (Recovered{{kReportFrame}, 1}));
}

TEST(ContainerRecoveryTest, AnUnknownVersionsFramesAreKept) {
    EXPECT_EQ(recover(R"({"Version":2,"Frames":[)" + kReport), (Recovered{{kReportFrame}, 0}));
    EXPECT_EQ(recover(R"({"Frames":[)" + kReport), (Recovered{{kReportFrame}, 0}));
}

TEST(ContainerRecoveryTest, WhatIsNoContainerHasNoFrames) {
    EXPECT_EQ(recover(""), (Recovered{{}, 0}));
    EXPECT_EQ(recover("nonsense"), (Recovered{{}, 0}));
    EXPECT_EQ(recover("[{}]"), (Recovered{{}, 0}));
}

}  // namespace
}  // namespace VexaTouch
