#pragma once

#include <vexa/abi.h>
#include <array>
#include <cstdint>
#include <ostream>

namespace VexaTouch::Testing {

/// How many platform objects live in this process: values, events, queues, devices, run loops.
struct LiveObjects {
    std::array<std::int64_t, 5> counts{};

    static LiveObjects now() {
        LiveObjects live;
        for (std::size_t kind = 0; kind < live.counts.size(); ++kind) {
            live.counts.at(kind) = vexa_live_objects(static_cast<vexa_object_kind>(kind));
        }
        return live;
    }

    friend bool operator==(const LiveObjects&, const LiveObjects&) = default;
    friend std::ostream& operator<<(std::ostream& out, const LiveObjects& live) {
        return out << live.counts[VEXA_OBJECT_VALUE] << " values, "
                   << live.counts[VEXA_OBJECT_EVENT] << " events, "
                   << live.counts[VEXA_OBJECT_QUEUE] << " queues, "
                   << live.counts[VEXA_OBJECT_DEVICE] << " devices, "
                   << live.counts[VEXA_OBJECT_RUN_LOOP] << " run loops";
    }
};

}  // namespace VexaTouch::Testing
