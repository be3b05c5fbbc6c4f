#include "Service/Identifier.h"
#include "Service/VexaTouchHIDService.h"

#include <vexa/plugin.h>

/// The one symbol that the plug-in exports; <vexa/plugin.h> is its manual.
extern "C" VEXA_API void* VexaTouchHIDServiceFactory(void* /*allocator*/,
                                                     vexa_identifier type) noexcept {
    using VexaTouch::Identifier;
    if (!vexa_abi_serves(VEXA_ABI_VERSION)) return nullptr;
    if (Identifier(type) != Identifier(VEXA_HID_SERVICE_PLUGIN_TYPE)) return nullptr;
    const auto service = VexaTouch::makeService<VexaTouch::VexaTouchHIDService>();
    if (!service) return nullptr;
    // The host's reference; ours goes with this scope.
    service.get()->retain();
    return service.get()->getPluginInterface();
}
