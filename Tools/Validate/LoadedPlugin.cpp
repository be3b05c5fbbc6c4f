#include "Tools/Validate/LoadedPlugin.h"

#include "Host/HostFailure.h"
#include "Host/PluginLibrary.h"

#include <dlfcn.h>

namespace VexaTouch::Tools {
namespace {

std::string loaderError() {
    const char* text = dlerror();
    return text == nullptr ? "the loader does not say why" : text;
}

/// A plug-in is not to blame for what it does with a platform that is not the one it was promised.
void requirePlatform(CheckRun& run) {
    try {
        Host::PluginLibrary::requirePlatform();
    } catch (const Host::HostFailure& failure) {
        run.fail(std::string("cannot be checked: ") + failure.what());
    }
}

}  // namespace

LoadedPlugin::LoadedPlugin(CheckRun& run) : run_(run) {
    requirePlatform(run);
    run.step("loading " + run.plugin());
    // Every symbol now: what is missing shows here and not in the middle of a call.
    library_ = dlopen(run.plugin().c_str(), RTLD_NOW | RTLD_LOCAL);
    if (library_ == nullptr) {
        run.fail("cannot be loaded: " + loaderError());
    }
    factory_ = reinterpret_cast<vexa_plugin_factory>(dlsym(library_, VEXA_PLUGIN_FACTORY_NAME));
    run.require(factory_ != nullptr, "exports no " VEXA_PLUGIN_FACTORY_NAME);
}

vexa_plugin_interface** LoadedPlugin::make(vexa_identifier type, void* allocator) const {
    return static_cast<vexa_plugin_interface**>(factory_(allocator, type));
}

void LoadedPlugin::unload() {
    run_.step("unloading the plug-in");
    if (dlclose(library_) != 0) {
        run_.fail("cannot be unloaded: " + loaderError());
    }
    library_ = nullptr;
    factory_ = nullptr;
}

}  // namespace VexaTouch::Tools
