// The probe that the service has no use for, for the kernel to hear.

#include <gtest/gtest.h>
#include <vexa/trace.h>

namespace VexaTouch::Testing {
namespace {

TEST(TraceKernelTest, CodeOfItsOwnIsPassed) {
    vexa_trace(0x1234, 1, 0xFFFFFFFFFFFFFFFF, 3, 4);
}

}  // namespace
}  // namespace VexaTouch::Testing
