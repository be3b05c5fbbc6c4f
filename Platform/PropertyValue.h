#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace Vexa {

namespace Detail {
struct PropertyNode;
}

/// A dynamically typed value: a handle the size of a pointer to an immutable node.
///
/// Copying shares the node (one atomic increment); nothing below a handle ever changes, so values
/// may be read and copied on any thread, and released on any thread. Assigning to one handle from
/// two threads at once needs a lock, as with any object.
///
/// Two states look alike and are not: a handle without a value (default constructed, the answer of
/// a read that found nothing) and the value `null()`, which is a value like any other.
class PropertyValue {
public:
    enum class Type : std::uint8_t {
        None,  ///< no value at all
        Null,  ///< the value null
        Boolean,
        Signed,    ///< 64-bit signed integer
        Unsigned,  ///< 64-bit unsigned integer
        Float,     ///< single-precision number, kept exactly
        Double,
        String,  ///< bytes, by convention UTF-8
        Bytes,
        Array,
        Dictionary,
    };

    using Bytes = std::vector<std::uint8_t>;
    using Array = std::vector<PropertyValue>;
    using Dictionary = std::map<std::string, PropertyValue, std::less<>>;

    /// No value.
    PropertyValue() noexcept = default;
    PropertyValue(const PropertyValue& other) noexcept;
    PropertyValue(PropertyValue&& other) noexcept : node_(std::exchange(other.node_, nullptr)) {}
    PropertyValue& operator=(const PropertyValue& other) noexcept;
    PropertyValue& operator=(PropertyValue&& other) noexcept;
    ~PropertyValue();

    /// The value null (shared, never allocates).
    static PropertyValue null() noexcept;

    // Each constructor may throw std::bad_alloc and nothing else. They convert implicitly, so that
    // a call such as setState("Algs.HoldTimeoutMilliseconds", 300) reads as it should.
    // NOLINTBEGIN(google-explicit-constructor)
    PropertyValue(std::same_as<bool> auto value) : PropertyValue(fromBoolean(value)) {}
    PropertyValue(std::signed_integral auto value)
        : PropertyValue(fromSigned(static_cast<std::int64_t>(value))) {}
    PropertyValue(std::unsigned_integral auto value)
        requires(!std::same_as<decltype(value), bool>)
        : PropertyValue(fromUnsigned(static_cast<std::uint64_t>(value))) {}
    PropertyValue(float value);
    PropertyValue(double value);
    PropertyValue(const char* text);
    PropertyValue(std::string_view text);
    PropertyValue(std::string text);
    PropertyValue(Bytes bytes);
    PropertyValue(Array elements);
    PropertyValue(Dictionary members);
    // NOLINTEND(google-explicit-constructor)

    [[nodiscard]] Type type() const noexcept;
    /// True unless this handle holds no value; null is a value.
    [[nodiscard]] explicit operator bool() const noexcept { return node_ != nullptr; }
    /// Signed, unsigned, float or double. A boolean is none of them (see the readings below).
    [[nodiscard]] bool isNumber() const noexcept;

    // Readings. A boolean counts as the number 0 or 1; whatever is neither boolean nor number
    // reads as the number 0. None of them throws.

    /// True for any number other than 0 (not-a-number included).
    [[nodiscard]] bool toBoolean() const noexcept;
    /// Floating-point values are truncated toward zero, negative values go through signed 64-bit
    /// two's complement, what is out of range saturates, not-a-number is 0.
    [[nodiscard]] std::uint64_t toUnsigned64() const noexcept;
    /// Rounded once to nearest; overflow gives infinity.
    [[nodiscard]] float toFloat() const noexcept;
    [[nodiscard]] double toDouble() const noexcept;

    // Views of the content, null when the value is of another type. They live as long as any
    // handle to this value.
    [[nodiscard]] const std::string* asString() const noexcept;
    [[nodiscard]] const Bytes* asBytes() const noexcept;
    [[nodiscard]] const Array* asArray() const noexcept;
    [[nodiscard]] const Dictionary* asDictionary() const noexcept;

    /// The exact content of an integer value: asSigned for Type::Signed, asUnsigned for
    /// Type::Unsigned, null for every other type.
    [[nodiscard]] const std::int64_t* asSigned() const noexcept;
    [[nodiscard]] const std::uint64_t* asUnsigned() const noexcept;

    /// The member of a dictionary, or no value (also when this is no dictionary).
    [[nodiscard]] PropertyValue member(std::string_view key) const noexcept;

    /// Equal values of the same kind. Integers compare by value whatever their sign type, float
    /// and double by their exact bits as doubles (so 0.0 differs from -0.0), every not-a-number
    /// equals every other; an integer never equals a floating-point value, a boolean or null
    /// never equals a number. Deep values are compared member by member.
    friend bool operator==(const PropertyValue& a, const PropertyValue& b) noexcept;

    /// A readable text, for logs and diagnostics: strings in quotes, bytes as <hex>, floating-point
    /// numbers in the shortest form that reads back and always with a point, exponent or name.
    [[nodiscard]] std::string description() const;

private:
    friend struct Detail::PropertyNode;

    explicit PropertyValue(Detail::PropertyNode* adopted) noexcept : node_(adopted) {}
    static PropertyValue fromBoolean(bool value);
    static PropertyValue fromSigned(std::int64_t value);
    static PropertyValue fromUnsigned(std::uint64_t value);

    Detail::PropertyNode* node_ = nullptr;
};

static_assert(sizeof(PropertyValue) == sizeof(void*));

}  // namespace Vexa
