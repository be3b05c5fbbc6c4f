#include "Host/SurfaceWatch.h"

#include "Host/HostFailure.h"
#include "Platform/ReportDescriptor.h"

#include <fcntl.h>
#include <libudev.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <optional>
#include <string_view>
#include <utility>

namespace VexaTouch::Host {
namespace {

constexpr const char* kSubsystem = "hidraw";
/// There while udev's daemon runs.
constexpr const char* kUdevSocket = "/run/udev/control";
/// Taken at once; whatever comes faster waits for the next time.
constexpr std::size_t kMostEvents = 256;

template <auto kRelease>
struct Releaser {
    template <typename Object>
    void operator()(Object* object) const noexcept {
        static_cast<void>(kRelease(object));
    }
};
template <typename Object, auto kRelease>
using Owned = std::unique_ptr<Object, Releaser<kRelease>>;

using Context = Owned<udev, &udev_unref>;
using Monitor = Owned<udev_monitor, &udev_monitor_unref>;
using Enumeration = Owned<udev_enumerate, &udev_enumerate_unref>;
using Device = Owned<udev_device, &udev_device_unref>;

[[noreturn]] void fail(const std::string& what, int error) {
    throw HostFailure(what + ": " + std::strerror(error));
}

std::string textOf(const char* text) {
    return text != nullptr ? text : std::string();
}

std::string propertyOf(udev_device* device, const char* key) {
    return textOf(udev_device_get_property_value(device, key));
}

/// What udev tells after its rules were applied, the second one when it is triggered anew.
bool isNews(std::string_view action) {
    return action == "add" || action == "change";
}

/// Whether who takes these changes looks at the surface anyway, as after an event that was on its
/// way while the list was made.
bool isTold(const std::vector<SurfaceChange>& changes, std::string_view sysPath) {
    return std::ranges::any_of(changes, [sysPath](const SurfaceChange& change) {
        return change.kind != SurfaceChange::Kind::Removed && change.surface.sysPath == sysPath;
    });
}

/// Empty when it cannot be read, as that of a device that has gone.
std::vector<std::uint8_t> readDescriptor(const std::string& path) {
    std::vector<std::uint8_t> bytes;
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (file < 0) return bytes;
    std::array<std::uint8_t, Vexa::kLongestReportDescriptor> piece{};
    ssize_t count = 0;
    while ((count = ::read(file, piece.data(), piece.size())) > 0 &&
           bytes.size() <= Vexa::kLongestReportDescriptor) {
        bytes.insert(bytes.end(), piece.begin(), piece.begin() + count);
    }
    ::close(file);
    return bytes;
}

/// What the kernel's HID device above a hidraw node says of itself; nothing when either has gone.
std::optional<Surface> surfaceOf(udev_device* device) {
    const char* const node = udev_device_get_devnode(device);
    udev_device* const hid = udev_device_get_parent_with_subsystem_devtype(device, "hid", nullptr);
    if (node == nullptr || hid == nullptr) return std::nullopt;
    Surface surface{.node = node,
                    .sysPath = textOf(udev_device_get_syspath(device)),
                    .name = propertyOf(hid, "HID_NAME"),
                    .physicalPath = propertyOf(hid, "HID_PHYS"),
                    .serial = propertyOf(hid, "HID_UNIQ"),
                    .reportDescriptor = readDescriptor(textOf(udev_device_get_syspath(hid)) +
                                                       "/report_descriptor")};
    unsigned bus = 0;
    unsigned vendor = 0;
    unsigned product = 0;
    const std::string ids = propertyOf(hid, "HID_ID");  // "0003:00005658:00005454"
    if (std::sscanf(ids.c_str(), "%x:%x:%x", &bus, &vendor, &product) != 3) return std::nullopt;
    surface.bus = bus;
    surface.vendor = static_cast<std::uint16_t>(vendor);
    surface.product = static_cast<std::uint16_t>(product);
    return surface;
}

}  // namespace

class SurfaceWatch::Udev {
public:
    explicit Udev(Events events) : context_(udev_new()), isUdevs_(events == Events::Udev) {
        if (!context_) fail("udev cannot be used", errno);
    }

    /// From now on events are kept until they are taken.
    void listen() {
        monitor_.reset(udev_monitor_new_from_netlink(context_.get(), isUdevs_ ? "udev" : "kernel"));
        if (!monitor_) fail("no events of devices", errno);
        int error =
            udev_monitor_filter_add_match_subsystem_devtype(monitor_.get(), kSubsystem, nullptr);
        if (error >= 0) error = udev_monitor_enable_receiving(monitor_.get());
        if (error < 0) fail("no events of devices", -error);
    }

    [[nodiscard]] int descriptor() const noexcept { return udev_monitor_get_fd(monitor_.get()); }

    /// The next event; none with errno set: EAGAIN when all have been taken, ENOBUFS when some were
    /// lost.
    [[nodiscard]] Device nextEvent() const noexcept {
        errno = 0;
        return Device(udev_monitor_receive_device(monitor_.get()));
    }

    /// Calls `found` with each device that is there and ready for use.
    template <typename Found>
    void list(Found&& found) const {
        const Enumeration enumeration(udev_enumerate_new(context_.get()));
        if (!enumeration) fail("devices cannot be listed", errno);
        int error = udev_enumerate_add_match_subsystem(enumeration.get(), kSubsystem);
        if (error >= 0) error = udev_enumerate_scan_devices(enumeration.get());
        if (error < 0) fail("devices cannot be listed", -error);
        udev_list_entry* entry = nullptr;
        udev_list_entry_foreach(entry, udev_enumerate_get_list_entry(enumeration.get())) {
            const Device device(
                udev_device_new_from_syspath(context_.get(), udev_list_entry_get_name(entry)));
            if (device && isReady(device.get())) found(device.get());
        }
    }

private:
    /// A device that udev has not come to yet gets its event later, unless it may be used already.
    [[nodiscard]] bool isReady(udev_device* device) const noexcept {
        const char* const node = udev_device_get_devnode(device);
        return !isUdevs_ || udev_device_get_is_initialized(device) > 0 ||
               (node != nullptr && ::access(node, R_OK | W_OK) == 0);
    }

    Context context_;
    Monitor monitor_;
    bool isUdevs_;
};

SurfaceWatch::SurfaceWatch(SurfaceMatch match, Events events)
    : match_(std::move(match)), events_(events) {
    if (events_ == Events::Automatic) {
        events_ = ::access(kUdevSocket, F_OK) == 0 ? Events::Udev : Events::Kernel;
    }
    udev_ = std::make_unique<Udev>(events_);
    // Before the list is made, so that nothing falls between the two.
    udev_->listen();
}

SurfaceWatch::~SurfaceWatch() = default;

int SurfaceWatch::descriptor() const noexcept {
    return udev_->descriptor();
}

std::vector<SurfaceChange> SurfaceWatch::takeChanges() {
    std::vector<SurfaceChange> changes;
    if (std::exchange(mustEnumerate_, false)) enumerate(changes);
    takeEvents(changes);
    // Events were lost: what they told is in a new list.
    if (std::exchange(mustEnumerate_, false)) enumerate(changes);
    return changes;
}

void SurfaceWatch::enumerate(std::vector<SurfaceChange>& changes) {
    std::vector<Surface> present;
    udev_->list([&](udev_device* device) {
        if (auto surface = surfaceOf(device); surface && match_.matches(*surface)) {
            present.push_back(*std::move(surface));
        }
    });
    std::erase_if(known_, [&](const auto& known) {
        const bool isThere = std::ranges::find(present, known.second) != present.end();
        if (!isThere) changes.push_back({SurfaceChange::Kind::Removed, known.second});
        return !isThere;
    });
    // /dev/hidraw10 comes behind /dev/hidraw9.
    std::ranges::sort(present, {}, [](const Surface& surface) {
        return std::pair(surface.node.size(), surface.node);
    });
    for (Surface& surface : present) {
        if (!known_.emplace(surface.sysPath, surface).second) continue;
        changes.push_back({SurfaceChange::Kind::Added, std::move(surface)});
    }
}

void SurfaceWatch::takeEvents(std::vector<SurfaceChange>& changes) {
    for (std::size_t taken = 0; taken < kMostEvents; ++taken) {
        const Device device = udev_->nextEvent();
        if (!device) {
            if (errno == EAGAIN || errno == EWOULDBLOCK) return;
            if (errno == EINTR) continue;
            mustEnumerate_ = true;
            if (errno != ENOBUFS) return;
            continue;
        }
        const std::string path = textOf(udev_device_get_syspath(device.get()));
        const char* const action = udev_device_get_action(device.get());
        const auto known = known_.find(path);
        if (action != nullptr && std::string_view(action) == "remove") {
            if (known == known_.end()) continue;
            changes.push_back({SurfaceChange::Kind::Removed, std::move(known->second)});
            known_.erase(known);
        } else if (known == known_.end()) {
            auto surface = surfaceOf(device.get());
            if (!surface || !match_.matches(*surface)) continue;
            known_.emplace(path, *surface);
            changes.push_back({SurfaceChange::Kind::Added, *std::move(surface)});
        } else if (action != nullptr && isNews(action) && !isTold(changes, path)) {
            changes.push_back({SurfaceChange::Kind::Changed, known->second});
        }
    }
}

std::vector<Surface> findSurfaces(const SurfaceMatch& match) {
    std::vector<Surface> surfaces;
    for (SurfaceChange& change : SurfaceWatch(match).takeChanges()) {
        if (change.kind != SurfaceChange::Kind::Added) continue;
        surfaces.push_back(std::move(change.surface));
    }
    return surfaces;
}

}  // namespace VexaTouch::Host
