#pragma once

#include "Platform/Library/LogMessage.h"

#include <sys/types.h>
#include <sys/uio.h>

namespace Vexa::Library {

/// systemd's journal, which keeps a message with its fields. Its library is looked for when the
/// process's standard error is the journal's stream, and not needed otherwise.
class Journal {
public:
    Journal() noexcept;

    /// Whether standard error still is the journal's stream, and the journal's library was found.
    [[nodiscard]] bool isStandardError() const noexcept;
    /// Whether the journal's library took it. Throws std::bad_alloc.
    [[nodiscard]] bool send(const LogMessage& message) const;

private:
    using Send = int (*)(const iovec* fields, int count);

    dev_t device_ = 0;
    ino_t inode_ = 0;
    Send send_ = nullptr;
};

}  // namespace Vexa::Library
