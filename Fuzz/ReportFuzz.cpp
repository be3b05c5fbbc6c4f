// Reports of any content and length, and settings between them, go into a recording pipeline: the
// algorithm does what its literal reading does, to the bit, and a replay repeats the session.

#include "Fuzz/FuzzInput.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/PropertyValue.h"
#include "Tests/Reference/Algs.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tools/EventRecord.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

namespace {

using namespace VexaTouch;
using Fuzz::FuzzInput;
using Fuzz::require;
using Events = std::vector<Tools::EventRecord>;
using Vexa::PropertyValue;

constexpr std::size_t kMostReports = 500;

Events recordsOf(const std::vector<Vexa::HidEvent>& events) {
    Events records;
    for (const Vexa::HidEvent& event : events) {
        records.push_back(Tools::eventRecordFromHidEvent(event));
    }
    return records;
}

/// What the bytes of an input say, one command after the other.
class Session {
public:
    explicit Session(FuzzInput input) : input_(input) {
        recording_.hidEventsProbe = [this](const std::vector<Vexa::HidEvent>& events) {
            require(!events.empty(), "a batch has events");
            for (const Vexa::HidEvent& event : events) {
                require(event.timestamp() == clock_.ticks, "events carry the time of their input");
            }
            const Events records = recordsOf(events);
            live_.insert(live_.end(), records.begin(), records.end());
        };
    }

    void play() {
        for (std::size_t i = 0; i < kMostReports && !input_.atEnd(); ++i) {
            clock_.ticks += input_.take<std::uint16_t>();
            step();
            const auto difference = Testing::firstDifference(recording_.algs(), reference_);
            require(!difference.has_value(), difference.value_or(""));
            require(live_ == expected_, "the events of the literal reading");
        }
        checkReplay();
    }

private:
    enum class Command : std::uint8_t { Image, SameImage, Reset, AnyReport, Setting };

    void step() {
        switch (static_cast<Command>(input_.takeUpTo(4))) {
            case Command::Image:
                changeImage();
                sendImage();
                break;
            case Command::SameImage:
                ++frameNumber_;
                timestampMs_ += 10;
                sendImage();
                break;
            case Command::Reset:
                send({InputReport::FirmwareEvent::reportId, input_.take<std::uint8_t>(), 1, 2, 3, 4,
                      5, 6, 7, 8});
                break;
            case Command::AnyReport:
                send(input_.takeBytes(input_.take<std::uint8_t>()));
                break;
            case Command::Setting:
                changeSetting();
                break;
        }
    }

    // A few pixels change: that is how a finger moves, and it needs few bytes.
    void changeImage() {
        frameNumber_ += input_.take<std::uint8_t>();
        timestampMs_ += static_cast<std::uint32_t>(input_.take<std::int16_t>());
        const std::uint16_t changed = input_.take<std::uint16_t>();
        for (std::size_t pixel = 0; pixel < kPixelCount; ++pixel) {
            if ((changed >> pixel & 1U) != 0) {
                samples_[pixel] = input_.take<std::int16_t>();
            }
        }
    }

    void sendImage() {
        std::vector<std::uint8_t> report = {InputReport::Image::reportId};
        const auto append = [&report](std::uint32_t value, int bytes) {
            for (int i = 0; i < bytes; ++i) {
                report.push_back(static_cast<std::uint8_t>(value >> (8 * i)));
            }
        };
        append(frameNumber_, 4);
        append(timestampMs_, 4);
        append(0, 4);
        report.resize(report.size() + 2 * kPixelCount);
        for (const std::int16_t sample : samples_) {
            append(static_cast<std::uint16_t>(sample), 2);
        }
        send(report);
    }

    void send(const std::vector<std::uint8_t>& report) {
        recording_.handleInputReport(report.data(), report.size());
        std::vector<Vexa::HidEvent> events;
        const std::uint8_t* data = report.data();
        if (const auto firmware = InputReport::FirmwareEvent::parse(data, report.size())) {
            if (firmware->code == 0) {
                events = reference_.handleReset();
                events.push_back(Vexa::HidEvent::vendorDefined(
                    {.usagePage = 0xFF60, .usage = 2, .payload = {}}));
            }
        } else if (const auto image = InputReport::Image::parse(data, report.size())) {
            events = reference_.handleImage(*image);
        }
        const Events records = recordsOf(events);
        expected_.insert(expected_.end(), records.begin(), records.end());
    }

    void changeSetting() {
        static const std::vector<std::string> keys = {
            "ActivationThreshold",  "HoldTimeoutMilliseconds", "EnableHoldSuppression",
            "EnableTapSuppression", "ResetEventStats",         "VirtualNormalizationFactors.3"};
        const std::string& key = keys[input_.takeUpTo(5)];
        PropertyValue value;
        switch (input_.takeUpTo(2)) {
            case 0:
                value = std::bit_cast<float>(input_.take<std::uint32_t>());
                break;
            case 1:
                value = input_.take<std::int16_t>();
                break;
            default:
                value = input_.take<std::uint64_t>();
                break;
        }
        recording_.setState("Algs." + key, value);
        reference_.setState(key, value);
    }

    void checkReplay() {
        PipelineRecording replay(recording_);
        replay.hidEventsProbe = {};
        Events replayed;
        replay.hidEventsProbe = [&replayed](const std::vector<Vexa::HidEvent>& events) {
            const Events records = recordsOf(events);
            replayed.insert(replayed.end(), records.begin(), records.end());
        };
        // From the beginning: the copy's algorithm has already seen all of it.
        PipelineRecording fresh(replay.json());
        fresh.hidEventsProbe = replay.hidEventsProbe;
        fresh.playReset();
        while (fresh.playCanContinue()) {
            fresh.playNextFrame(std::numeric_limits<float>::infinity());
        }
        if (settingsHaveJsonForm()) {
            require(replayed == live_, "a replay repeats the session");
        }
    }

    [[nodiscard]] bool settingsHaveJsonForm() const {
        // A number that is not finite is written as null.
        return std::ranges::all_of(recording_.frames(), [](const PipelineRecording::Frame& frame) {
            return std::isfinite(frame.value.toDouble());
        });
    }

    FuzzInput input_;
    Testing::FakeHostClock clock_;
    PipelineRecording recording_{clock_};
    Reference::Algs reference_;
    Events live_;
    Events expected_;
    std::uint32_t frameNumber_ = 0;
    std::uint32_t timestampMs_ = 0;
    std::array<std::int16_t, kPixelCount> samples_{};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    Session(FuzzInput(data, size)).play();
    return 0;
}
