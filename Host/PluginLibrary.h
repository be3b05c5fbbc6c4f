#pragma once

#include <vexa/plugin.h>
#include <filesystem>
#include <memory>

namespace VexaTouch::Host {

/// A plug-in's shared object, loaded as long as this lives, and its factory.
///
/// It must outlive everything that was made by the factory. Loading and unloading is for one thread
/// at a time.
class PluginLibrary {
public:
    /// Loads the file. Throws HostFailure when libvexaplatform does not serve this program, or the
    /// file cannot be loaded or exports no factory.
    explicit PluginLibrary(const std::filesystem::path& file);
    /// Throws HostFailure when libvexaplatform does not serve this program.
    static void requirePlatform();
    /// The plug-in at its usual place (PluginPlaces). Throws HostFailure.
    static PluginLibrary loadDefault();

    [[nodiscard]] const std::filesystem::path& file() const noexcept { return file_; }
    [[nodiscard]] vexa_plugin_factory factory() const noexcept { return factory_; }

private:
    struct Close {
        void operator()(void* library) const noexcept;
    };

    std::filesystem::path file_;
    std::unique_ptr<void, Close> library_;
    vexa_plugin_factory factory_ = nullptr;
};

}  // namespace VexaTouch::Host
