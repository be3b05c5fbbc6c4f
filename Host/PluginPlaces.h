#pragma once

#include <filesystem>
#include <optional>
#include <vector>

namespace VexaTouch::Host {

/// Where a host looks for its plug-in, the first place first.
struct PluginPlaces {
    std::vector<std::filesystem::path> files;
    /// The one place was named in VEXATOUCH_PLUGIN.
    bool overridden = false;

    /// Beside the program, then in the library folders of the prefix that the program stands in
    /// (<prefix>/lib, <prefix>/lib64, <prefix>/lib/<machine>); when `named` is there and not empty,
    /// that place and no other.
    static PluginPlaces of(const std::filesystem::path& program,
                           const std::optional<std::filesystem::path>& named);
    /// Those of the running program and its environment.
    static PluginPlaces ofThisProgram();

    /// The first place that holds a file. Throws HostFailure, with all places tried, when none
    /// does.
    [[nodiscard]] std::filesystem::path find() const;
};

}  // namespace VexaTouch::Host
