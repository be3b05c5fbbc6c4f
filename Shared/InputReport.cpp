#include "Shared/InputReport.h"

#include "Shared/ParseReport.h"

namespace VexaTouch::InputReport {

std::optional<Image> Image::parse(const std::uint8_t* data, std::size_t length) noexcept {
    return parseReport<Image>(data, length);
}

std::optional<FirmwareEvent> FirmwareEvent::parse(const std::uint8_t* data,
                                                  std::size_t length) noexcept {
    return parseReport<FirmwareEvent>(data, length);
}

}  // namespace VexaTouch::InputReport
