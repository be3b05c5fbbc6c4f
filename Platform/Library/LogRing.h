#pragma once

#include "Platform/Library/LogMessage.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace Vexa::Library {

/// The messages of threads that must not block, on their way to the sink.
///
/// A bounded queue in an array: any number of threads push at once without a lock, one thread at a
/// time takes out. Each slot counts its turns: it is free for the message at position p when its
/// turn is p, and holds it when its turn is p + 1. Texts up to kPlainLength bytes need no memory;
/// longer ones leave their slot larger, up to kKeptLength.
class LogRing {
public:
    static constexpr std::size_t kCapacity = 2048;
    static constexpr std::size_t kPlainLength = 239;
    static constexpr std::size_t kKeptLength = 4096;

    /// What was pushed, and how many messages had been dropped by then.
    struct Entry {
        LogMessage message;
        std::uint64_t droppedBefore = 0;
        bool isLost = false;
    };

    /// Throws std::bad_alloc.
    LogRing();

    /// False when there is no room, or no memory for a long text. Any thread.
    bool push(vexa_log_category category, vexa_log_level level,
              std::chrono::system_clock::time_point time, pid_t thread, std::string_view text,
              std::uint64_t droppedBefore) noexcept;

    /// The position behind the last message that was pushed or is just being pushed. Any thread.
    [[nodiscard]] std::uint64_t end() const noexcept { return end_.load(); }
    /// The position of the first message not taken out yet. Any thread.
    [[nodiscard]] std::uint64_t begin() const noexcept { return begin_.load(); }

    /// The first message; begin() must be before end(). Waits for a thread that is pushing it this
    /// very moment. For one thread at a time, as is dropFront().
    [[nodiscard]] const Entry& front() const noexcept;
    /// Makes room for another.
    void dropFront() noexcept;

private:
    struct Slot {
        std::atomic<std::uint64_t> turn;
        Entry entry;
    };

    std::array<Slot, kCapacity> slots_;
    // Apart from each other: those who push and the one who takes out do not disturb each other.
    alignas(64) std::atomic<std::uint64_t> end_{0};
    alignas(64) std::atomic<std::uint64_t> begin_{0};
};

}  // namespace Vexa::Library
