#pragma once

#include <cstddef>
#include <cstdlib>
#include <new>

/// Replaces the heap's operators by counting ones, in the whole process: for one file of a test
/// that is a process of its own.
namespace VexaTouch::Testing {

/// How often the calling thread took memory from the heap, and gave some back.
inline thread_local std::size_t allocations = 0;
inline thread_local std::size_t releases = 0;
/// The calling thread gets no memory when it asks for the so-manieth time from now; 0: it always
/// does.
inline thread_local std::size_t failingAllocation = 0;

inline void* countedAllocation(std::size_t size, std::size_t alignment) {
    ++allocations;
    if (failingAllocation != 0 && --failingAllocation == 0) {
        throw std::bad_alloc();
    }
    const std::size_t rounded = (size + alignment - 1) / alignment * alignment;
    void* memory = alignment <= alignof(std::max_align_t) ? std::malloc(size == 0 ? 1 : size)
                                                          : std::aligned_alloc(alignment, rounded);
    if (memory == nullptr) {
        throw std::bad_alloc();
    }
    return memory;
}

inline void countedRelease(void* memory) noexcept {
    releases += memory == nullptr ? 0U : 1U;
    std::free(memory);
}

}  // namespace VexaTouch::Testing

// The other forms (arrays, sized) end in these, as does the one that does not throw, but for a
// sanitizer's. Not inlined, or g++ sees free() beside operator new and warns of a mismatch.
// NOLINTBEGIN(misc-definitions-in-headers): included once in a program, they must replace
[[gnu::noinline]] void* operator new(std::size_t size) {
    return VexaTouch::Testing::countedAllocation(size, 1);
}
[[gnu::noinline]] void* operator new(std::size_t size, const std::nothrow_t& /*tag*/) noexcept {
    try {
        return VexaTouch::Testing::countedAllocation(size, 1);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}
[[gnu::noinline]] void* operator new(std::size_t size, std::align_val_t alignment) {
    return VexaTouch::Testing::countedAllocation(size, static_cast<std::size_t>(alignment));
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    VexaTouch::Testing::countedRelease(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    VexaTouch::Testing::countedRelease(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::align_val_t) noexcept {
    VexaTouch::Testing::countedRelease(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t, std::align_val_t) noexcept {
    VexaTouch::Testing::countedRelease(memory);
}
// NOLINTEND(misc-definitions-in-headers)
