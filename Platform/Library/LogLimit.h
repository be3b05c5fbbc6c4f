#pragma once

#include "Platform/Library/LogMessage.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace Vexa::Library {

/// Keeps one fault that goes on and on from filling standard error: of errors that differ in their
/// digits alone only so many are written in a time, then a line tells how many were left out. While
/// they go on it is one and that line each time. Other levels, which somebody has asked for, pass.
///
/// One thread at a time. Header-only, for its test.
class LogLimit {
public:
    using Time = std::chrono::steady_clock::time_point;
    static constexpr std::uint64_t kMost = 20;
    static constexpr std::chrono::minutes kPeriod{1};
    /// Kinds of messages that are counted at once; further ones take the place of the oldest.
    static constexpr std::size_t kKinds = 16;
    /// Bytes of a message that are kept to tell what was left out.
    static constexpr std::size_t kKeptLength = 200;

    /// Calls `write` with what is to be written now: lines of what was left out, and the message
    /// unless it is. Throws what `write` throws, and std::bad_alloc.
    template <typename Write>
    void pass(const LogMessage& message, Time now, Write&& write) {
        for (Kind& kind : kinds_) {
            if (kind.isUsed && now - kind.start >= kPeriod) endPeriod(kind, now, write);
        }
        if (message.level != VEXA_LOG_ERROR) {
            write(message);
            return;
        }
        Kind& kind = kindOf(message, now, write);
        if (kind.written < kMost) {
            ++kind.written;
            write(message);
            return;
        }
        ++kind.leftOut;
        kind.last.category = message.category;
        kind.last.level = message.level;
        kind.last.time = message.time;
        kind.last.thread = message.thread;
        kind.last.text.assign(message.text, 0, kKeptLength);
    }

    /// Calls `write` with a line for each kind of which something was left out until now.
    template <typename Write>
    void tellAll(Time now, Write&& write) {
        for (Kind& kind : kinds_) {
            if (kind.isUsed) endPeriod(kind, now, write);
        }
    }

private:
    struct Kind {
        bool isUsed = false;
        std::uint64_t hash = 0;
        Time start;
        std::uint64_t written = 0;
        std::uint64_t leftOut = 0;
        LogMessage last;  ///< of those left out
    };

    template <typename Write>
    static void endPeriod(Kind& kind, Time now, Write&& write) {
        if (kind.leftOut == 0) {
            kind.isUsed = false;
            return;
        }
        LogMessage line = kind.last;
        line.text =
            std::to_string(kind.leftOut) + " more like this left out, the last: " + line.text;
        kind.start = now;
        kind.written = kMost - 1;
        kind.leftOut = 0;
        write(line);
    }

    template <typename Write>
    Kind& kindOf(const LogMessage& message, Time now, Write&& write) {
        const std::uint64_t hash = hashOf(message);
        const auto known = std::ranges::find_if(
            kinds_, [hash](const Kind& kind) { return kind.isUsed && kind.hash == hash; });
        if (known != kinds_.end()) return *known;
        Kind& kind = *std::ranges::min_element(
            kinds_, {}, [](const Kind& each) { return each.isUsed ? each.start : Time::min(); });
        if (kind.isUsed) endPeriod(kind, now, write);
        kind = {.isUsed = true, .hash = hash, .start = now, .last = {}};
        return kind;
    }

    // FNV-1a.
    static std::uint64_t hashOf(const LogMessage& message) noexcept {
        constexpr std::uint64_t kPrime = 0x100000001B3;
        std::uint64_t hash = 0xCBF29CE484222325;
        hash = (hash ^ static_cast<std::uint64_t>(message.category)) * kPrime;
        for (const char character : message.text) {
            if (character >= '0' && character <= '9') continue;
            hash = (hash ^ static_cast<unsigned char>(character)) * kPrime;
        }
        return hash;
    }

    std::array<Kind, kKinds> kinds_;
};

}  // namespace Vexa::Library
