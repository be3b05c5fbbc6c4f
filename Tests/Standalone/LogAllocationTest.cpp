// A process of its own, since it replaces the heap's operators by counting ones.

#include "Platform/Log.h"
#include "Tests/Support/CountedHeap.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <thread>

namespace Vexa {
namespace {

using VexaTouch::Testing::allocations;

TEST(LogAllocation, TheHeapIsCountedInTheLibraryToo) {
    const Log log(LogCategory::HIDService);
    const std::size_t before = allocations;
    log.write(LogLevel::Error, "A message too long to be kept inside a text object itself.");
    EXPECT_GT(allocations, before);
}

TEST(LogAllocation, AThreadThatMustNotBlockNeedsNoMemoryForAMessage) {
    vexa_log_set_sink([](void*, vexa_log_category, vexa_log_level, const char*, size_t) {}, nullptr,
                      nullptr);
    const std::string text(239, 'x');
    std::thread([&text] {
        const LogWithoutBlocking here;
        const Log log(LogCategory::HIDService);
        const std::size_t before = allocations;
        for (int i = 0; i < 10'000; ++i) {
            log.write(LogLevel::Error, text);
            log.write(LogLevel::Debug, text);
        }
        EXPECT_EQ(allocations, before);
    }).join();
    vexa_log_set_sink(nullptr, nullptr, nullptr);
}

}  // namespace
}  // namespace Vexa
