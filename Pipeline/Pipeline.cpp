#include "Pipeline/Pipeline.h"

#include "Shared/Util.h"

#include <string_view>

namespace VexaTouch {

namespace {

constexpr std::uint32_t kResetUsagePage = 0xFF60;
constexpr std::uint32_t kResetUsage = 2;

/// Removes the algorithm's domain from the key; false when it is of another.
bool stripAlgorithmDomain(std::string& key) {
    static const std::string domain = "Algs";
    return Util::stripDomainFromKey(key, domain);
}

}  // namespace

void Pipeline::setTime(std::uint64_t timeMach) noexcept {
    setTimeProbe(timeMach);
    _timeMach = timeMach;
}

void Pipeline::setState(const std::string& key, Vexa::PropertyValue value) noexcept {
    setStateProbe(key, value);
    std::string name = key;
    if (stripAlgorithmDomain(name)) {
        _algs.setState(name, value);
    }
}

Vexa::PropertyValue Pipeline::getState(const std::string& key) noexcept {
    getStateProbe(key);
    std::string name = key;
    // "DebugInfo" has deliberately no answer here: the pipeline has nothing to tell of its own.
    return stripAlgorithmDomain(name) ? _algs.getState(name) : Vexa::PropertyValue();
}

void Pipeline::handleInputReport(const std::uint8_t* report, std::size_t length) noexcept {
    inputReportProbe(report, length);
    if (const auto event = InputReport::FirmwareEvent::parse(report, length)) {
        handleFirmwareEvent(*event);
    } else if (const auto image = InputReport::Image::parse(report, length)) {
        imageProbe(&*image);
        handleHIDEvents(_algs.handleImage(*image));
    } else {
        invalidInputReportProbe(report, length);
    }
}

void Pipeline::handleFirmwareEvent(const InputReport::FirmwareEvent& event) {
    firmwareEventProbe(&event);
    if (event.code != 0) {
        return;
    }
    std::vector<Vexa::HidEvent> events = _algs.handleReset();
    Vexa::VendorEventRecord reset;
    reset.usagePage = kResetUsagePage;
    reset.usage = kResetUsage;
    events.push_back(Vexa::HidEvent::vendorDefined(reset));
    handleHIDEvents(events);
}

void Pipeline::handleHIDEvents(const std::vector<Vexa::HidEvent>& events) noexcept {
    for (const Vexa::HidEvent& event : events) {
        event.setTimestamp(_timeMach);
    }
    if (!events.empty()) {
        hidEventsProbe(events);
    }
}

}  // namespace VexaTouch
