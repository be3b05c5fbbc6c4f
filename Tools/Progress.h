#pragma once

#include "Tools/Streams.h"

#include <cstdint>
#include <string>

namespace VexaTouch::Tools {

/// A line on the error stream that says how far a long work is: only on a terminal, only after a
/// while, gone when the work ends.
class Progress {
public:
    /// `total` is 0 when it is not known. The time is looked at on every `lookEvery`th update.
    Progress(Streams& streams, std::string label, std::uint64_t total, unsigned lookEvery = 1024);
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    /// Cheap enough to be called for every frame.
    void update(std::uint64_t done) {
        if (shown_ && --untilLook_ == 0) {
            look(done);
        }
    }

private:
    void look(std::uint64_t done);

    Streams& streams_;
    std::string label_;
    std::uint64_t total_;
    bool shown_;
    bool drawn_ = false;
    unsigned lookEvery_;
    unsigned untilLook_ = 1;
    std::uint64_t nextNs_;  // host time of the next look that may draw
};

}  // namespace VexaTouch::Tools
