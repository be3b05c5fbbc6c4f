#include "Host/VirtualKeyboard.h"

#include "Host/HostFailure.h"

#include <fcntl.h>
#include <libevdev/libevdev-uinput.h>
#include <libevdev/libevdev.h>
#include <linux/input.h>
#include <unistd.h>

#include <cerrno>
#include <new>
#include <string_view>

namespace VexaTouch::Host {
namespace {

static_assert(VirtualKeyboard::kBus == BUS_VIRTUAL);

struct Free {
    void operator()(libevdev* description) const noexcept { libevdev_free(description); }
};

/// What somebody can do who got this error from uinput.
std::string_view advice(int error) noexcept {
    switch (error) {
        case ENOENT:
        case ENODEV:
        case ENXIO:
            return " (the kernel's module is not loaded; as root: modprobe uinput)";
        case EACCES:
        case EPERM:
            return " (run as root, or let a group of yours write to it with a udev rule: "
                   "KERNEL==\"uinput\", GROUP=\"...\", MODE=\"0660\")";
        case ENOTTY:
        case EINVAL:
            return " (it is not the node of uinput)";
        default:
            return "";
    }
}

/// The node is there: what fails now is not a missing module.
std::string_view adviceOnMaking(int error) noexcept {
    switch (error) {
        case ENOENT:
        case ENODEV:
        case ENXIO:
            return " (the kernel made it, but it is not to be found in /sys)";
        default:
            return advice(error);
    }
}

[[noreturn]] void fail(const std::string& step, int error, std::string_view advice) {
    throw HostFailure("no keyboard: cannot " + step + ": " +
                      std::generic_category().message(error) + std::string(advice));
}

/// What the keyboard shall be.
std::unique_ptr<libevdev, Free> describe(std::span<const KeyCode> keys) {
    std::unique_ptr<libevdev, Free> description(libevdev_new());
    if (!description) {
        throw std::bad_alloc();
    }
    libevdev_set_name(description.get(), VirtualKeyboard::kName);
    libevdev_set_id_bustype(description.get(), VirtualKeyboard::kBus);
    libevdev_set_id_vendor(description.get(), VirtualKeyboard::kVendor);
    libevdev_set_id_product(description.get(), VirtualKeyboard::kProduct);
    libevdev_set_id_version(description.get(), VirtualKeyboard::kVersion);
    bool done = libevdev_enable_event_type(description.get(), EV_REP) == 0;
    for (const KeyCode key : keys) {
        done = done && libevdev_enable_event_code(description.get(), EV_KEY, key, nullptr) == 0;
    }
    if (!done) {
        throw HostFailure("no keyboard: it cannot have all of its keys");
    }
    return description;
}

}  // namespace

VirtualKeyboard::Node::Node(const std::string& path) noexcept
    : descriptor_(::open(path.c_str(), O_RDWR | O_CLOEXEC)) {}

VirtualKeyboard::Node::~Node() {
    if (descriptor_ >= 0) {
        ::close(descriptor_);
    }
}

void VirtualKeyboard::Destroy::operator()(libevdev_uinput* device) const noexcept {
    libevdev_uinput_destroy(device);
}

VirtualKeyboard::VirtualKeyboard(std::span<const KeyCode> keys, const std::string& node)
    : node_(node) {
    if (node_.get() < 0) {
        const int error = errno;
        fail("open " + node, error, advice(error));
    }
    libevdev_uinput* made = nullptr;
    const int status = libevdev_uinput_create_from_device(describe(keys).get(), node_.get(), &made);
    if (status < 0) {
        fail("make one with " + node, -status, adviceOnMaking(-status));
    }
    device_.reset(made);
}

VirtualKeyboard::~VirtualKeyboard() = default;

std::error_code VirtualKeyboard::press(KeyCode key) noexcept {
    return write(EV_KEY, key, 1);
}

std::error_code VirtualKeyboard::release(KeyCode key) noexcept {
    return write(EV_KEY, key, 0);
}

std::error_code VirtualKeyboard::synchronise() noexcept {
    return write(EV_SYN, SYN_REPORT, 0);
}

std::string VirtualKeyboard::eventNode() const {
    const char* node = libevdev_uinput_get_devnode(device_.get());
    return node == nullptr ? "" : node;
}

std::error_code VirtualKeyboard::write(std::uint16_t type, std::uint16_t code, int value) noexcept {
    int status = 0;
    do {
        status = libevdev_uinput_write_event(device_.get(), type, code, value);
    } while (status == -EINTR);
    return {-status, std::generic_category()};
}

}  // namespace VexaTouch::Host
