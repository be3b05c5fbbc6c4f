#include "Tools/Daemon/RememberedSettings.h"

#include <algorithm>
#include <utility>

namespace VexaTouch::Tools::Daemon {

RememberedSettings::Arrival RememberedSettings::arrive(const SurfaceIdentity& surface) {
    const auto isOfNumber = [&](const SurfaceIdentity& other) {
        return other.hasNumberOf(surface);
    };
    auto found = std::ranges::find(gone_, surface, &Record::surface);
    if (found == gone_.end() && std::ranges::none_of(present_, isOfNumber) &&
        std::ranges::count_if(gone_, isOfNumber, &Record::surface) == 1) {
        found = std::ranges::find_if(gone_, isOfNumber, &Record::surface);
    }
    present_.push_back(surface);
    if (found == gone_.end()) {
        return {.before = surface, .settings = {}};
    }
    // From now on it is known at this place.
    return {.before = std::exchange(found->surface, surface), .settings = found->settings};
}

void RememberedSettings::leave(const SurfaceIdentity& surface, Settings settings) {
    if (const auto found = std::ranges::find(present_, surface); found != present_.end()) {
        present_.erase(found);
    }
    correct(surface, std::move(settings));
}

void RememberedSettings::correct(const SurfaceIdentity& surface, Settings settings) {
    std::erase_if(gone_, [&](const Record& record) { return record.surface == surface; });
    const auto isAnother = [&](const SurfaceIdentity& other) {
        return other != surface && other.hasNumberOf(surface);
    };
    // One without settings must not be taken for the other one with its number.
    const bool isOneOfSeveral = std::ranges::any_of(present_, isAnother) ||
                                std::ranges::any_of(gone_, isAnother, &Record::surface);
    if (settings.empty() && !isOneOfSeveral) {
        return;
    }
    gone_.push_back({.surface = surface, .settings = std::move(settings)});
    if (gone_.size() > kMost) {
        gone_.pop_front();
    }
}

}  // namespace VexaTouch::Tools::Daemon
