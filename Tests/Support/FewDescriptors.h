#pragma once

#include <fcntl.h>
#include <sys/resource.h>
#include <cerrno>
#include <system_error>

namespace VexaTouch::Testing {

/// While it lives the process can open so many descriptors more. Nobody else opens or closes any
/// meanwhile.
class FewDescriptors {
public:
    explicit FewDescriptors(rlim_t left) {
        if (::getrlimit(RLIMIT_NOFILE, &before_) != 0) fail();
        rlimit few = before_;
        few.rlim_cur = firstFreeAfter(left);
        if (::setrlimit(RLIMIT_NOFILE, &few) != 0) fail();
    }
    ~FewDescriptors() { ::setrlimit(RLIMIT_NOFILE, &before_); }
    FewDescriptors(const FewDescriptors&) = delete;
    FewDescriptors(FewDescriptors&&) = delete;
    FewDescriptors& operator=(const FewDescriptors&) = delete;
    FewDescriptors& operator=(FewDescriptors&&) = delete;

private:
    [[noreturn]] static void fail() {
        throw std::system_error(errno, std::generic_category(), "limit of descriptors");
    }

    // The number of a descriptor that is free, with so many free ones below it.
    static rlim_t firstFreeAfter(rlim_t left) {
        for (int number = 0;; ++number) {
            const bool isFree = ::fcntl(number, F_GETFD) < 0;
            if (isFree && left == 0) return static_cast<rlim_t>(number);
            if (isFree) --left;
        }
    }

    rlimit before_{};
};

}  // namespace VexaTouch::Testing
