#include "Platform/PropertyValue.h"

#include <algorithm>
#include <iterator>
#include <new>
#include <stdexcept>
#include <tuple>
#include <type_traits>

namespace Vexa {

namespace {

PropertyValue madeOrThrow(const vexa_value* made) {
    if (!made) throw std::bad_alloc();
    return PropertyValue::adopt(made);
}

// An array of handles is one of references, as the C interface takes it.
static_assert(std::is_standard_layout_v<PropertyValue>);

const vexa_value* const* references(std::span<const PropertyValue> elements) noexcept {
    return reinterpret_cast<const vexa_value* const*>(elements.data());
}

std::vector<vexa_member> membersOf(const PropertyValue::Dictionary& members) {
    std::vector<vexa_member> list;
    list.reserve(members.size());
    for (const auto& [key, value] : members) {
        list.push_back({key.data(), key.size(), value.handle()});
    }
    return list;
}

}  // namespace

PropertyValue PropertyValue::null() noexcept {
    return adopt(vexa_value_create_null());
}

PropertyValue PropertyValue::fromBoolean(bool value) noexcept {
    return adopt(vexa_value_create_boolean(value));
}

PropertyValue PropertyValue::fromSigned(std::int64_t value) {
    return madeOrThrow(vexa_value_create_signed(value));
}

PropertyValue PropertyValue::fromUnsigned(std::uint64_t value) {
    return madeOrThrow(vexa_value_create_unsigned(value));
}

PropertyValue::PropertyValue(float value)
    : PropertyValue(madeOrThrow(vexa_value_create_float(value))) {}
PropertyValue::PropertyValue(double value)
    : PropertyValue(madeOrThrow(vexa_value_create_double(value))) {}
PropertyValue::PropertyValue(const char* text) : PropertyValue(std::string_view(text)) {}
PropertyValue::PropertyValue(std::string_view text)
    : PropertyValue(madeOrThrow(vexa_value_create_string(text.data(), text.size()))) {}
PropertyValue::PropertyValue(const std::string& text) : PropertyValue(std::string_view(text)) {}
PropertyValue::PropertyValue(const Bytes& bytes)
    : PropertyValue(madeOrThrow(vexa_value_create_bytes(bytes.data(), bytes.size()))) {}
PropertyValue::PropertyValue(const Array& elements)
    : PropertyValue(madeOrThrow(vexa_value_create_array(references(elements), elements.size()))) {}
PropertyValue::PropertyValue(Array&& elements) {
    Array taken = std::move(elements);
    *this = arrayOf(taken);
}
PropertyValue::PropertyValue(const Dictionary& members) {
    const std::vector<vexa_member> list = membersOf(members);
    *this = madeOrThrow(vexa_value_create_dictionary_of(list.data(), list.size()));
}

PropertyValue PropertyValue::arrayOf(std::span<PropertyValue> elements) {
    PropertyValue array =
        madeOrThrow(vexa_value_create_array_adopting(references(elements), elements.size()));
    for (PropertyValue& element : elements) std::ignore = element.detach();
    return array;
}

bool PropertyValue::isNumber() const noexcept {
    const Type mine = type();
    return mine >= Type::Signed && mine <= Type::Double;
}

OptionalView<std::string_view> PropertyValue::asString() const noexcept {
    std::size_t length = 0;
    const char* text = vexa_value_get_string(handle(), &length);
    if (!text) return {};
    return std::string_view(text, length);
}

OptionalView<std::span<const std::uint8_t>> PropertyValue::asBytes() const noexcept {
    std::size_t length = 0;
    const std::uint8_t* bytes = vexa_value_get_bytes(handle(), &length);
    if (!bytes) return {};
    return std::span(bytes, length);
}

OptionalView<PropertyValue::ArrayView> PropertyValue::asArray() const noexcept {
    if (type() != Type::Array) return {};
    return ArrayView(handle());
}

OptionalView<PropertyValue::DictionaryView> PropertyValue::asDictionary() const noexcept {
    if (type() != Type::Dictionary) return {};
    return DictionaryView(handle());
}

std::optional<std::int64_t> PropertyValue::asSigned() const noexcept {
    std::int64_t content = 0;
    if (!vexa_value_get_signed(handle(), &content)) return std::nullopt;
    return content;
}

std::optional<std::uint64_t> PropertyValue::asUnsigned() const noexcept {
    std::uint64_t content = 0;
    if (!vexa_value_get_unsigned(handle(), &content)) return std::nullopt;
    return content;
}

PropertyValue PropertyValue::member(std::string_view key) const noexcept {
    const std::size_t index = vexa_value_find_key(handle(), key.data(), key.size());
    return share(vexa_value_get_element(handle(), index));
}

std::string PropertyValue::description() const {
    const PropertyValue text = madeOrThrow(vexa_value_create_description(handle()));
    return std::string(text.asString().value());
}

PropertyValue PropertyValue::ArrayView::at(std::size_t index) const {
    if (index >= size()) throw std::out_of_range("no such element");
    return item(index);
}

bool operator==(const PropertyValue::ArrayView& a, const PropertyValue::Array& b) noexcept {
    return std::ranges::equal(a, b);
}

PropertyValue::DictionaryView::value_type PropertyValue::DictionaryView::item(
    std::size_t index) const noexcept {
    std::size_t length = 0;
    const char* key = vexa_value_get_key(container(), index, &length);
    return {std::string_view(key, length), share(vexa_value_get_element(container(), index))};
}

PropertyValue::DictionaryView::const_iterator PropertyValue::DictionaryView::find(
    std::string_view key) const noexcept {
    return {*this, std::min(vexa_value_find_key(container(), key.data(), key.size()), size())};
}

PropertyValue PropertyValue::DictionaryView::at(std::string_view key) const {
    const const_iterator found = find(key);
    if (found == end()) throw std::out_of_range("no such member");
    return found->second;
}

bool operator==(const PropertyValue::DictionaryView& a,
                const PropertyValue::Dictionary& b) noexcept {
    return std::ranges::equal(a, b, [](const auto& mine, const auto& other) {
        return mine.first == other.first && mine.second == other.second;
    });
}

}  // namespace Vexa
