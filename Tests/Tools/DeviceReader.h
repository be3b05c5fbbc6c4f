#pragma once

#include "Pipeline/FrameList.h"
#include "Pipeline/RecordedFrame.h"
#include "Platform/DeviceBackend.h"
#include "Platform/HidDevice.h"
#include "Platform/Mutex.h"
#include "Platform/RunLoop.h"
#include "Tools/PlayedDevice.h"

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <iterator>
#include <memory>
#include <string>
#include <utility>
#include <vector>

/// How tests use a played device as a service does: through a HID device on a run loop.
namespace VexaTouch::Testing {

/// Frames without their time: what comes out of a device, in its order.
inline std::vector<RecordedFrame> untimed(const FrameList& frames) {
    std::vector<RecordedFrame> inputs(frames.begin(), frames.end());
    for (RecordedFrame& input : inputs) {
        input.timestamp = 0;
    }
    return inputs;
}

inline std::vector<std::vector<std::uint8_t>> reportsOf(const FrameList& frames) {
    std::vector<std::vector<std::uint8_t>> reports;
    for (const RecordedFrame& frame : frames) {
        if (frame.type == RecordedFrame::Type::InputReport) {
            reports.push_back(frame.report);
        }
    }
    return reports;
}

inline std::ptrdiff_t entriesOf(const char* folder) {
    const std::filesystem::directory_iterator entries(folder);
    return std::distance(begin(entries), end(entries));
}
inline std::ptrdiff_t threadCount() {
    return entriesOf("/proc/self/task");
}
inline std::ptrdiff_t descriptorCount() {
    return entriesOf("/proc/self/fd");
}

/// Reads a device on the loop of the thread that made the reader, and keeps what comes.
class DeviceReader {
public:
    static constexpr const char* kMode = "reading";
    /// So long may anything take before a test fails.
    static constexpr std::uint64_t kPatienceNs = 60'000'000'000;

    /// `hooks` are called besides the reader's own.
    explicit DeviceReader(const std::shared_ptr<Tools::PlayedDevice>& played,
                          Tools::DeviceHooks hooks = {})
        : registration_(played), device_(Vexa::HidDevice::create(registration_.service())) {
        hooks.onStateFrame = [this, also = std::move(hooks.onStateFrame)](
                                 const std::string& key, const Vexa::PropertyValue& value) {
            RecordedFrame frame;
            frame.type = RecordedFrame::Type::State;
            frame.key = key;
            frame.value = value;
            keep(std::move(frame));
            if (also) also(key, value);
        };
        hooks.onFinished = [this, also = std::move(hooks.onFinished)] {
            if (also) also();
            loop_.submit(kMode, [this] {
                finished_ = true;
                loop_.stop();
            });
        };
        played->setHooks(std::move(hooks));
        device_.setInputReportCallback(buffer_, &DeviceReader::receive, this);
        EXPECT_EQ(device_.schedule(loop_, kMode), VEXA_STATUS_SUCCESS);
    }
    ~DeviceReader() {
        device_.close(0);
        device_.unschedule(loop_, kMode);
        device_.setInputReportCallback(buffer_, nullptr, nullptr);
    }
    DeviceReader(const DeviceReader&) = delete;
    DeviceReader& operator=(const DeviceReader&) = delete;

    [[nodiscard]] const Vexa::HidDevice& device() const { return device_; }

    void open() {
        finished_ = false;
        EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    }
    void close() { device_.close(0); }
    /// Reads until the device has played everything.
    void readToEnd() {
        if (!finished_) {
            EXPECT_EQ(loop_.run(kMode, kPatienceNs), VEXA_RUN_STOPPED);
        }
        EXPECT_TRUE(finished_);
    }
    /// Opens, reads everything and closes; gives what came this time.
    std::vector<RecordedFrame> play() {
        clear();
        open();
        readToEnd();
        close();
        return inputs();
    }
    /// Reads until so many reports have come since the last clearing.
    void readReports(std::size_t count) {
        while (reportCount() < count) {
            ASSERT_EQ(loop_.run(kMode, kPatienceNs, true), VEXA_RUN_HANDLED);
        }
    }
    /// Reads until the device is gone.
    void readUntilGone() {
        while (isPresent()) {
            loop_.run(kMode, 1'000'000, true);
        }
    }

    [[nodiscard]] bool isPresent() const { return vexa_device_is_present(device_.get()); }
    [[nodiscard]] std::vector<RecordedFrame> inputs() {
        const Vexa::MutexLock held(lock_);
        return inputs_;
    }
    [[nodiscard]] std::size_t reportCount() {
        const Vexa::MutexLock held(lock_);
        return reports_;
    }
    void clear() {
        const Vexa::MutexLock held(lock_);
        inputs_.clear();
        reports_ = 0;
    }

private:
    static void receive(void* context, vexa_status result, vexa_device* sender,
                        vexa_report_type type, std::uint32_t reportId, const std::uint8_t* report,
                        std::size_t length, std::uint64_t) {
        auto& reader = *static_cast<DeviceReader*>(context);
        EXPECT_EQ(result, VEXA_STATUS_SUCCESS);
        EXPECT_EQ(sender, reader.device_.get());
        EXPECT_EQ(type, VEXA_REPORT_INPUT);
        EXPECT_EQ(reportId, length == 0 ? 0U : report[0]);
        RecordedFrame frame;
        frame.report.assign(report, report + length);
        reader.keep(std::move(frame));
    }
    void keep(RecordedFrame frame) {
        const Vexa::MutexLock held(lock_);
        reports_ += frame.type == RecordedFrame::Type::InputReport ? 1U : 0U;
        inputs_.push_back(std::move(frame));
    }

    Vexa::DeviceRegistration registration_;
    Vexa::HidDevice device_;
    Vexa::RunLoop loop_ = Vexa::RunLoop::current();
    /// Longer than any report.
    std::vector<std::uint8_t> buffer_ =
        std::vector<std::uint8_t>(2 * Tools::PlayedDevice::kLongestReport);
    bool finished_ = false;
    Vexa::Mutex lock_;
    std::vector<RecordedFrame> inputs_ GUARDED_BY(lock_);
    std::size_t reports_ GUARDED_BY(lock_) = 0;
};

}  // namespace VexaTouch::Testing
