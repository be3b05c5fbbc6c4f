#pragma once

#include <vexa/log.h>
#include <array>
#include <string_view>

namespace Vexa::Library {

/// By their codes.
inline constexpr std::array<const char*, 4> kLogCategoryNames = {"HIDService", "Pipeline",
                                                                 "Recording", "Algs"};
inline constexpr std::array<const char*, 4> kLogLevelNames = {"debug", "info", "error", "off"};

inline bool isLogCategory(vexa_log_category category) noexcept {
    return static_cast<unsigned>(category) < kLogCategoryNames.size();
}
/// Off, a threshold only, is one as well.
inline bool isLogLevel(vexa_log_level level) noexcept {
    return static_cast<unsigned>(level) < kLogLevelNames.size();
}

}  // namespace Vexa::Library
