#include "Tools/StateSnapshot.h"

#include "Algorithm/StateFields.h"
#include "Platform/ShortestText.h"

#include <bit>
#include <cmath>
#include <limits>
#include <string_view>
#include <type_traits>

namespace VexaTouch::Tools {
namespace {

enum class FieldKind : std::uint8_t { Boolean, Signed, Unsigned, Float, Type };

struct FieldInfo {
    std::string name;
    FieldKind kind;
};

template <typename Value>
constexpr FieldKind kindOf() {
    if constexpr (std::is_same_v<Value, PlayedType>) {
        return FieldKind::Type;
    } else if constexpr (std::is_same_v<Value, bool>) {
        return FieldKind::Boolean;
    } else if constexpr (std::is_same_v<Value, float>) {
        return FieldKind::Float;
    } else {
        return std::is_signed_v<Value> ? FieldKind::Signed : FieldKind::Unsigned;
    }
}

template <typename Value>
std::uint64_t bitsOf(Value value) {
    if constexpr (std::is_same_v<Value, float>) {
        // One not-a-number stands for all of them.
        return std::bit_cast<std::uint32_t>(
            std::isnan(value) ? std::numeric_limits<float>::quiet_NaN() : value);
    } else {
        return static_cast<std::uint64_t>(value);
    }
}

/// Calls visit(prefix, name, value) for each field in a fixed order. `Prefix` is a text that is
/// made only where it is asked for.
template <typename Visit>
void forEachField(const PlayedFrame& played, const Algs& algs, Visit&& visit) {
    const auto plain = [] { return std::string(); };
    const bool isImage = played.type == PlayedType::Image;
    visit(plain, "type", played.type);
    visit(plain, "time_ns", played.frame == nullptr ? std::uint64_t{0} : played.frame->timestamp);
    visit(plain, "frame", isImage ? played.image.frameNumber : std::uint32_t{0});
    visit(plain, "device_ms", isImage ? played.image.timestampMs : std::uint32_t{0});
    std::size_t index = 0;
    for (const Pixel& pixel : algs.touchPixels()) {
        const auto prefix = [index] {
            return std::string("pixels[") + static_cast<char>('A' + index) + "].";
        };
        forEachPixelField(
            pixel, [&](std::string_view name, const auto& value) { visit(prefix, name, value); });
        ++index;
    }
    for (const VirtualPixel& pixel : algs.virtualPixels()) {
        const auto prefix = [&pixel] { return "virtual[" + pixel._name + "]."; };
        forEachPixelField(
            pixel, [&](std::string_view name, const auto& value) { visit(prefix, name, value); });
    }
    const auto hand = [] { return std::string("hand."); };
    forEachHandStatsField(algs.handStats(), [&](std::string_view name, const auto& value) {
        if constexpr (requires { value.size(); }) {
            std::size_t element = 0;
            for (const auto& each : value) {
                visit(hand, std::string(name) + '[' + std::to_string(element++) + ']', each);
            }
        } else {
            visit(hand, name, value);
        }
    });
    visit(plain, "lastDispatchedPhase", algs.lastDispatchedPhase());
    const auto stats = [] { return std::string("stats."); };
    for (const EventStats::CounterEntry& entry : EventStats::kCounterTable) {
        visit(stats, entry.name, algs.eventStats()._stats.*entry.counter);
    }
}

const std::vector<FieldInfo>& fields() {
    static const std::vector<FieldInfo> list = [] {
        std::vector<FieldInfo> found;
        forEachField(PlayedFrame(), Algs(),
                     [&found](const auto& prefix, std::string_view name, const auto& value) {
                         found.push_back({prefix() + std::string(name),
                                          kindOf<std::remove_cvref_t<decltype(value)>>()});
                     });
        return found;
    }();
    return list;
}

}  // namespace

std::size_t StateSnapshot::fieldCount() {
    return fields().size();
}

const std::string& StateSnapshot::fieldName(std::size_t field) {
    return fields().at(field).name;
}

void StateSnapshot::take(const PlayedFrame& played, const Algs& algs) {
    values_.clear();
    values_.reserve(fieldCount());
    forEachField(played, algs, [this](const auto&, std::string_view, const auto& value) {
        values_.push_back(bitsOf(value));
    });
}

std::string StateSnapshot::fieldText(std::size_t field) const {
    const std::uint64_t bits = values_.at(field);
    switch (fields().at(field).kind) {
        case FieldKind::Type:
            return '"' + std::string(playedTypeName(static_cast<PlayedType>(bits))) + '"';
        case FieldKind::Boolean:
            return bits != 0 ? "true" : "false";
        case FieldKind::Signed:
            return std::to_string(static_cast<std::int64_t>(bits));
        case FieldKind::Unsigned:
            return std::to_string(bits);
        case FieldKind::Float:
            break;
    }
    const auto value = std::bit_cast<float>(static_cast<std::uint32_t>(bits));
    std::string text;
    Vexa::appendShortest(text, value);
    return std::isfinite(value) ? text : '"' + text + '"';
}

}  // namespace VexaTouch::Tools
