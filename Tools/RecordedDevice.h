#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Platform/HostClock.h"
#include "Tools/PlayedDevice.h"
#include "Tools/SurfaceAnswers.h"

#include <limits>

namespace VexaTouch::Tools {

/// The frames of a recording, once.
PlayedDevice::FrameSource recordingSource(FrameList frames);

/// Plays the frames of a recording as if the surface were there. No report is lost: when the reader
/// does not keep up, the reports come later.
///
/// The recorded time between two input reports, divided by the speed, is the time between their
/// departures; where the recorded time goes back, no time passes. State frames take their turn at
/// once.
class RecordedDevice final : public PlayedDevice {
public:
    static constexpr double kAsFastAsTaken = std::numeric_limits<double>::infinity();

    /// `speed` is a factor of the recorded pace, above 0.
    explicit RecordedDevice(FrameList frames, double speed = 1.0, SurfaceIdentity identity = {},
                            Vexa::HostClock& clock = Vexa::HostClock::system());
};

}  // namespace VexaTouch::Tools
