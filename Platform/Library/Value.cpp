#include "Platform/Library/ValueNode.h"

#include <vexa/value.h>
#include <algorithm>
#include <cstring>
#include <functional>
#include <limits>
#include <memory>
#include <new>
#include <utility>
#include <vector>

namespace Vexa::Library {

namespace {

constinit vexa_value nullValue(VEXA_VALUE_NULL);
constinit BooleanValue falseValue(false);
constinit BooleanValue trueValue(true);

bool isCounted(const vexa_value& value) noexcept {
    return value.type > VEXA_VALUE_BOOLEAN;
}

bool isContainer(const vexa_value& value) noexcept {
    return value.type >= VEXA_VALUE_ARRAY;
}

vexa_value* retain(const vexa_value* value) noexcept {
    if (value && isCounted(*value)) value->references.fetch_add(1, std::memory_order_relaxed);
    return const_cast<vexa_value*>(value);  // to let go of it, the only thing that changes it
}

/// Whether that was the last one.
bool dropReference(const vexa_value* value) noexcept {
    if (!value || !isCounted(*value)) return false;
    // Who holds the only reference shares it with nobody: nothing to subtract from.
    return value->references.load(std::memory_order_acquire) == 1 ||
           value->references.fetch_sub(1, std::memory_order_acq_rel) == 1;
}

/// A new node with room for `tail` bytes behind it; null when there is no memory.
template <class Node, class... Arguments>
Node* makeNode(std::size_t tail, Arguments... arguments) noexcept {
    if (tail > std::numeric_limits<std::ptrdiff_t>::max() - sizeof(Node)) return nullptr;
    void* memory = ::operator new(sizeof(Node) + tail, std::nothrow);
    return memory ? ::new (memory) Node(arguments...) : nullptr;
}

template <class Node>
void freeNode(const vexa_value& value) noexcept {
    auto* node = const_cast<Node*>(&as<Node>(value));
    std::destroy_at(node);
    ::operator delete(node);
}

void freeLeaf(const vexa_value& value) noexcept {
    switch (value.type) {
        case VEXA_VALUE_SIGNED:
            return freeNode<SignedValue>(value);
        case VEXA_VALUE_UNSIGNED:
            return freeNode<UnsignedValue>(value);
        case VEXA_VALUE_FLOAT:
            return freeNode<FloatValue>(value);
        case VEXA_VALUE_DOUBLE:
            return freeNode<DoubleValue>(value);
        default:
            return freeNode<TextValue>(value);
    }
}

void release(const vexa_value* root) noexcept {
    // Containers that are to be freed wait in a list that runs through themselves: neither the
    // stack nor the heap is needed, whatever the depth.
    const ContainerValue* waiting = nullptr;
    const auto drop = [&waiting](const vexa_value* value) {
        if (!dropReference(value)) return;
        if (isContainer(*value)) {
            const auto& container = as<ContainerValue>(*value);
            container.nextToFree = std::exchange(waiting, &container);
        } else {
            freeLeaf(*value);
        }
    };

    drop(root);
    while (waiting) {
        const ContainerValue* container = std::exchange(waiting, waiting->nextToFree);
        if (container->type == VEXA_VALUE_ARRAY) {
            for (const vexa_value* element : as<ArrayValue>(*container).items()) drop(element);
            freeNode<ArrayValue>(*container);
        } else {
            for (const vexa_member& member : as<DictionaryValue>(*container).items()) {
                drop(member.value);
            }
            freeNode<DictionaryValue>(*container);
        }
    }
}

vexa_value* makeText(vexa_value_type type, const void* content, std::size_t length) noexcept {
    if (length == std::numeric_limits<std::size_t>::max() || (!content && length > 0)) {
        return nullptr;
    }
    auto* node = makeNode<TextValue>(length + 1, type, length);
    if (!node) return nullptr;
    if (length > 0) std::memcpy(node->content(), content, length);
    node->content()[length] = '\0';
    return node;
}

/// More than fit into memory, and few enough that their size is no overflow.
constexpr std::size_t kMostItems = std::numeric_limits<std::ptrdiff_t>::max() / sizeof(vexa_member);

/// An array that takes over references to the elements.
ArrayValue* makeArray(const vexa_value* const* elements, std::size_t count) noexcept {
    if ((!elements && count > 0) || count > kMostItems) return nullptr;
    auto* node = makeNode<ArrayValue>(std::span(elements, count).size_bytes(), count);
    if (node) std::copy_n(elements, count, node->items().begin());
    return node;
}

/// The members are in the order of keys, and each key is there once.
vexa_value* makeDictionaryInOrder(std::span<const vexa_member> members) noexcept {
    if (members.size() > kMostItems) return nullptr;
    std::size_t tail = members.size_bytes();
    for (const vexa_member& member : members) {
        if (member.key_length >= std::numeric_limits<std::ptrdiff_t>::max() - tail) return nullptr;
        tail += member.key_length + 1;
    }
    auto* node = makeNode<DictionaryValue>(tail, members.size());
    if (!node) return nullptr;
    auto* text = reinterpret_cast<char*>(node->items().data() + members.size());
    std::ranges::transform(members, node->items().begin(), [&text](const vexa_member& member) {
        const char* key = text;
        text = std::ranges::copy(keyOf(member), text).out;
        *text++ = '\0';
        return vexa_member{key, member.key_length, retain(member.value)};
    });
    return node;
}

/// May throw std::bad_alloc.
vexa_value* makeDictionary(std::span<const vexa_member> members) {
    const bool isInOrder =
        std::ranges::adjacent_find(members, std::ranges::greater_equal(), keyOf) == members.end();
    if (isInOrder) return makeDictionaryInOrder(members);

    std::vector<const vexa_member*> order;
    order.reserve(members.size());
    for (const vexa_member& member : members) order.push_back(&member);
    std::ranges::sort(order, [](const vexa_member* a, const vexa_member* b) {
        const auto comparison = keyOf(*a) <=> keyOf(*b);
        return comparison == 0 ? a < b : comparison < 0;
    });
    // Of each run of equal keys the last one stays.
    std::vector<vexa_member> kept;
    kept.reserve(order.size());
    for (const vexa_member* member : order) {
        if (!kept.empty() && keyOf(kept.back()) == keyOf(*member)) kept.pop_back();
        kept.push_back(*member);
    }
    return makeDictionaryInOrder(kept);
}

}  // namespace

}  // namespace Vexa::Library

using namespace Vexa::Library;

extern "C" {

vexa_value* vexa_value_retain(const vexa_value* value) noexcept {
    return retain(value);
}

void vexa_value_release(const vexa_value* value) noexcept {
    release(value);
}

vexa_value* vexa_value_create_null(void) noexcept {
    return &nullValue;
}

vexa_value* vexa_value_create_boolean(bool value) noexcept {
    return value ? &trueValue : &falseValue;
}

vexa_value* vexa_value_create_signed(int64_t value) noexcept {
    return makeNode<SignedValue>(0, value);
}

vexa_value* vexa_value_create_unsigned(uint64_t value) noexcept {
    return makeNode<UnsignedValue>(0, value);
}

vexa_value* vexa_value_create_float(float value) noexcept {
    return makeNode<FloatValue>(0, value);
}

vexa_value* vexa_value_create_double(double value) noexcept {
    return makeNode<DoubleValue>(0, value);
}

vexa_value* vexa_value_create_string(const char* text, size_t length) noexcept {
    return makeText(VEXA_VALUE_STRING, text, length);
}

vexa_value* vexa_value_create_bytes(const uint8_t* bytes, size_t length) noexcept {
    return makeText(VEXA_VALUE_BYTES, bytes, length);
}

vexa_value* vexa_value_create_array(const vexa_value* const* elements, size_t count) noexcept {
    auto* array = makeArray(elements, count);
    if (array) std::ranges::for_each(array->items(), retain);
    return array;
}

vexa_value* vexa_value_create_array_adopting(const vexa_value* const* elements,
                                             size_t count) noexcept {
    return makeArray(elements, count);
}

vexa_value* vexa_value_create_dictionary(const vexa_value* const* keys,
                                         const vexa_value* const* members, size_t count) noexcept {
    if ((!keys || !members) && count > 0) return nullptr;
    try {
        std::vector<vexa_member> given(count);
        for (std::size_t index = 0; index < count; ++index) {
            vexa_member& member = given[index];
            member.key = vexa_value_get_string(keys[index], &member.key_length);
            if (!member.key) return nullptr;
            member.value = members[index];
        }
        return makeDictionary(given);
    } catch (...) {
        return nullptr;
    }
}

vexa_value* vexa_value_create_dictionary_of(const vexa_member* members, size_t count) noexcept {
    if (!members && count > 0) return nullptr;
    const std::span given(members, count);
    const auto lacksKey = [](const vexa_member& member) {
        return !member.key && member.key_length > 0;
    };
    if (std::ranges::any_of(given, lacksKey)) return nullptr;
    try {
        return makeDictionary(given);
    } catch (...) {
        return nullptr;
    }
}

vexa_value_type vexa_value_get_type(const vexa_value* value) noexcept {
    return typeOf(value);
}

bool vexa_value_get_signed(const vexa_value* value, int64_t* out) noexcept {
    if (typeOf(value) != VEXA_VALUE_SIGNED) return false;
    *out = as<SignedValue>(*value).content;
    return true;
}

bool vexa_value_get_unsigned(const vexa_value* value, uint64_t* out) noexcept {
    if (typeOf(value) != VEXA_VALUE_UNSIGNED) return false;
    *out = as<UnsignedValue>(*value).content;
    return true;
}

const char* vexa_value_get_string(const vexa_value* value, size_t* length) noexcept {
    if (typeOf(value) != VEXA_VALUE_STRING) return nullptr;
    const std::string_view text = as<TextValue>(*value).text();
    if (length) *length = text.size();
    return text.data();
}

const uint8_t* vexa_value_get_bytes(const vexa_value* value, size_t* length) noexcept {
    if (typeOf(value) != VEXA_VALUE_BYTES) return nullptr;
    const std::string_view text = as<TextValue>(*value).text();
    if (length) *length = text.size();
    return reinterpret_cast<const uint8_t*>(text.data());
}

size_t vexa_value_get_count(const vexa_value* value) noexcept {
    return value && isContainer(*value) ? as<ContainerValue>(*value).count : 0;
}

const vexa_value* vexa_value_get_element(const vexa_value* value, size_t index) noexcept {
    if (index >= vexa_value_get_count(value)) return nullptr;
    if (value->type == VEXA_VALUE_ARRAY) return as<ArrayValue>(*value).items()[index];
    return as<DictionaryValue>(*value).items()[index].value;
}

const char* vexa_value_get_key(const vexa_value* value, size_t index, size_t* length) noexcept {
    if (typeOf(value) != VEXA_VALUE_DICTIONARY || index >= vexa_value_get_count(value)) {
        return nullptr;
    }
    const vexa_member& member = as<DictionaryValue>(*value).items()[index];
    if (length) *length = member.key_length;
    return member.key;
}

const vexa_value* const* vexa_value_get_elements(const vexa_value* array, size_t* count) noexcept {
    if (typeOf(array) != VEXA_VALUE_ARRAY) return nullptr;
    const auto elements = as<ArrayValue>(*array).items();
    if (count) *count = elements.size();
    return elements.data();
}

const vexa_member* vexa_value_get_members(const vexa_value* dictionary, size_t* count) noexcept {
    if (typeOf(dictionary) != VEXA_VALUE_DICTIONARY) return nullptr;
    const auto members = as<DictionaryValue>(*dictionary).items();
    if (count) *count = members.size();
    return members.data();
}

size_t vexa_value_find_key(const vexa_value* value, const char* key, size_t length) noexcept {
    if (typeOf(value) != VEXA_VALUE_DICTIONARY || (!key && length > 0)) return SIZE_MAX;
    const auto members = as<DictionaryValue>(*value).items();
    const std::string_view wanted(key, length);
    const auto found = std::ranges::lower_bound(members, wanted, {}, keyOf);
    if (found == members.end() || keyOf(*found) != wanted) return SIZE_MAX;
    return static_cast<std::size_t>(found - members.begin());
}

}  // extern "C"
