#pragma once

#include "Platform/Library/LiveObjects.h"

#include <vexa/value.h>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

/// The head of every value; the content follows in a node of the class that `type` tells. Only the
/// count changes once a value is made, and a container's link when nobody refers to it any more.
struct vexa_value {
    constexpr explicit vexa_value(vexa_value_type itsType) noexcept : type(itsType) {}

    mutable std::atomic<std::size_t> references = 1;
    const vexa_value_type type;
};

namespace Vexa::Library {

/// True and false, which like null are static and not counted.
struct BooleanValue final : vexa_value {
    constexpr explicit BooleanValue(bool value) noexcept
        : vexa_value(VEXA_VALUE_BOOLEAN), content(value) {}

    const bool content;
};

struct CountedValue : vexa_value, private Counted<VEXA_OBJECT_VALUE> {
    using vexa_value::vexa_value;
};

template <vexa_value_type kType, class Number>
struct NumberValue final : CountedValue {
    explicit NumberValue(Number value) noexcept : CountedValue(kType), content(value) {}

    const Number content;
};

using SignedValue = NumberValue<VEXA_VALUE_SIGNED, std::int64_t>;
using UnsignedValue = NumberValue<VEXA_VALUE_UNSIGNED, std::uint64_t>;
using FloatValue = NumberValue<VEXA_VALUE_FLOAT, float>;
using DoubleValue = NumberValue<VEXA_VALUE_DOUBLE, double>;

/// A string or bytes. The content stands behind the node, with a zero byte after it.
struct TextValue final : CountedValue {
    TextValue(vexa_value_type itsType, std::size_t itsLength) noexcept
        : CountedValue(itsType), length(itsLength) {}

    [[nodiscard]] char* content() noexcept { return reinterpret_cast<char*>(this + 1); }
    [[nodiscard]] std::string_view text() const noexcept {
        return {reinterpret_cast<const char*>(this + 1), length};
    }

    const std::size_t length;
};

/// A value that holds others; a list of them stands behind the node.
struct ContainerValue : CountedValue {
    ContainerValue(vexa_value_type itsType, std::size_t itsCount) noexcept
        : CountedValue(itsType), count(itsCount) {}

    const std::size_t count;
    /// The next one to free, once nobody refers to this one.
    mutable const ContainerValue* nextToFree = nullptr;
};

template <vexa_value_type kType, class Item>
struct ContainerOf final : ContainerValue {
    explicit ContainerOf(std::size_t itsCount) noexcept : ContainerValue(kType, itsCount) {}

    [[nodiscard]] std::span<Item> items() noexcept {
        return {reinterpret_cast<Item*>(this + 1), count};
    }
    [[nodiscard]] std::span<const Item> items() const noexcept {
        return {reinterpret_cast<const Item*>(this + 1), count};
    }
};

using ArrayValue = ContainerOf<VEXA_VALUE_ARRAY, const vexa_value*>;
/// In the order of keys, each once. The keys' texts stand behind the list, with a zero byte each.
using DictionaryValue = ContainerOf<VEXA_VALUE_DICTIONARY, vexa_member>;

/// The node of a value whose type is known.
template <class Node>
const Node& as(const vexa_value& value) noexcept {
    return static_cast<const Node&>(value);
}

inline vexa_value_type typeOf(const vexa_value* value) noexcept {
    return value ? value->type : VEXA_VALUE_NONE;
}

inline std::string_view keyOf(const vexa_member& member) noexcept {
    return {member.key, member.key_length};
}

}  // namespace Vexa::Library
