#pragma once

#include "Algorithm/Algs.h"
#include "Tools/Replay.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// The state after a played frame as a flat list of fields, to be compared with another's: what the
/// frame was, every field of the algorithm's state, and the frame's events.
class StateSnapshot {
public:
    /// Fields of every snapshot, the events not counted.
    static std::size_t fieldCount();
    /// The name of a field: "type", "pixels[A]._value", "virtual[ABE]._progress",
    /// "hand._isTouching", "stats.numTaps", ...
    static const std::string& fieldName(std::size_t field);

    void take(const PlayedFrame& played, const Algs& algs);

    /// Calls visit(field) for each field in which the two differ. Floats differ when their bits do,
    /// but every not-a-number equals every other.
    template <typename Visit>
    void forEachDifference(const StateSnapshot& other, Visit&& visit) const {
        if (values_ == other.values_) {
            return;
        }
        for (std::size_t field = 0; field < values_.size(); ++field) {
            if (values_[field] != other.values_[field]) {
                visit(field);
            }
        }
    }

    /// The value of a field as JSON text.
    [[nodiscard]] std::string fieldText(std::size_t field) const;

private:
    std::vector<std::uint64_t> values_;
};

}  // namespace VexaTouch::Tools
