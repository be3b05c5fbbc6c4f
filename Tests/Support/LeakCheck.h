#pragma once

#include "Platform/Log.h"
#include "Tests/Support/LiveObjects.h"
#include "Tests/Support/OpenDescriptors.h"
#include "Tests/Support/ProcessThreads.h"

#include <gtest/gtest.h>

#include <cstddef>

namespace VexaTouch::Testing {

/// Remembers the threads, descriptors and platform objects of the process, to find what was left
/// behind.
class LeakCheck {
public:
    void expectNothingLeft() const {
        ASSERT_TRUE(waitForThreads(threads_))
            << threadCount() << " threads instead of " << threads_;
        EXPECT_EQ(descriptorCount(), descriptors_) << "descriptors";
        EXPECT_EQ(LiveObjects::now(), objects_);
    }

private:
    // The log's own thread starts with the first thread that it must not hold up, and stays.
    [[maybe_unused]] Vexa::LogWithoutBlocking startsTheLogsThread_;
    std::size_t threads_ = threadCount();
    std::size_t descriptors_ = descriptorCount();
    LiveObjects objects_ = LiveObjects::now();
};

}  // namespace VexaTouch::Testing
