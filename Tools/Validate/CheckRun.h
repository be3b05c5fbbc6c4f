#pragma once

#include "Tools/SeededNumbers.h"
#include "Tools/Streams.h"
#include "Tools/Validate/CheckResult.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {

/// One run of one check, in the process that was made for it.
///
/// A check that has found a fault ends the process at once: the plug-in's threads may still run,
/// and nothing that it holds can be trusted, so nothing is given back.
class CheckRun {
public:
    CheckRun(std::string_view check, std::string plugin, std::uint64_t seed, bool json,
             Streams& streams)
        : check_(check), plugin_(std::move(plugin)), seed_(seed), json_(json), streams_(streams) {}
    CheckRun(const CheckRun&) = delete;
    CheckRun(CheckRun&&) = delete;
    CheckRun& operator=(const CheckRun&) = delete;
    CheckRun& operator=(CheckRun&&) = delete;
    ~CheckRun() = default;

    [[nodiscard]] const std::string& plugin() const noexcept { return plugin_; }
    [[nodiscard]] SeededNumbers random() const noexcept { return SeededNumbers(seed_); }

    /// Says on the error stream what comes now ("calling Stop"), so that a crash or a hang can be
    /// told with it. The check's own thread.
    void step(std::string_view what) const;

    /// The check passes, but this is worth knowing.
    void warn(std::string_view what);
    /// Ends the process with the reason.
    [[noreturn]] void fail(std::string_view reason) const;
    void require(bool holds, std::string_view reason) const {
        if (!holds) {
            fail(reason);
        }
    }
    /// Ends the process with what was found so far, and leaves to the system what still runs.
    [[noreturn]] void leave() const;
    /// The check is done and all is given back. Returns the exit code.
    [[nodiscard]] int finish() const;

private:
    void print(CheckVerdict verdict, const std::string& reason) const;
    [[nodiscard]] CheckVerdict verdict() const noexcept {
        return warnings_.empty() ? CheckVerdict::Pass : CheckVerdict::Warning;
    }

    std::string_view check_;
    std::string plugin_;
    std::uint64_t seed_;
    bool json_;
    Streams& streams_;
    std::string warnings_;
    std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
};

/// What CheckRun::step writes before its text.
std::string stepPrefix(std::string_view check);

/// For what should be done when a call has returned, and at the latest very soon.
inline constexpr std::chrono::milliseconds kSettleTime{500};

/// Waits until the condition holds; false when it does not within the time.
bool waitUntil(const std::function<bool()>& holds,
               std::chrono::milliseconds limit = std::chrono::seconds(5));

}  // namespace VexaTouch::Tools
