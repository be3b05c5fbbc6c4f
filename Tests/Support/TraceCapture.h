#pragma once

#include "Platform/TraceListener.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <ios>
#include <mutex>
#include <ostream>
#include <vector>

namespace VexaTouch::Testing {

/// A trace point as it was passed.
struct TracePoint {
    std::uint32_t code = 0;
    std::array<std::uint64_t, 4> arguments{};

    friend bool operator==(const TracePoint&, const TracePoint&) = default;
    friend std::ostream& operator<<(std::ostream& out, const TracePoint& point) {
        out << std::hex << point.code;
        for (const std::uint64_t argument : point.arguments) out << ' ' << argument;
        return out << std::dec;
    }
};

/// Keeps the trace points of the process.
class TraceCapture {
public:
    /// What was passed since the last call.
    [[nodiscard]] std::vector<TracePoint> take() {
        const std::lock_guard lock(mutex_);
        std::vector<TracePoint> points;
        points.swap(points_);
        return points;
    }

private:
    std::mutex mutex_;
    std::vector<TracePoint> points_;
    Vexa::TraceListener listener_{
        [this](std::uint32_t code, Vexa::TraceListener::Arguments arguments) {
            TracePoint point{code, {}};
            std::copy(arguments.begin(), arguments.end(), point.arguments.begin());
            const std::lock_guard lock(mutex_);
            points_.push_back(point);
        }};
};

}  // namespace VexaTouch::Testing
