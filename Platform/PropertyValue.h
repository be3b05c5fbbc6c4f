#pragma once

#include "Platform/Handle.h"
#include "Platform/OptionalView.h"

#include <vexa/value.h>
#include <compare>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <map>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace Vexa {

/// A dynamically typed value: a counted reference, the size of a pointer, to an immutable object of
/// libvexaplatform.
///
/// Copying shares the object (one atomic increment); nothing below a handle ever changes, so values
/// may be read and copied on any thread, and released on any thread. Assigning to one handle from
/// two threads at once needs a lock, as with any object.
///
/// Two states look alike and are not: a handle without a value (default constructed, the answer of
/// a read that found nothing) and the value `null()`, which is a value like any other.
class PropertyValue {
public:
    enum class Type : std::uint8_t {
        None = VEXA_VALUE_NONE,  ///< no value at all
        Null = VEXA_VALUE_NULL,  ///< the value null
        Boolean = VEXA_VALUE_BOOLEAN,
        Signed = VEXA_VALUE_SIGNED,      ///< 64-bit signed integer
        Unsigned = VEXA_VALUE_UNSIGNED,  ///< 64-bit unsigned integer
        Float = VEXA_VALUE_FLOAT,        ///< single-precision number, kept exactly
        Double = VEXA_VALUE_DOUBLE,
        String = VEXA_VALUE_STRING,  ///< bytes, by convention UTF-8
        Bytes = VEXA_VALUE_BYTES,
        Array = VEXA_VALUE_ARRAY,
        Dictionary = VEXA_VALUE_DICTIONARY,
    };

    // What containers are made from.
    using Bytes = std::vector<std::uint8_t>;
    using Array = std::vector<PropertyValue>;
    using Dictionary = std::map<std::string, PropertyValue, std::less<>>;

    // How they are read.
    class ArrayView;
    class DictionaryView;

    /// No value.
    PropertyValue() noexcept = default;

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
    PropertyValue(const std::string& text);
    PropertyValue(const Bytes& bytes);
    PropertyValue(const Array& elements);
    PropertyValue(Array&& elements);
    PropertyValue(const Dictionary& members);
    // NOLINTEND(google-explicit-constructor)

    /// An array that takes the elements; they have no value afterwards. May throw std::bad_alloc.
    static PropertyValue arrayOf(std::span<PropertyValue> elements);

    // For those who speak the C interface.

    /// Takes over a reference that the caller owns; NULL gives no value.
    static PropertyValue adopt(const vexa_value* owned) noexcept {
        PropertyValue value;
        value.handle_ = Handle::adopt(owned);
        return value;
    }
    /// Takes a reference of its own; NULL gives no value.
    static PropertyValue share(const vexa_value* borrowed) noexcept {
        PropertyValue value;
        value.handle_ = Handle::share(borrowed);
        return value;
    }
    /// Borrowed, as long as this handle keeps the value; NULL when there is none.
    [[nodiscard]] const vexa_value* handle() const noexcept { return handle_.get(); }
    /// Gives the reference to the caller and has no value afterwards.
    [[nodiscard]] vexa_value* detach() noexcept {
        return const_cast<vexa_value*>(handle_.detach());  // no value is made const
    }

    [[nodiscard]] Type type() const noexcept {
        return static_cast<Type>(vexa_value_get_type(handle()));
    }
    /// True unless this handle holds no value; null is a value.
    [[nodiscard]] explicit operator bool() const noexcept { return static_cast<bool>(handle_); }
    /// Signed, unsigned, float or double. A boolean is none of them (see the readings below).
    [[nodiscard]] bool isNumber() const noexcept;

    // Readings. A boolean counts as the number 0 or 1; whatever is neither boolean nor number
    // reads as the number 0. None of them throws.

    /// True for any number other than 0 (not-a-number included).
    [[nodiscard]] bool toBoolean() const noexcept { return vexa_value_to_boolean(handle()); }
    /// Floating-point values are truncated toward zero, negative values go through signed 64-bit
    /// two's complement, what is out of range saturates, not-a-number is 0.
    [[nodiscard]] std::uint64_t toUnsigned64() const noexcept {
        return vexa_value_to_unsigned(handle());
    }
    /// Rounded once to nearest; overflow gives infinity.
    [[nodiscard]] float toFloat() const noexcept { return vexa_value_to_float(handle()); }
    [[nodiscard]] double toDouble() const noexcept { return vexa_value_to_double(handle()); }

    // Views of the content, none when the value is of another type. They live as long as any
    // handle to this value.

    /// With a zero byte behind it.
    [[nodiscard]] OptionalView<std::string_view> asString() const noexcept;
    [[nodiscard]] OptionalView<std::span<const std::uint8_t>> asBytes() const noexcept;
    [[nodiscard]] OptionalView<ArrayView> asArray() const noexcept;
    [[nodiscard]] OptionalView<DictionaryView> asDictionary() const noexcept;

    /// The exact content of an integer value: asSigned for Type::Signed, asUnsigned for
    /// Type::Unsigned, none for every other type.
    [[nodiscard]] std::optional<std::int64_t> asSigned() const noexcept;
    [[nodiscard]] std::optional<std::uint64_t> asUnsigned() const noexcept;

    /// The member of a dictionary, or no value (also when this is no dictionary).
    [[nodiscard]] PropertyValue member(std::string_view key) const noexcept;

    /// Equal values of the same kind. Integers compare by value whatever their sign type, float
    /// and double by their exact bits as doubles (so 0.0 differs from -0.0), every not-a-number
    /// equals every other; an integer never equals a floating-point value, a boolean or null
    /// never equals a number. Deep values are compared member by member.
    friend bool operator==(const PropertyValue& a, const PropertyValue& b) noexcept {
        return vexa_value_equal(a.handle(), b.handle());
    }

    /// A readable text, for logs and diagnostics: strings in quotes, bytes as <hex>, floating-point
    /// numbers in the shortest form that reads back and always with a point, exponent or name.
    [[nodiscard]] std::string description() const;

private:
    using Handle = Vexa::Handle<const vexa_value, vexa_value_retain, vexa_value_release>;

    static PropertyValue fromBoolean(bool value) noexcept;
    static PropertyValue fromSigned(std::int64_t value);
    static PropertyValue fromUnsigned(std::uint64_t value);

    Handle handle_;
};

static_assert(sizeof(PropertyValue) == sizeof(void*));

namespace Detail {

/// Goes through a view by index. Yields values, not references.
template <class View>
class PropertyIterator {
public:
    using iterator_concept = std::random_access_iterator_tag;
    using iterator_category = std::input_iterator_tag;
    using value_type = typename View::value_type;
    using reference = value_type;
    using difference_type = std::ptrdiff_t;
    /// Keeps what operator-> shows for as long as the expression.
    class pointer {
    public:
        explicit pointer(value_type value) noexcept : value_(std::move(value)) {}
        const value_type* operator->() const noexcept { return &value_; }

    private:
        value_type value_;
    };

    PropertyIterator() noexcept = default;
    PropertyIterator(View view, std::size_t index) noexcept : view_(view), index_(index) {}

    reference operator*() const noexcept { return view_.item(index_); }
    pointer operator->() const noexcept { return pointer(**this); }
    reference operator[](difference_type offset) const noexcept { return *(*this + offset); }

    PropertyIterator& operator+=(difference_type offset) noexcept {
        index_ += static_cast<std::size_t>(offset);
        return *this;
    }
    PropertyIterator& operator-=(difference_type offset) noexcept { return *this += -offset; }
    PropertyIterator& operator++() noexcept { return *this += 1; }
    PropertyIterator& operator--() noexcept { return *this -= 1; }
    PropertyIterator operator++(int) noexcept { return std::exchange(*this, *this + 1); }
    PropertyIterator operator--(int) noexcept { return std::exchange(*this, *this - 1); }
    friend PropertyIterator operator+(PropertyIterator it, difference_type offset) noexcept {
        return it += offset;
    }
    friend PropertyIterator operator+(difference_type offset, PropertyIterator it) noexcept {
        return it += offset;
    }
    friend PropertyIterator operator-(PropertyIterator it, difference_type offset) noexcept {
        return it -= offset;
    }
    friend difference_type operator-(const PropertyIterator& a,
                                     const PropertyIterator& b) noexcept {
        return static_cast<difference_type>(a.index_) - static_cast<difference_type>(b.index_);
    }
    /// Of two of one view.
    friend bool operator==(const PropertyIterator& a, const PropertyIterator& b) noexcept {
        return a.index_ == b.index_;
    }
    friend auto operator<=>(const PropertyIterator& a, const PropertyIterator& b) noexcept {
        return a.index_ <=> b.index_;
    }

private:
    View view_;
    std::size_t index_ = 0;
};

/// What the views of arrays and of dictionaries have in common: a range of elements by index, each
/// of which the view makes when it is asked for.
template <class View, class Element>
class PropertyView {
public:
    using value_type = Element;
    using size_type = std::size_t;
    using difference_type = std::ptrdiff_t;
    using reference = value_type;
    using const_reference = value_type;
    using const_iterator = PropertyIterator<View>;
    using iterator = const_iterator;

    [[nodiscard]] std::size_t size() const noexcept { return vexa_value_get_count(container_); }
    [[nodiscard]] bool empty() const noexcept { return size() == 0; }
    [[nodiscard]] const_iterator begin() const noexcept { return {view(), 0}; }
    [[nodiscard]] const_iterator end() const noexcept { return {view(), size()}; }

    /// Element by element.
    friend bool operator==(const View& a, const View& b) noexcept {
        return vexa_value_equal(a.container(), b.container());
    }

protected:
    PropertyView() noexcept = default;
    explicit PropertyView(const vexa_value* container) noexcept : container_(container) {}
    ~PropertyView() = default;
    PropertyView(const PropertyView&) noexcept = default;
    PropertyView& operator=(const PropertyView&) noexcept = default;

    [[nodiscard]] const vexa_value* container() const noexcept { return container_; }

private:
    [[nodiscard]] const View& view() const noexcept { return static_cast<const View&>(*this); }

    const vexa_value* container_ = nullptr;
};

}  // namespace Detail

/// The elements of an array, which lives as long as any handle to its value.
class PropertyValue::ArrayView
    : public Detail::PropertyView<PropertyValue::ArrayView, PropertyValue> {
public:
    ArrayView() noexcept = default;

    /// No value beyond the end.
    [[nodiscard]] PropertyValue operator[](std::size_t index) const noexcept { return item(index); }
    /// Throws std::out_of_range beyond the end.
    [[nodiscard]] PropertyValue at(std::size_t index) const;
    [[nodiscard]] PropertyValue front() const noexcept { return item(0); }
    [[nodiscard]] PropertyValue back() const noexcept { return item(size() - 1); }

    friend bool operator==(const ArrayView& a, const Array& b) noexcept;

private:
    friend class PropertyValue;
    friend PropertyView;
    friend const_iterator;

    explicit ArrayView(const vexa_value* array) noexcept : PropertyView(array) {}
    [[nodiscard]] PropertyValue item(std::size_t index) const noexcept {
        return share(vexa_value_get_element(container(), index));
    }
};

/// The members of a dictionary in the order of keys, which live as long as any handle to its value.
/// Texts of keys live as long, too, and have a zero byte behind them.
class PropertyValue::DictionaryView
    : public Detail::PropertyView<PropertyValue::DictionaryView,
                                  std::pair<std::string_view, PropertyValue>> {
public:
    using key_type = std::string_view;
    using mapped_type = PropertyValue;

    DictionaryView() noexcept = default;

    [[nodiscard]] const_iterator find(std::string_view key) const noexcept;
    [[nodiscard]] bool contains(std::string_view key) const noexcept { return find(key) != end(); }
    [[nodiscard]] std::size_t count(std::string_view key) const noexcept { return contains(key); }
    /// Throws std::out_of_range when there is no such member.
    [[nodiscard]] PropertyValue at(std::string_view key) const;

    friend bool operator==(const DictionaryView& a, const Dictionary& b) noexcept;

private:
    friend class PropertyValue;
    friend PropertyView;
    friend const_iterator;

    explicit DictionaryView(const vexa_value* dictionary) noexcept : PropertyView(dictionary) {}
    [[nodiscard]] value_type item(std::size_t index) const noexcept;
};

}  // namespace Vexa
