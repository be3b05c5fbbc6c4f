#pragma once

#include "Tools/Validate/CheckRun.h"

#include <vexa/plugin.h>
#include <string>

namespace VexaTouch::Tools {

/// The plug-in as the system's loader gives it, mapped until it is unloaded or the process ends.
class LoadedPlugin {
public:
    /// Fails the check when libvexaplatform does not serve this program, and when the plug-in
    /// cannot be loaded or has no factory.
    explicit LoadedPlugin(CheckRun& run);

    /// Calls the factory.
    [[nodiscard]] vexa_plugin_interface** make(vexa_identifier type = VEXA_HID_SERVICE_PLUGIN_TYPE,
                                               void* allocator = nullptr) const;

    /// Everything that it made has been given back.
    void unload();

private:
    CheckRun& run_;
    void* library_ = nullptr;
    vexa_plugin_factory factory_ = nullptr;
};

}  // namespace VexaTouch::Tools
