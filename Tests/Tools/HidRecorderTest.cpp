#include "Platform/PropertyValue.h"
#include "Shared/FeatureReport.h"
#include "Shared/InputReport.h"
#include "Tools/HidRecorderReader.h"
#include "Tools/HidRecorderWriter.h"
#include "Tools/HidReportDescriptor.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <map>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Frame = PipelineRecording::Frame;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;
using Vexa::PropertyValue;

const std::string kHeader =
    "# Vexa Touch\n"
    "R: 105 06 60 ff 09 01 a1 01 15 00 85 01 27 ff ff ff ff 75 20 95 02 09 10 09 11 81 02 26 ff 00 "
    "75 08 95 04 09 12 81 02 27 ff ff 00 00 75 10 95 0f 09 13 81 02 16 00 80 26 ff 7f 09 14 81 02 "
    "15 00 26 ff 00 85 02 75 08 95 09 09 20 81 02 85 04 95 02 09 30 b1 02 27 ff ff ff ff 75 20 95 "
    "01 85 1f 09 31 b1 02 85 3f 09 32 b1 02 c0\n"
    "N: Vexa Touch\n"
    "P: vexatouch/recording\n"
    "I: 6 5658 5454\n";

Frame report(std::uint64_t timestamp, std::vector<std::uint8_t> bytes) {
    return {.type = Frame::Type::InputReport,
            .timestamp = timestamp,
            .key = {},
            .value = {},
            .report = std::move(bytes)};
}

Frame state(std::uint64_t timestamp, std::string key, PropertyValue value) {
    return {.type = Frame::Type::State,
            .timestamp = timestamp,
            .key = std::move(key),
            .value = std::move(value),
            .report = {}};
}

std::string written(const FrameList& frames) {
    std::string text;
    HidRecorderWriter writer([&](std::string_view piece) { text += piece; });
    for (const Frame& frame : frames) {
        writer.write(frame);
    }
    writer.finish();
    return text;
}

FrameList read(std::string_view text) {
    HidRecorderReader reader;
    reader.write(text);
    return reader.finish();
}

std::string faultOf(std::string_view text) {
    try {
        read(text);
    } catch (const std::invalid_argument& error) {
        return error.what();
    }
    return "(none)";
}

const FrameList& everything() {
    static const FrameList frames = {
        state(999, "Algs.ActivationThreshold", 200.0),
        report(1'000'000'000, {2, 0, 1, 2, 3, 4, 5, 6, 7, 8}),
        report(1'000'000'001, {0xFF}),
        state(1'000'000'002, "quote\" \\ and\nline", PropertyValue::null()),
        report(1'008'333'000, {1, 2}),
        state(5, "", PropertyValue::Dictionary{{"a b", PropertyValue::Array{1, "x y", true}}}),
        report(7, {}),
        report(999'999'999, {3}),  // the clock has stepped back below the first event
        report(std::numeric_limits<std::uint64_t>::max(), {4}),
        state(std::numeric_limits<std::uint64_t>::max(), "big", 18446744073709551615U),
    };
    return frames;
}

const std::string kEverythingText = kHeader +
                                    R"(# vexatouch: state 999 "Algs.ActivationThreshold" 200.0
# vexatouch: start 1000000000
E: 000000.000000 10 02 00 01 02 03 04 05 06 07 08
# vexatouch: nanoseconds 1
E: 000000.000000 1 ff
# vexatouch: state 1000000002 "quote\" \\ and\nline" null
E: 000000.008333 2 01 02
# vexatouch: state 5 "" {"a b":[1,"x y",true]}
# vexatouch: empty-report 7
# vexatouch: start 999999999
E: 000000.000000 1 03
# vexatouch: nanoseconds 616
E: 18446744072.709551 1 04
# vexatouch: state 18446744073709551615 "big" 18446744073709551615
)";

// Walks the short items of the descriptor as the kernel does and gives, by kind and report id, the
// bits of each report.
struct ReportBits {
    std::map<int, unsigned> input;
    std::map<int, unsigned> feature;
    int openCollections = 0;
    std::size_t consumed = 0;
};

ReportBits bitsOfDescriptor() {
    ReportBits bits;
    unsigned size = 0;
    unsigned count = 0;
    int id = 0;
    while (bits.consumed < kHidReportDescriptor.size()) {
        const unsigned prefix = kHidReportDescriptor.at(bits.consumed);
        const std::size_t length = (prefix & 3U) == 3U ? 4 : prefix & 3U;
        unsigned value = 0;
        for (std::size_t i = 0; i < length; ++i) {
            value |= unsigned{kHidReportDescriptor.at(bits.consumed + 1 + i)} << (8 * i);
        }
        bits.consumed += 1 + length;
        switch (prefix & 0xFCU) {
            case 0x74:
                size = value;
                break;
            case 0x94:
                count = value;
                break;
            case 0x84:
                id = static_cast<int>(value);
                break;
            case 0x80:
                bits.input[id] += size * count;
                break;
            case 0xB0:
                bits.feature[id] += size * count;
                break;
            case 0xA0:
                ++bits.openCollections;
                break;
            case 0xC0:
                --bits.openCollections;
                break;
            default:
                break;
        }
    }
    return bits;
}

template <class Report>
auto idAndBits() {
    return Pair(int{Report::reportId}, 8 * (Report::minimumLength - 1));
}

TEST(HidReportDescriptor, DescribesEveryReportOfTheDevice) {
    const ReportBits bits = bitsOfDescriptor();
    EXPECT_THAT(bits.input, ElementsAre(idAndBits<InputReport::Image>(),
                                        idAndBits<InputReport::FirmwareEvent>()));
    EXPECT_THAT(bits.feature, ElementsAre(idAndBits<FeatureReport::FirmwareVersion>(),
                                          idAndBits<FeatureReport::FactoryResetHoldDuration>(),
                                          idAndBits<FeatureReport::CriticalErrors>()));
    EXPECT_EQ(bits.openCollections, 0);
    EXPECT_EQ(bits.consumed, kHidReportDescriptor.size());
}

TEST(HidRecorder, EmptyRecordingIsAHeader) {
    EXPECT_EQ(written({}), kHeader);
    EXPECT_THAT(read(kHeader), IsEmpty());
}

TEST(HidRecorder, WritesEventsAndKeepsTheRestInComments) {
    EXPECT_EQ(written(everything()), kEverythingText);
}

TEST(HidRecorder, ReadsBackWhatItWrote) {
    EXPECT_EQ(read(kEverythingText), everything());
    EXPECT_EQ(written(read(kEverythingText)), kEverythingText);
}

TEST(HidRecorder, ValuesComeBackWithTheirTypes) {
    const FrameList values = {state(1, "k", 200.0), state(1, "k", 200), state(1, "k", true),
                              state(1, "k", "200"), state(1, "k", -1),  state(1, "k", 0.1),
                              state(1, "k", -0.0)};
    const FrameList back = read(written(values));
    EXPECT_EQ(back, values);
    std::vector<PropertyValue::Type> types;
    for (const Frame& frame : back) {
        types.push_back(frame.value.type());
    }
    using enum PropertyValue::Type;
    EXPECT_THAT(types, ElementsAre(Double, Signed, Boolean, String, Signed, Double, Double));
}

TEST(HidRecorder, AFrameOfAnUnknownTypeIsNotWritten) {
    Frame odd = report(1, {1});
    odd.type = static_cast<Frame::Type>(7);
    EXPECT_EQ(written({odd}), kHeader);
}

TEST(HidRecorder, ReadingInPiecesOfAnySizeIsTheSame) {
    for (std::size_t size = 1; size < 40; ++size) {
        HidRecorderReader reader;
        for (std::size_t at = 0; at < kEverythingText.size(); at += size) {
            reader.write(std::string_view(kEverythingText).substr(at, size));
        }
        EXPECT_EQ(reader.finish(), everything()) << "pieces of " << size;
    }
}

TEST(HidRecorder, ReadsWhatTheHidToolsWrite) {
    const std::string text =
        "# Some Device\r\n"
        "#   Usage Page (Vendor)\r\n"
        "R: 3 06 60 ff\r\n"
        "N: Some Device\r\n"
        "P: usb-0000:00:14.0-1\r\n"
        "I: 3 5658 5454\r\n"
        "#  ReportID: 2\r\n"
        "E: 000000.000000 3 02 0A ff \r\n"
        "\r\n"
        "X: nobody knows\r\n"
        "E: 000012.345678 1 00";
    EXPECT_EQ(read(text), (FrameList{report(0, {2, 10, 255}), report(12'345'678'000, {0})}));
}

TEST(HidRecorder, AnEventWithoutBytesIsAnEmptyReport) {
    EXPECT_EQ(read("E: 000001.000000 0\n"), (FrameList{report(1'000'000'000, {})}));
}

TEST(HidRecorder, OnlyTheFirstDeviceIsRead) {
    HidRecorderReader reader;
    reader.write(
        "D: 3\nN: ours\nD: 4\nN: other\n"
        "D: 3\nE: 000000.000000 1 01\nD: 4\nE: 000000.000001 1 02\nE: 000000.000002 1 03\n"
        "D: 3\nE: 000000.000003 1 04\n");
    EXPECT_EQ(reader.finish(), (FrameList{report(0, {1}), report(3000, {4})}));
    EXPECT_EQ(reader.otherDevicesEvents(), 2U);
}

TEST(HidRecorder, AnUnknownWordInAVexaTouchCommentIsIgnored) {
    EXPECT_THAT(read("# vexatouch: weather fine\n# vexatouch: \n"), IsEmpty());
}

TEST(HidRecorder, ATextOfAnotherKindIsNoRecording) {
    EXPECT_EQ(faultOf(""), "no line of a HID recording");
    EXPECT_EQ(faultOf("{\"Version\": 1, \"Frames\": []}\n"), "no line of a HID recording");
    EXPECT_EQ(faultOf("# a comment\n\n"), "no line of a HID recording");
}

struct Fault {
    std::string line;
    std::string message;
};

TEST(HidRecorder, FaultyLinesAreNamed) {
    const std::vector<Fault> faults = {
        {"E:", "time '' is not seconds.microseconds"},
        {"E: 1 1 00", "time '1' is not seconds.microseconds"},
        {"E: -1.0 1 00", "time '-1.0' is not seconds.microseconds"},
        {"E: 1.1000000 1 00", "time '1.1000000' is not seconds.microseconds"},
        {"E: 1.x 1 00", "time '1.x' is not seconds.microseconds"},
        {"E: 18446744073.709552 1 00", "time '18446744073.709552' is too large"},
        {"E: 99999999999999999999.0 1 00",
         "time '99999999999999999999.0' is not seconds.microseconds"},
        {"E: 1.0", "length '' is no number"},
        {"E: 1.0 two 00", "length 'two' is no number"},
        {"E: 1.0 2 00", "an event of 2 bytes has 1"},
        {"E: 1.0 0 00", "an event of 0 bytes has 1"},
        {"E: 1.0 1 0", "'0' is no byte"},
        {"E: 1.0 1 0x1", "'0x1' is no byte"},
        {"E: 1.0 1 -1", "'-1' is no byte"},
        {"E: 1.0 1 g0", "'g0' is no byte"},
        {"E: 1.0 1 \x1B[31m this is not a byte but a long text", "'?[31m' is no byte"},
        {"E: 1.0 1 0123456789012345678901234567890123456789",
         "'01234567890123456789012345678901...' is no byte"},
        {"D: x", "device 'x' is no number"},
        {"D: 1 2", "unexpected '2'"},
        {"# vexatouch: start", "time '' is no number"},
        {"# vexatouch: start 1 2", "unexpected '2'"},
        {"# vexatouch: nanoseconds 1000", "more than 999 nanoseconds"},
        {"# vexatouch: empty-report -5", "time '-5' is no number"},
        {"# vexatouch: state", "time '' is no number"},
        {"# vexatouch: state 1", "state without a key"},
        {"# vexatouch: state 1 key 2", "state without a key"},
        {"# vexatouch: state 1 \"key", "state key without its closing quote"},
        {"# vexatouch: state 1 \"key\\\"", "state key without its closing quote"},
        {"# vexatouch: state 1 \"\\q\" 1", "state key is no JSON string"},
        {"# vexatouch: state 1 \"key\"", "state without a value"},
        {"# vexatouch: state 1 \"key\" 1 2", "state value is no JSON"},
        {"# vexatouch: state 1 \"key\" nul", "state value is no JSON"},
    };
    for (const Fault& fault : faults) {
        EXPECT_EQ(faultOf("N: x\n" + fault.line + "\n"), "line 2: " + fault.message) << fault.line;
    }
    EXPECT_EQ(faultOf("# vexatouch: start 18446744073709551615\nE: 000000.000001 1 00\n"),
              "line 2: the event's time does not fit into 64 bits of nanoseconds");
}

// A cut inside a number or a value could leave a shorter one that still reads.
TEST(HidRecorder, ACommentWithoutItsLineFeedIsCutOff) {
    EXPECT_EQ(faultOf("# vexatouch: state 1 \"key\" 25"), "line 1: cut off");
    EXPECT_EQ(faultOf("# vexatouch: empty-report 1"), "line 1: cut off");
}

TEST(HidRecorder, WithAHandlerFaultyLinesAreLeftOut) {
    std::vector<std::string> faults;
    HidRecorderReader reader([&](std::uint64_t line, std::string_view fault) {
        faults.push_back(std::to_string(line) + " " + std::string(fault));
    });
    reader.write(
        "E: 000000.000001 1 01\n# vexatouch: nanoseconds 5\nE: 000000.000002 2 01\n"
        "E: 000000.000003 1 03\nE: 0000");
    EXPECT_EQ(reader.finish(), (FrameList{report(1000, {1}), report(3000, {3})}));
    EXPECT_THAT(faults, ElementsAre("3 an event of 2 bytes has 1",
                                    "5 time '0000' is not seconds.microseconds"));
}

// Wherever a text is cut, what is read is a beginning of the whole recording.
TEST(HidRecorder, ACutTextGivesItsWholeFrames) {
    std::size_t longest = 0;
    for (std::size_t length = kHeader.size(); length <= kEverythingText.size(); ++length) {
        HidRecorderReader reader([](std::uint64_t, std::string_view) {});
        reader.write(std::string_view(kEverythingText).substr(0, length));
        const FrameList frames = reader.finish();
        ASSERT_LE(frames.size(), everything().size());
        ASSERT_TRUE(std::equal(frames.begin(), frames.end(), everything().begin()))
            << "cut at " << length;
        ASSERT_GE(frames.size(), longest) << "cut at " << length;
        longest = frames.size();
    }
    EXPECT_EQ(longest, everything().size());
}

}  // namespace
}  // namespace VexaTouch::Tools
