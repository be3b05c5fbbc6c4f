#include "Tools/Validate/CheckStand.h"

#include <array>
#include <string>

namespace VexaTouch::Tools {

CheckStand::CheckStand(CheckRun& run, const LoadedPlugin& plugin)
    : run_(run), service_(run, plugin) {}

void CheckStand::begin() {
    start();
    setCallback();
    schedule();
    service_.open();
}

void CheckStand::end() {
    service_.close();
    unschedule();
    service_.stop();
}

void CheckStand::send(std::span<const std::uint8_t> bytes) {
    run_.require(waitUntil([&] { return device_->trySendReport(bytes); }),
                 device_->isOpen() ? "does not take its reports: the device has no room for more"
                                   : "has closed its device without being asked to");
}

void CheckStand::report(std::span<const std::uint8_t> bytes) {
    const std::uint64_t before = device_->handled();
    send(bytes);
    waitForReports(before + 1);
}

void CheckStand::resetReport() {
    static constexpr std::array<std::uint8_t, 10> kReset = {2, 0};
    report(kReset);
}

void CheckStand::waitForReports(std::uint64_t count) {
    if (!waitUntil([&] { return device_->handled() >= count; })) {
        run_.fail("does not take its reports: " + std::to_string(device_->handled()) + " of " +
                  std::to_string(count) + " handled");
    }
}

}  // namespace VexaTouch::Tools
