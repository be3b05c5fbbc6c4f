#pragma once

#include "Tools/Daemon/EventLoop.h"
#include "Tools/FileDescriptor.h"
#include "Tools/FrameFeed.h"
#include "Tools/InputTap.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <string>

namespace VexaTouch::Tools::Daemon {

/// Feeds on their way to other processes, each through a socket of its own. One that is not read
/// fast enough loses frames, which the feed counts and tells; nobody waits for it. One thread, the
/// loop's.
class RecordStreams {
public:
    /// At the same time.
    static constexpr std::size_t kMost = 16;

    explicit RecordStreams(EventLoop& loop);
    ~RecordStreams();
    RecordStreams(const RecordStreams&) = delete;
    RecordStreams(RecordStreams&&) = delete;
    RecordStreams& operator=(const RecordStreams&) = delete;
    RecordStreams& operator=(RecordStreams&&) = delete;

    /// A new stream for one reader; `owner` is for count(). Throws BusError (Busy, Failed).
    struct Opened {
        std::shared_ptr<FrameFeed> feed;
        FileDescriptor reader;  ///< for the one who reads
    };
    [[nodiscard]] Opened open(const std::string& owner);
    /// The feed is filled through this tap now.
    void started(const std::shared_ptr<FrameFeed>& feed, const std::shared_ptr<InputTap>& tap);
    /// It is not going to be.
    void abandon(const std::shared_ptr<FrameFeed>& feed);

    /// Calls back, from the loop, when all streams have been taken to their ends, or after that
    /// time: what is left then is cut, which its reader sees from the missing end. The feeds are
    /// closed or about to be; none is opened any more.
    void end(std::chrono::nanoseconds patience, std::function<void()> done);

    [[nodiscard]] std::size_t count(const std::string& owner) const;
    /// Reports that streams of this owner which are open had to leave out.
    [[nodiscard]] std::uint64_t lost(const std::string& owner) const;

private:
    struct Stream;

    void pump(Stream& stream);
    void finish(Stream& stream);
    Stream* find(const std::shared_ptr<FrameFeed>& feed);

    EventLoop& loop_;
    std::list<Stream> streams_;
    std::function<void()> done_;  // of end()
    EventLoop::WatchHandle patience_;
};

}  // namespace VexaTouch::Tools::Daemon
