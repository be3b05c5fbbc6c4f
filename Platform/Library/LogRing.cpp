#include "Platform/Library/LogRing.h"

#include <string>

namespace Vexa::Library {

LogRing::LogRing() {
    std::uint64_t position = 0;
    for (Slot& slot : slots_) {
        slot.entry.message.text.reserve(kPlainLength);
        slot.turn.store(position++, std::memory_order_relaxed);
    }
}

bool LogRing::push(vexa_log_category category, vexa_log_level level,
                   std::chrono::system_clock::time_point time, pid_t thread, std::string_view text,
                   std::uint64_t droppedBefore) noexcept {
    std::uint64_t position = end_.load(std::memory_order_relaxed);
    for (;;) {
        const std::uint64_t turn =
            slots_[position % kCapacity].turn.load(std::memory_order_acquire);
        if (turn < position) return false;  // still holds what was pushed a round ago
        if (turn > position) {
            position = end_.load(std::memory_order_relaxed);
        } else if (end_.compare_exchange_weak(position, position + 1)) {
            break;
        }
    }
    Slot& slot = slots_[position % kCapacity];
    LogMessage& message = slot.entry.message;
    slot.entry.isLost = false;
    try {
        message.text.assign(text);
    } catch (...) {
        slot.entry.isLost = true;  // the place is taken and must be given on
    }
    message.category = category;
    message.level = level;
    message.time = time;
    message.thread = thread;
    slot.entry.droppedBefore = droppedBefore;
    const bool isKept = !slot.entry.isLost;
    slot.turn.store(position + 1);
    slot.turn.notify_one();
    return isKept;
}

const LogRing::Entry& LogRing::front() const noexcept {
    const std::uint64_t position = begin_.load(std::memory_order_relaxed);
    const Slot& slot = slots_[position % kCapacity];
    slot.turn.wait(position);
    return slot.entry;
}

void LogRing::dropFront() noexcept {
    const std::uint64_t position = begin_.load(std::memory_order_relaxed);
    Slot& slot = slots_[position % kCapacity];
    std::string& text = slot.entry.message.text;
    if (text.capacity() > kKeptLength) {
        text.clear();
        text.shrink_to_fit();
    }
    slot.turn.store(position + kCapacity, std::memory_order_release);
    begin_.store(position + 1);
}

}  // namespace Vexa::Library
