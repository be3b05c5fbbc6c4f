#include "Tools/RecordedDevice.h"

#include <utility>

namespace VexaTouch::Tools {

PlayedDevice::FrameSource recordingSource(FrameList frames) {
    return [frames = std::move(frames)](const PlayedDevice::FrameSink& sink) {
        for (const RecordedFrame& frame : frames) {
            sink(frame);
        }
    };
}

RecordedDevice::RecordedDevice(FrameList frames, double speed, SurfaceIdentity identity,
                               Vexa::HostClock& clock)
    : PlayedDevice(recordingSource(std::move(frames)), {.speed = speed, .lossless = true},
                   std::move(identity), clock) {}

}  // namespace VexaTouch::Tools
