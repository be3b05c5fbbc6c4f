#include "Host/PluginLibrary.h"

#include "Host/HostFailure.h"
#include "Host/PluginPlaces.h"

#include <dlfcn.h>

#include <cstdint>
#include <string>

namespace VexaTouch::Host {
namespace {

std::string versionText(std::uint32_t version) {
    return std::to_string(version >> 16U) + "." + std::to_string(version & 0xFFFFU);
}

/// What dlopen() and dlsym() complain of, without the name of the file that they may put first.
std::string loaderFault(const std::string& file) {
    const char* fault = dlerror();
    std::string text = fault != nullptr ? fault : "unknown fault";
    if (text.starts_with(file + ": ")) {
        text.erase(0, file.size() + 2);
    }
    return text;
}

}  // namespace

void PluginLibrary::Close::operator()(void* library) const noexcept {
    dlclose(library);
}

void PluginLibrary::requirePlatform() {
    if (!vexa_abi_serves(VEXA_ABI_VERSION)) {
        throw HostFailure("libvexaplatform has ABI " + versionText(vexa_abi_version()) +
                          ", this program needs " + versionText(VEXA_ABI_VERSION));
    }
}

PluginLibrary::PluginLibrary(const std::filesystem::path& file)
    : file_(std::filesystem::absolute(file)) {
    requirePlatform();
    const std::string name = file_;
    library_.reset(dlopen(name.c_str(), RTLD_NOW | RTLD_LOCAL));
    if (!library_) {
        throw HostFailure("cannot load the plug-in " + name + ": " + loaderFault(name));
    }
    void* symbol = dlsym(library_.get(), VEXA_PLUGIN_FACTORY_NAME);
    if (symbol == nullptr) {
        throw HostFailure(name + " is no plug-in: it exports no " VEXA_PLUGIN_FACTORY_NAME);
    }
    factory_ = reinterpret_cast<vexa_plugin_factory>(symbol);
}

PluginLibrary PluginLibrary::loadDefault() {
    return PluginLibrary(PluginPlaces::ofThisProgram().find());
}

}  // namespace VexaTouch::Host
