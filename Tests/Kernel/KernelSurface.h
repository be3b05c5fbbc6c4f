#pragma once

#include "Host/HostSession.h"
#include "Host/PluginLibrary.h"
#include "Platform/HidrawDevice.h"
#include "Tests/Kernel/UhidDevice.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

/// What the tests inside the virtual machine share.
namespace VexaTouch::Testing {

inline constexpr std::chrono::seconds kLimit{20};

/// The firmware has reset: each makes one event, whatever came before.
inline constexpr std::array<std::uint8_t, 10> kReset = {2, 0};

/// The node of a surface that was just plugged in. Throws when none comes.
inline std::string nodeOf(const UhidDevice& surface) {
    const std::string node = surface.waitForNode(kLimit);
    if (node.empty()) throw std::runtime_error("no hidraw node came");
    return node;
}

/// A counter that can be waited for. Any thread.
class Counter {
public:
    void add() {
        const std::scoped_lock held(lock_);
        ++count_;
        changed_.notify_all();
    }
    [[nodiscard]] std::uint64_t count() const {
        const std::scoped_lock held(lock_);
        return count_;
    }
    /// False after the limit.
    [[nodiscard]] bool waitUntil(std::uint64_t count) {
        std::unique_lock held(lock_);
        return changed_.wait_for(held, kLimit, [&] { return count_ >= count; });
    }

private:
    mutable std::mutex lock_;
    std::condition_variable changed_;
    std::uint64_t count_ = 0;
};

/// The back-end, with a hook that hears of each operation before it, and of two after it: "open
/// done", "report done".
class HookedHidraw final : public Vexa::HidrawDevice {
public:
    using Hook = std::function<void(const std::string& moment)>;

    HookedHidraw(std::string node, Hook hook)
        : HidrawDevice(std::move(node)), hook_(std::move(hook)) {}

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override {
        hook_("open");
        const vexa_status status = HidrawDevice::open(options, descriptor);
        hook_("open done");
        return status;
    }
    void close(std::uint32_t options) noexcept override {
        hook_("close");
        HidrawDevice::close(options);
    }
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override {
        hook_("getReport");
        return HidrawDevice::getReport(type, reportId, report, length);
    }
    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override {
        hook_("property");
        return HidrawDevice::property(key);
    }
    bool setProperty(const Vexa::PropertyValue& key,
                     const Vexa::PropertyValue& value) noexcept override {
        hook_("setProperty");
        return HidrawDevice::setProperty(key, value);
    }
    void reportHandled() noexcept override {
        hook_("report done");
        handled.add();
    }

    Counter handled;

private:
    const Hook hook_;
};

/// The service on a surface, by the real plug-in and a host.
class KernelSession {
public:
    explicit KernelSession(const std::shared_ptr<Vexa::DeviceBackend>& device)
        : registration_(device),
          session_(library_, registration_.service(),
                   [this](const Vexa::HidEvent& /*event*/) { events.add(); }) {}

    [[nodiscard]] Host::HostSession& operator*() { return session_; }
    [[nodiscard]] Host::HostSession* operator->() { return &session_; }

    Counter events;

private:
    Host::PluginLibrary library_ = Host::PluginLibrary::loadDefault();
    Vexa::DeviceRegistration registration_;
    Host::HostSession session_;
};

}  // namespace VexaTouch::Testing
