#include "Service/EventDelivery.h"

#include "Platform/Trace.h"
#include "Service/LogText.h"

#include <cstdint>
#include <utility>

namespace VexaTouch {

EventDelivery::EventDelivery(ServiceReference<VexaHIDService> service, DispatchEventContext context,
                             Vexa::Log log) noexcept
    : service_(std::move(service)), context_(std::move(context)), log_(log) {}

void EventDelivery::operator()(const std::vector<Vexa::HidEvent>& events) const {
    const auto count = static_cast<std::uintmax_t>(events.size());
    logFormat(log_, Vexa::LogLevel::Debug, "HID events probe: %ju event(s)", count);
    if (events.empty()) return;
    if (!context_.queue) {
        logFormat(log_, Vexa::LogLevel::Debug, "Dispatch %ju event(s) dropped, no queue", count);
        return;
    }
    logFormat(log_, Vexa::LogLevel::Debug, "Dispatch %ju event(s) takeoff", count);
    context_.queue.submit([delivery = *this, batch = events]() noexcept { delivery.land(batch); });
}

void EventDelivery::land(const std::vector<Vexa::HidEvent>& events) const noexcept {
    Vexa::trace(Vexa::TraceCode::Batch, events.size());
    logFormat(log_, Vexa::LogLevel::Debug, "Dispatch %ju event(s) land",
              static_cast<std::uintmax_t>(events.size()));
    for (const Vexa::HidEvent& event : events) {
        Vexa::trace(Vexa::TraceCode::Event, static_cast<std::uint64_t>(event.type()),
                    static_cast<std::uint64_t>(event.phase()));
        logText(log_, Vexa::LogLevel::Info,
                [&event] { return "Dispatch event: " + event.description(); });
        // A host that set no callback wants no events.
        if (context_.callback) {
            context_.callback(context_.target, context_.refcon, context_.sender, event.handle(), 0);
        }
    }
}

}  // namespace VexaTouch
