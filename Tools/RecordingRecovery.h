#pragma once

#include "Pipeline/PipelineRecording.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// What could be saved of a damaged recording.
struct RecordingRecovery {
    FrameList frames;
    std::optional<std::uint32_t> version;  ///< of the container, where that much was left of it
    std::vector<std::string> damages;      ///< what was lost and where; empty when nothing was
};

/// Every whole frame of a container that may be damaged or cut off: also those behind a damaged
/// place, where reading is taken up again at the next object that is a frame. Never throws but
/// std::bad_alloc.
RecordingRecovery recoverContainer(std::string_view text);

/// The same for the text of the HID tools' recorder; a line that cannot be read is a damaged place.
RecordingRecovery recoverHidRecording(std::string_view text);

}  // namespace VexaTouch::Tools
