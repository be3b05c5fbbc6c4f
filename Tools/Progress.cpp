#include "Tools/Progress.h"

#include "Shared/Util.h"

#include <algorithm>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::uint64_t kPatienceNs = 500'000'000;
constexpr std::uint64_t kIntervalNs = 100'000'000;
constexpr std::string_view kEraseLine = "\r\x1b[K";

std::uint64_t nowNs(const Streams& streams) {
    return Util::nanosecondsFromMachTime(streams.clock.now());
}

}  // namespace

Progress::Progress(Streams& streams, std::string label, std::uint64_t total, unsigned lookEvery)
    : streams_(streams),
      label_(std::move(label)),
      total_(total),
      shown_(streams.errorIsTerminal),
      lookEvery_(lookEvery),
      nextNs_(nowNs(streams) + kPatienceNs) {}

Progress::~Progress() {
    if (drawn_) {
        streams_.error << kEraseLine << std::flush;
    }
}

void Progress::look(std::uint64_t done) {
    untilLook_ = lookEvery_;
    const std::uint64_t now = nowNs(streams_);
    if (now < nextNs_) {
        return;
    }
    nextNs_ = now + kIntervalNs;
    drawn_ = true;
    streams_.error << kEraseLine << label_;
    if (total_ > 0) {
        streams_.error << ' ' << std::min<std::uint64_t>(100, done * 100 / total_) << " %";
    }
    streams_.error << std::flush;
}

}  // namespace VexaTouch::Tools
