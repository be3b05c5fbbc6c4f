#include "Platform/HidDevice.h"

namespace Vexa {

HidDevice HidDevice::create(std::uint32_t service) noexcept {
    HidDevice device;
    device.handle_ = Reference::adopt(vexa_device_create(service));
    return device;
}

vexa_status HidDevice::open(std::uint32_t options) const noexcept {
    return handle_ ? vexa_device_open(handle_.get(), options) : VEXA_STATUS_NOT_OPEN;
}

void HidDevice::close(std::uint32_t options) const noexcept {
    if (handle_) static_cast<void>(vexa_device_close(handle_.get(), options));
}

vexa_status HidDevice::featureReport(std::uint32_t reportId, std::uint8_t* buffer,
                                     std::size_t& length) const noexcept {
    if (handle_) {
        return vexa_device_get_report(handle_.get(), VEXA_REPORT_FEATURE, reportId, buffer,
                                      &length);
    }
    length = 0;
    return VEXA_STATUS_NOT_OPEN;
}

PropertyValue HidDevice::property(const PropertyValue& key) const noexcept {
    if (!handle_) return {};
    return PropertyValue::adopt(vexa_device_copy_property(handle_.get(), key.handle()));
}

bool HidDevice::setProperty(const PropertyValue& key, const PropertyValue& value) const noexcept {
    return handle_ && vexa_device_set_property(handle_.get(), key.handle(), value.handle());
}

vexa_status HidDevice::setInputReportCallback(std::span<std::uint8_t> buffer,
                                              vexa_input_report_callback callback,
                                              void* context) const noexcept {
    if (!handle_) return VEXA_STATUS_NOT_OPEN;
    return vexa_device_set_input_report_callback(handle_.get(), buffer.data(), buffer.size(),
                                                 callback, context);
}

vexa_status HidDevice::schedule(const RunLoop& loop, const char* mode) const noexcept {
    return handle_ ? vexa_device_schedule(handle_.get(), loop.get(), mode) : VEXA_STATUS_NOT_OPEN;
}

void HidDevice::unschedule(const RunLoop& loop, const char* mode) const noexcept {
    if (handle_) vexa_device_unschedule(handle_.get(), loop.get(), mode);
}

bool HidDevice::isPresent() const noexcept {
    return handle_ && vexa_device_is_present(handle_.get());
}

}  // namespace Vexa
