#pragma once

#include "Host/InterfaceReference.h"
#include "Platform/HidEvent.h"
#include "Platform/PropertyValue.h"

#include <vexa/plugin.h>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>

namespace VexaTouch::Host {

/// The service interface of one plug-in instance: a typed call for each slot of its table. The
/// order and the threads of the calls are those of <vexa/plugin.h>. There must be a reference.
class ServiceReference {
public:
    ServiceReference() noexcept = default;
    explicit ServiceReference(InterfaceReference<vexa_service_interface> reference) noexcept
        : reference_(std::move(reference)) {}

    [[nodiscard]] bool open(std::uint32_t options) const {
        return reference_->open(reference_.self(), options);
    }
    void close(std::uint32_t options) const { reference_->close(reference_.self(), options); }
    /// No value when the key has none.
    [[nodiscard]] Vexa::PropertyValue property(std::string_view key) const;
    /// Whether the value was taken.
    // NOLINTNEXTLINE(modernize-use-nodiscard): a write that nobody checks is fine
    bool setProperty(std::string_view key, const Vexa::PropertyValue& value) const;
    void setEventCallback(vexa_event_callback callback, void* target, void* refcon) const {
        reference_->setEventCallback(reference_.self(), callback, target, refcon);
    }
    void schedule(vexa_queue* queue) const {
        reference_->scheduleWithDispatchQueue(reference_.self(), queue);
    }
    void unschedule(vexa_queue* queue) const {
        reference_->unscheduleFromDispatchQueue(reference_.self(), queue);
    }
    [[nodiscard]] std::optional<Vexa::HidEvent> copyEvent(std::uint32_t type,
                                                          const Vexa::HidEvent* matching,
                                                          std::uint32_t options) const;
    [[nodiscard]] vexa_status setOutputEvent(const Vexa::HidEvent& event) const;

    /// Gives the reference back.
    void reset() noexcept { reference_.reset(); }
    /// What events name as their sender.
    [[nodiscard]] void* self() const noexcept { return reference_.self(); }
    explicit operator bool() const noexcept { return static_cast<bool>(reference_); }

private:
    InterfaceReference<vexa_service_interface> reference_;
};

}  // namespace VexaTouch::Host
