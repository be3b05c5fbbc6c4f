#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Platform/PropertyValue.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/CommandRun.h"

#include <cstdint>
#include <list>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {

/// A recording as a test writes it down. Host time starts at 5 s and runs with the device's clock,
/// which starts at 10 s; frames are numbered from 1 and come every 10 ms.
class RecordedSession {
public:
    static constexpr std::uint64_t kHostStartNs = 5'000'000'000;

    RecordedSession& feel(const Touch& touch) {
        sequence_.play(touch,
                       [this](const Samples& samples, std::uint32_t frame, std::uint32_t timeMs) {
                           append(imageReport(samples, frame, timeMs), timeMs);
                       });
        return *this;
    }
    RecordedSession& report(std::vector<std::uint8_t> bytes) {
        append(std::move(bytes), sequence_.nowMs);
        return *this;
    }
    RecordedSession& set(std::string key, Vexa::PropertyValue value) {
        PipelineRecording::Frame frame;
        frame.type = PipelineRecording::Frame::Type::State;
        frame.timestamp = hostNs(sequence_.nowMs);
        frame.key = std::move(key);
        frame.value = std::move(value);
        frames_.push_back(std::move(frame));
        return *this;
    }

    [[nodiscard]] const std::list<PipelineRecording::Frame>& frames() const { return frames_; }
    [[nodiscard]] std::string text() const { return containerText(frames_); }

private:
    static std::uint64_t hostNs(std::uint32_t deviceMs) {
        return kHostStartNs + (std::uint64_t{deviceMs} - 10'000) * 1'000'000;
    }
    void append(std::vector<std::uint8_t> bytes, std::uint32_t timeMs) {
        PipelineRecording::Frame frame;
        frame.timestamp = hostNs(timeMs);
        frame.report = std::move(bytes);
        frames_.push_back(std::move(frame));
    }

    FrameSequence sequence_;
    std::list<PipelineRecording::Frame> frames_;
};

/// A tap on volume up, a hold on play/pause that is 600 ms old when it ends, a firmware reset in
/// the middle of a touch on volume down, a report that is none and a setting: 125 frames.
inline RecordedSession mixedSession() {
    RecordedSession session;
    session.feel(nothing().forMs(50))
        .feel(touch("H").at(350).with("I", 150).forMs(120))
        .feel(nothing().forMs(100))
        .feel(touch("A").at(350).with("B", 150).forMs(600))
        .feel(nothing().forMs(100))
        .report({0x07, 0x00})
        .set("Algs.HoldTimeoutMilliseconds", 300)
        .feel(touch("N").at(350).with("O", 150).forMs(80))
        .report(firmwareReport(0))
        .feel(nothing().forMs(170));
    return session;
}

}  // namespace VexaTouch::Testing
