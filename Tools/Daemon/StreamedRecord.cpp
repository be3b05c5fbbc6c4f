#include "Tools/Daemon/StreamedRecord.h"

#include "Tools/Daemon/EventLoop.h"
#include "Tools/Failure.h"
#include "Tools/FrameFeed.h"

#include <fcntl.h>
#include <sys/epoll.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <span>
#include <stdexcept>
#include <string>

namespace VexaTouch::Tools::Daemon {
namespace {

/// Reads frames from a descriptor and writes them until there is a reason to end.
class StreamWriter {
public:
    StreamWriter(const FileDescriptor& frames, const StreamedRecordOptions& options,
                 RecordingStream& stream, RecordSummary& summary, SignalWatch& signals,
                 const WakeUp& wake, Streams& streams)
        : frames_(frames),
          stream_(stream),
          summary_(summary),
          keeper_(stream, options.count, streams),
          signals_(signals),
          decoder_({.onFrame = [this](const RecordedFrame& frame) { keeper_.take(frame); },
                    .onGap = [this](const FrameGap& gap) { keeper_.take(gap); }}) {
        signalWatch_ = loop_.watch(wake, [this] {
            if (signals_.takeRecordingWanted()) {
                keeper_.tellHowMuchThereIs();
            }
            if (signals_.endWanted()) {
                loop_.stop();
            }
        });
        frameWatch_ = loop_.watch(frames.get(), EPOLLIN, [this](std::uint32_t) { read(); });
        if (options.duration) {
            deadline_ = loop_.after(*options.duration, [this] { loop_.stop(); });
        }
        if (streams.errorIsTerminal) {
            constexpr auto kDrawInterval = std::chrono::milliseconds(100);
            drawWatch_ = loop_.every(kDrawInterval, [this] { keeper_.drawProgress(); });
        }
    }

    void run() {
        try {
            loop_.run();
        } catch (...) {
            end();
            throw;
        }
        end();
    }
    [[nodiscard]] bool isFarEndGone() const { return gone_; }
    [[nodiscard]] bool isWhole() const { return decoder_.isAtEnd(); }

private:
    void end() {
        keeper_.eraseProgress();
        summary_ = keeper_.summary();
    }
    void read() {
        std::array<std::uint8_t, 65'536> bytes{};
        const ssize_t got = ::read(frames_.get(), bytes.data(), bytes.size());
        if (got > 0) {
            decoder_.write(std::span(bytes).first(static_cast<std::size_t>(got)));
            flush();
        }
        gone_ = got == 0 || (got < 0 && errno != EAGAIN && errno != EINTR);
        if (gone_ || keeper_.isFull()) {
            loop_.stop();
        }
    }
    void flush() {
        stream_.flush();
        // When nothing comes any more, what came last is made safe in time all the same.
        const auto due = stream_.syncDue();
        if (due && !syncWatch_) {
            syncWatch_ = loop_.after(*due - std::chrono::steady_clock::now(), [this] {
                syncWatch_.reset();
                flush();
            });
        }
    }

    const FileDescriptor& frames_;
    RecordingStream& stream_;
    RecordSummary& summary_;
    RecordKeeper keeper_;
    bool gone_ = false;
    SignalWatch& signals_;
    FrameDecoder decoder_;
    EventLoop loop_;
    EventLoop::WatchHandle signalWatch_;
    EventLoop::WatchHandle frameWatch_;
    EventLoop::WatchHandle deadline_;
    EventLoop::WatchHandle drawWatch_;
    EventLoop::WatchHandle syncWatch_;
};

}  // namespace

void recordStreamed(const FileDescriptor& frames, const StreamedRecordOptions& options,
                    RecordingStream& stream, RecordSummary& summary, SignalWatch& signals,
                    const WakeUp& wake, Streams& streams) {
    static_cast<void>(::fcntl(frames.get(), F_SETFL, O_NONBLOCK));
    StreamWriter writer(frames, options, stream, summary, signals, wake, streams);
    try {
        writer.run();
    } catch (const Failure&) {
        // The file says itself as far as where it is safe.
        throw;
    } catch (const std::runtime_error& error) {
        throw stream.finishAfter(error.what());
    }
    if (writer.isFarEndGone()) {
        throw stream.finishAfter(std::string("the surface was unplugged, or the daemon has ended") +
                                 (writer.isWhole() ? "" : ", and what came last is missing"));
    }
    stream.finish();
}

}  // namespace VexaTouch::Tools::Daemon
