#pragma once

#include "Tools/LatencyProbe.h"
#include "Tools/LatencySummary.h"
#include "Tools/ObservedDevice.h"
#include "Tools/PlayedDevice.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// The service's recording has so many frames when it is at its longest.
inline constexpr std::size_t kFullRecording = 2699;

/// Touches so short that each image makes an event: every report has its latency to the callback.
extern const std::string_view kLatencyGestures;

/// Whether a thread reads "Recording" without pause meanwhile. Turns: for half a second and not for
/// another, over and over, so that whatever else the machine does meets both alike.
enum class LatencyReader : std::uint8_t { Off, On, Turns };

struct LatencyRunOptions {
    /// Whose reports are measured as they come, from the moment at which each was read. None: the
    /// reports of `source` are, at their rate.
    std::shared_ptr<ObservedDevice> live = {};
    /// When to end with fewer reports of a live device.
    std::chrono::nanoseconds longest = std::chrono::nanoseconds::max();
    PlayedDevice::FrameSource source = {};
    double rate = 1000.0;          ///< reports a second
    std::size_t reports = 10'000;  ///< that are measured, of each result
    LatencyReader reader = LatencyReader::Off;
    bool mayBeRealTime = true;
};

struct LatencyResult {
    std::array<LatencySummary, kLatencyStages.size()> stages;
    ThreadPriority inputThread;
    ThreadPriority queueThread;
    bool hadReader = false;
    std::uint64_t recordingReads = 0;
    std::uint64_t recordingReadNs = 0;  ///< mean time of one
    std::uint64_t recordingBytes = 0;   ///< of the text of the last one
};

/// Runs a service of its own on a device of its own: fills the recording, then sends the reports at
/// their rate and measures. On a live device it only measures. Two results, the first without the
/// reader, when it takes turns. Throws HostFailure, and Failure when a live device is unplugged.
std::vector<LatencyResult> measureLatency(const LatencyRunOptions& options);

}  // namespace VexaTouch::Tools
