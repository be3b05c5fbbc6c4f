#include "Tools/Replay.h"

#include <utility>

namespace VexaTouch::Tools {

std::string_view playedTypeName(PlayedType type) noexcept {
    switch (type) {
        case PlayedType::Image:
            return "image";
        case PlayedType::Firmware:
            return "firmware";
        case PlayedType::Invalid:
            return "invalid";
        case PlayedType::State:
            break;
    }
    return "state";
}

Replay::Replay(FrameList frames, ReplaySettings settings, Vexa::HostClock& clock)
    : settings_(std::move(settings)),
      recording_(std::move(frames), clock),
      upcoming_(recording_.frames().begin()) {
    installProbes();
    recording_.playReset();
    giveSettings(false);
    for (const Setting& setting : settings_.list) {
        inForce_.push_back(recording_.getState(setting.key));
    }
}

void Replay::giveSettings(bool again) {
    for (const Setting& setting : settings_.list) {
        // What cannot be read is an action, which is done once.
        if (!again || recording_.getState(setting.key)) {
            // The base operation: the recording neither keeps it nor ends its playback.
            recording_.Pipeline::setState(setting.key, setting.value);
        }
    }
}

void Replay::lookAtState() {
    if (settings_.pinned) {
        giveSettings(true);
        return;
    }
    for (std::size_t i = 0; !lost_ && i < settings_.list.size(); ++i) {
        const std::string& key = settings_.list[i].key;
        if (recording_.getState(key) != inForce_[i]) {
            lost_ = {.key = key, .index = counts_.frames};
        }
    }
}

void Replay::installProbes() {
    recording_.imageProbe = [this](const InputReport::Image* image) {
        played_.type = PlayedType::Image;
        played_.image = *image;
    };
    recording_.firmwareEventProbe = [this](const InputReport::FirmwareEvent* event) {
        played_.type = PlayedType::Firmware;
        played_.firmware = *event;
    };
    recording_.invalidInputReportProbe = [this](const std::uint8_t*, std::uint64_t) {
        played_.type = PlayedType::Invalid;
    };
    recording_.hidEventsProbe = [this](const std::vector<Vexa::HidEvent>& events) {
        for (const Vexa::HidEvent& event : events) {
            EventRecord& record = events_.emplace_back(eventRecordFromHidEvent(event));
            record.index = counts_.frames;
            record.timeNs = upcoming_->timestamp;
            record.deviceMs = played_.type == PlayedType::Image ? played_.image.timestampMs : 0;
        }
    };
}

const PlayedFrame& Replay::next(float speed) {
    events_.clear();
    played_.type = PlayedType::State;
    recording_.playNextFrame(speed);
    if (upcoming_->type == PipelineRecording::Frame::Type::State) {
        lookAtState();
    }
    played_.index = counts_.frames;
    played_.frame = &*upcoming_;
    played_.events = events_;
    ++upcoming_;
    ++counts_.frames;
    switch (played_.type) {
        case PlayedType::Image:
            ++counts_.images;
            break;
        case PlayedType::Firmware:
            ++counts_.firmwareEvents;
            break;
        case PlayedType::Invalid:
            ++counts_.invalidReports;
            break;
        case PlayedType::State:
            ++counts_.states;
            break;
    }
    counts_.events += events_.size();
    return played_;
}

}  // namespace VexaTouch::Tools
