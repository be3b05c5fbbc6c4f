#include "Platform/PropertyValue.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/CsvExport.h"
#include "Tools/Replay.h"

#include <gtest/gtest.h>

#include <list>
#include <string>

namespace VexaTouch::Tools {
namespace {

using namespace VexaTouch::Testing;

std::string csvOf(const FrameList& frames) {
    std::string text;
    CsvExport writer([&text](std::string_view piece) { text += piece; });
    Replay replay(frames);
    while (replay.canContinue()) {
        writer.write(replay.next(), replay.algs());
    }
    writer.finish();
    return text;
}

const std::string kHeader =
    "index,type,time_ns,time_ms,device_ms,frame,"
    "signed_A,signed_B,signed_C,signed_D,signed_E,signed_F,signed_G,signed_H,signed_I,signed_J,"
    "signed_K,signed_L,signed_M,signed_N,signed_O,"
    "unsigned_A,unsigned_B,unsigned_C,unsigned_D,unsigned_E,unsigned_F,unsigned_G,unsigned_H,"
    "unsigned_I,unsigned_J,unsigned_K,unsigned_L,unsigned_M,unsigned_N,unsigned_O,"
    "above_noise,touching,holding,hold_suppressed,would_be_holding,maybe_tap,tap,tap_suppressed,"
    "region,touch_score,tap_score,events,key,value\r\n";
const std::string kNoImage(32, ',');

TEST(CsvExport, AnEmptyRecordingIsAHeader) {
    EXPECT_EQ(csvOf({}), kHeader);
}

TEST(CsvExport, EachFrameIsARow) {
    RecordedSession session;
    session.set("Algs.HoldTimeoutMilliseconds", 20)
        .feel(touch("H").at(350).with("I", 150).forMs(30))
        .feel(nothing())
        .report({0x07})
        .report(firmwareReport(0));
    const std::string touching = "0,0,0,0,0,0,0,350,150,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,";
    const std::string idle = "0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,0,";
    EXPECT_EQ(csvOf(session.frames()),
              kHeader + "0,state,5000000000,0.000000" + kNoImage +
                  ",0,0,0,0,0,0,0,0,0,0.0,0.0,,Algs.HoldTimeoutMilliseconds,20\r\n"
                  "1,image,5000000000,0.000000,10000,1," +
                  touching +
                  "1,1,0,0,0,0,0,0,3,1.370785,0.9832001,may-begin 3,,\r\n"
                  "2,image,5010000000,10.000000,10010,2," +
                  touching +
                  "1,1,0,0,0,0,0,0,3,2.74157,0.9832001,,,\r\n"
                  "3,image,5020000000,20.000000,10020,3," +
                  touching +
                  "1,1,0,0,0,0,0,0,3,4.112355,0.9832001,,,\r\n"
                  "4,image,5030000000,30.000000,10030,4," +
                  idle +
                  "0,0,0,0,0,1,1,0,3,0.0,6.1162033,tap 3,,\r\n"
                  "5,invalid,5040000000,40.000000" +
                  kNoImage +
                  ",0,0,0,0,0,1,1,0,3,0.0,6.1162033,,,\r\n"
                  "6,firmware,5040000000,40.000000" +
                  kNoImage + ",0,0,0,0,0,0,0,0,3,0.0,1.549,firmware-reset 0,,\r\n");
}

TEST(CsvExport, TextWithSeparatorsIsQuoted) {
    RecordedSession session;
    session.set("a,\"b\"", "x\ny").set("plain", Vexa::PropertyValue::null());
    EXPECT_EQ(csvOf(session.frames()),
              kHeader + "0,state,5000000000,0.000000" + kNoImage +
                  ",0,0,0,0,0,0,0,0,0,0.0,0.0,,\"a,\"\"b\"\"\",\"\"\"x\\ny\"\"\"\r\n"
                  "1,state,5000000000,0.000000" +
                  kNoImage + ",0,0,0,0,0,0,0,0,0,0.0,0.0,,plain,null\r\n");
}

TEST(CsvExport, AClockThatStepsBackGivesNegativeTimes) {
    std::list<PipelineRecording::Frame> frames(3);
    frames.front().timestamp = 2'000'000;
    frames.back().timestamp = 2'000'001;
    const std::string invalid = kNoImage + ",0,0,0,0,0,0,0,0,0,0.0,0.0,,,\r\n";
    EXPECT_EQ(csvOf(frames), kHeader + "0,invalid,2000000,0.000000" + invalid +
                                 "1,invalid,0,-2.000000" + invalid + "2,invalid,2000001,0.000001" +
                                 invalid);
}

TEST(CsvExport, UnsignedAndNegativeValuesAreWrittenAsTheyAre) {
    Samples samples{};
    samples.front() = -32768;
    samples.back() = 32767;
    std::array<std::uint16_t, kPixelCount> levels{};
    levels.front() = 65535;
    levels.back() = 1;
    RecordedSession session;
    session.report(imageReport(samples, 4294967295, 4294967294, levels));
    const std::string beginning =
        "0,image,5000000000,0.000000,4294967294,4294967295,-32768,0,0,0,0,0,0,0,0,0,0,0,0,0,32767,"
        "65535,0,0,0,0,0,0,0,0,0,0,0,0,0,1,";
    EXPECT_EQ(csvOf(session.frames()).substr(kHeader.size(), beginning.size()), beginning);
}

}  // namespace
}  // namespace VexaTouch::Tools
