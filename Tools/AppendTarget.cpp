#include "Tools/AppendTarget.h"

#include "Tools/DiskSync.h"
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

    int sync() noexcept override { return syncFile(descriptor_.get()); }

    int close() noexcept override { return ::close(descriptor_.release()) == 0 ? 0 : errno; }

protected:
    [[nodiscard]] int descriptor() const noexcept { return descriptor_.get(); }

private:
    FileDescriptor descriptor_;
    bool isRegular_;
};

/// The path by which the system knows an open file that has no name.
std::string openPath(int descriptor) {
    return "/proc/self/fd/" + std::to_string(descriptor);
}

/// A regular file with a name, which was made, was empty, or takes that of an old one when it is
/// kept.
class FileTarget final : public DescriptorTarget {
public:
    enum class Origin : std::uint8_t { Made, Empty, Beside };

    /// `beside` is the name of the new file beside the old one. Where it `isNameless`, it gets that
    /// only when it is kept.
    FileTarget(Origin origin, FileDescriptor descriptor, const std::filesystem::path& path,
               std::string beside = {}, bool isNameless = false)
        : DescriptorTarget(std::move(descriptor), true),
          origin_(origin),
          path_(path),
          folder_(path.parent_path()),
          beside_(std::move(beside)),
          openPath_(isNameless ? openPath(this->descriptor()) : std::string()) {}
    ~FileTarget() override {
        const std::string& name = origin_ == Origin::Beside ? beside_ : path_;
        if (isKept_) {
            return;
        }
        if (origin_ == Origin::Empty) {
            DescriptorTarget::cut(0);
        } else if (isNamed(name)) {
            ::unlink(name.c_str());
        }
    }
    FileTarget(const FileTarget&) = delete;
    FileTarget(FileTarget&&) = delete;
    FileTarget& operator=(const FileTarget&) = delete;
    FileTarget& operator=(FileTarget&&) = delete;

    int keep() noexcept override {
        if (origin_ == Origin::Beside && !isKept_) {
            return replace();
        }
        isKept_ = true;
        return 0;
    }
    [[nodiscard]] bool wasThere() const noexcept override { return origin_ != Origin::Made; }
    [[nodiscard]] std::string beside() const override {
        return isBeside_ ? beside_ : std::string();
    }
    int sync() noexcept override {
        int error = DescriptorTarget::sync();
        if (error == 0 && isKept_ && !isNameSafe_) {
            error = syncFolder(folder_);
            isNameSafe_ = error == 0;
        }
        return error;
    }

private:
    int replace() noexcept {
        // Otherwise the machine's end might leave the name with nothing behind it.
        if (const int error = DescriptorTarget::sync(); error != 0) {
            return error;
        }
        if (!openPath_.empty() && ::linkat(AT_FDCWD, openPath_.c_str(), AT_FDCWD, beside_.c_str(),
                                           AT_SYMLINK_FOLLOW) != 0) {
            return errno;
        }
        // What was written is there, under either name.
        isKept_ = true;
        if (::rename(beside_.c_str(), path_.c_str()) != 0) {
            isBeside_ = true;
            return errno;
        }
        return 0;
    }
    /// Whether the open file is the one of that name. Another program may have given the name to a
    /// file of its own meanwhile.
    [[nodiscard]] bool isNamed(const std::string& path) const noexcept {
        struct stat own{};
        struct stat named{};
        return ::fstat(descriptor(), &own) == 0 && ::lstat(path.c_str(), &named) == 0 &&
               own.st_dev == named.st_dev && own.st_ino == named.st_ino;
    }

    const Origin origin_;
    const std::string path_;
    const std::string folder_;
    const std::string beside_;
    const std::string openPath_;  // of a file without a name
    bool isKept_ = false;
    bool isBeside_ = false;  // its name could not be taken
    bool isNameSafe_ = false;
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

/// A new file for the folder of the old one, and a name for it that is free. It has that already
/// unless `isNameless`, which not every file system knows.
FileDescriptor makeBeside(const std::filesystem::path& target, std::string& name,
                          bool& isNameless) {
    name = target.parent_path() / ("." + target.filename().string() + ".XXXXXX");
    FileDescriptor nameless(
        ::open(target.parent_path().c_str(), O_WRONLY | O_TMPFILE | O_CLOEXEC, S_IRUSR | S_IWUSR));
    isNameless = nameless && ::access(openPath(nameless.get()).c_str(), F_OK) == 0;
    FileDescriptor named(::mkostemp(name.data(), O_CLOEXEC));
    if (named && isNameless) {
        ::unlink(name.c_str());
        return nameless;
    }
    return named;
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
    bool isNameless = false;
    FileDescriptor descriptor = makeBeside(target, name, isNameless);
    if (!descriptor) {
        fail(path, errno);
    }
    // Best effort: the file stays as readable as it was.
    static_cast<void>(::fchmod(descriptor.get(), old.st_mode & 07777U) == 0);
    return std::make_unique<FileTarget>(FileTarget::Origin::Beside, std::move(descriptor), target,
                                        std::move(name), isNameless);
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
        return std::make_unique<FileTarget>(FileTarget::Origin::Made, std::move(made), path);
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
        return std::make_unique<FileTarget>(FileTarget::Origin::Empty, std::move(opened), path);
    }
    return std::make_unique<DescriptorTarget>(std::move(opened), false);
}

}  // namespace VexaTouch::Tools
