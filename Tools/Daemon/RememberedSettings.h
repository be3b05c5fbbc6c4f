#pragma once

#include "Platform/PropertyValue.h"
#include "Tools/Daemon/DeviceSource.h"

#include <cstddef>
#include <deque>
#include <map>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// Settings by the keys of the service.
using Settings = std::map<std::string, Vexa::PropertyValue>;

/// What was in force on surfaces that are gone, for when they come back.
///
/// A surface is the one from before if its ids, serial number and place are. At another place it
/// is known by its serial number, unless another surface that is known has the same one: some
/// makers give all their devices one number. Without a number the place is all there is. One
/// thread.
class RememberedSettings {
public:
    /// Surfaces that are gone; beyond that the oldest are forgotten.
    static constexpr std::size_t kMost = 64;

    struct Arrival {
        SurfaceIdentity before;  ///< what it was known as, its own identity when it is new
        Settings settings;
    };

    /// It is plugged in.
    Arrival arrive(const SurfaceIdentity& surface);
    /// It is plugged in no more.
    void leave(const SurfaceIdentity& surface, Settings settings);
    /// Others were in force after all on one that has left.
    void correct(const SurfaceIdentity& surface, Settings settings);

private:
    struct Record {
        SurfaceIdentity surface;
        Settings settings;
    };

    std::vector<SurfaceIdentity> present_;
    std::deque<Record> gone_;  // the oldest first; those that are back as well
};

}  // namespace VexaTouch::Tools::Daemon
