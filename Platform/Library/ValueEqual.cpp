#include "Platform/Library/ValueNode.h"

#include <vexa/value.h>
#include <algorithm>
#include <bit>
#include <cmath>
#include <utility>
#include <vector>

namespace Vexa::Library {

namespace {

bool sameDouble(double a, double b) noexcept {
    if (std::isnan(a) || std::isnan(b)) return std::isnan(a) && std::isnan(b);
    return std::bit_cast<std::uint64_t>(a) == std::bit_cast<std::uint64_t>(b);
}

bool sameInteger(const vexa_value& a, const vexa_value& b) noexcept {
    // Two that differ in sign type are equal only where both types have the value.
    const auto isNegative = [](const vexa_value& value) {
        return value.type == VEXA_VALUE_SIGNED && as<SignedValue>(value).content < 0;
    };
    return isNegative(a) == isNegative(b) &&
           vexa_value_to_unsigned(&a) == vexa_value_to_unsigned(&b);
}

/// Integers, floating-point numbers and everything else: values of two kinds are never equal.
vexa_value_type kindOf(const vexa_value* value) noexcept {
    switch (const vexa_value_type type = typeOf(value)) {
        case VEXA_VALUE_UNSIGNED:
            return VEXA_VALUE_SIGNED;
        case VEXA_VALUE_FLOAT:
            return VEXA_VALUE_DOUBLE;
        default:
            return type;
    }
}

/// Compares values in a recursion of bounded depth; what lies deeper waits for another round.
class Comparison {
public:
    /// May throw std::bad_alloc.
    bool areEqual(const vexa_value* a, const vexa_value* b) {
        if (!compare(a, b, kMaxDepth)) return false;
        while (!deferred_.empty()) {
            const auto [first, second] = deferred_.back();
            deferred_.pop_back();
            if (!compare(first, second, kMaxDepth)) return false;
        }
        return true;
    }

private:
    static constexpr int kMaxDepth = 128;

    bool compare(const vexa_value* a, const vexa_value* b, int depthLeft) {
        if (a == b) return true;
        const vexa_value_type kind = kindOf(a);
        if (kind != kindOf(b)) return false;
        switch (kind) {
            case VEXA_VALUE_SIGNED:
                return sameInteger(*a, *b);
            case VEXA_VALUE_DOUBLE:
                return sameDouble(vexa_value_to_double(a), vexa_value_to_double(b));
            case VEXA_VALUE_STRING:
            case VEXA_VALUE_BYTES:
                return as<TextValue>(*a).text() == as<TextValue>(*b).text();
            case VEXA_VALUE_ARRAY:
            case VEXA_VALUE_DICTIONARY:
                break;
            default:
                return false;  // one node for each value, and these are not the same
        }
        if (depthLeft == 0) {
            deferred_.emplace_back(a, b);
            return true;
        }
        return kind == VEXA_VALUE_ARRAY
                   ? compareArrays(as<ArrayValue>(*a), as<ArrayValue>(*b), depthLeft)
                   : compareDictionaries(as<DictionaryValue>(*a), as<DictionaryValue>(*b),
                                         depthLeft);
    }

    bool compareArrays(const ArrayValue& a, const ArrayValue& b, int depthLeft) {
        return std::ranges::equal(a.items(), b.items(),
                                  [&](const vexa_value* first, const vexa_value* second) {
                                      return compare(first, second, depthLeft - 1);
                                  });
    }

    bool compareDictionaries(const DictionaryValue& a, const DictionaryValue& b, int depthLeft) {
        return std::ranges::equal(a.items(), b.items(),
                                  [&](const vexa_member& first, const vexa_member& second) {
                                      return keyOf(first) == keyOf(second) &&
                                             compare(first.value, second.value, depthLeft - 1);
                                  });
    }

    std::vector<std::pair<const vexa_value*, const vexa_value*>> deferred_;
};

}  // namespace

}  // namespace Vexa::Library

extern "C" bool vexa_value_equal(const vexa_value* a, const vexa_value* b) noexcept {
    try {
        return Vexa::Library::Comparison().areEqual(a, b);
    } catch (...) {
        return false;
    }
}
