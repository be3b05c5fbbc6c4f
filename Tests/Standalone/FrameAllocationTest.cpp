// A process of its own, since it replaces the heap's operators by counting ones.

#include "Algorithm/Algs.h"
#include "Tests/Support/SessionGenerator.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <cstdlib>
#include <new>

namespace {

std::atomic<std::size_t> allocations{0};

void* countedAllocation(std::size_t size, std::size_t alignment) {
    ++allocations;
    const std::size_t rounded = (size + alignment - 1) / alignment * alignment;
    void* memory = alignment <= alignof(std::max_align_t) ? std::malloc(size == 0 ? 1 : size)
                                                          : std::aligned_alloc(alignment, rounded);
    if (memory == nullptr) {
        throw std::bad_alloc();
    }
    return memory;
}

}  // namespace

// The other forms (arrays, not throwing, sized) end in these. Not inlined, or g++ sees free()
// beside operator new and warns of a mismatch.
[[gnu::noinline]] void* operator new(std::size_t size) {
    return countedAllocation(size, 1);
}
[[gnu::noinline]] void* operator new(std::size_t size, std::align_val_t alignment) {
    return countedAllocation(size, static_cast<std::size_t>(alignment));
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::align_val_t) noexcept {
    std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t, std::align_val_t) noexcept {
    std::free(memory);
}

namespace VexaTouch {
namespace {

TEST(FrameAllocation, TheHeapIsCounted) {
    const std::size_t before = allocations;
    // A direct call, which no compiler may leave out as it may a new expression.
    void* const memory = ::operator new(16);
    EXPECT_EQ(allocations, before + 1);
    ::operator delete(memory);
}

TEST(FrameAllocation, AFrameWithoutAnEventAllocatesNothing) {
    Testing::SessionGenerator generator(1);
    Testing::SessionGenerator::Images images = generator.mixed(50'000);
    for (const auto& image : generator.noisy(2000)) {
        images.push_back(image);
    }
    Algs algs;
    std::size_t quietFrames = 0;
    std::size_t touchingFrames = 0;
    std::size_t events = 0;
    for (const InputReport::Image& image : images) {
        const std::size_t before = allocations;
        const std::size_t made = algs.handleImage(image).size();
        const std::size_t used = allocations - before;
        events += made;
        if (made == 0) {
            ASSERT_EQ(used, 0U) << "frame " << image.frameNumber;
            ++quietFrames;
            touchingFrames += algs.handStats()._isTouching ? 1U : 0U;
        } else {
            // The list of one event and the event itself.
            ASSERT_LE(used, 2U) << "frame " << image.frameNumber;
        }
    }
    // What was counted is worth it.
    EXPECT_GT(quietFrames, 50'000U);
    EXPECT_GT(touchingFrames, 5'000U);
    EXPECT_GT(events, 300U);
}

TEST(FrameAllocation, ASettingDoesNotMakeTheNextFrameAllocate) {
    Testing::SessionGenerator generator(2);
    Algs algs;
    for (const InputReport::Image& image : generator.touching(100)) {
        algs.handleImage(image);
    }
    algs.setState("ActivationThreshold", 180.0);
    algs.setState("VirtualNormalizationFactors.3", 0.5);
    for (const InputReport::Image& image : generator.touching(100)) {
        const std::size_t before = allocations;
        const bool none = algs.handleImage(image).empty();
        EXPECT_TRUE(!none || allocations == before);
    }
}

}  // namespace
}  // namespace VexaTouch
