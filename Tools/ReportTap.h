#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>

namespace VexaTouch::Tools {

/// Reports on their way from the thread that sends them to one that looks at them. Has room for a
/// fixed number: putting never blocks, allocates or locks; when there is no room the report is left
/// out and counted. One thread puts, one takes.
class ReportTap {
public:
    static constexpr std::size_t kCapacity = 256;
    /// What is kept of a report.
    static constexpr std::size_t kLongestReport = 512;

    ReportTap();

    /// The sending thread.
    void put(std::span<const std::uint8_t> report) noexcept;
    /// The looking thread: gives each report that is there, oldest first; how many there were.
    std::size_t drain(const std::function<void(std::span<const std::uint8_t> report)>& take);
    /// Reports that were left out. Any thread.
    [[nodiscard]] std::uint64_t lost() const noexcept { return lost_.load(); }

private:
    struct Slot {
        std::size_t length = 0;
        std::array<std::uint8_t, kLongestReport> bytes{};
    };

    std::unique_ptr<std::array<Slot, kCapacity>> slots_;
    std::atomic<std::uint64_t> put_{0};
    std::atomic<std::uint64_t> taken_{0};
    std::atomic<std::uint64_t> lost_{0};
};

}  // namespace VexaTouch::Tools
