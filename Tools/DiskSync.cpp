#include "Tools/DiskSync.h"

#include "Tools/FileDescriptor.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace VexaTouch::Tools {
namespace {

int errorOf(int result) noexcept {
    return result == 0 || errno == EINVAL || errno == EROFS ? 0 : errno;
}

}  // namespace

int syncFile(int descriptor) noexcept {
    return errorOf(::fdatasync(descriptor));
}

int syncFolder(const std::string& folder) noexcept {
    const FileDescriptor opened(
        ::open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    // Who may write into a folder may perhaps not read it.
    return opened ? errorOf(::fsync(opened.get())) : 0;
}

}  // namespace VexaTouch::Tools
