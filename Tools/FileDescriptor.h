#pragma once

#include <unistd.h>

#include <utility>

namespace VexaTouch::Tools {

/// Owns a file descriptor, or none.
class FileDescriptor {
public:
    FileDescriptor() noexcept = default;
    explicit FileDescriptor(int owned) noexcept : descriptor_(owned) {}
    FileDescriptor(FileDescriptor&& other) noexcept
        : descriptor_(std::exchange(other.descriptor_, -1)) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        FileDescriptor(std::move(other)).swap(*this);
        return *this;
    }
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;
    ~FileDescriptor() {
        if (descriptor_ >= 0) {
            ::close(descriptor_);
        }
    }

    /// -1 when there is none.
    [[nodiscard]] int get() const noexcept { return descriptor_; }
    /// Gives it to the caller and is empty afterwards.
    [[nodiscard]] int release() noexcept { return std::exchange(descriptor_, -1); }
    void swap(FileDescriptor& other) noexcept { std::swap(descriptor_, other.descriptor_); }
    explicit operator bool() const noexcept { return descriptor_ >= 0; }

private:
    int descriptor_ = -1;
};

}  // namespace VexaTouch::Tools
