#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

namespace Vexa {

/// One item of a HID report descriptor.
struct DescriptorItem {
    enum class Type : std::uint8_t { Main = 0, Global = 1, Local = 2, Reserved = 3, Long = 4 };

    // Tags of the items that are known by name, each with its type.
    enum Main : std::uint8_t {
        Input = 0x8,
        Output = 0x9,
        Collection = 0xA,
        Feature = 0xB,
        EndCollection = 0xC,
    };
    enum Global : std::uint8_t {
        UsagePage = 0x0,
        LogicalMinimum = 0x1,
        LogicalMaximum = 0x2,
        PhysicalMinimum = 0x3,
        PhysicalMaximum = 0x4,
        UnitExponent = 0x5,
        Unit = 0x6,
        ReportSize = 0x7,
        ReportId = 0x8,
        ReportCount = 0x9,
        Push = 0xA,
        Pop = 0xB,
    };
    enum Local : std::uint8_t {
        Usage = 0x0,
        UsageMinimum = 0x1,
        UsageMaximum = 0x2,
        DesignatorIndex = 0x3,
        DesignatorMinimum = 0x4,
        DesignatorMaximum = 0x5,
        StringIndex = 0x7,
        StringMinimum = 0x8,
        StringMaximum = 0x9,
        Delimiter = 0xA,
    };

    Type type = Type::Reserved;
    std::uint8_t tag = 0;
    std::span<const std::uint8_t> data = {};  ///< 0, 1, 2 or 4 bytes; of a long item up to 255
    std::size_t length = 0;                   ///< in bytes, the prefix included

    /// The first item of the bytes; nothing when they break off within it. No bytes: nothing too.
    static std::optional<DescriptorItem> first(std::span<const std::uint8_t> bytes) noexcept;

    /// The first four bytes of the data as a little-endian number.
    [[nodiscard]] std::uint32_t number() const noexcept;
    /// The same, with the sign that its length gives it.
    [[nodiscard]] std::int32_t signedNumber() const noexcept;
    [[nodiscard]] bool is(Main main) const noexcept { return type == Type::Main && tag == main; }
    [[nodiscard]] bool is(Global global) const noexcept {
        return type == Type::Global && tag == global;
    }
    [[nodiscard]] bool is(Local local) const noexcept {
        return type == Type::Local && tag == local;
    }
};

}  // namespace Vexa
