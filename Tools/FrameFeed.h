#pragma once

#include "Pipeline/RecordedFrame.h"
#include "Platform/PropertyValue.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// Inputs that a feed had no room for, at one place of it.
struct FrameGap {
    std::uint64_t reports = 0;
    std::uint64_t settings = 0;

    friend bool operator==(const FrameGap&, const FrameGap&) = default;
};

/// Frames on their way from the thread that handles them to one that keeps them, in a ring of
/// bytes. Putting never blocks, allocates for a report, or waits for the taking side: what finds no
/// room is left out, and a gap that says how much stands at its place as soon as there is room
/// again. A setting finds room where a report finds none any more.
///
/// The bytes are those that FrameDecoder reads, in this process or, sent through a pipe or a
/// socket, in another one of the same machine. Putting is for one thread at a time, taking for one.
class FrameFeed {
public:
    /// Room for a report of the surface every millisecond for a good ten seconds.
    static constexpr std::size_t kUsualBytes = std::size_t{1} << 20U;
    static constexpr std::size_t kFewestBytes = 4096;

    /// `wake` is called on the putting thread when there is something behind an empty ring; it must
    /// not block. `bytes` is rounded up to a power of two.
    explicit FrameFeed(std::function<void()> wake, std::size_t bytes = kUsualBytes);

    // The putting side. Times are host time in nanoseconds.

    void putReport(std::span<const std::uint8_t> report, std::uint64_t timestampNs) noexcept;
    /// `key` as a pipeline takes it, `json` from settingText.
    void putState(std::string_view key, std::string_view json, std::uint64_t timestampNs) noexcept;
    /// Nothing is put afterwards.
    void close() noexcept;

    // The taking side.

    /// The bytes that are there, in their order; both empty when there are none.
    [[nodiscard]] std::array<std::span<const std::uint8_t>, 2> readable() const noexcept;
    /// Makes room of the first `count` bytes that are readable.
    void consume(std::size_t count) noexcept;
    /// Whether the putting side is done. What it put before is readable by then.
    [[nodiscard]] bool isClosed() const noexcept { return closed_.load(); }

    /// Bytes that wait to be taken, and room for how many there is in all. Any thread.
    [[nodiscard]] std::uint64_t waiting() const noexcept { return put_.load() - taken_.load(); }
    [[nodiscard]] std::size_t size() const noexcept { return size_; }
    /// Everything that was left out so far. Any thread.
    [[nodiscard]] FrameGap lost() const noexcept;

private:
    class Record;

    [[nodiscard]] bool tryPut(const Record& record, std::size_t reserve) noexcept;
    [[nodiscard]] std::uint64_t append(std::uint64_t at, const Record& record) noexcept;
    [[nodiscard]] std::uint64_t copy(std::uint64_t at,
                                     std::span<const std::uint8_t> bytes) noexcept;
    [[nodiscard]] std::uint64_t room(std::uint64_t reserve) const noexcept;
    void publish(std::uint64_t end) noexcept;

    const std::size_t size_;  // a power of two
    const std::size_t forSettings_;
    const std::unique_ptr<std::uint8_t[]> bytes_;
    const std::function<void()> wake_;
    FrameGap gap_;  // not yet told; the putting side's
    std::atomic<std::uint64_t> lostReports_{0};
    std::atomic<std::uint64_t> lostSettings_{0};
    std::atomic<bool> closed_{false};
    // Bytes put and taken since the beginning.
    alignas(64) std::atomic<std::uint64_t> put_{0};
    alignas(64) std::atomic<std::uint64_t> taken_{0};
};

/// A setting's value as a feed and a recording can hold it: null stands for no value and for one
/// that is nested more deeply than a recording can be read; a pipeline takes all three alike.
std::string settingText(const Vexa::PropertyValue& value);

/// Makes frames and gaps of the bytes of a feed again, in pieces of any size.
class FrameDecoder {
public:
    struct Sink {
        std::function<void(const RecordedFrame& frame)> onFrame;
        /// Behind the latest frame something is missing.
        std::function<void(const FrameGap& gap)> onGap;
    };

    explicit FrameDecoder(Sink sink);

    /// Throws std::runtime_error for bytes that no feed writes; the decoder is spent then.
    void write(std::span<const std::uint8_t> bytes);
    /// Whether bytes of an unfinished frame are waiting for the rest, or all of it was begun so far
    /// is nothing at all.
    [[nodiscard]] bool isBetweenFrames() const noexcept { return pending_.empty() && begun_; }

    /// Whether the feed was closed: everything that was put has come.
    [[nodiscard]] bool isAtEnd() const noexcept { return isAtEnd_; }

private:
    [[nodiscard]] std::size_t takeOne(std::span<const std::uint8_t> bytes);
    void take(std::uint32_t type, std::uint64_t timestampNs, std::span<const std::uint8_t> payload);

    Sink sink_;
    bool begun_ = false;
    bool isAtEnd_ = false;
    std::vector<std::uint8_t> pending_;
    RecordedFrame frame_;
};

/// Gives the decoder all that is readable now; whether there was anything.
bool drain(FrameFeed& feed, FrameDecoder& decoder);

}  // namespace VexaTouch::Tools
