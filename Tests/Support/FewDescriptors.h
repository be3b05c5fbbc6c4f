#pragma once

#include <sys/resource.h>
#include <unistd.h>
#include <cerrno>
#include <system_error>

namespace VexaTouch::Testing {

/// While it lives the process can open so many descriptors more. Nobody else opens or closes any
/// meanwhile.
class FewDescriptors {
public:
    explicit FewDescriptors(rlim_t left) {
        const int next = ::dup(STDOUT_FILENO);
        if (next < 0 || ::getrlimit(RLIMIT_NOFILE, &before_) != 0) fail();
        ::close(next);
        rlimit few = before_;
        few.rlim_cur = static_cast<rlim_t>(next) + left;
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

    rlimit before_{};
};

}  // namespace VexaTouch::Testing
