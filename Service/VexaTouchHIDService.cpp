#include "Service/VexaTouchHIDService.h"

#include "Service/LogText.h"

#include <string>

namespace VexaTouch {

namespace {

/// Input reports that the recording keeps.
constexpr std::size_t kMaxFrameCount = 1350;

}  // namespace

bool VexaTouchHIDService::init() noexcept {
    if (!VexaHIDService::init()) return false;
    const Vexa::MutexLock lock(_pipelineLock);
    _pipeline.setMaxFrameCount(kMaxFrameCount);
    return true;
}

void VexaTouchHIDService::dealloc() noexcept {
    logOperation("dealloc");
    _inputReportRunLoop.reset();
    _vexaDevice.reset();
    VexaHIDService::dealloc();
}

void VexaTouchHIDService::logOperation(std::string_view name) const noexcept {
    _log.write(Vexa::LogLevel::Debug, name);
}

vexa_status VexaTouchHIDService::probeWithService(std::uint32_t, const Vexa::PropertyValue&,
                                                  std::int32_t*) {
    logOperation("probeWithService:properties:outScore:");
    return VEXA_STATUS_SUCCESS;
}

vexa_status VexaTouchHIDService::startWithService(std::uint32_t service,
                                                  const Vexa::PropertyValue&) {
    logOperation("startWithService:properties:");
    _vexaDevice = Vexa::HidDevice::create(service);
    return _vexaDevice ? VEXA_STATUS_SUCCESS : VEXA_STATUS_NO_RESOURCES;
}

vexa_status VexaTouchHIDService::stop() {
    logOperation("stop");
    _vexaDevice.reset();
    return VEXA_STATUS_SUCCESS;
}

bool VexaTouchHIDService::openWithOptions(std::uint32_t options) {
    logFormat(_log, Vexa::LogLevel::Debug, "openWithOptions:%jx", std::uintmax_t{options});
    return _vexaDevice.open(options) == VEXA_STATUS_SUCCESS;
}

void VexaTouchHIDService::closeWithOptions(std::uint32_t options) {
    logFormat(_log, Vexa::LogLevel::Debug, "closeWithOptions:%jx", std::uintmax_t{options});
    _vexaDevice.close(options);
}

void VexaTouchHIDService::setEventCallback(vexa_event_callback callback, void* target,
                                           void* refcon) {
    logOperation("setEventCallback:target:refcon:");
    _dispatchEventContext.callback = callback;
    _dispatchEventContext.target = target;
    _dispatchEventContext.refcon = refcon;
}

std::optional<Vexa::HidEvent> VexaTouchHIDService::copyEventWithType(std::uint32_t,
                                                                     const Vexa::HidEvent&,
                                                                     std::uint32_t) {
    logOperation("copyEventWithType:matching:options:");
    return std::nullopt;
}

vexa_status VexaTouchHIDService::setOutputEvent(const Vexa::HidEvent&) {
    logOperation("setOutputEvent:");
    return VEXA_STATUS_UNSUPPORTED;
}

}  // namespace VexaTouch
