#include "Tools/AppendTarget.h"

#include "Tools/Failure.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr unsigned kNewFileMode = 0666;  // less the process's mask

[[noreturn]] void fail(const std::string& name, int error) {
    throw Failure(name + ": cannot write: " + std::generic_category().message(error));
}

/// A descriptor: of a regular file, or of what is written in sequence.
class DescriptorTarget : public AppendTarget {
public:
    DescriptorTarget(FileDescriptor descriptor, bool isRegular) noexcept
        : descriptor_(std::move(descriptor)), isRegular_(isRegular) {}

    [[nodiscard]] bool isRewritable() const noexcept override { return isRegular_; }

    Result write(std::uint64_t offset, std::string_view text) noexcept override {
        Result result;
        while (result.written < text.size()) {
            const std::string_view left = text.substr(result.written);
            const ssize_t count = isRegular_ ? ::pwrite(descriptor_.get(), left.data(), left.size(),
                                                        static_cast<off_t>(offset + result.written))
                                             : ::write(descriptor_.get(), left.data(), left.size());
            if (count >= 0) {
                result.written += static_cast<std::size_t>(count);
            } else if (errno != EINTR) {
                result.error = errno;
                break;
            }
        }
        return result;
    }

    int cut(std::uint64_t offset) noexcept override {
        return ::ftruncate(descriptor_.get(), static_cast<off_t>(offset)) == 0 ? 0 : errno;
    }

    int sync() noexcept override {
        if (::fdatasync(descriptor_.get()) == 0 || errno == EINVAL || errno == EROFS) {
            return 0;  // or there is nothing that could be done
        }
        return errno;
    }

    int close() noexcept override { return ::close(descriptor_.release()) == 0 ? 0 : errno; }

protected:
    /// Whether the open file is the one of that name. Another program may have given the name to a
    /// file of its own meanwhile.
    [[nodiscard]] bool isNamed(const std::string& path) const noexcept {
        struct stat own{};
        struct stat named{};
        return ::fstat(descriptor_.get(), &own) == 0 && ::lstat(path.c_str(), &named) == 0 &&
               own.st_dev == named.st_dev && own.st_ino == named.st_ino;
    }

private:
    FileDescriptor descriptor_;
    bool isRegular_;
};

/// A regular file that was made or was empty.
class NewFile final : public DescriptorTarget {
public:
    NewFile(FileDescriptor descriptor, std::string path, bool wasMade) noexcept
        : DescriptorTarget(std::move(descriptor), true),
          path_(std::move(path)),
          wasMade_(wasMade) {}
    ~NewFile() override {
        if (isKept_) {
            return;
        }
        if (!wasMade_) {
            DescriptorTarget::cut(0);
        } else if (isNamed(path_)) {
            ::unlink(path_.c_str());
        }
    }
    NewFile(const NewFile&) = delete;
    NewFile(NewFile&&) = delete;
    NewFile& operator=(const NewFile&) = delete;
    NewFile& operator=(NewFile&&) = delete;

    int keep() noexcept override {
        isKept_ = true;
        return 0;
    }

private:
    const std::string path_;
    const bool wasMade_;
    bool isKept_ = false;
};

/// A new file beside the old one, whose name it takes when it is kept.
class ReplacingFile final : public DescriptorTarget {
public:
    ReplacingFile(FileDescriptor descriptor, std::string temporary, std::string path) noexcept
        : DescriptorTarget(std::move(descriptor), true),
          temporary_(std::move(temporary)),
          path_(std::move(path)) {}
    ~ReplacingFile() override {
        if (!isKept_) {
            ::unlink(temporary_.c_str());
        }
    }
    ReplacingFile(const ReplacingFile&) = delete;
    ReplacingFile(ReplacingFile&&) = delete;
    ReplacingFile& operator=(const ReplacingFile&) = delete;
    ReplacingFile& operator=(ReplacingFile&&) = delete;

    int keep() noexcept override {
        if (isKept_) {
            return 0;
        }
        // What was written is there, under either name.
        isKept_ = true;
        if (::rename(temporary_.c_str(), path_.c_str()) != 0) {
            isBeside_ = true;
            return errno;
        }
        return 0;
    }
    [[nodiscard]] std::string beside() const override {
        return isBeside_ ? temporary_ : std::string();
    }

private:
    const std::string temporary_;
    const std::string path_;
    bool isKept_ = false;
    bool isBeside_ = false;  // its name could not be taken
};

/// The result stream. Each write is there for its reader when it returns.
class StreamTarget final : public AppendTarget {
public:
    explicit StreamTarget(std::ostream& stream) noexcept : stream_(stream) {}

    [[nodiscard]] bool isRewritable() const noexcept override { return false; }

    Result write(std::uint64_t, std::string_view text) noexcept override {
        errno = 0;
        stream_.write(text.data(), static_cast<std::streamsize>(text.size())).flush();
        if (stream_.good()) {
            return {.written = text.size(), .error = 0};
        }
        return {.written = 0, .error = errno != 0 ? errno : EIO};
    }
    int cut(std::uint64_t) noexcept override { return 0; }
    int sync() noexcept override { return 0; }
    int close() noexcept override { return 0; }

private:
    std::ostream& stream_;
};

/// A new file beside the old one, under a name of its own.
FileDescriptor makeBeside(const std::filesystem::path& target, std::string& name) {
    name = target.parent_path() / ("." + target.filename().string() + ".XXXXXX");
    return FileDescriptor(::mkostemp(name.data(), O_CLOEXEC));
}

std::unique_ptr<AppendTarget> replaceFile(const std::string& path, const struct stat& old) {
    // A link keeps pointing where it points.
    std::error_code error;
    const std::filesystem::path target = std::filesystem::canonical(path, error);
    if (error) {
        fail(path, error.value());
    }
    if (::access(target.c_str(), W_OK) != 0) {
        fail(path, errno);
    }
    std::string name;
    FileDescriptor descriptor = makeBeside(target, name);
    if (!descriptor) {
        fail(path, errno);
    }
    // Best effort: the file stays as readable as it was.
    static_cast<void>(::fchmod(descriptor.get(), old.st_mode & 07777U) == 0);
    return std::make_unique<ReplacingFile>(std::move(descriptor), std::move(name), target);
}

}  // namespace

std::unique_ptr<AppendTarget> openAppendTarget(const std::string& path, bool replace,
                                               Streams& streams) {
    if (path == "-") {
        return std::make_unique<StreamTarget>(streams.out);
    }
    FileDescriptor made(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kNewFileMode));
    if (made) {
        return std::make_unique<NewFile>(std::move(made), path, true);
    }
    const int reason = errno;
    struct stat old{};
    if (reason != EEXIST || ::stat(path.c_str(), &old) != 0) {
        fail(path, reason == EEXIST ? errno : reason);
    }
    if (S_ISREG(old.st_mode) && old.st_size > 0) {
        if (!replace) {
            throw Failure(path +
                          ": is there already and would be lost (--force replaces it, another "
                          "name keeps it)");
        }
        return replaceFile(path, old);
    }
    FileDescriptor opened(::open(path.c_str(), O_WRONLY | O_CLOEXEC));
    if (!opened) {
        fail(path, errno);
    }
    if (S_ISREG(old.st_mode)) {
        return std::make_unique<NewFile>(std::move(opened), path, false);
    }
    return std::make_unique<DescriptorTarget>(std::move(opened), false);
}

}  // namespace VexaTouch::Tools
