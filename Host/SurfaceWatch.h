#pragma once

#include "Host/Surface.h"
#include "Host/SurfaceMatch.h"

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

struct udev_device;

namespace VexaTouch::Host {

/// A surface has come or gone, or there is news of one that is there.
struct SurfaceChange {
    enum class Kind : std::uint8_t {
        Added,
        Removed,
        /// The system told of it anew, as when its node has got other permissions; what the surface
        /// says of itself is as before.
        Changed,
    };

    Kind kind = Kind::Added;
    Surface surface;

    friend bool operator==(const SurfaceChange&, const SurfaceChange&) = default;
};

/// Finds surfaces: those that are there and those that come, change and go. It has no thread and no
/// timer; while nothing is plugged or unplugged it does nothing at all. One thread.
///
/// It acts on udev's events, which come when udev has set a node's permissions. Where udev does not
/// run (/run/udev/control is missing) the kernel's own events must do; whoever sets permissions
/// there does so without telling.
///
/// In the log (HIDService, error) it tells of a device that was a surface and, plugged in again, is
/// none any more, and of devices that cannot be looked at.
class SurfaceWatch {
public:
    enum class Events : std::uint8_t {
        Automatic,  ///< udev's where it runs, else the kernel's
        Udev,
        Kernel,
    };

    /// Throws HostFailure when the system gives no list or no events.
    explicit SurfaceWatch(SurfaceMatch match, Events events = Events::Automatic);
    ~SurfaceWatch();
    SurfaceWatch(const SurfaceWatch&) = delete;
    SurfaceWatch(SurfaceWatch&&) = delete;
    SurfaceWatch& operator=(const SurfaceWatch&) = delete;
    SurfaceWatch& operator=(SurfaceWatch&&) = delete;

    /// Poll it for POLLIN, then take the changes. It stays the same and is the watch's own.
    [[nodiscard]] int descriptor() const noexcept;
    /// What has changed since the last time, in the order in which it did; the first time all that
    /// is there, by node. Never blocks. When events were lost because nobody took them, the list is
    /// made anew and compared. Where there are no descriptors or no memory to look at a device,
    /// what is known stays, and the list is made anew the next time. Throws HostFailure when the
    /// list cannot be made for another reason, or the first one at all.
    [[nodiscard]] std::vector<SurfaceChange> takeChanges();

    /// Automatic is what it turned out to be.
    [[nodiscard]] Events events() const noexcept { return events_; }

private:
    class Udev;
    struct Look;

    void enumerate(std::vector<SurfaceChange>& changes);
    void takeEvents(std::vector<SurfaceChange>& changes);
    static Look lookAt(udev_device* device);
    bool isSurface(const Look& look);
    void lookLater(int error);

    const SurfaceMatch match_;
    Events events_;
    std::unique_ptr<Udev> udev_;
    std::map<std::string, Surface, std::less<>> known_;  // by path in /sys
    // Ids, serial and interface of what was a surface; whether it was told that it is none any
    // more.
    std::map<std::string, bool, std::less<>> former_;
    bool mustEnumerate_ = true;
    bool hasEnumerated_ = false;
    bool isShort_ = false;  // of descriptors or memory, and that was told
};

/// All that match and are there now, by node. Throws HostFailure.
std::vector<Surface> findSurfaces(const SurfaceMatch& match);

}  // namespace VexaTouch::Host
