// The input thread: how reports come in and events go out.

#include "Platform/SignalsBlocked.h"
#include "Platform/Trace.h"
#include "Service/EventDelivery.h"
#include "Service/LogText.h"
#include "Service/VexaTouchHIDService.h"

#include <pthread.h>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch {

namespace {

constexpr const char* kRunLoopMode = "kHandleInputReportsRunLoopMode";
constexpr int kThreadPriority = 63;
/// Bytes of the longest input report that is read whole.
constexpr std::size_t kReportBufferSize = 512;

/// The service whose input thread the calling thread is, or null.
thread_local const VexaTouchHIDService* inputThreadOf = nullptr;

/// What a report is handed to: its type, id, bytes, length and time stamp in host ticks.
using ReportHandler =
    std::function<void(vexa_report_type type, std::uint8_t reportId, const std::uint8_t* report,
                       std::size_t length, std::uint64_t timestamp)>;

void inputReportArrived(void* context, vexa_status /*result*/, vexa_device* /*sender*/,
                        vexa_report_type type, std::uint32_t reportId, const std::uint8_t* report,
                        std::size_t length, std::uint64_t timestamp) noexcept {
    const auto& handler = *static_cast<const ReportHandler*>(context);
    handler(type, static_cast<std::uint8_t>(reportId), report, length, timestamp);
}

/// The bytes of a firmware event as one big-endian number.
std::uint64_t bigEndian(const std::array<std::uint8_t, 8>& bytes) noexcept {
    std::uint64_t number = 0;
    for (const std::uint8_t byte : bytes) {
        number = number << 8 | byte;
    }
    return number;
}

/// Real-time round robin, so that reports are processed as they arrive. 0, or the error.
int raisePriority() noexcept {
    sched_param parameters{};
    parameters.sched_priority = kThreadPriority;
    return pthread_setschedparam(pthread_self(), SCHED_RR, &parameters);
}

/// Ends the process loudly: whoever waits here would wait forever.
void demand(bool holds, const char* what) noexcept {
    if (holds) return;
    std::fprintf(stderr, "%s\n", what);
    std::abort();
}

}  // namespace

/// What one run of the input thread works with, all fixed before the thread starts: the host may
/// set another callback or take back the device meanwhile.
class VexaTouchHIDService::InputReportRun {
public:
    ServiceReference<VexaTouchHIDService> service;
    Vexa::HidDevice device;
    DispatchEventContext context;
    std::shared_ptr<CountingSemaphore> signal;
    /// The number of the last image of this run, if there was one. Belongs to the image probe.
    std::optional<std::uint32_t> lastFrame;
};

void VexaTouchHIDService::scheduleWithDispatchQueue(const Vexa::SerialQueue& queue) {
    logOperation("scheduleWithDispatchQueue:");
    _dispatchEventContext.queue = queue;
    _dispatchEventContext.sender = getServiceInterface();
    _inputReportThreadSignal = std::make_shared<CountingSemaphore>();
    InputReportRun run{ServiceReference<VexaTouchHIDService>::share(this), _vexaDevice,
                       _dispatchEventContext, _inputReportThreadSignal, std::nullopt};
    try {
        const Vexa::SignalsBlocked blocked;
        std::thread([run = std::move(run)]() mutable noexcept {
            run.service.get()->runInputThread(run);
        }).detach();
    } catch (const std::system_error& error) {
        logFormat(_log, Vexa::LogLevel::Error, "input report thread not started: %d",
                  error.code().value());
        _inputReportThreadSignal.reset();
        return;
    }
    _inputReportThreadSignal->wait();
}

void VexaTouchHIDService::unscheduleWithDispatchQueue(const Vexa::SerialQueue&) {
    logOperation("unscheduleWithDispatchQueue:");
#ifndef NDEBUG
    demand(!_pipelineLock.isHeldByThisThread(),
           "unscheduleWithDispatchQueue: the input report thread cannot end while the caller holds "
           "the pipeline's lock");
    demand(inputThreadOf != this,
           "unscheduleWithDispatchQueue: the input report thread cannot wait for itself");
#endif
    if (_inputReportRunLoop) {
        _log.write(Vexa::LogLevel::Debug, "signalling input report thread to exit");
        const bool submitted = _inputReportRunLoop.submit(
            kRunLoopMode, []() noexcept { vexa_run_loop_stop(vexa_run_loop_current()); });
        // Only without memory: the thread would never end and the wait below neither.
        demand(submitted,
               "unscheduleWithDispatchQueue: the input report thread cannot be told to stop");
        _inputReportRunLoop.wake();
        _inputReportRunLoop.reset();
        _log.write(Vexa::LogLevel::Debug, "waiting for input report thread to exit");
        _inputReportThreadSignal->wait();
        _inputReportThreadSignal.reset();
        _log.write(Vexa::LogLevel::Debug, "input report thread exited");
    }
    _dispatchEventContext.queue.reset();
}

void VexaTouchHIDService::runInputThread(InputReportRun& run) noexcept {
    inputThreadOf = this;
    static_cast<void>(pthread_setname_np(pthread_self(), "vexa-input"));
    // Who reads the log slowly must not hold up reports.
    const Vexa::LogWithoutBlocking logWithoutBlocking;
    const Vexa::Log log = _log;
    const std::shared_ptr<CountingSemaphore> signal = run.signal;

    log.write(Vexa::LogLevel::Debug, "input report thread start");
    try {
        _inputReportRunLoop = Vexa::RunLoop::current();
    } catch (const std::bad_alloc&) {
        // Without descriptors, or memory, there is no run loop: the service stays unscheduled.
        log.write(Vexa::LogLevel::Error, "input report thread has no run loop");
        run = {};
        signal->signal();
        return;
    }
    signal->signal();
    handleInputReports(run);
    // Before the last signal, so that who unschedules owns what is left, this object included.
    inputThreadOf = nullptr;
    run = {};
    signal->signal();
    log.write(Vexa::LogLevel::Debug, "input report thread end");
}

void VexaTouchHIDService::handleInputReports(InputReportRun& run) {
    if (const int error = raisePriority(); error != 0) {
        logFormat(_log, Vexa::LogLevel::Error, "pthread_setschedparam failed: %d", error);
    }
    ReportHandler handler = [service = run.service](vexa_report_type type, std::uint8_t reportId,
                                                    const std::uint8_t* report, std::size_t length,
                                                    std::uint64_t timestamp) {
        service.get()->handleInputReport(type, reportId, report, length, timestamp);
    };
    {
        const Vexa::MutexLock lock(_pipelineLock);
        installProbes(run);
    }
    std::array<std::uint8_t, kReportBufferSize> buffer{};
    const Vexa::RunLoop loop = Vexa::RunLoop::current();
    // Reports wait until there is a callback. The device of a service that was scheduled twice is
    // still the first thread's, and so are its buffer and its handler.
    const vexa_status status = run.device.schedule(loop, kRunLoopMode);
    if (status == VEXA_STATUS_SUCCESS) {
        run.device.setInputReportCallback(buffer, &inputReportArrived, &handler);
    } else if (run.device) {
        logFormat(_log, Vexa::LogLevel::Error, "device not scheduled: %jx", std::uintmax_t{status});
    }
    loop.run(kRunLoopMode);
    if (status == VEXA_STATUS_SUCCESS) {
        run.device.unschedule(loop, kRunLoopMode);
        run.device.setInputReportCallback(buffer, nullptr, nullptr);
    }
    {
        const Vexa::MutexLock lock(_pipelineLock);
        clearProbes();
    }
}

void VexaTouchHIDService::installProbes(InputReportRun& run) {
    const ServiceReference<VexaTouchHIDService>& service = run.service;
    _pipeline.inputReportProbe = [service](const std::uint8_t* report, std::uint64_t length) {
        service.get()->observeInputReport(report, length);
    };
    _pipeline.invalidInputReportProbe = [service](const std::uint8_t* report,
                                                  std::uint64_t length) {
        service.get()->observeInvalidInputReport(report, length);
    };
    _pipeline.firmwareEventProbe = [service](const InputReport::FirmwareEvent* event) {
        service.get()->observeFirmwareEvent(*event);
    };
    _pipeline.imageProbe = [service, &lastFrame = run.lastFrame](const InputReport::Image* image) {
        service.get()->observeImage(*image, lastFrame);
    };
    _pipeline.hidEventsProbe =
        EventDelivery(ServiceReference<VexaHIDService>::share(service.get()), run.context, _log);
}

void VexaTouchHIDService::clearProbes() {
    _pipeline.inputReportProbe = nullptr;
    _pipeline.invalidInputReportProbe = nullptr;
    _pipeline.firmwareEventProbe = nullptr;
    _pipeline.imageProbe = nullptr;
    _pipeline.hidEventsProbe = nullptr;
}

void VexaTouchHIDService::handleInputReport(vexa_report_type type, std::uint8_t reportId,
                                            const std::uint8_t* report, std::size_t length,
                                            std::uint64_t timestamp) {
    logFormat(_log, Vexa::LogLevel::Debug,
              "Received input report (type %ju, reportID %ju, reportLength %ju, timestampMach %ju)",
              static_cast<std::uintmax_t>(type), std::uintmax_t{reportId},
              static_cast<std::uintmax_t>(length), static_cast<std::uintmax_t>(timestamp));
    const Vexa::MutexLock lock(_pipelineLock);
    _pipeline.handleInputReport(report, length);
}

void VexaTouchHIDService::observeInputReport(const std::uint8_t* report,
                                             std::uint64_t length) const {
    const auto byte = [report, length](std::uint64_t index) -> std::uint64_t {
        return index < length ? report[index] : 0U;
    };
    Vexa::trace(Vexa::TraceCode::Report, byte(0), byte(1), byte(2), byte(3));
    _log.write(Vexa::LogLevel::Debug, "Input report probe");
}

void VexaTouchHIDService::observeInvalidInputReport(const std::uint8_t* report,
                                                    std::uint64_t length) const {
    if (length == 0) {
        _log.write(Vexa::LogLevel::Debug, "Invalid input report len==0");
    } else {
        logFormat(_log, Vexa::LogLevel::Debug, "Invalid input report with ID %ju",
                  std::uintmax_t{report[0]});
    }
}

void VexaTouchHIDService::observeFirmwareEvent(const InputReport::FirmwareEvent& event) const {
    const std::uint64_t context = bigEndian(event.data);
    Vexa::trace(Vexa::TraceCode::FirmwareEvent, event.code, context);
    logFormat(_log, Vexa::LogLevel::Info, "Firmware event probe; event: %jx, context: %jx",
              std::uintmax_t{event.code}, static_cast<std::uintmax_t>(context));
}

void VexaTouchHIDService::observeImage(const InputReport::Image& image,
                                       std::optional<std::uint32_t>& lastFrame) {
    // 32-bit arithmetic: 0xFFFFFFFF is followed by 0.
    if (lastFrame && image.frameNumber != *lastFrame + 1U) {
        logFormat(_log, Vexa::LogLevel::Error, "Disjoint image (frame number: %ju -> %ju) ***\n\n",
                  std::uintmax_t{*lastFrame}, std::uintmax_t{image.frameNumber});
        _disjointImageCount.fetch_add(1, std::memory_order_relaxed);
    }
    lastFrame = image.frameNumber;
}

}  // namespace VexaTouch
