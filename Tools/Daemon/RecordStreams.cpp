#include "Tools/Daemon/RecordStreams.h"

#include "Tools/Daemon/BusError.h"

#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <exception>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

/// Of the ring that a reader may be behind; a surface sends some eight kilobytes a second.
constexpr std::size_t kFeedBytes = std::size_t{1} << 18U;

}  // namespace

struct RecordStreams::Stream {
    std::string owner;
    std::shared_ptr<FrameFeed> feed;
    std::weak_ptr<InputTap> tap;
    FileDescriptor writer;
    std::shared_ptr<FileDescriptor> wake;
    EventLoop::WatchHandle wakeWatch;
    EventLoop::WatchHandle socketWatch;  // for the reader's end, and for room while it is full
};

RecordStreams::RecordStreams(EventLoop& loop) : loop_(loop) {}

RecordStreams::~RecordStreams() = default;

RecordStreams::Opened RecordStreams::open(const std::string& owner) {
    if (streams_.size() >= kMost) {
        throw BusError(ErrorName::kBusy, "too many recordings are being streamed");
    }
    std::array<int, 2> ends{};
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0) {
        throw BusError(ErrorName::kFailed, std::string("no socket: ") + std::strerror(errno));
    }
    FileDescriptor writer(ends[0]);
    FileDescriptor reader(ends[1]);
    static_cast<void>(::shutdown(reader.get(), SHUT_WR));
    auto wake = std::make_shared<FileDescriptor>(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
    if (!*wake || ::fcntl(writer.get(), F_SETFL, O_NONBLOCK) != 0) {
        throw BusError(ErrorName::kFailed, std::string("no descriptor: ") + std::strerror(errno));
    }
    auto feed = std::make_shared<FrameFeed>(
        [wake] {
            const std::uint64_t one = 1;
            static_cast<void>(::write(wake->get(), &one, sizeof one) == sizeof one);
        },
        kFeedBytes);
    Stream& stream = streams_.emplace_back();
    stream.owner = owner;
    stream.feed = feed;
    stream.writer = std::move(writer);
    stream.wake = wake;
    try {
        stream.wakeWatch = loop_.watch(wake->get(), EPOLLIN, [this, &stream](std::uint32_t) {
            std::uint64_t count = 0;
            static_cast<void>(::read(stream.wake->get(), &count, sizeof count) == sizeof count);
            pump(stream);
        });
        stream.socketWatch =
            loop_.watch(stream.writer.get(), 0, [this, &stream](std::uint32_t events) {
                if ((events & (EPOLLHUP | EPOLLERR)) != 0) {
                    finish(stream);
                } else {
                    EventLoop::setEvents(stream.socketWatch, 0);
                    pump(stream);
                }
            });
    } catch (const std::exception&) {
        finish(stream);
        throw;
    }
    return {.feed = std::move(feed), .reader = std::move(reader)};
}

void RecordStreams::started(const std::shared_ptr<FrameFeed>& feed,
                            const std::shared_ptr<InputTap>& tap) {
    if (Stream* stream = find(feed)) {
        stream->tap = tap;
        pump(*stream);
    } else {
        tap->remove(feed);
    }
}

void RecordStreams::abandon(const std::shared_ptr<FrameFeed>& feed) {
    if (Stream* stream = find(feed)) {
        finish(*stream);
    }
}

void RecordStreams::end(std::chrono::nanoseconds patience, std::function<void()> done) {
    done_ = std::move(done);
    patience_ = loop_.after(streams_.empty() ? std::chrono::nanoseconds::zero() : patience, [this] {
        const auto ended = std::exchange(done_, nullptr);
        while (!streams_.empty()) {
            finish(streams_.front());
        }
        ended();
    });
}

std::size_t RecordStreams::count(const std::string& owner) const {
    return static_cast<std::size_t>(std::ranges::count(streams_, owner, &Stream::owner));
}

std::uint64_t RecordStreams::lost(const std::string& owner) const {
    std::uint64_t lost = 0;
    for (const Stream& stream : streams_) {
        lost += stream.owner == owner ? stream.feed->lost().reports : 0;
    }
    return lost;
}

RecordStreams::Stream* RecordStreams::find(const std::shared_ptr<FrameFeed>& feed) {
    const auto found = std::ranges::find(streams_, feed, &Stream::feed);
    return found == streams_.end() ? nullptr : &*found;
}

void RecordStreams::pump(Stream& stream) {
    // Read first: what was put before the end is then seen.
    const bool closed = stream.feed->isClosed();
    while (true) {
        const auto parts = stream.feed->readable();
        if (parts[0].empty()) {
            break;
        }
        const ssize_t sent = ::send(stream.writer.get(), parts[0].data(), parts[0].size(),
                                    MSG_DONTWAIT | MSG_NOSIGNAL);
        if (sent >= 0) {
            stream.feed->consume(static_cast<std::size_t>(sent));
            continue;
        }
        if (errno == EINTR) {
            continue;
        }
        if (errno != EAGAIN) {
            finish(stream);
            return;
        }
        EventLoop::setEvents(stream.socketWatch, EPOLLOUT);
        return;
    }
    if (closed) {
        finish(stream);
    }
}

void RecordStreams::finish(Stream& stream) {
    if (const auto tap = stream.tap.lock()) {
        tap->remove(stream.feed);
    }
    streams_.remove_if([&stream](const Stream& each) { return &each == &stream; });
    if (streams_.empty() && done_) {
        end(std::chrono::nanoseconds::zero(), std::move(done_));
    }
}

}  // namespace VexaTouch::Tools::Daemon
