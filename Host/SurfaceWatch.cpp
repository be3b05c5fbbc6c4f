#include "Host/SurfaceWatch.h"

#include "Host/HostFailure.h"
#include "Platform/Log.h"
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
#include <set>
#include <string_view>
#include <utility>

namespace VexaTouch::Host {
namespace {

constexpr const char* kSubsystem = "hidraw";
/// There while udev's daemon runs.
constexpr const char* kUdevSocket = "/run/udev/control";
/// Taken at once; whatever comes faster waits for the next time.
constexpr std::size_t kMostEvents = 256;
// Surfaces of which it is remembered that they were one.
constexpr std::size_t kMostFormer = 256;

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

void logError(const std::string& text) {
    Vexa::Log(Vexa::LogCategory::HIDService).write(Vexa::LogLevel::Error, text);
}

/// Whether it is this process that lacks something, and nothing was learned of a device.
bool isShortage(int error) {
    return error == EMFILE || error == ENFILE || error == ENOMEM;
}

/// Why nothing can be learned of any device just now; 0: there are descriptors. What the library
/// could not read of a device for want of one it takes for not being there, and does not say why.
int shortageNow() {
    // More than it ever holds open at once.
    std::array<int, 6> some{};
    some.fill(-1);
    int error = 0;
    for (int& any : some) {
        any = ::open("/", O_PATH | O_DIRECTORY | O_CLOEXEC);
        if (any >= 0) continue;
        error = isShortage(errno) ? errno : 0;
        break;
    }
    for (const int any : some) {
        if (any >= 0) ::close(any);
    }
    return error;
}

/// Empty when it cannot be read; then `error` is why, or 0 when the device has gone.
std::vector<std::uint8_t> readDescriptor(const std::string& path, int& error) {
    std::vector<std::uint8_t> bytes;
    error = 0;
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (file < 0) {
        error = errno;
    } else {
        std::array<std::uint8_t, Vexa::kLongestReportDescriptor> piece{};
        ssize_t count = 0;
        while ((count = ::read(file, piece.data(), piece.size())) > 0 &&
               bytes.size() <= Vexa::kLongestReportDescriptor) {
            bytes.insert(bytes.end(), piece.begin(), piece.begin() + count);
        }
        if (count < 0) {
            error = errno;
            bytes.clear();
        }
        ::close(file);
    }
    if (error == ENOENT || error == ENODEV) error = 0;
    return bytes;
}

/// What stays the same of a device that is plugged in again, perhaps elsewhere. Of one with several
/// interfaces, which share the ids and the serial number, the end of the path tells which it is.
std::string identityOf(const Surface& surface) {
    const std::string& path = surface.physicalPath;
    const std::size_t slash = path.rfind('/');
    return std::to_string(surface.vendor) + ':' + std::to_string(surface.product) + ' ' +
           surface.serial + (slash == std::string::npos ? std::string() : path.substr(slash));
}

}  // namespace

/// What looking at a device has shown.
struct SurfaceWatch::Look {
    /// Nothing when the device has gone, or could not be looked at.
    std::optional<Surface> surface = std::nullopt;
    /// Why something was not learned: with a surface, of its report descriptor.
    int error = 0;
};

/// What the kernel's HID device above a hidraw node says of itself.
SurfaceWatch::Look SurfaceWatch::lookAt(udev_device* device) {
    const char* const node = udev_device_get_devnode(device);
    udev_device* const hid = udev_device_get_parent_with_subsystem_devtype(device, "hid", nullptr);
    if (node == nullptr || hid == nullptr) return {.error = shortageNow()};
    int error = 0;
    Surface surface{.node = node,
                    .sysPath = textOf(udev_device_get_syspath(device)),
                    .name = propertyOf(hid, "HID_NAME"),
                    .physicalPath = propertyOf(hid, "HID_PHYS"),
                    .serial = propertyOf(hid, "HID_UNIQ"),
                    .reportDescriptor = readDescriptor(
                        textOf(udev_device_get_syspath(hid)) + "/report_descriptor", error)};
    if (isShortage(error)) return {.error = error};
    unsigned bus = 0;
    unsigned vendor = 0;
    unsigned product = 0;
    const std::string ids = propertyOf(hid, "HID_ID");  // "0003:00005658:00005454"
    if (std::sscanf(ids.c_str(), "%x:%x:%x", &bus, &vendor, &product) != 3) {
        return {.error = shortageNow()};
    }
    surface.bus = bus;
    surface.vendor = static_cast<std::uint16_t>(vendor);
    surface.product = static_cast<std::uint16_t>(product);
    return {.surface = std::move(surface), .error = error};
}

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

    /// Calls `found` with each device that is there and ready for use, and `missed` with the path
    /// in /sys of each that could not be looked at. Why the list could not be made, or 0.
    template <typename Found, typename Missed>
    [[nodiscard]] int list(Found&& found, Missed&& missed) const {
        const Enumeration enumeration(udev_enumerate_new(context_.get()));
        if (!enumeration) return errno;
        int error = udev_enumerate_add_match_subsystem(enumeration.get(), kSubsystem);
        if (error >= 0) error = udev_enumerate_scan_devices(enumeration.get());
        if (error < 0) return -error;
        udev_list_entry* entry = nullptr;
        udev_list_entry_foreach(entry, udev_enumerate_get_list_entry(enumeration.get())) {
            const char* const path = udev_list_entry_get_name(entry);
            const Device device(udev_device_new_from_syspath(context_.get(), path));
            if (device && isReady(device.get())) {
                found(device.get());
            } else if (const int shortage = shortageNow()) {
                missed(path, shortage);
            }
        }
        return 0;
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
    // Events were lost: what they told is in a new list. What cannot be looked at now can be no
    // more a moment later.
    if (!isShort_ && std::exchange(mustEnumerate_, false)) enumerate(changes);
    return changes;
}

void SurfaceWatch::lookLater(int error) {
    mustEnumerate_ = true;
    if (std::exchange(isShort_, true)) return;
    logError(std::string("HID devices cannot be looked at: ") + std::strerror(error) +
             "; what is known stays, the others are looked at with the next news of a device");
}

bool SurfaceWatch::isSurface(const Look& look) {
    const Surface& surface = *look.surface;
    if (look.error != 0) {
        logError(surface.node +
                 ": its report descriptor cannot be read: " + std::strerror(look.error));
    }
    if (match_.matches(surface)) {
        former_.insert_or_assign(identityOf(surface), false);
        // Enough for what is plugged in again; a device with ever new serial numbers gets no more.
        if (former_.size() > kMostFormer) former_.erase(former_.begin());
        return true;
    }
    const std::string identity = identityOf(surface);
    // What is still there is another device.
    const bool isThere = std::ranges::any_of(
        known_, [&](const auto& known) { return identityOf(known.second) == identity; });
    const auto former = former_.find(identity);
    if (!isThere && former != former_.end() && !std::exchange(former->second, true)) {
        logError(surface.node + ": no surface any more: " + match_.reason(surface));
    }
    return false;
}

void SurfaceWatch::enumerate(std::vector<SurfaceChange>& changes) {
    std::vector<Surface> present;
    std::set<std::string, std::less<>> unclear;
    int shortage = 0;
    const auto missed = [&](std::string path, int error) {
        unclear.insert(std::move(path));
        if (isShortage(error)) shortage = error;
    };
    const int failure = udev_->list(
        [&](udev_device* device) {
            Look look = lookAt(device);
            const std::string path = textOf(udev_device_get_syspath(device));
            if (look.error != 0 && (!look.surface || known_.contains(path))) {
                missed(path, look.error);
            } else if (look.surface && isSurface(look)) {
                present.push_back(*std::move(look.surface));
            }
        },
        missed);
    if (failure != 0) {
        if (!hasEnumerated_ || !isShortage(failure)) fail("devices cannot be listed", failure);
        lookLater(failure);
        return;
    }
    hasEnumerated_ = true;
    isShort_ = isShort_ && shortage != 0;
    if (shortage != 0) lookLater(shortage);
    std::erase_if(known_, [&](const auto& known) {
        const bool isThere = unclear.contains(known.first) ||
                             std::ranges::find(present, known.second) != present.end();
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
            Look look = lookAt(device.get());
            if (!look.surface && look.error != 0) lookLater(look.error);
            if (!look.surface || !isSurface(look)) continue;
            known_.emplace(path, *look.surface);
            changes.push_back({SurfaceChange::Kind::Added, *std::move(look.surface)});
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
