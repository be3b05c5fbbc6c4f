#include "Platform/SignalsBlocked.h"

#include <gtest/gtest.h>

#include <pthread.h>
#include <csignal>
#include <thread>

namespace Vexa {
namespace {

bool isBlocked(int signal) {
    sigset_t blocked;
    pthread_sigmask(SIG_SETMASK, nullptr, &blocked);
    return sigismember(&blocked, signal) == 1;
}

TEST(SignalsBlocked, LastsAsLongAsItLivesAndForGoodInAThreadStartedMeanwhile) {
    std::jthread([] {
        sigset_t some;
        sigemptyset(&some);
        sigaddset(&some, SIGUSR2);
        pthread_sigmask(SIG_SETMASK, &some, nullptr);
        std::jthread started;
        {
            const SignalsBlocked blocked;
            for (const int signal : {SIGINT, SIGTERM, SIGUSR1, SIGUSR2, SIGPIPE}) {
                EXPECT_TRUE(isBlocked(signal)) << signal;
            }
            started = std::jthread([] { EXPECT_TRUE(isBlocked(SIGTERM)); });
        }
        EXPECT_FALSE(isBlocked(SIGTERM));
        EXPECT_TRUE(isBlocked(SIGUSR2));
    }).join();
}

}  // namespace
}  // namespace Vexa
