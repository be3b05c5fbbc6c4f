#include "Pipeline/PipelineRecording.h"

#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Pipeline/TrimRule.h"
#include "Shared/Util.h"

#include <iterator>
#include <stdexcept>
#include <utility>

namespace VexaTouch {

namespace {

using Frame = PipelineRecording::Frame;

/// Whole microseconds to wait, clamped before it becomes an integer. The division by the speed is
/// single precision like every number of the system.
std::uint64_t waitMicroseconds(std::uint64_t nanoseconds, float speed) noexcept {
    const float microseconds = static_cast<float>(nanoseconds) / speed / 1000.0F;
    constexpr float kLimit = 9223372036854775808.0F;  // 2^63
    return microseconds < kLimit ? static_cast<std::uint64_t>(microseconds)
                                 : static_cast<std::uint64_t>(kLimit);
}

FrameList readFrames(std::optional<std::string_view> data) {
    if (!data) {
        throw std::invalid_argument("json not supplied");
    }
    ContainerReader reader;
    reader.write(*data);
    return reader.finish();
}

}  // namespace

PipelineRecording::PipelineRecording(Vexa::HostClock& clock) : clock_(&clock) {}

PipelineRecording::PipelineRecording(std::optional<std::string_view> data, Vexa::HostClock& clock)
    : _frames(readFrames(data)), clock_(&clock) {}

PipelineRecording::PipelineRecording(FrameList frames, Vexa::HostClock& clock)
    : _frames(std::move(frames)), clock_(&clock) {}

PipelineRecording::PipelineRecording(const PipelineRecording& other)
    : Pipeline(other),
      _frames(other._frames),
      _maxFrameCount(other._maxFrameCount),
      clock_(other.clock_) {}

PipelineRecording& PipelineRecording::operator=(const PipelineRecording& other) {
    if (this != &other) {
        *this = PipelineRecording(other);
    }
    return *this;
}

// The base takes only its own part of what it is moved from.
// NOLINTBEGIN(bugprone-use-after-move)
PipelineRecording::PipelineRecording(PipelineRecording&& other) noexcept
    : Pipeline(std::move(other)),
      _frames(std::move(other._frames)),
      _maxFrameCount(other._maxFrameCount),
      clock_(other.clock_) {
    other._play = {};
}

PipelineRecording& PipelineRecording::operator=(PipelineRecording&& other) noexcept {
    Pipeline::operator=(std::move(other));
    _frames = std::move(other._frames);
    _maxFrameCount = other._maxFrameCount;
    clock_ = other.clock_;
    _play = {};
    other._play = {};
    return *this;
}
// NOLINTEND(bugprone-use-after-move)

void PipelineRecording::setTime(std::uint64_t /*ticks*/) noexcept {}

void PipelineRecording::setState(const std::string& key, Vexa::PropertyValue value) noexcept {
    const std::uint64_t now = clock_->now();
    Pipeline::setTime(now);
    Frame frame;
    frame.type = Frame::Type::State;
    frame.timestamp = Util::nanosecondsFromMachTime(now);
    frame.key = key;
    frame.value = value;
    appendFrame(std::move(frame));
    Pipeline::setState(key, std::move(value));
}

void PipelineRecording::handleInputReport(const std::uint8_t* bytes, std::size_t length) noexcept {
    const std::uint64_t now = clock_->now();
    Pipeline::setTime(now);
    Frame frame;
    frame.timestamp = Util::nanosecondsFromMachTime(now);
    frame.report.assign(bytes, bytes + length);
    appendFrame(std::move(frame));
    Pipeline::handleInputReport(bytes, length);
}

void PipelineRecording::appendFrame(Frame frame) {
    _frames.push_back(std::move(frame));
    // The list grows to twice the cap and is then cut back in one pass. Halving the size instead of
    // doubling the cap keeps a huge cap from overflowing.
    if (_maxFrameCount != 0 && _frames.size() / 2 >= _maxFrameCount) {
        trimToCap();
    }
    _play.valid = false;
}

void PipelineRecording::trimFrames(std::list<Frame>& frames, std::size_t maxCount) {
    TrimRule keeps(maxCount);
    for (auto next = frames.end(); next != frames.begin();) {
        const auto frame = std::prev(next);
        next = keeps(*frame) ? frame : frames.erase(frame);
    }
}

void PipelineRecording::trimFrames(FrameList& frames, std::size_t maxCount) {
    frames.retain(TrimRule(maxCount));
}

void PipelineRecording::setMaxFrameCount(std::size_t count) {
    _maxFrameCount = count;
    trimToCap();
}

void PipelineRecording::trimToCap() {
    if (_maxFrameCount == 0) {
        return;
    }
    TrimRule keeps(_maxFrameCount);
    // The frame under the cursor, and how many are kept from there on.
    const Frame* next = playCanContinue() ? &*_play.iterator : nullptr;
    std::ptrdiff_t upcoming = 0;
    _frames.retain([&](const Frame& frame) {
        const bool keep = keeps(frame);
        if (next != nullptr) {
            upcoming += keep ? 1 : 0;
            if (&frame == next) {
                _play.valid = keep;
                next = nullptr;
            }
        }
        return keep;
    });
    if (_play.valid) {
        _play.iterator = std::prev(_frames.end(), upcoming);
    }
}

void PipelineRecording::playReset() {
    _play.startTimeMach = clock_->now();
    _play.iterator = _frames.begin();
    _play.lastInputReportTimeNs.reset();
    _play.valid = true;
}

bool PipelineRecording::playCanContinue() const noexcept {
    return _play.valid && _play.iterator != _frames.end();
}

void PipelineRecording::playNextFrame(float speed) {
    if (!playCanContinue()) {
        throw std::runtime_error("playback finished");
    }
    // Probes may record and trim meanwhile.
    const FrameList::Pin pin = _frames.pin(_play.iterator++);
    const Frame& frame = *pin;
    if (frame.type == Frame::Type::InputReport) {
        waitForFrame(frame, speed > 0.0F ? speed : 1.0F);
    }
    Pipeline::setTime(_play.startTimeMach +
                      Util::machTimeFromNanoseconds(frame.timestamp - _frames.front().timestamp));
    if (frame.type == Frame::Type::InputReport) {
        Pipeline::handleInputReport(frame.report.data(), frame.report.size());
    } else if (frame.type == Frame::Type::State) {
        Pipeline::setState(frame.key, frame.value);
    }
}

void PipelineRecording::waitForFrame(const Frame& frame, float speed) {
    const auto last = std::exchange(_play.lastInputReportTimeNs, frame.timestamp);
    if (last && frame.timestamp > *last) {
        const std::uint64_t wait = waitMicroseconds(frame.timestamp - *last, speed);
        if (wait != 0) {
            clock_->sleepMicroseconds(wait);
        }
    }
}

std::string PipelineRecording::json() {
    trimToCap();
    // About as long as the text becomes, so that it grows without being copied.
    constexpr std::size_t kFrameBytes = 128;
    std::size_t bytes = kFrameBytes;
    for (const Frame& frame : _frames) {
        bytes += kFrameBytes + frame.report.size() * 3 + frame.key.size();
    }
    std::string text;
    text.reserve(bytes);
    ContainerWriter writer(text);
    for (const Frame& frame : _frames) {
        writer.write(frame);
    }
    writer.finish();
    return text;
}

}  // namespace VexaTouch
