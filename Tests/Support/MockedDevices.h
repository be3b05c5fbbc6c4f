#pragma once

#include "Tools/HidReportDescriptor.h"

#include <linux/hidraw.h>
#include <pty.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <umockdev.h>
#include <unistd.h>
#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <filesystem>
#include <iostream>
#include <iterator>
#include <map>
#include <memory>
#include <mutex>
#include <semaphore>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

/// For the leak sanitizer: umockdev loses the name of its folder with each device, in memory that
/// it has from GLib, which nobody else uses.
extern "C" __attribute__((used, visibility("default"))) inline const char*
__lsan_default_suppressions() {
    return "leak:libglib-2.0.so\n";
}

namespace VexaTouch::Testing {

/// How a device that is made up presents itself.
struct MockedIdentity {
    std::uint32_t bus = Tools::kHidBusVirtual;
    std::uint16_t vendor = Tools::kHidVendorId;
    std::uint16_t product = Tools::kHidProductId;
    std::string name{Tools::kHidDeviceName};
    std::string physicalPath = "port-1";
    std::string serial = "0001";
    std::vector<std::uint8_t> descriptor{Tools::kHidReportDescriptor.begin(),
                                         Tools::kHidReportDescriptor.end()};
};

/// What a device that is made up answers when a feature report is asked for.
struct MockedAnswer {
    std::vector<std::uint8_t> bytes;  ///< the id first
    int error = 0;                    ///< an errno instead
};

/// HID devices that are made up: a /sys, a /dev and udev events of their own, hidraw nodes that
/// give reports and answer ioctls, for all code of the process. Needs the interposing library of
/// umockdev, with which the build links every test that includes this.
///
/// A node is a terminal in raw mode: what is sent before the reader reads comes as one report, so
/// send one at a time. Everything may be called on any one thread.
class MockedDevices {
public:
    MockedDevices() : testbed_(umockdev_testbed_new()) {
        require(umockdev_in_mock_environment(), "umockdev is not between us and the system");
    }
    ~MockedDevices() {
        devices_.clear();
        g_object_unref(testbed_);
    }
    MockedDevices(const MockedDevices&) = delete;
    MockedDevices(MockedDevices&&) = delete;
    MockedDevices& operator=(const MockedDevices&) = delete;
    MockedDevices& operator=(MockedDevices&&) = delete;

    static std::string nodeOf(unsigned number) { return "/dev/hidraw" + std::to_string(number); }

    /// Plugs a device in as /dev/hidraw<number> and sends the event. The path in /sys, another one
    /// for each plugging.
    std::string plug(unsigned number, const MockedIdentity& identity = {}) {
        const std::string hid = "/devices/virtual/misc/uhid/" + hex(identity.bus) + ':' +
                                hex(identity.vendor) + ':' + hex(identity.product) + '.' +
                                hex(++instances_);
        const std::string name = "hidraw" + std::to_string(number);
        std::string text =
            "P: " + hid + "/hidraw/" + name + "\nE: SUBSYSTEM=hidraw\nE: DEVNAME=/dev/" + name +
            "\nE: MAJOR=240\nE: MINOR=" + std::to_string(number) + "\n\nP: " + hid +
            "\nE: SUBSYSTEM=hid\nE: HID_ID=" + hex(identity.bus) + ":0000" + hex(identity.vendor) +
            ":0000" + hex(identity.product) + "\nE: HID_NAME=" + identity.name +
            "\nE: HID_PHYS=" + identity.physicalPath + "\nE: HID_UNIQ=" + identity.serial +
            "\nH: report_descriptor=" + hexBytes(identity.descriptor) + '\n';
        GError* error = nullptr;
        require(umockdev_testbed_add_from_string(testbed_, text.c_str(), &error) != 0, error);
        auto device = std::make_unique<Device>();
        device->identity = identity;
        device->hidPath = "/sys" + hid;
        device->sysPath = device->hidPath + "/hidraw/" + name;
        device->terminal = makeNode(name, "240:" + std::to_string(number));
        device->handler = umockdev_ioctl_base_new();
        g_signal_connect(device->handler, "handle-ioctl", G_CALLBACK(&MockedDevices::answer),
                         device.get());
        g_signal_connect(device->handler, "handle-read", G_CALLBACK(&MockedDevices::give),
                         device.get());
        require(umockdev_testbed_attach_ioctl(testbed_, nodeOf(number).c_str(), device->handler,
                                              &error) != 0,
                error);
        const std::string sysPath = device->sysPath;
        devices_[number] = std::move(device);
        return sysPath;
    }
    /// Sends a further event.
    void announce(unsigned number, const char* action) {
        umockdev_testbed_uevent(testbed_, devices_.at(number)->sysPath.c_str(), action);
    }
    /// Sends the reports and pulls the plug before anybody can have read one: as from a device of
    /// the kernel, reads give these, and fail afterwards.
    void sendAndUnplug(unsigned number, std::vector<std::vector<std::uint8_t>> reports) {
        Device& device = *devices_.at(number);
        {
            const std::lock_guard lock(device.mutex);
            device.left.assign(std::make_move_iterator(reports.begin()),
                               std::make_move_iterator(reports.end()));
        }
        unplug(number);
    }
    /// Pulls the plug: readers hang up, ioctls fail, one that waits for its answer too, the folders
    /// in /sys go, then comes the event.
    void unplug(unsigned number, bool announced = true) {
        Device& device = *devices_.at(number);
        {
            const std::lock_guard lock(device.mutex);
            device.gone = true;
        }
        ::close(std::exchange(device.terminal, -1));
        removeNode("hidraw" + std::to_string(number));
        if (device.heldClient) answerHeld(number);
        umockdev_testbed_detach_ioctl(testbed_, nodeOf(number).c_str(), nullptr);
        if (announced) umockdev_testbed_uevent(testbed_, device.sysPath.c_str(), "remove");
        umockdev_testbed_remove_device(testbed_, device.sysPath.c_str());
        umockdev_testbed_remove_device(testbed_, device.hidPath.c_str());
        pulled_.push_back(std::move(devices_.at(number)));
        devices_.erase(number);
    }

    void send(unsigned number, std::span<const std::uint8_t> report) {
        const ssize_t sent = ::write(devices_.at(number)->terminal, report.data(), report.size());
        require(sent == static_cast<ssize_t>(report.size()), "the report was not sent whole");
    }
    void setFeature(unsigned number, std::uint8_t id, MockedAnswer answer) {
        Device& device = *devices_.at(number);
        const std::lock_guard lock(device.mutex);
        device.features[id] = std::move(answer);
    }
    /// The next request for a feature report gets no answer before answerHeld(); returns at once.
    void holdNextFeature(unsigned number) {
        Device& device = *devices_.at(number);
        const std::lock_guard lock(device.mutex);
        device.holdNext = true;
    }
    /// Returns when the request has come.
    void waitUntilHeld(unsigned number) { devices_.at(number)->held.acquire(); }
    void answerHeld(unsigned number) {
        Device& device = *devices_.at(number);
        UMockdevIoctlClient* const client = std::exchange(device.heldClient, nullptr);
        complete(device, client);
        g_object_unref(client);
    }
    /// The feature reports that were sent to the device.
    std::vector<std::vector<std::uint8_t>> written(unsigned number) {
        Device& device = *devices_.at(number);
        const std::lock_guard lock(device.mutex);
        return device.written;
    }

private:
    struct Device {
        ~Device() {
            if (terminal >= 0) ::close(terminal);
            if (handler) g_object_unref(handler);
        }
        MockedIdentity identity;
        std::string hidPath;
        std::string sysPath;
        int terminal = -1;
        UMockdevIoctlBase* handler = nullptr;
        std::mutex mutex;
        bool gone = false;
        bool holdNext = false;
        std::map<std::uint8_t, MockedAnswer> features;
        std::vector<std::vector<std::uint8_t>> written;
        std::deque<std::vector<std::uint8_t>> left;  ///< to be read after the unplug
        std::binary_semaphore held{0};
        UMockdevIoctlClient* heldClient = nullptr;
    };

    static void require(bool holds, std::string_view what) {
        if (holds) return;
        std::cerr << "MockedDevices: " << what << '\n';
        std::abort();
    }
    static void require(bool holds, const GError* error) {
        require(holds, std::string_view(error ? error->message : "no reason given"));
    }

    [[nodiscard]] std::filesystem::path nodes() const {
        return std::filesystem::path(umockdev_testbed_get_root_dir(testbed_)) / "dev";
    }

    /// Makes a node as the testbed makes its own, which it cannot make a second time: a terminal,
    /// and a link that tells the number. The end that sends.
    int makeNode(const std::string& name, const std::string& number) const {
        int sender = -1;
        int reader = -1;
        std::array<char, 64> terminal{};
        termios raw{};
        ::cfmakeraw(&raw);
        require(::openpty(&sender, &reader, terminal.data(), &raw, nullptr) == 0, "no terminal");
        ::close(reader);
        std::string map = terminal.data();
        std::ranges::replace(map, '/', '_');
        std::filesystem::create_directories(nodes() / ".node");
        std::filesystem::create_directories(nodes() / ".ptymap");
        std::filesystem::remove(nodes() / ".ptymap" / map);
        std::filesystem::create_symlink(number, nodes() / ".ptymap" / map);
        std::filesystem::create_symlink(number, nodes() / ".node" / name);
        std::filesystem::create_symlink(terminal.data(), nodes() / name);
        return sender;
    }
    void removeNode(const std::string& name) const {
        std::filesystem::remove(nodes() / ".node" / name);
        std::filesystem::remove(nodes() / name);
    }

    static std::string hex(std::uint32_t number) {
        std::array<char, 16> text{};
        std::snprintf(text.data(), text.size(), "%04X", number);
        return text.data();
    }
    static std::string hexBytes(const std::vector<std::uint8_t>& bytes) {
        std::string text;
        for (const std::uint8_t byte : bytes) {
            constexpr std::string_view kDigits = "0123456789ABCDEF";
            text += kDigits[byte >> 4U];
            text += kDigits[byte & 15U];
        }
        return text;
    }

    /// On a thread of the testbed.
    static gboolean answer(UMockdevIoctlBase* /*handler*/, UMockdevIoctlClient* client,
                           gpointer context) {
        Device& device = *static_cast<Device*>(context);
        const auto request = static_cast<unsigned long>(umockdev_ioctl_client_get_request(client));
        {
            const std::lock_guard lock(device.mutex);
            const bool asks = _IOC_NR(request) == _IOC_NR(HIDIOCGFEATURE(0));
            if (asks && std::exchange(device.holdNext, false)) {
                // This thread has the reads to serve as well.
                device.heldClient = UMOCKDEV_IOCTL_CLIENT(g_object_ref(client));
                device.held.release();
                return TRUE;
            }
        }
        complete(device, client);
        return TRUE;
    }

    /// Of the same thread: what is left to be read. The terminal gives all else.
    static gboolean give(UMockdevIoctlBase* /*handler*/, UMockdevIoctlClient* client,
                         gpointer context) {
        Device& device = *static_cast<Device*>(context);
        const std::lock_guard lock(device.mutex);
        if (!device.gone) return FALSE;
        if (device.left.empty()) {
            umockdev_ioctl_client_complete(client, -1, EIO);
            return TRUE;
        }
        const std::vector<std::uint8_t> report = std::move(device.left.front());
        device.left.pop_front();
        UMockdevIoctlData* const room = umockdev_ioctl_client_get_arg(client);
        umockdev_ioctl_data_update(room, 0, const_cast<guint8*>(report.data()),
                                   static_cast<int>(report.size()));
        umockdev_ioctl_client_complete(client, static_cast<glong>(report.size()), 0);
        return TRUE;
    }

    static void complete(Device& device, UMockdevIoctlClient* client) {
        const auto request = static_cast<unsigned long>(umockdev_ioctl_client_get_request(client));
        const std::lock_guard lock(device.mutex);
        const int result = device.gone ? -ENODEV : answerLocked(device, client, request);
        umockdev_ioctl_client_complete(client, result < 0 ? -1 : result, result < 0 ? -result : 0);
    }

    /// The result, or an errno negated.
    static int answerLocked(Device& device, UMockdevIoctlClient* client, unsigned long request) {
        const std::size_t size = _IOC_SIZE(request);
        GError* error = nullptr;
        UMockdevIoctlData* const data =
            umockdev_ioctl_data_resolve(umockdev_ioctl_client_get_arg(client), 0, size, &error);
        require(data != nullptr, error);
        const int result = answerWith(device, data, request, size);
        umockdev_ioctl_data_unref(data);
        return result;
    }

    static int fill(UMockdevIoctlData* data, std::size_t room, const void* bytes,
                    std::size_t size) {
        const std::size_t count = std::min(room, size);
        if (count == 0) return 0;
        std::vector<std::uint8_t> copy(count);
        std::memcpy(copy.data(), bytes, count);
        umockdev_ioctl_data_update(data, 0, copy.data(), static_cast<int>(count));
        return static_cast<int>(count);
    }

    static std::vector<std::uint8_t> bytesOf(UMockdevIoctlData* data) {
        guint8* bytes = nullptr;
        int length = 0;
        umockdev_ioctl_data_retrieve(data, &bytes, &length);
        std::vector<std::uint8_t> copy(bytes, bytes + length);
        g_free(bytes);
        return copy;
    }

    static int answerWith(Device& device, UMockdevIoctlData* data, unsigned long request,
                          std::size_t room) {
        const MockedIdentity& identity = device.identity;
        const auto text = [&](const std::string& answer) {
            return fill(data, room, answer.c_str(), answer.size() + 1);
        };
        switch (_IOC_NR(request)) {
            case _IOC_NR(HIDIOCGRDESCSIZE): {
                const int size = static_cast<int>(identity.descriptor.size());
                fill(data, room, &size, sizeof size);
                return 0;
            }
            case _IOC_NR(HIDIOCGRDESC): {
                hidraw_report_descriptor descriptor{};
                descriptor.size = static_cast<std::uint32_t>(identity.descriptor.size());
                std::ranges::copy(identity.descriptor, descriptor.value);
                fill(data, room, &descriptor, sizeof descriptor);
                return 0;
            }
            case _IOC_NR(HIDIOCGRAWINFO): {
                const hidraw_devinfo info{.bustype = identity.bus,
                                          .vendor = static_cast<std::int16_t>(identity.vendor),
                                          .product = static_cast<std::int16_t>(identity.product)};
                fill(data, room, &info, sizeof info);
                return 0;
            }
            case _IOC_NR(HIDIOCGRAWNAME(0)):
                return text(identity.name);
            case _IOC_NR(HIDIOCGRAWPHYS(0)):
                return text(identity.physicalPath);
            case _IOC_NR(HIDIOCGRAWUNIQ(0)):
                return text(identity.serial);
            case _IOC_NR(HIDIOCGFEATURE(0)): {
                const auto asked = bytesOf(data);
                const auto found = device.features.find(asked.at(0));
                if (found == device.features.end()) return -EIO;
                if (found->second.error != 0) return -found->second.error;
                return fill(data, room, found->second.bytes.data(), found->second.bytes.size());
            }
            case _IOC_NR(HIDIOCSFEATURE(0)):
                device.written.push_back(bytesOf(data));
                return static_cast<int>(room);
            default:
                return -EINVAL;
        }
    }

    UMockdevTestbed* testbed_;
    std::uint32_t instances_ = 0;
    std::map<unsigned, std::unique_ptr<Device>> devices_;
    std::vector<std::unique_ptr<Device>> pulled_;
};

}  // namespace VexaTouch::Testing
