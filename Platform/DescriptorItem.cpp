#include "Platform/DescriptorItem.h"

#include <algorithm>

namespace Vexa {

std::optional<DescriptorItem> DescriptorItem::first(std::span<const std::uint8_t> bytes) noexcept {
    constexpr std::uint8_t kLongPrefix = 0xFE;
    constexpr std::size_t kLongHead = 3;  // prefix, length of the data, tag
    if (bytes.empty()) return std::nullopt;
    DescriptorItem item;
    std::size_t head = 1;
    std::size_t size = 0;
    if (bytes[0] == kLongPrefix) {
        if (bytes.size() < kLongHead) return std::nullopt;
        head = kLongHead;
        size = bytes[1];
        item.type = Type::Long;
        item.tag = bytes[2];
    } else {
        const unsigned code = bytes[0] & 3U;
        size = code == 3 ? 4 : code;
        item.type = static_cast<Type>(bytes[0] >> 2U & 3U);
        item.tag = static_cast<std::uint8_t>(bytes[0] >> 4U);
    }
    if (bytes.size() - head < size) return std::nullopt;
    item.data = bytes.subspan(head, size);
    item.length = head + size;
    return item;
}

std::uint32_t DescriptorItem::number() const noexcept {
    std::uint32_t value = 0;
    const std::size_t count = std::min<std::size_t>(data.size(), 4);
    for (std::size_t i = 0; i < count; ++i) {
        value |= std::uint32_t{data[i]} << (8U * i);
    }
    return value;
}

std::int32_t DescriptorItem::signedNumber() const noexcept {
    switch (data.size()) {
        case 1:
            return static_cast<std::int8_t>(number());
        case 2:
            return static_cast<std::int16_t>(number());
        default:
            return static_cast<std::int32_t>(number());
    }
}

}  // namespace Vexa
