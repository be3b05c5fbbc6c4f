#include "Tests/Kernel/UhidDevice.h"

#include <fcntl.h>
#include <linux/uhid.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <system_error>

namespace VexaTouch::Testing {
namespace {

[[noreturn]] void fail(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

void writeEvent(int uhid, const uhid_event& event, std::size_t contentSize, const char* what) {
    const std::size_t size = sizeof event.type + contentSize;
    if (write(uhid, &event, size) != static_cast<ssize_t>(size)) {
        fail(what);
    }
}

template <std::size_t Size>
void copyText(const std::string& text, __u8 (&target)[Size]) {  // NOLINT(modernize-avoid-c-arrays)
    std::memcpy(&target[0], text.data(), std::min(text.size(), Size - 1));
}

bool hasSerial(const std::filesystem::path& node, const std::string& serial) {
    std::ifstream properties(node / "device" / "uevent");
    for (std::string line; std::getline(properties, line);) {
        if (line == "HID_UNIQ=" + serial) {
            return true;
        }
    }
    return false;
}

}  // namespace

UhidDevice::UhidDevice(const Identity& identity, Features features)
    : serial_(identity.serial),
      features_(features),
      uhid_(::open("/dev/uhid", O_RDWR | O_CLOEXEC)),
      end_(eventfd(0, EFD_CLOEXEC)) {
    if (!uhid_ || !end_) {
        fail("/dev/uhid");
    }
    uhid_event event{};
    event.type = UHID_CREATE2;
    uhid_create2_req& request = event.u.create2;
    copyText(identity.name, request.name);
    copyText(identity.physicalPath, request.phys);
    copyText(identity.serial, request.uniq);
    request.rd_size = static_cast<__u16>(identity.descriptor.size());
    request.bus = Tools::kHidBusVirtual;
    request.vendor = identity.vendor;
    request.product = identity.product;
    std::memcpy(&request.rd_data[0], identity.descriptor.data(),
                std::min(identity.descriptor.size(), sizeof request.rd_data));
    writeEvent(uhid_.get(), event, sizeof request, "creating the surface");
    thread_ = std::thread([this] { handleEvents(); });
}

UhidDevice::~UhidDevice() {
    // Closing the descriptor pulls the plug; the thread must not be in the middle of using it.
    const std::uint64_t one = 1;
    [[maybe_unused]] const auto written = write(end_.get(), &one, sizeof one);
    thread_.join();
}

void UhidDevice::send(std::span<const std::uint8_t> report) {
    uhid_event event{};
    event.type = UHID_INPUT2;
    event.u.input2.size = static_cast<__u16>(std::min(report.size(), sizeof event.u.input2.data));
    std::memcpy(&event.u.input2.data[0], report.data(), event.u.input2.size);
    writeEvent(uhid_.get(), event, sizeof event.u.input2.size + event.u.input2.size,
               "sending a report");
}

bool UhidDevice::waitUntilOpen(bool open, std::chrono::milliseconds limit) {
    std::unique_lock held(lock_);
    return changed_.wait_for(held, limit, [&] { return open_ == open; });
}

bool UhidDevice::waitUntilAsked(std::uint64_t requests, std::chrono::milliseconds limit) {
    std::unique_lock held(lock_);
    return changed_.wait_for(held, limit, [&] { return requests_ >= requests; });
}

std::string UhidDevice::waitForNode(std::chrono::milliseconds limit) const {
    const auto end = std::chrono::steady_clock::now() + limit;
    do {
        std::error_code error;
        for (const auto& node : std::filesystem::directory_iterator("/sys/class/hidraw", error)) {
            const std::string path = "/dev/" + node.path().filename().string();
            if (hasSerial(node.path(), serial_) && std::filesystem::exists(path, error)) {
                return path;
            }
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    } while (std::chrono::steady_clock::now() < end);
    return {};
}

void UhidDevice::handleEvents() {
    std::array<pollfd, 2> waited = {{{.fd = uhid_.get(), .events = POLLIN, .revents = 0},
                                     {.fd = end_.get(), .events = POLLIN, .revents = 0}}};
    while (poll(waited.data(), waited.size(), -1) >= 0 && waited[1].revents == 0) {
        uhid_event event{};
        if (read(uhid_.get(), &event, sizeof event) <= 0) {
            return;
        }
        if (event.type == UHID_OPEN || event.type == UHID_CLOSE) {
            const std::scoped_lock held(lock_);
            open_ = event.type == UHID_OPEN;
        } else if (event.type == UHID_GET_REPORT) {
            answer(event.u.get_report.id, event.u.get_report.rnum);
            const std::scoped_lock held(lock_);
            ++requests_;
        }
        changed_.notify_all();
    }
}

void UhidDevice::answer(std::uint32_t request, std::uint8_t reportId) {
    const Features features = features_;
    if (features == Features::Never) {
        return;
    }
    uhid_event event{};
    event.type = UHID_GET_REPORT_REPLY;
    uhid_get_report_reply_req& reply = event.u.get_report_reply;
    reply.id = request;
    std::size_t length = 0;
    const vexa_status status =
        answers_.getReport(VEXA_REPORT_FEATURE, reportId, std::span(reply.data), length);
    if (status != VEXA_STATUS_SUCCESS || features == Features::Refused) {
        reply.err = EIO;
    } else {
        reply.size = static_cast<__u16>(features == Features::Short ? 2 : length);
    }
    writeEvent(uhid_.get(), event, sizeof reply, "answering a feature request");
}

}  // namespace VexaTouch::Testing
