#include "Platform/Json.h"
#include "Platform/PropertyValue.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/PerfettoExport.h"
#include "Tools/Replay.h"

#include <gtest/gtest.h>

#include <list>
#include <map>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using namespace VexaTouch::Testing;

std::string traceOf(const FrameList& frames) {
    std::string text;
    PerfettoExport writer([&text](std::string_view piece) { text += piece; });
    Replay replay(frames);
    while (replay.canContinue()) {
        writer.write(replay.next(), replay.algs());
    }
    writer.finish();
    return text;
}

const std::string kBegin =
    R"({"displayTimeUnit":"ms","traceEvents":[
{"ph":"M","pid":1,"name":"process_name","args":{"name":"Vexa Touch"}}
,{"ph":"M","pid":1,"name":"thread_name","tid":1,"args":{"name":"touch"}}
,{"ph":"M","pid":1,"name":"thread_sort_index","tid":1,"args":{"sort_index":1}}
,{"ph":"M","pid":1,"name":"thread_name","tid":2,"args":{"name":"hold"}}
,{"ph":"M","pid":1,"name":"thread_sort_index","tid":2,"args":{"sort_index":2}}
,{"ph":"M","pid":1,"name":"thread_name","tid":3,"args":{"name":"events"}}
,{"ph":"M","pid":1,"name":"thread_sort_index","tid":3,"args":{"sort_index":3}}
,{"ph":"M","pid":1,"name":"thread_name","tid":4,"args":{"name":"firmware"}}
,{"ph":"M","pid":1,"name":"thread_sort_index","tid":4,"args":{"sort_index":4}}
,{"ph":"M","pid":1,"name":"thread_name","tid":5,"args":{"name":"settings"}}
,{"ph":"M","pid":1,"name":"thread_sort_index","tid":5,"args":{"sort_index":5}})";

// The trace's events behind the names of its tracks, a line each.
std::string eventsOf(const FrameList& frames) {
    const std::string text = traceOf(frames);
    const std::string end = "]}\n";
    EXPECT_EQ(text.substr(0, kBegin.size()), kBegin);
    EXPECT_TRUE(text.ends_with(end));
    EXPECT_TRUE(Vexa::readJson(text));
    return text.substr(kBegin.size(), text.size() - kBegin.size() - end.size());
}

TEST(PerfettoExport, AnEmptyRecordingNamesItsTracks) {
    EXPECT_EQ(eventsOf({}), "");
}

TEST(PerfettoExport, CountersComeWhenTheyChange) {
    RecordedSession session;
    session.feel(nothing().forMs(30)).feel(touch("N").at(7)).feel(touch("N").at(7));
    std::string expected = R"(
,{"ph":"C","pid":1,"ts":0,"name":"region","args":{"value":0.0}}
,{"ph":"C","pid":1,"ts":0,"name":"touch score","args":{"value":0.0}})";
    for (char letter = 'A'; letter <= 'O'; ++letter) {
        expected += std::string("\n,{\"ph\":\"C\",\"pid\":1,\"ts\":0,\"name\":\"pixel ") + letter +
                    "\",\"args\":{\"value\":0.0}}";
    }
    expected +=
        "\n,{\"ph\":\"C\",\"pid\":1,\"ts\":30000,\"name\":\"pixel N\",\"args\":{\"value\":7.0}}";
    EXPECT_EQ(eventsOf(session.frames()), expected);
}

TEST(PerfettoExport, SettingsFirmwareEventsAndInvalidReportsAreInstants) {
    RecordedSession session;
    session.set("a \"key\"", Vexa::PropertyValue::Array{1, "x"})
        .report({1, 2, 3})
        .report(firmwareReport(9));
    EXPECT_EQ(eventsOf(session.frames()), R"(
,{"ph":"i","pid":1,"ts":0,"name":"a \"key\"","tid":5,"s":"t","args":{"value":[1,"x"]}}
,{"ph":"C","pid":1,"ts":0,"name":"region","args":{"value":0.0}}
,{"ph":"C","pid":1,"ts":0,"name":"touch score","args":{"value":0.0}}
,{"ph":"i","pid":1,"ts":0,"name":"invalid report","tid":4,"s":"t","args":{"bytes":3}}
,{"ph":"i","pid":1,"ts":0,"name":"firmware event 9","tid":4,"s":"t"})");
}

// The trace's lines that are no counters.
std::string withoutCounters(const std::string& events) {
    std::string rest;
    for (const std::string& line : linesOf(events)) {
        if (!line.starts_with(R"(,{"ph":"C")")) {
            rest += line + "\n";
        }
    }
    return rest;
}

TEST(PerfettoExport, TouchesAndHoldsAreSlicesAndEventsInstants) {
    RecordedSession session;
    session.set("Algs.HoldTimeoutMilliseconds", 20)
        .feel(nothing())
        .feel(touch("A").at(350).with("B", 150).forMs(50))
        .feel(nothing())
        .report(firmwareReport(0));
    EXPECT_EQ(withoutCounters(eventsOf(session.frames())), R"(
,{"ph":"i","pid":1,"ts":0,"name":"Algs.HoldTimeoutMilliseconds","tid":5,"s":"t","args":{"value":20}}
,{"ph":"B","pid":1,"ts":10000,"name":"touch region 1","tid":1}
,{"ph":"i","pid":1,"ts":10000,"name":"may-begin play/pause or voice-assistant call","tid":3,"s":"t","args":{"index":2,"device_ms":10010,"frame":2,"region":1,"phase":128,"mask":0}}
,{"ph":"B","pid":1,"ts":40000,"name":"hold voice-assistant call","tid":2}
,{"ph":"i","pid":1,"ts":40000,"name":"hold-start voice-assistant call","tid":3,"s":"t","args":{"index":5,"device_ms":10040,"frame":5,"region":1,"phase":1,"mask":2}}
,{"ph":"E","pid":1,"ts":60000,"tid":2}
,{"ph":"E","pid":1,"ts":60000,"tid":1}
,{"ph":"i","pid":1,"ts":60000,"name":"hold-end voice-assistant call","tid":3,"s":"t","args":{"index":7,"device_ms":10060,"frame":7,"region":1,"phase":4,"mask":2}}
,{"ph":"i","pid":1,"ts":70000,"name":"firmware-reset","tid":3,"s":"t","args":{"index":8,"device_ms":0,"frame":0,"region":0,"phase":0,"mask":0}}
,{"ph":"i","pid":1,"ts":70000,"name":"firmware event 0","tid":4,"s":"t"}
)");
}

TEST(PerfettoExport, SlicesOpenAtTheEndAreClosed) {
    RecordedSession session;
    session.set("Algs.HoldTimeoutMilliseconds", 20)
        .feel(touch("A").at(350).with("B", 150).forMs(50));
    const std::string events = eventsOf(session.frames());
    EXPECT_TRUE(
        events.ends_with("\n,{\"ph\":\"E\",\"pid\":1,\"ts\":40000,\"tid\":2}"
                         "\n,{\"ph\":\"E\",\"pid\":1,\"ts\":40000,\"tid\":1}"))
        << events;
}

// Wherever a recording is cut, every slice that begins ends, later and on the same track, and time
// never runs back.
TEST(PerfettoExport, SlicesAreBalancedWhereverARecordingEnds) {
    std::list<PipelineRecording::Frame> frames = mixedSession().frames();
    while (!frames.empty()) {
        const Vexa::PropertyValue trace = Vexa::readJson(traceOf(frames));
        std::map<double, int> open;
        double now = 0;
        const Vexa::PropertyValue events = trace.member("traceEvents");
        ASSERT_TRUE(events.asArray());
        for (const Vexa::PropertyValue event : *events.asArray()) {
            const std::string phase(*event.member("ph").asString());
            if (phase == "M") {
                continue;
            }
            ASSERT_GE(event.member("ts").toDouble(), now);
            now = event.member("ts").toDouble();
            if (phase == "B" || phase == "E") {
                int& depth = open[event.member("tid").toDouble()];
                depth += phase == "B" ? 1 : -1;
                ASSERT_TRUE(depth == 0 || depth == 1);
            }
        }
        for (const auto& [track, depth] : open) {
            ASSERT_EQ(depth, 0) << "track " << track << " of " << frames.size() << " frames";
        }
        frames.pop_back();
    }
}

TEST(PerfettoExport, TimeKeepsItsNanosecondsAndNeverRunsBack) {
    std::list<PipelineRecording::Frame> frames(4);
    std::uint64_t times[] = {5000, 5001, 4000, 1'000'005'000};
    std::size_t next = 0;
    for (PipelineRecording::Frame& frame : frames) {
        frame.timestamp = times[next++];
        frame.report = {9};
    }
    EXPECT_EQ(withoutCounters(eventsOf(frames)), R"(
,{"ph":"i","pid":1,"ts":0,"name":"invalid report","tid":4,"s":"t","args":{"bytes":1}}
,{"ph":"i","pid":1,"ts":0.001,"name":"invalid report","tid":4,"s":"t","args":{"bytes":1}}
,{"ph":"i","pid":1,"ts":0.001,"name":"invalid report","tid":4,"s":"t","args":{"bytes":1}}
,{"ph":"i","pid":1,"ts":1000000,"name":"invalid report","tid":4,"s":"t","args":{"bytes":1}}
)");
}

}  // namespace
}  // namespace VexaTouch::Tools
