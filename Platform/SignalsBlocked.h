#pragma once

#include <pthread.h>
#include <csignal>

namespace Vexa {

/// While it lives, the calling thread and those that it starts have all signals blocked: signals go
/// to the program's own threads, which expect them. A thread started meanwhile keeps them blocked.
class SignalsBlocked {
public:
    SignalsBlocked() noexcept {
        sigset_t all;
        sigfillset(&all);
        static_cast<void>(pthread_sigmask(SIG_SETMASK, &all, &before_));
    }
    ~SignalsBlocked() { static_cast<void>(pthread_sigmask(SIG_SETMASK, &before_, nullptr)); }
    SignalsBlocked(const SignalsBlocked&) = delete;
    SignalsBlocked(SignalsBlocked&&) = delete;
    SignalsBlocked& operator=(const SignalsBlocked&) = delete;
    SignalsBlocked& operator=(SignalsBlocked&&) = delete;

private:
    sigset_t before_{};
};

}  // namespace Vexa
