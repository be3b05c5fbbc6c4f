#pragma once

#include "Tools/Validate/CheckRun.h"

#include <vexa/abi.h>
#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// What the process holds at one moment and a plug-in must give back.
class ProcessResources {
public:
    [[nodiscard]] static ProcessResources now();

    /// "2 values, 1 thread": what there is more than there was; empty when nothing is.
    [[nodiscard]] std::string excessOver(const ProcessResources& before) const;
    [[nodiscard]] bool hasMoreThreadsThan(const ProcessResources& before) const noexcept {
        return counts_[Threads] > before.counts_[Threads];
    }

private:
    enum Kind : std::uint8_t { Values, Events, Queues, Devices, RunLoops, Descriptors, Threads };
    static constexpr std::size_t kKinds = Threads + 1;

    std::array<std::int64_t, kKinds> counts_{};
};

/// Waits until there is no more than there was, and tells what there still is: empty when all was
/// given back. A detached thread may need its last instructions, so threads are waited for long;
/// once they have ended, only those that were there before could give anything back.
std::string settledExcess(const ProcessResources& before);

/// Fails the check when something is not given back: "leaves 1 thread behind after ...".
void requireGivenBack(CheckRun& run, const ProcessResources& before, std::string_view after);

}  // namespace VexaTouch::Tools
