#include "Tools/Validate/ReportChecks.h"

#include "Platform/HostClock.h"
#include "Tools/Validate/CheckStand.h"
#include "Tools/Validate/CheckTexts.h"
#include "Tools/Validate/InterfaceSelf.h"
#include "Tools/Validate/LoadedPlugin.h"
#include "Tools/Validate/ProcessResources.h"

#include <vexa/trace.h>
#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

/// The length of the buffer that reports are read into; what is longer arrives cut.
constexpr std::size_t kBufferLength = 512;

/// Counts the trace points of input threads in this process as long as it lives. Those of the
/// queue do not count: what has been queued may still be delivered after unscheduling.
class TraceCount {
public:
    TraceCount() {
        vexa_trace_set_sink(
            [](void* context, std::uint32_t code, const std::uint64_t* /*arguments*/) {
                if (code == VEXA_TRACE_REPORT || code == VEXA_TRACE_FIRMWARE_EVENT) {
                    ++*static_cast<std::atomic<std::uint64_t>*>(context);
                }
            },
            &count_);
    }
    ~TraceCount() { vexa_trace_set_sink(nullptr, nullptr); }
    TraceCount(const TraceCount&) = delete;
    TraceCount(TraceCount&&) = delete;
    TraceCount& operator=(const TraceCount&) = delete;
    TraceCount& operator=(TraceCount&&) = delete;

    [[nodiscard]] std::uint64_t value() const { return count_; }

private:
    std::atomic<std::uint64_t> count_{0};
};

std::vector<std::uint8_t> randomReport(SeededNumbers& numbers, std::size_t length) {
    std::vector<std::uint8_t> report(length);
    for (std::uint8_t& byte : report) {
        byte = static_cast<std::uint8_t>(numbers.below(256));
    }
    return report;
}

void requireRight(CheckRun& run, CheckStand& stand, const EventSink::Delivery& delivery) {
    run.require(delivery.onQueue, "an event is delivered on another thread than the queue's");
    run.require(delivery.hasEvent, "an event is delivered as NULL");
    run.require(delivery.callback == 0 && delivery.target == stand.target() &&
                    delivery.refcon == stand.refcon(),
                "an event comes with another target or refcon than was set");
    run.require(delivery.sender == selfOf(stand.service().service()),
                "the sender of an event is not the service interface reference");
    run.require(delivery.options == 0, "an event is delivered with options that are not 0");
}

}  // namespace

void checkReportLengths(CheckRun& run) {
    constexpr std::array<std::uint8_t, 4> kFills = {0x00, 0x01, 0x02, 0xFF};
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.begin();
    const auto send = [&](std::size_t length, std::uint8_t fill) {
        run.step("sending a report of " + countText(static_cast<std::int64_t>(length), "byte"));
        std::vector<std::uint8_t> report(length, fill);
        stand.report(report);
        if (length > 1) {
            // As long, but of the first kind of report that devices have.
            report[0] = 1;
            stand.report(report);
        }
    };
    for (std::size_t length = 0; length <= kBufferLength; ++length) {
        for (const std::uint8_t fill : kFills) {
            send(length, fill);
        }
    }
    for (const std::size_t length : {kBufferLength + 1, 2 * kBufferLength, 8 * kBufferLength}) {
        send(length, 0);
    }
    stand.end();
}

void checkRandomReports(CheckRun& run) {
    constexpr int kReports = 20'000;
    constexpr int kTogether = 16;
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.begin();
    SeededNumbers numbers = run.random();
    std::uint64_t sent = stand.device().handled();
    for (int first = 0; first < kReports; first += kTogether) {
        run.step("sending report " + std::to_string(first) + " and those after it");
        for (int count = 0; count < kTogether; ++count) {
            // Mostly as long as what devices send, and often a kind that they do send.
            const std::size_t length =
                numbers.below(numbers.below(8) == 0 ? kBufferLength + 1 : 100);
            std::vector<std::uint8_t> report = randomReport(numbers, length);
            if (!report.empty() && numbers.below(2) == 0) {
                report[0] = static_cast<std::uint8_t>(1 + numbers.below(2));
            }
            stand.send(report);
            ++sent;
        }
        stand.waitForReports(sent);
    }
    stand.end();
    stand.drain();
    for (const EventSink::Delivery& delivery : stand.sink().deliveries()) {
        requireRight(run, stand, delivery);
    }
}

void checkEvents(CheckRun& run) {
    constexpr int kReports = 100;
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    const std::uint64_t begin = Vexa::HostClock::system().now();
    stand.begin();
    const std::int64_t events = vexa_live_objects(VEXA_OBJECT_EVENT);
    for (int count = 0; count < kReports; ++count) {
        run.step("sending a report of a reset");
        stand.resetReport();
    }
    stand.end();
    stand.drain();
    const std::uint64_t end = Vexa::HostClock::system().now();
    for (const EventSink::Delivery& delivery : stand.sink().deliveries()) {
        requireRight(run, stand, delivery);
        run.require(delivery.timestamp >= begin && delivery.timestamp <= end,
                    "the time stamp of an event is not in host ticks of when it was made");
    }
    run.require(
        waitUntil([&] { return vexa_live_objects(VEXA_OBJECT_EVENT) <= events; }, kSettleTime),
        "an event lives on after it was delivered");
    if (stand.sink().count() == 0) {
        run.warn("no report made an event, so deliveries were not checked");
    }
}

void checkLateCallback(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.begin();
    int lateTarget = 0;
    int lateRefcon = 0;
    stand.service().setEventCallback(EventSink::callback(1), &lateTarget, &lateRefcon);
    stand.resetReport();
    stand.unschedule();
    stand.drain();
    for (const EventSink::Delivery& delivery : stand.sink().deliveries()) {
        run.require(delivery.callback == 0 && delivery.target == stand.target() &&
                        delivery.refcon == stand.refcon(),
                    "a callback that is set while the service is scheduled gets its events");
    }
    stand.sink().clear();
    stand.schedule();
    stand.resetReport();
    stand.end();
    stand.drain();
    for (const EventSink::Delivery& delivery : stand.sink().deliveries()) {
        run.require(delivery.callback == 1 && delivery.target == &lateTarget &&
                        delivery.refcon == &lateRefcon,
                    "a callback that was set late does not get the events of the next scheduling");
    }
}

void checkUnschedule(CheckRun& run) {
    constexpr int kRounds = 30;
    constexpr int kFlood = 8;
    constexpr std::chrono::milliseconds kGrace{100};  // for a plug-in that keeps its thread
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.start();
    stand.setCallback();
    SeededNumbers numbers = run.random();
    for (int round = 0; round < kRounds; ++round) {
        const ProcessResources before = ProcessResources::now();
        stand.schedule();
        stand.service().open();
        const TraceCount traced;
        // The thread has something to do when it is asked to end.
        const std::vector<std::uint8_t> report = {2, 0, 0, 0, 0, 0, 0, 0, 0, 0};
        const auto flood = static_cast<int>(numbers.below(kFlood));
        for (int count = 0; count < flood; ++count) {
            static_cast<void>(stand.device().trySendReport(report));
        }
        stand.unschedule();
        const std::uint64_t handled = stand.device().handled();
        const std::uint64_t traces = traced.value();
        run.step("sending reports after unscheduling");
        for (int count = 0; count < kFlood; ++count) {
            static_cast<void>(stand.device().trySendReport(report));
        }
        // Only what runs on after unscheduling could still read them; when it has ended nothing
        // will.
        static_cast<void>(
            waitUntil([&] { return !ProcessResources::now().hasMoreThreadsThan(before); }, kGrace));
        run.require(stand.device().handled() == handled,
                    "a report that was sent after unscheduling is read");
        stand.drain();
        run.require(traced.value() == traces, "a trace point is passed after unscheduling");
        stand.service().close();
    }
    stand.service().stop();
}

}  // namespace VexaTouch::Tools
