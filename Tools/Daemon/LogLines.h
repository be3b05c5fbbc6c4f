#pragma once

#include "Platform/SerialQueue.h"

#include <atomic>
#include <cstddef>
#include <ostream>
#include <sstream>

namespace VexaTouch::Tools::Daemon {

/// The buffer of a stream whose lines go to another stream on a thread of their own, so that
/// whoever writes them never waits for who reads them. A line is what stands before each flush.
/// One thread writes.
class LogLines final : public std::stringbuf {
public:
    /// Lines that wait; beyond that they are dropped, which is told.
    static constexpr std::size_t kMostWaiting = 256;

    /// Nobody else writes to `to`, which must outlive it, meanwhile.
    explicit LogLines(std::ostream& to);
    /// Waits until all lines have been written.
    ~LogLines() override;
    LogLines(const LogLines&) = delete;
    LogLines(LogLines&&) = delete;
    LogLines& operator=(const LogLines&) = delete;
    LogLines& operator=(LogLines&&) = delete;

protected:
    int sync() override;

private:
    std::ostream& to_;
    std::size_t dropped_ = 0;
    std::atomic<std::size_t> waiting_{0};
    Vexa::SerialQueue queue_;
};

}  // namespace VexaTouch::Tools::Daemon
