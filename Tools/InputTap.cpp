#include "Tools/InputTap.h"

#include "Platform/Log.h"
#include "Shared/Util.h"
#include "Tools/SettingKeys.h"

#include <algorithm>
#include <cassert>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kPipelineDomain = "Pipeline";

/// A setting ready to be put, so that nothing is left to be made while inputs wait.
struct PreparedSetting {
    std::string key;  // as a pipeline takes it
    std::string json;
};

std::vector<PreparedSetting> settingsInForce(const Host::HostSession& session) {
    std::vector<PreparedSetting> settings;
    for (std::string& key : pipelineSettingKeys()) {
        if (const auto value = session.property(std::string(kPipelineDomain) + '.' + key)) {
            settings.push_back({.key = std::move(key), .json = settingText(value)});
        }
    }
    return settings;
}

}  // namespace

std::uint64_t InputTap::nowNs() const noexcept {
    return Util::nanosecondsFromMachTime(clock_.now());
}

void InputTap::add(std::shared_ptr<FrameFeed> feed, const Host::HostSession& session) {
    // Reports go on meanwhile, but they change no setting.
    const Vexa::MutexLock noOther(settings_);
    const std::vector<PreparedSetting> settings = settingsInForce(session);
    const Vexa::MutexLock inOrder(order_);
    const std::uint64_t now = nowNs();
    for (const PreparedSetting& setting : settings) {
        feed->putState(setting.key, setting.json, now);
    }
    feeds_.push_back(std::move(feed));
}

void InputTap::remove(const std::shared_ptr<FrameFeed>& feed) {
    const Vexa::MutexLock inOrder(order_);
    const auto found = std::ranges::find(feeds_, feed);
    if (found != feeds_.end()) {
        feeds_.erase(found);
        feed->close();
    }
}

bool InputTap::setProperty(const Host::HostSession& session, const std::string& key,
                           const Vexa::PropertyValue& value) {
    PreparedSetting setting{.key = key, .json = {}};
    if (!Util::stripDomainFromKey(setting.key, std::string(kPipelineDomain))) {
        return session.setProperty(key, value);
    }
    setting.json = settingText(value);
    assert(!order_.isHeldByThisThread());
    const Vexa::MutexLock noOther(settings_);
    const Vexa::MutexLock inOrder(order_);
    // Who reads the log slowly must not hold up reports.
    const Vexa::LogWithoutBlocking logWithoutBlocking;
    const std::uint64_t now = nowNs();
    if (!session.setProperty(key, value)) {
        return false;
    }
    for (const auto& feed : feeds_) {
        feed->putState(setting.key, setting.json, now);
    }
    return true;
}

void InputTap::reportArrived(std::span<const std::uint8_t> report) noexcept {
    order_.lock();
    if (feeds_.empty()) {
        return;
    }
    const std::uint64_t now = nowNs();
    for (const auto& feed : feeds_) {
        feed->putReport(report, now);
    }
}

void InputTap::reportHandled() noexcept {
    order_.unlock();
}

TappedDevice::TappedDevice(std::shared_ptr<Vexa::DeviceBackend> device,
                           std::shared_ptr<InputTap> tap) noexcept
    : ForwardingDevice(std::move(device)), tap_(std::move(tap)) {}

void TappedDevice::reportArrived(std::span<const std::uint8_t> report,
                                 std::uint64_t timestamp) noexcept {
    tap_->reportArrived(report);
    ForwardingDevice::reportArrived(report, timestamp);
}

// The tap first, here too: whoever is told by the device may write a setting next.
void TappedDevice::reportHandled() noexcept {
    tap_->reportHandled();
    ForwardingDevice::reportHandled();
}

}  // namespace VexaTouch::Tools
