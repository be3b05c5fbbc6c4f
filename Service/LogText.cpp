#include "Service/LogText.h"

#include <algorithm>
#include <array>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <string_view>

namespace VexaTouch {

void logFormat(const Vexa::Log& log, Vexa::LogLevel level, const char* format, ...) noexcept {
    if (!log.isEnabled(level)) return;
    std::array<char, 256> text{};
    std::va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(text.data(), text.size(), format, arguments);
    va_end(arguments);
    if (length < 0) return;
    log.write(level, std::string_view(text.data(),
                                      std::min(static_cast<std::size_t>(length), text.size() - 1)));
}

std::string objectText(const Vexa::PropertyValue& value) {
    if (!value) return "(null)";
    if (const auto text = value.asString()) return std::string(*text);
    return value.description();
}

}  // namespace VexaTouch
