#include "Tools/OptionValues.h"

#include "Tools/Failure.h"

#include <array>
#include <charconv>
#include <string>
#include <system_error>

namespace VexaTouch::Tools {
namespace {

/// The value, given or by default, or nothing.
std::optional<std::string> textOf(const Arguments& arguments, std::string_view name) {
    std::string text = arguments.value(name);
    return text.empty() && !arguments.given(name) ? std::nullopt : std::optional(std::move(text));
}

[[noreturn]] void refuse(std::string_view name, const std::string& text,
                         const std::string& expected) {
    throw UsageError(std::string(name) + ": expected " + expected + ", found \"" + text + "\"");
}

/// The number that the text begins with; the rest goes to `rest`.
template <typename Number>
std::optional<Number> leadingNumber(std::string_view text, std::string_view& rest) {
    Number number{};
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    rest = text.substr(static_cast<std::size_t>(end - text.data()));
    return error == std::errc() ? std::optional(number) : std::nullopt;
}

}  // namespace

std::optional<std::uint64_t> numberOption(const Arguments& arguments, std::string_view name,
                                          std::uint64_t lowest, std::uint64_t highest) {
    const auto text = textOf(arguments, name);
    if (!text) {
        return std::nullopt;
    }
    std::string_view rest;
    const auto number = leadingNumber<std::uint64_t>(*text, rest);
    if (!number || !rest.empty() || *number < lowest || *number > highest) {
        refuse(name, *text,
               "a number from " + std::to_string(lowest) + " to " + std::to_string(highest));
    }
    return number;
}

std::optional<double> rateOption(const Arguments& arguments, std::string_view name,
                                 double highest) {
    const auto text = textOf(arguments, name);
    if (!text) {
        return std::nullopt;
    }
    std::string_view rest;
    const auto number = leadingNumber<double>(*text, rest);
    // Written so that not-a-number is refused.
    if (!number || !rest.empty() || !(*number > 0 && *number <= highest)) {
        refuse(name, *text,
               "a number above 0, at most " + std::to_string(static_cast<std::uint64_t>(highest)));
    }
    return number;
}

std::optional<std::chrono::nanoseconds> durationOption(const Arguments& arguments,
                                                       std::string_view name) {
    struct Unit {
        std::string_view name;
        double seconds;
    };
    constexpr std::array<Unit, 5> kUnits = {
        {{"", 1}, {"s", 1}, {"ms", 1e-3}, {"min", 60}, {"h", 3600}}};
    constexpr double kLongest = 1e9;  // more than thirty years
    const auto text = textOf(arguments, name);
    if (!text) {
        return std::nullopt;
    }
    std::string_view rest;
    if (const auto number = leadingNumber<double>(*text, rest)) {
        for (const Unit& unit : kUnits) {
            const double seconds = *number * unit.seconds;
            if (unit.name == rest && seconds >= 0 && seconds <= kLongest) {
                return std::chrono::duration_cast<std::chrono::nanoseconds>(
                    std::chrono::duration<double>(seconds));
            }
        }
    }
    refuse(name, *text, "a time such as 10, 10s, 500ms or 2min");
}

ColorDepth colorOption(const Arguments& arguments, std::string_view name, const Streams& streams) {
    const std::string text = arguments.value(name);
    if (text == "auto") {
        return detectColorDepth(streams);
    }
    const auto depth = colorDepthFromText(text);
    if (!depth) {
        throw UsageError(std::string(name) + ' ' + text + ": not auto, never, 256 or truecolor");
    }
    return *depth;
}

}  // namespace VexaTouch::Tools
