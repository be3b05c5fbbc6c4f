#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

enum class CheckVerdict : std::uint8_t { Pass, Warning, Fail };

/// What one check found out about a plug-in.
struct CheckResult {
    std::string check;
    CheckVerdict verdict = CheckVerdict::Pass;
    std::string reason;  ///< empty when it passed
    std::uint64_t seed = 0;
    std::chrono::nanoseconds duration{0};
};

/// "fail     null-keys             12.3 ms  NULL as key: ..."
std::string resultLine(const CheckResult& result);
/// The same as one JSON object, without a line end.
std::string resultJson(const CheckResult& result);
/// The result of that check in what its process wrote, which may hold anything else as well.
std::optional<CheckResult> findResult(std::string_view output, std::string_view check);

}  // namespace VexaTouch::Tools
