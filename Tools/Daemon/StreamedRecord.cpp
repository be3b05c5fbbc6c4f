#include "Tools/Daemon/StreamedRecord.h"

#include "Tools/Daemon/EventLoop.h"
#include "Tools/Failure.h"
#include "Tools/FrameFeed.h"

#include <fcntl.h>
#include <sys/epoll.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <span>
#include <stdexcept>
#include <string>

namespace VexaTouch::Tools::Daemon {
namespace {

/// Puts frames and what is missing between them into the stream, up to a number of reports.
class FrameTaker {
public:
    FrameTaker(RecordingStream& stream, std::optional<std::uint64_t> count)
        : stream_(stream), count_(count) {}

    void take(const RecordedFrame& frame) {
        if (isFull()) {
            return;
        }
        latestNs_ = frame.timestamp;
        ++(frame.type == RecordedFrame::Type::InputReport ? summary_.reports : summary_.settings);
        stream_.add(frame);
    }
    void take(const FrameGap& gap) {
        if (isFull()) {
            return;
        }
        summary_.lost.reports += gap.reports;
        summary_.lost.settings += gap.settings;
        add("Recording.LostReports", gap.reports);
        add("Recording.LostSettings", gap.settings);
    }
    [[nodiscard]] bool isFull() const { return count_ && summary_.reports >= *count_; }
    [[nodiscard]] const RecordSummary& summary() const { return summary_; }

private:
    void add(const char* key, std::uint64_t count) {
        if (count > 0) {
            RecordedFrame frame;
            frame.type = RecordedFrame::Type::State;
            frame.timestamp = latestNs_;
            frame.key = key;
            frame.value = count;
            stream_.add(frame);
        }
    }

    RecordingStream& stream_;
    std::optional<std::uint64_t> count_;
    RecordSummary summary_;
    std::uint64_t latestNs_ = 0;
};

}  // namespace

RecordSummary recordStreamed(const FileDescriptor& frames, const StreamedRecordOptions& options,
                             RecordingStream& stream) {
    FrameTaker taker(stream, options.count);
    FrameDecoder decoder({.onFrame = [&](const RecordedFrame& frame) { taker.take(frame); },
                          .onGap = [&](const FrameGap& gap) { taker.take(gap); }});
    static_cast<void>(::fcntl(frames.get(), F_SETFL, O_NONBLOCK));
    bool gone = false;
    EventLoop loop;
    const std::array signals = {SIGINT, SIGTERM, SIGHUP};
    const auto signalWatch = loop.watchSignals(signals, [&](int) { loop.stop(); });
    const auto frameWatch = loop.watch(frames.get(), EPOLLIN, [&](std::uint32_t) {
        std::array<std::uint8_t, 65'536> bytes{};
        const ssize_t got = ::read(frames.get(), bytes.data(), bytes.size());
        if (got > 0) {
            decoder.write(std::span(bytes).first(static_cast<std::size_t>(got)));
            stream.flush();
        }
        gone = got == 0 || (got < 0 && errno != EAGAIN && errno != EINTR);
        if (gone || taker.isFull()) {
            loop.stop();
        }
    });
    const auto microseconds = [](std::chrono::nanoseconds time) {
        return std::chrono::duration_cast<std::chrono::microseconds>(time);
    };
    const auto deadline = options.duration
                              ? loop.every(microseconds(*options.duration), [&] { loop.stop(); })
                              : nullptr;
    try {
        loop.run();
    } catch (const std::runtime_error& error) {
        stream.finish();
        throw Failure(error.what());
    }
    stream.finish();
    if (gone) {
        throw Failure(
            "the surface was unplugged, or the daemon has ended; what came before is in " +
            stream.name());
    }
    return taker.summary();
}

}  // namespace VexaTouch::Tools::Daemon
