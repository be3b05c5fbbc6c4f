#include "Tools/Daemon/SealedFile.h"

#include "Tools/Failure.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

namespace VexaTouch::Tools::Daemon {

FileDescriptor sealedFile(std::string_view content) {
    FileDescriptor file(memfd_create("vexatouch", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    bool whole = static_cast<bool>(file);
    while (whole && !content.empty()) {
        const ssize_t written = ::write(file.get(), content.data(), content.size());
        whole = written > 0 || (written < 0 && errno == EINTR);
        content.remove_prefix(written > 0 ? static_cast<std::size_t>(written) : 0);
    }
    constexpr int kSeals = F_SEAL_SEAL | F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;
    if (!whole || ::lseek(file.get(), 0, SEEK_SET) != 0 ||
        ::fcntl(file.get(), F_ADD_SEALS, kSeals) != 0) {
        throw Failure(std::string("no file in memory: ") + std::strerror(errno));
    }
    return file;
}

}  // namespace VexaTouch::Tools::Daemon
