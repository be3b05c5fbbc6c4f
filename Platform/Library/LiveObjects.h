#pragma once

#include <vexa/abi.h>
#include <atomic>
#include <cstdint>

namespace Vexa::Library {

/// How many objects of the kind live; constant initialised, so objects of any static may count.
std::atomic<std::int64_t>& liveObjects(vexa_object_kind kind) noexcept;

/// Derive from it (privately) to be counted.
template <vexa_object_kind kKind>
class Counted {
public:
    Counted(const Counted&) = delete;
    Counted(Counted&&) = delete;
    Counted& operator=(const Counted&) = delete;
    Counted& operator=(Counted&&) = delete;

protected:
    Counted() noexcept { liveObjects(kKind).fetch_add(1, std::memory_order_relaxed); }
    ~Counted() { liveObjects(kKind).fetch_sub(1, std::memory_order_relaxed); }
};

}  // namespace Vexa::Library
