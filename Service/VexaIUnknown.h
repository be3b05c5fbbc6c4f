#pragma once

#include <vexa/plugin.h>
#include <cstdint>

namespace VexaTouch {

/// What the slots of both interface tables point at. Each function gets an interface reference as
/// its first argument, finds the service behind it and forwards to the operation of its name;
/// <vexa/plugin.h> is the manual.
///
/// What the host passes is borrowed for the call and wrapped in references of our own; these, and
/// every other temporary, are gone when the function returns. No exception leaves: without memory
/// a function answers like one that failed, or ends the process where there is no such answer and
/// where the pipeline runs out of it.
class VexaIUnknown {
public:
    VexaIUnknown() = delete;

    static vexa_status QueryInterface(void* self, vexa_identifier identifier, void** out) noexcept;
    /// Both return the count as it was before the call, plus or minus one: for information only.
    static std::uint32_t AddRef(void* self) noexcept;
    static std::uint32_t Release(void* self) noexcept;

    // The plug-in interface. The properties come before the service handle here, after it in the
    // service's operations.
    static vexa_status Probe(void* self, const vexa_value* properties, std::uint32_t service,
                             std::int32_t* score) noexcept;
    static vexa_status Start(void* self, const vexa_value* properties,
                             std::uint32_t service) noexcept;
    static vexa_status Stop(void* self) noexcept;

    // The service interface.
    static bool open(void* self, std::uint32_t options) noexcept;
    static void close(void* self, std::uint32_t options) noexcept;
    static vexa_value* copyProperty(void* self, const vexa_value* key) noexcept;
    static bool setProperty(void* self, const vexa_value* key, const vexa_value* value) noexcept;
    static void setEventCallback(void* self, vexa_event_callback callback, void* target,
                                 void* refcon) noexcept;
    static void scheduleWithDispatchQueue(void* self, vexa_queue* queue) noexcept;
    static void unscheduleFromDispatchQueue(void* self, vexa_queue* queue) noexcept;
    static vexa_event* copyEvent(void* self, std::uint32_t type, vexa_event* matching,
                                 std::uint32_t options) noexcept;
    static vexa_status setOutputEvent(void* self, vexa_event* event) noexcept;
};

}  // namespace VexaTouch
