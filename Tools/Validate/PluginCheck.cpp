#include "Tools/Validate/PluginCheck.h"

#include "Tools/Validate/InterfaceChecks.h"
#include "Tools/Validate/LifecycleChecks.h"
#include "Tools/Validate/PropertyChecks.h"
#include "Tools/Validate/ReportChecks.h"

#include <algorithm>
#include <array>

namespace VexaTouch::Tools {
namespace {

using std::chrono::seconds;

constexpr seconds kShort{20};
constexpr seconds kLong{60};

constexpr std::array kChecks = {
    PluginCheck{"load", "is loaded soon, has a factory, and exports nothing else", kShort,
                checkLoad},
    PluginCheck{"factory",
                "answers the type of HID services with a new service each time, and no other "
                "identifier, however near",
                kShort, checkFactory},
    PluginCheck{"query-interface",
                "gives both interfaces from either reference; refuses all others, the base "
                "interface too, and leaves the out pointer alone",
                kShort, checkQueryInterface},
    PluginCheck{"slots", "fills every slot, has version 1 revision 0, and never changes its tables",
                kShort, checkSlots},
    PluginCheck{"reference-counts",
                "counts references, and destroys the service with the last one and no sooner",
                kShort, checkReferenceCounts},
    PluginCheck{"reference-threads", "counts references on several threads", kLong,
                checkReferenceThreads},
    PluginCheck{"argument-order",
                "takes the properties before the service handle, and just this handle's device",
                kShort, checkArgumentOrder},
    PluginCheck{"unknown-service", "fails to start without a device", kShort, checkUnknownService},
    PluginCheck{"property-values", "passes values of every type to the device and back as they are",
                kShort, checkPropertyValues},
    PluginCheck{"property-threads", "reads and writes properties on several threads", kLong,
                checkPropertyThreads},
    PluginCheck{"unknown-keys", "has no value for keys that the device does not know", kShort,
                checkUnknownKeys},
    PluginCheck{"null-keys", "refuses NULL and whatever is no string as a key", kShort,
                checkNullKeys},
    PluginCheck{"event-queries", "survives queries for events and output events", kShort,
                checkEventQueries},
    PluginCheck{"before-start", "survives every call before Start", kShort, checkBeforeStart},
    PluginCheck{"repeated-calls", "survives calls that come twice or without their opposite",
                kShort, checkRepeatedCalls},
    PluginCheck{"second-schedule", "survives being scheduled twice", kShort, checkSecondSchedule},
    PluginCheck{"report-lengths", "takes reports of every length from 0 to 512 bytes, and longer",
                kLong, checkReportLengths},
    PluginCheck{"random-reports", "takes reports of random bytes", kLong, checkRandomReports},
    PluginCheck{"events",
                "delivers events on the queue with target, refcon, sender and time stamp as "
                "promised",
                kShort, checkEvents},
    PluginCheck{"late-callback", "keeps a callback that is set late for the next scheduling",
                kShort, checkLateCallback},
    PluginCheck{"unschedule", "returns from unscheduling only when no report is read any more",
                kShort, checkUnschedule},
    PluginCheck{"device-failures", "tells of a device that fails, and survives it", kShort,
                checkDeviceFailures},
    PluginCheck{"unplug", "survives its device being unplugged", kShort, checkUnplug},
    PluginCheck{"destroy", "gives everything back when it is destroyed in any state", kShort,
                checkDestroy},
    PluginCheck{"destroy-scheduled", "survives its last release while it is scheduled", kShort,
                checkDestroyScheduled},
    PluginCheck{"cycles", "starts and stops a thousand times", kLong, checkCycles},
    PluginCheck{"leaks", "leaves no object, descriptor or thread behind", kShort, checkLeaks},
    PluginCheck{"memory", "loses no memory", kLong, checkMemory},
    PluginCheck{"unload", "can be unloaded once its services are gone", kShort, checkUnload},
};

}  // namespace

std::span<const PluginCheck> pluginChecks() {
    return kChecks;
}

const PluginCheck* findPluginCheck(std::string_view name) {
    const auto found = std::ranges::find(kChecks, name, &PluginCheck::name);
    return found == kChecks.end() ? nullptr : &*found;
}

}  // namespace VexaTouch::Tools
