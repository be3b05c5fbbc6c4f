#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Platform/HostClock.h"
#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/FileDescriptor.h"
#include "Tools/ObservedDevice.h"
#include "Tools/SurfaceAnswers.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>

namespace VexaTouch::Tools {

/// When the reports leave.
struct PlayedPace {
    /// Factor of the pace that the frames' time stamps give; infinity: as fast as they are taken.
    double speed = 1.0;
    /// Reports a second, whatever the time stamps say.
    std::optional<double> rate = {};
    /// True: a reader that is too slow holds the player up, and no report is lost. False: the
    /// newest report is dropped and counted when kBacklog reports wait to be handled, as in a
    /// device.
    bool lossless = true;

    static constexpr std::uint64_t kBacklog = 64;
};

/// A device that plays frames: reports go out through a socket pair whose other end the service
/// reads, state frames to a hook. Playing starts with each opening, from the first frame, on a
/// thread of its own, and stops at once when the device is closed, unplugged or destroyed. After
/// the last frame the device stays plugged in and is silent.
///
/// An empty report is an empty datagram: a reader that reads 0 bytes has lost the device only if
/// the socket hangs up as well. The device never hangs up while reports are left to be handled,
/// unless it is unplugged. A report is cut at kLongestReport.
///
/// Reports count as handled by reportHandled; reports that a closed device had left over do not
/// count for the next opening.
class PlayedDevice : public ObservedDevice {
public:
    using Frame = PipelineRecording::Frame;
    /// Takes the next frame, waits until it is its turn and sends it. Throws to end the playing:
    /// let it pass.
    using FrameSink = std::function<void(const Frame& frame)>;
    /// Gives all frames, on the player's thread; called once for each opening. What it throws
    /// itself ends the playing as if the frames were over.
    using FrameSource = std::function<void(const FrameSink& sink)>;

    /// More than any service reads of a report.
    static constexpr std::size_t kLongestReport = 65'536;

    PlayedDevice(FrameSource source, PlayedPace pace, SurfaceIdentity identity,
                 Vexa::HostClock& clock);
    ~PlayedDevice() override;
    PlayedDevice(const PlayedDevice&) = delete;
    PlayedDevice(PlayedDevice&&) = delete;
    PlayedDevice& operator=(const PlayedDevice&) = delete;
    PlayedDevice& operator=(PlayedDevice&&) = delete;

    void setHooks(DeviceHooks hooks) override;
    /// While the device is closed: of its next openings.
    void setPace(const PlayedPace& pace);

    /// NO_RESOURCES when there is no thread or no descriptor.
    vexa_status open(std::uint32_t options, int& descriptor) noexcept override;
    /// Returns when the player's thread has ended: not from a hook of that thread, and under no
    /// lock that a hook takes.
    void close(std::uint32_t options) noexcept override;
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override;
    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override;
    bool setProperty(const Vexa::PropertyValue& key,
                     const Vexa::PropertyValue& value) noexcept override;
    void reportArrived(std::span<const std::uint8_t> report) noexcept override;
    void reportHandled() noexcept override;
    [[nodiscard]] std::string tally() const override;

    /// Pulls the plug: the reader finds the socket hung up once it has read what is in it. Any
    /// thread, hooks too. The device can be closed and opened again.
    void unplug() noexcept;

    // Of the latest opening. Any thread.
    [[nodiscard]] std::uint64_t sent() const noexcept { return sent_.load(); }
    /// Reports that found no room, of `sent` none.
    [[nodiscard]] std::uint64_t dropped() const noexcept { return dropped_.load(); }
    [[nodiscard]] std::uint64_t handled() const noexcept { return handled_.load(); }

private:
    class Player;

    /// Ends any waiting of the player.
    void wake() noexcept;

    const FrameSource source_;
    PlayedPace pace_;
    Vexa::HostClock& clock_;
    SurfaceAnswers answers_;
    DeviceHooks hooks_;

    std::atomic<std::uint64_t> sent_{0};
    std::atomic<std::uint64_t> dropped_{0};
    std::atomic<std::uint64_t> handled_{0};
    /// The player waits until so many are handled; 0: it does not wait.
    std::atomic<std::uint64_t> awaited_{0};
    /// An eventfd that ends any waiting of the player, so that it looks around.
    FileDescriptor wake_;

    Vexa::Mutex lock_;
    std::shared_ptr<Player> player_ GUARDED_BY(lock_);
};

}  // namespace VexaTouch::Tools
