#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Platform/HidDevice.h"
#include "Platform/Log.h"
#include "Platform/Mutex.h"
#include "Platform/RunLoop.h"
#include "Platform/ThreadAnnotations.h"
#include "Service/CountingSemaphore.h"
#include "Service/DispatchEventContext.h"
#include "Service/VexaHIDService.h"
#include "Shared/InputReport.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

namespace VexaTouch {

/// The service of one touch device: owns the device, the pipeline with its recording and, while it
/// is scheduled, a detached input thread on which reports run through the pipeline.
///
/// Three threads meet. The host's runs the lifecycle; the input thread runs reports, pipeline and
/// probes; the host's serial queue runs the delivery of events. Properties may be read and written
/// on any thread. `_pipelineLock` is the only lock: it is held for the whole processing of a report
/// and for every property that is routed into the pipeline, never while the host is called. There
/// is no state flag: each operation acts on what is there.
class VexaTouchHIDService final : public VexaHIDService {
public:
    VexaTouchHIDService() = default;

    /// Caps the recording at 1350 input reports.
    [[nodiscard]] bool init() noexcept override;

    /// Leaves the score as the host set it.
    vexa_status probeWithService(std::uint32_t service, const Vexa::PropertyValue& properties,
                                 std::int32_t* outScore) override;
    /// Makes the device of the service handle, NO_RESOURCES when it cannot.
    vexa_status startWithService(std::uint32_t service,
                                 const Vexa::PropertyValue& properties) override;
    vexa_status stop() override;
    bool openWithOptions(std::uint32_t options) override;
    void closeWithOptions(std::uint32_t options) override;

    /// Keys of the domain "Pipeline" go to the pipeline, the service answers its own, the rest goes
    /// to the device. A key that is no string yields no value.
    Vexa::PropertyValue getPropertyForKey(const Vexa::PropertyValue& key) override
        EXCLUDES(_pipelineLock);
    /// Keys of the domain "Pipeline" are always taken; all others, the service's own included, are
    /// the device's. False for a key that is no string.
    bool setPropertyForKey(const Vexa::PropertyValue& value,
                           const Vexa::PropertyValue& key) override EXCLUDES(_pipelineLock);
    /// A dictionary of what the service knows of itself, without what has no value.
    Vexa::PropertyValue debugInfo() EXCLUDES(_pipelineLock);

    /// For the next scheduling.
    void setEventCallback(vexa_event_callback callback, void* target, void* refcon) override;
    /// Starts the input thread and returns once its run loop is there. When the thread or its loop
    /// cannot be made it logs why and returns all the same; unscheduling then only lets the queue
    /// go (and ends the thread of an earlier scheduling, if there is one).
    ///
    /// Scheduling a second time without unscheduling starts a second thread and leaves the first
    /// one beyond reach: it runs and keeps the service alive until the process ends. Its device
    /// stays with it, so it goes on reading the reports; the probes are the second thread's, events
    /// go to the second queue, and once that thread is unscheduled reports are read without any
    /// probe.
    void scheduleWithDispatchQueue(const Vexa::SerialQueue& queue) override;
    /// Returns once the input thread has taken back its probes and the device; without one it only
    /// lets the queue go. Neither the input thread itself nor a holder of `_pipelineLock` (a sink
    /// of the trace points is called under it on the input thread) can wait for that: a build with
    /// assertions aborts, another one waits forever.
    void unscheduleWithDispatchQueue(const Vexa::SerialQueue& queue) override
        EXCLUDES(_pipelineLock);

    /// The service answers no event queries.
    std::optional<Vexa::HidEvent> copyEventWithType(std::uint32_t type,
                                                    const Vexa::HidEvent& matching,
                                                    std::uint32_t options) override;
    /// UNSUPPORTED: there are no output events.
    vexa_status setOutputEvent(const Vexa::HidEvent& event) override;

protected:
    void dealloc() noexcept override;

private:
    class InputReportRun;

    /// Logs the name of the operation that was called.
    void logOperation(std::string_view name) const noexcept;

    // Properties.
    Vexa::PropertyValue version();
    Vexa::PropertyValue recording() EXCLUDES(_pipelineLock);
    Vexa::PropertyValue disjointImageCount();
    Vexa::PropertyValue firmwareVersion();
    Vexa::PropertyValue factoryResetHoldDuration();
    Vexa::PropertyValue criticalErrors();
    /// Reads and parses a feature report; nothing when either fails.
    template <typename Report>
    std::optional<Report> featureReport() const noexcept;

    /// 0, or the error number that says why there is no thread.
    int startInputThread();

    // The input thread.
    void runInputThread(InputReportRun& run) noexcept;
    void handleInputReports(InputReportRun& run, const Vexa::RunLoop& loop) EXCLUDES(_pipelineLock);
    void installProbes(InputReportRun& run) REQUIRES(_pipelineLock);
    void clearProbes() REQUIRES(_pipelineLock);
    void handleInputReport(vexa_report_type type, std::uint8_t reportId, const std::uint8_t* report,
                           std::size_t length, std::uint64_t timestamp) EXCLUDES(_pipelineLock);
    void observeInputReport(const std::uint8_t* report, std::uint64_t length) const;
    void observeInvalidInputReport(const std::uint8_t* report, std::uint64_t length) const;
    void observeFirmwareEvent(const InputReport::FirmwareEvent& event) const;
    /// Counts an image that does not follow the last one, if there is a last one.
    void observeImage(const InputReport::Image& image, std::optional<std::uint32_t>& lastFrame);

    Vexa::Log _log{Vexa::LogCategory::HIDService};
    Vexa::HidDevice _vexaDevice;
    /// None when no input thread runs.
    Vexa::RunLoop _inputReportRunLoop;
    /// Signalled twice by each input thread: when its run loop is there and when its work is done.
    std::shared_ptr<CountingSemaphore> _inputReportThreadSignal;
    DispatchEventContext _dispatchEventContext;
    std::atomic<std::uint32_t> _disjointImageCount{0};
    Vexa::Mutex _pipelineLock;
    PipelineRecording _pipeline GUARDED_BY(_pipelineLock);
};

}  // namespace VexaTouch
