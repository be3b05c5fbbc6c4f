#pragma once

#include "Algorithm/Algs.h"
#include "Platform/HidEvent.h"
#include "Platform/PropertyValue.h"
#include "Shared/InputReport.h"

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch {

/// A reference-counted callable that may be empty. Copies share the closure; calling an empty one
/// does nothing.
template <typename... Arguments>
class Probe {
public:
    Probe() = default;
    Probe(std::nullptr_t) {}
    template <typename F>
        requires std::invocable<F&, Arguments...>
    Probe(F callable) {
        std::function<void(Arguments...)> closure(std::move(callable));
        if (closure) {  // an empty function or null pointer makes an empty probe
            closure_ =
                std::make_shared<const std::function<void(Arguments...)>>(std::move(closure));
        }
    }

    explicit operator bool() const noexcept { return closure_ != nullptr; }

    void operator()(Arguments... arguments) const {
        if (closure_) {
            // Held for the call, so that a probe may clear itself.
            const auto closure = closure_;
            (*closure)(arguments...);
        }
    }

private:
    std::shared_ptr<const std::function<void(Arguments...)>> closure_;
};

/// The single entry point to the touch gesture algorithm: raw input reports, the time and
/// string-keyed state go in, time-stamped events come out through a probe.
///
/// Probes observe the traffic on the caller's thread; an empty probe is skipped. The pipeline has
/// no lock and no virtual destructor (pipelines are held by value, by their own type): its owner
/// serialises all calls and every change of the probes. No exception leaves the operations, they
/// end the process instead (a failing probe, a broken invariant). Copying copies the probes
/// (sharing their closures), the time and the whole algorithm.
class Pipeline {
public:
    Pipeline() = default;

    /// Sets the time, in host ticks, that events are stamped with.
    virtual void setTime(std::uint64_t timeMach) noexcept;

    /// Hands a state of the domain "Algs" to the algorithm; any other key is ignored.
    virtual void setState(const std::string& key, Vexa::PropertyValue value) noexcept;

    /// Takes one input report of any content: a firmware event, else a touch image, else dropped
    /// as invalid. `report` may be null if `length` is 0.
    virtual void handleInputReport(const std::uint8_t* report, std::size_t length) noexcept;

    /// The algorithm's state of the domain "Algs", no value for any other key.
    [[nodiscard]] virtual Vexa::PropertyValue getState(const std::string& key) noexcept;

    /// Stamps the events with the current time and passes them on unless there are none.
    void handleHIDEvents(const std::vector<Vexa::HidEvent>& events) noexcept;

    /// The algorithm, to look at.
    [[nodiscard]] const Algs& algs() const noexcept { return _algs; }
    /// The current time in host ticks.
    [[nodiscard]] std::uint64_t timeMach() const noexcept { return _timeMach; }

    Probe<std::uint64_t> setTimeProbe;
    /// Sees the key unchanged, its domain included.
    Probe<const std::string&, const Vexa::PropertyValue&> setStateProbe;
    /// Every input report, valid or not.
    Probe<const std::uint8_t*, std::uint64_t> inputReportProbe;
    /// A report that is neither a firmware event nor an image.
    Probe<const std::uint8_t*, std::uint64_t> invalidInputReportProbe;
    Probe<const InputReport::FirmwareEvent*> firmwareEventProbe;
    Probe<const InputReport::Image*> imageProbe;
    /// Every batch of events that is not empty.
    Probe<const std::vector<Vexa::HidEvent>&> hidEventsProbe;
    Probe<const std::string&> getStateProbe;

protected:
    std::uint64_t _timeMach = 0;  ///< host ticks
    Algs _algs;

private:
    void handleFirmwareEvent(const InputReport::FirmwareEvent& event);
};

}  // namespace VexaTouch
