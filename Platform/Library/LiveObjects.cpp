#include "Platform/Library/LiveObjects.h"

#include <array>
#include <cstddef>

namespace Vexa::Library {

namespace {

constexpr std::size_t kKinds = VEXA_OBJECT_RUN_LOOP + 1;

// Apart from each other, so that counting values does not slow down counting events.
struct alignas(64) Counter {
    std::atomic<std::int64_t> count{0};
};
constinit std::array<Counter, kKinds> counters;

}  // namespace

std::atomic<std::int64_t>& liveObjects(vexa_object_kind kind) noexcept {
    return counters[static_cast<std::size_t>(kind)].count;
}

}  // namespace Vexa::Library

extern "C" int64_t vexa_live_objects(vexa_object_kind kind) noexcept {
    if (static_cast<std::size_t>(kind) >= Vexa::Library::kKinds) return -1;
    return Vexa::Library::liveObjects(kind).load(std::memory_order_relaxed);
}
