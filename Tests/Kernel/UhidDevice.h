#pragma once

#include "Tools/FileDescriptor.h"
#include "Tools/HidReportDescriptor.h"
#include "Tools/SurfaceAnswers.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <span>
#include <string>
#include <thread>
#include <vector>

namespace VexaTouch::Testing {

/// A surface that the kernel takes for a real one, made through /dev/uhid; plugged in as long as it
/// lives. Any thread. Operations throw std::system_error when the kernel refuses them.
class UhidDevice {
public:
    /// What becomes of feature requests. The kernel gives up waiting for an answer after 5 s.
    enum class Features : std::uint8_t { Normal, Refused, Short, Never };

    struct Identity {
        std::string name{Tools::kHidDeviceName};
        std::string physicalPath = "test/0";
        std::string serial = "0000000001";
        std::uint32_t vendor = Tools::kHidVendorId;
        std::uint32_t product = Tools::kHidProductId;
        std::vector<std::uint8_t> descriptor{Tools::kHidReportDescriptor.begin(),
                                             Tools::kHidReportDescriptor.end()};
    };

    explicit UhidDevice(const Identity& identity, Features features = Features::Normal);
    ~UhidDevice();
    UhidDevice(const UhidDevice&) = delete;
    UhidDevice& operator=(const UhidDevice&) = delete;

    /// An input report, its id first.
    void send(std::span<const std::uint8_t> report);
    void setFeatures(Features features) noexcept { features_ = features; }

    /// Blocks until somebody has the device open, or nobody has. False after `limit`.
    [[nodiscard]] bool waitUntilOpen(bool open, std::chrono::milliseconds limit);
    /// Blocks until so many feature requests have come since it was made. False after `limit`.
    [[nodiscard]] bool waitUntilAsked(std::uint64_t requests, std::chrono::milliseconds limit);
    /// Its hidraw node, which is there only some time after the device: "/dev/hidraw0". Blocks
    /// until then; empty after `limit`.
    [[nodiscard]] std::string waitForNode(std::chrono::milliseconds limit) const;

private:
    void handleEvents();
    void answer(std::uint32_t request, std::uint8_t reportId);

    const std::string serial_;
    Tools::SurfaceAnswers answers_{Tools::SurfaceIdentity{}};
    std::atomic<Features> features_;
    Tools::FileDescriptor uhid_;
    Tools::FileDescriptor end_;
    std::mutex lock_;
    std::condition_variable changed_;
    bool open_ = false;
    std::uint64_t requests_ = 0;
    std::thread thread_;
};

}  // namespace VexaTouch::Testing
