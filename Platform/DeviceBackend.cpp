#include "Platform/DeviceBackend.h"

#include <memory>
#include <new>
#include <utility>

namespace Vexa {

void DeviceBackend::close(std::uint32_t /*options*/) noexcept {}

vexa_status DeviceBackend::getReport(vexa_report_type /*type*/, std::uint32_t /*reportId*/,
                                     std::span<std::uint8_t> /*report*/,
                                     std::size_t& /*length*/) noexcept {
    return VEXA_STATUS_UNSUPPORTED;
}

PropertyValue DeviceBackend::property(const PropertyValue& /*key*/) noexcept {
    return {};
}

bool DeviceBackend::setProperty(const PropertyValue& /*key*/,
                                const PropertyValue& /*value*/) noexcept {
    return false;
}

void DeviceBackend::reportArrived(std::span<const std::uint8_t> /*report*/) noexcept {}

void DeviceBackend::reportHandled() noexcept {}

namespace {

// The context of a registration: a share in the back-end.
using Owner = std::shared_ptr<DeviceBackend>;

DeviceBackend& backendOf(void* context) noexcept {
    return **static_cast<Owner*>(context);
}

constexpr vexa_device_backend kTable{
    .size = sizeof(vexa_device_backend),
    .open = [](void* context, std::uint32_t options, int* descriptor) -> vexa_status {
        return backendOf(context).open(options, *descriptor);
    },
    .close = [](void* context, std::uint32_t options) { backendOf(context).close(options); },
    .get_report = [](void* context, vexa_report_type type, std::uint32_t reportId,
                     std::uint8_t* report, std::size_t* length) -> vexa_status {
        return backendOf(context).getReport(type, reportId, {report, *length}, *length);
    },
    .copy_property = [](void* context, const vexa_value* key) -> vexa_value* {
        return backendOf(context).property(PropertyValue::share(key)).detach();
    },
    .set_property = [](void* context, const vexa_value* key, const vexa_value* value) -> bool {
        return backendOf(context).setProperty(PropertyValue::share(key),
                                              PropertyValue::share(value));
    },
    .report_handled = [](void* context) { backendOf(context).reportHandled(); },
    .destroy = [](void* context) { delete static_cast<Owner*>(context); },
    .report_arrived =
        [](void* context, const std::uint8_t* report, std::size_t length) {
            backendOf(context).reportArrived({report, length});
        },
};

}  // namespace

DeviceRegistration::DeviceRegistration(std::shared_ptr<DeviceBackend> backend) : service_(0) {
    auto owner = std::make_unique<Owner>(std::move(backend));
    service_ = vexa_service_register(&kTable, owner.get());
    if (service_ == 0) throw std::bad_alloc();
    // The library's now; it gives it back to `destroy`.
    [[maybe_unused]] const Owner* const given = owner.release();
}

DeviceRegistration::~DeviceRegistration() {
    static_cast<void>(vexa_service_unregister(service_));
}

}  // namespace Vexa
