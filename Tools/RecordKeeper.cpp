#include "Tools/RecordKeeper.h"

#include <array>
#include <cstdio>
#include <string_view>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kEraseLine = "\r\x1b[K";
constexpr auto kDrawInterval = std::chrono::milliseconds(100);

}  // namespace

RecordKeeper::RecordKeeper(RecordingStream& stream, std::optional<std::uint64_t> count,
                           Streams& streams)
    : stream_(stream), count_(count), streams_(streams) {}

void RecordKeeper::take(const RecordedFrame& frame) {
    if (isFull()) {
        return;
    }
    latestNs_ = frame.timestamp;
    ++(frame.type == RecordedFrame::Type::InputReport ? summary_.reports : summary_.settings);
    stream_.add(frame);
}

void RecordKeeper::take(const FrameGap& gap) {
    if (isFull()) {
        return;
    }
    summary_.lost.reports += gap.reports;
    summary_.lost.settings += gap.settings;
    addLost(kLostReportsKey, gap.reports);
    addLost(kLostSettingsKey, gap.settings);
}

void RecordKeeper::addLost(const char* key, std::uint64_t count) {
    if (count == 0) {
        return;
    }
    RecordedFrame frame;
    frame.type = RecordedFrame::Type::State;
    frame.timestamp = latestNs_;
    frame.key = key;
    frame.value = count;
    stream_.add(frame);
}

void RecordKeeper::drawProgress() {
    const Time now = std::chrono::steady_clock::now();
    if (!streams_.errorIsTerminal || now < nextDraw_) {
        return;
    }
    nextDraw_ = now + kDrawInterval;
    constexpr double kBytesPerMegabyte = 1e6;
    std::array<char, 96> line{};
    std::snprintf(line.data(), line.size(), "%llu frames, %.1f MB, %.1f s",
                  static_cast<unsigned long long>(stream_.frames()),
                  static_cast<double>(stream_.bytes()) / kBytesPerMegabyte,
                  std::chrono::duration<double>(now - start_).count());
    streams_.error << kEraseLine << line.data() << std::flush;
}

void RecordKeeper::eraseProgress() {
    if (streams_.errorIsTerminal) {
        streams_.error << kEraseLine << std::flush;
    }
}

void RecordKeeper::tellHowMuchThereIs() {
    eraseProgress();
    streams_.error << "vexatouch record: " << stream_.whereItIs() << std::endl;
}

std::optional<RecordKeeper::Time> RecordKeeper::progressDue() const noexcept {
    return streams_.errorIsTerminal ? std::optional(nextDraw_) : std::nullopt;
}

}  // namespace VexaTouch::Tools
