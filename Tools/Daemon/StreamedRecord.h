#pragma once

#include "Tools/FileDescriptor.h"
#include "Tools/RecordKeeper.h"
#include "Tools/RecordingStream.h"
#include "Tools/SignalWatch.h"
#include "Tools/Streams.h"
#include "Tools/WakeUp.h"

#include <chrono>
#include <cstdint>
#include <optional>

namespace VexaTouch::Tools::Daemon {

/// When a streamed recording ends by itself.
struct StreamedRecordOptions {
    std::optional<std::chrono::nanoseconds> duration = {};
    std::optional<std::uint64_t> count = {};  ///< of input reports
};

/// Writes the frames that come through a descriptor, as FrameDecoder reads them, until SIGINT,
/// SIGTERM or SIGHUP, after a time or a number of reports, or when the far end is done, and
/// finishes the recording. A second signal ends the process. Throws Failure, also when the far end
/// is done: the surface is gone then, and where not everything came that it sent the failure says
/// so. A failure without a report leaves what was there before.
/// `summary` is what went into the stream, also when this throws. SIGUSR1 is answered with how much
/// there is. `signals` and `wake` belong together; they are there before the stream is, so that no
/// signal leaves half of a file.
void recordStreamed(const FileDescriptor& frames, const StreamedRecordOptions& options,
                    RecordingStream& stream, RecordSummary& summary, SignalWatch& signals,
                    const WakeUp& wake, Streams& streams);

}  // namespace VexaTouch::Tools::Daemon
