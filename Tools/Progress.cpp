#include "Tools/Progress.h"

#include <algorithm>

namespace VexaTouch::Tools {
namespace {

constexpr std::chrono::milliseconds kPatience{500};
constexpr std::chrono::milliseconds kInterval{100};
constexpr std::string_view kEraseLine = "\r\x1b[K";

}  // namespace

Progress::Progress(Streams& streams, std::string label, std::uint64_t total, unsigned lookEvery)
    : streams_(streams),
      label_(std::move(label)),
      total_(total),
      shown_(streams.errorIsTerminal),
      lookEvery_(lookEvery),
      next_(std::chrono::steady_clock::now() + kPatience) {}

Progress::~Progress() {
    if (drawn_) {
        streams_.error << kEraseLine << std::flush;
    }
}

void Progress::look(std::uint64_t done) {
    untilLook_ = lookEvery_;
    const auto now = std::chrono::steady_clock::now();
    if (now < next_) {
        return;
    }
    next_ = now + kInterval;
    drawn_ = true;
    streams_.error << kEraseLine << label_;
    if (total_ > 0) {
        streams_.error << ' ' << std::min<std::uint64_t>(100, done * 100 / total_) << " %";
    }
    streams_.error << std::flush;
}

}  // namespace VexaTouch::Tools
