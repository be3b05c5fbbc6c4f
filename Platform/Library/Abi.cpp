#include <vexa/abi.h>

extern "C" {

uint32_t vexa_abi_version(void) noexcept {
    return VEXA_ABI_VERSION;
}

bool vexa_abi_serves(uint32_t built_for) noexcept {
    return built_for >> 16 == VEXA_ABI_MAJOR && (built_for & 0xFFFFu) <= VEXA_ABI_MINOR;
}

}  // extern "C"
