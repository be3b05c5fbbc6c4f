#pragma once

#include "Tools/Validate/CheckRun.h"

#include <chrono>
#include <span>
#include <string_view>

namespace VexaTouch::Tools {

/// One thing that a plug-in must do right.
struct PluginCheck {
    std::string_view name;
    std::string_view summary;    ///< one line, without a full stop
    std::chrono::seconds limit;  ///< far more than it takes: when it is over, the plug-in hangs
    void (*run)(CheckRun& run);
};

/// All checks in the order in which they run. The first is whether the plug-in can be loaded.
std::span<const PluginCheck> pluginChecks();
/// The check of that name, or null.
const PluginCheck* findPluginCheck(std::string_view name);

}  // namespace VexaTouch::Tools
