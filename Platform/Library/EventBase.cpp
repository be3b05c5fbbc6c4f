#include "Platform/Library/EventBase.h"

#include "Platform/Library/FileDescriptor.h"

#include <event2/event.h>
#include <sys/eventfd.h>
#include <algorithm>
#include <array>
#include <cstddef>

namespace Vexa::Library {
namespace {

struct FreeConfig {
    void operator()(event_config* config) const noexcept { event_config_free(config); }
};

// Whether that many descriptors can still be opened.
template <std::size_t kCount>
bool canOpen() noexcept {
    std::array<FileDescriptor, kCount> opened;
    return std::ranges::all_of(opened, [](FileDescriptor& each) {
        each = FileDescriptor(::eventfd(0, EFD_CLOEXEC));
        return static_cast<bool>(each);
    });
}

}  // namespace

void FreeEventBase::operator()(event_base* base) const noexcept {
    event_base_free(base);
}

void FreeEvent::operator()(event* freed) const noexcept {
    event_free(freed);
}

EventBase makeEventBase() noexcept {
    const std::unique_ptr<event_config, FreeConfig> config(event_config_new());
    if (!config ||
        event_config_require_features(
            config.get(), EV_FEATURE_ET | EV_FEATURE_O1 | EV_FEATURE_EARLY_CLOSE) != 0 ||
        event_config_set_flag(config.get(), EVENT_BASE_FLAG_IGNORE_ENV) != 0 ||
        event_config_set_flag(config.get(), EVENT_BASE_FLAG_NOLOCK) != 0) {
        return nullptr;
    }
    // An epoll set and a pair of its own for signals. libevent ends the process when it gets the
    // set and not the pair.
    if (!canOpen<3>()) return nullptr;
    return EventBase(event_base_new_with_config(config.get()));
}

}  // namespace Vexa::Library
