#include "Tools/Validate/ProcessResources.h"

#include "Tools/Validate/CheckTexts.h"

#include <chrono>
#include <filesystem>
#include <iterator>
#include <system_error>

namespace VexaTouch::Tools {
namespace {

std::int64_t entriesOf(const char* folder) {
    // A thread may end while they are counted.
    std::int64_t count = 0;
    std::error_code error;
    for (std::filesystem::directory_iterator entry(folder, error), end; entry != end && !error;
         entry.increment(error)) {
        ++count;
    }
    return count;
}

}  // namespace

ProcessResources ProcessResources::now() {
    ProcessResources found;
    found.counts_ = {
        vexa_live_objects(VEXA_OBJECT_VALUE),
        vexa_live_objects(VEXA_OBJECT_EVENT),
        vexa_live_objects(VEXA_OBJECT_QUEUE),
        vexa_live_objects(VEXA_OBJECT_DEVICE),
        vexa_live_objects(VEXA_OBJECT_RUN_LOOP),
        entriesOf("/proc/self/fd"),
        entriesOf("/proc/self/task"),
    };
    return found;
}

std::string ProcessResources::excessOver(const ProcessResources& before) const {
    static constexpr std::array<std::string_view, kKinds> kNames = {
        "value", "event", "queue", "device", "run loop", "descriptor", "thread"};
    std::string text;
    for (std::size_t kind = 0; kind < kKinds; ++kind) {
        if (counts_[kind] > before.counts_[kind]) {
            text += text.empty() ? "" : ", ";
            text += countText(counts_[kind] - before.counts_[kind], kNames[kind]);
        }
    }
    return text;
}

std::string settledExcess(const ProcessResources& before) {
    constexpr std::chrono::seconds kForThreads{3};
    constexpr std::chrono::milliseconds kForTheRest{300};
    static_cast<void>(waitUntil([&] { return !ProcessResources::now().hasMoreThreadsThan(before); },
                                kForThreads));
    static_cast<void>(
        waitUntil([&] { return ProcessResources::now().excessOver(before).empty(); }, kForTheRest));
    return ProcessResources::now().excessOver(before);
}

void requireGivenBack(CheckRun& run, const ProcessResources& before, std::string_view after) {
    const std::string excess = settledExcess(before);
    run.require(excess.empty(), "leaves " + excess + " behind after " + std::string(after));
}

}  // namespace VexaTouch::Tools
