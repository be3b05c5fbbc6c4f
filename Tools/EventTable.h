#pragma once

#include "Tools/EventRecord.h"

#include <cstdint>
#include <string>

namespace VexaTouch::Tools {

/// Events as aligned columns for a person, a line each as they come.
class EventTable {
public:
    /// `startNs` is the recorded time that host times are counted from.
    explicit EventTable(std::uint64_t startNs) noexcept : startNs_(startNs) {}

    /// The names of the columns, with line feed.
    [[nodiscard]] static std::string heading();
    [[nodiscard]] std::string line(const EventRecord& event) const;

private:
    std::uint64_t startNs_;
};

}  // namespace VexaTouch::Tools
