#include "Platform/Library/ValueNode.h"

#include <vexa/value.h>
#include <cmath>
#include <limits>

namespace Vexa::Library {

namespace {

std::uint64_t unsignedFromDouble(double value) noexcept {
    constexpr double kTwoTo63 = 0x1p63;
    constexpr double kTwoTo64 = 0x1p64;
    if (std::isnan(value)) return 0;
    if (value >= kTwoTo64) return std::numeric_limits<std::uint64_t>::max();
    if (value >= 0) return static_cast<std::uint64_t>(value);
    const std::int64_t asSigned = value <= -kTwoTo63 ? std::numeric_limits<std::int64_t>::min()
                                                     : static_cast<std::int64_t>(value);
    return static_cast<std::uint64_t>(asSigned);
}

float floatFromDouble(double value) noexcept {
    // What rounds to beyond the largest float is stated, since the language leaves it undefined.
    constexpr double kRoundsToInfinity = 0x1.ffffffp127;
    constexpr float kLargest = std::numeric_limits<float>::max();
    const double magnitude = std::fabs(value);
    if (magnitude >= kRoundsToInfinity) {
        return std::copysign(std::numeric_limits<float>::infinity(), value < 0 ? -1.0f : 1.0f);
    }
    if (magnitude > static_cast<double>(kLargest)) return value < 0 ? -kLargest : kLargest;
    return static_cast<float>(value);
}

}  // namespace

}  // namespace Vexa::Library

using namespace Vexa::Library;

extern "C" {

bool vexa_value_to_boolean(const vexa_value* value) noexcept {
    switch (typeOf(value)) {
        case VEXA_VALUE_BOOLEAN:
            return as<BooleanValue>(*value).content;
        case VEXA_VALUE_SIGNED:
            return as<SignedValue>(*value).content != 0;
        case VEXA_VALUE_UNSIGNED:
            return as<UnsignedValue>(*value).content != 0;
        case VEXA_VALUE_FLOAT:
            return as<FloatValue>(*value).content != 0;
        case VEXA_VALUE_DOUBLE:
            return as<DoubleValue>(*value).content != 0;
        default:
            return false;
    }
}

uint64_t vexa_value_to_unsigned(const vexa_value* value) noexcept {
    switch (typeOf(value)) {
        case VEXA_VALUE_BOOLEAN:
            return as<BooleanValue>(*value).content ? 1 : 0;
        case VEXA_VALUE_SIGNED:
            return static_cast<std::uint64_t>(as<SignedValue>(*value).content);
        case VEXA_VALUE_UNSIGNED:
            return as<UnsignedValue>(*value).content;
        case VEXA_VALUE_FLOAT:
            return unsignedFromDouble(static_cast<double>(as<FloatValue>(*value).content));
        case VEXA_VALUE_DOUBLE:
            return unsignedFromDouble(as<DoubleValue>(*value).content);
        default:
            return 0;
    }
}

float vexa_value_to_float(const vexa_value* value) noexcept {
    switch (typeOf(value)) {
        case VEXA_VALUE_BOOLEAN:
            return as<BooleanValue>(*value).content ? 1.0f : 0.0f;
        case VEXA_VALUE_SIGNED:
            return static_cast<float>(as<SignedValue>(*value).content);
        case VEXA_VALUE_UNSIGNED:
            return static_cast<float>(as<UnsignedValue>(*value).content);
        case VEXA_VALUE_FLOAT:
            return as<FloatValue>(*value).content;
        case VEXA_VALUE_DOUBLE:
            return floatFromDouble(as<DoubleValue>(*value).content);
        default:
            return 0.0f;
    }
}

double vexa_value_to_double(const vexa_value* value) noexcept {
    switch (typeOf(value)) {
        case VEXA_VALUE_BOOLEAN:
            return as<BooleanValue>(*value).content ? 1.0 : 0.0;
        case VEXA_VALUE_SIGNED:
            return static_cast<double>(as<SignedValue>(*value).content);
        case VEXA_VALUE_UNSIGNED:
            return static_cast<double>(as<UnsignedValue>(*value).content);
        case VEXA_VALUE_FLOAT:
            return static_cast<double>(as<FloatValue>(*value).content);
        case VEXA_VALUE_DOUBLE:
            return as<DoubleValue>(*value).content;
        default:
            return 0.0;
    }
}

}  // extern "C"
