// The input thread: how reports come in and events go out.

#include "Platform/SignalsBlocked.h"
#include "Platform/Trace.h"
#include "Service/EventDelivery.h"
#include "Service/LogText.h"
#include "Service/VexaTouchHIDService.h"

#include <pthread.h>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <new>
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

/// The loop of the calling thread, its mode ready to be waited in; none without descriptors or
/// memory for either.
Vexa::RunLoop runLoopOfThisThread() noexcept {
    try {
        Vexa::RunLoop loop = Vexa::RunLoop::current();
        if (loop.run(kRunLoopMode, 0) != VEXA_RUN_FAILED) return loop;
    } catch (const std::bad_alloc&) {
        return {};
    }
    return {};
}

/// Has the loop end its innermost run in the mode, now or as soon as there is one. False when the
/// loop's thread has ended or there is no memory.
bool submitStop(const Vexa::RunLoop& loop) noexcept {
    try {
        return loop.submit(kRunLoopMode,
                           []() noexcept { vexa_run_loop_stop(vexa_run_loop_current()); });
    } catch (const std::bad_alloc&) {
        return false;
    }
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
    const Vexa::RunLoop loopBefore = _inputReportRunLoop;
    std::shared_ptr<CountingSemaphore> signalBefore = _inputReportThreadSignal;
    const int error = startInputThread();
    if (error == 0) {
        _inputReportThreadSignal->wait();
    } else {
        logFormat(_log, Vexa::LogLevel::Error, "input report thread not started: %d", error);
    }
    // A thread that did not get as far as its run loop gives no second signal. What can be
    // unscheduled is then still the thread before it, if there is one.
    if (_inputReportRunLoop == loopBefore) _inputReportThreadSignal = std::move(signalBefore);
}

int VexaTouchHIDService::startInputThread() {
    try {
        _inputReportThreadSignal = std::make_shared<CountingSemaphore>();
        InputReportRun run{ServiceReference<VexaTouchHIDService>::share(this), _vexaDevice,
                           _dispatchEventContext, _inputReportThreadSignal, std::nullopt};
        const Vexa::SignalsBlocked blocked;
        std::thread([run = std::move(run)]() mutable noexcept {
            run.service.get()->runInputThread(run);
        }).detach();
        return 0;
    } catch (const std::system_error& error) {
        return error.code().value();
    } catch (const std::bad_alloc&) {
        return ENOMEM;
    }
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
        const bool submitted = submitStop(_inputReportRunLoop);
        _inputReportRunLoop.wake();
        _inputReportRunLoop.reset();
        _log.write(Vexa::LogLevel::Debug, "waiting for input report thread to exit");
        if (submitted) {
            _inputReportThreadSignal->wait();
        } else {
            // The thread has ended by itself, after its last signal, because its loop could not
            // run. Without memory for the task it would never end, and the wait neither.
            demand(_inputReportThreadSignal->tryWait(),
                   "unscheduleWithDispatchQueue: the input report thread cannot be told to stop");
        }
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
    const Vexa::RunLoop loop = runLoopOfThisThread();
    if (!loop) {
        // The service stays unscheduled.
        log.write(Vexa::LogLevel::Error, "input report thread has no run loop");
        run = {};
        signal->signal();
        return;
    }
    _inputReportRunLoop = loop;
    signal->signal();
    handleInputReports(run, loop);
    // Before the last signal, so that who unschedules owns what is left, this object included.
    inputThreadOf = nullptr;
    run = {};
    signal->signal();
    log.write(Vexa::LogLevel::Debug, "input report thread end");
}

void VexaTouchHIDService::handleInputReports(InputReportRun& run, const Vexa::RunLoop& loop) {
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
    // Refused when the service was scheduled twice: the device is still the first thread's, and
    // with it the callback, which this thread must then not take back either.
    vexa_status status = run.device.setInputReportCallback(buffer, &inputReportArrived, &handler);
    const bool registered = status == VEXA_STATUS_SUCCESS;
    if (registered) status = run.device.schedule(loop, kRunLoopMode);
    if (status != VEXA_STATUS_SUCCESS && run.device) {
        logFormat(_log, Vexa::LogLevel::Error, "device not scheduled: %jx", std::uintmax_t{status});
    }
    if (loop.run(kRunLoopMode) == VEXA_RUN_FAILED) {
        _log.write(Vexa::LogLevel::Error, "input report run loop failed");
    }
    if (registered) {
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
