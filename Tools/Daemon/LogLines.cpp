#include "Tools/Daemon/LogLines.h"

#include <new>
#include <string>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

constexpr const char* kQueueLabel = "vexa-lines";

std::string droppedText(std::size_t dropped) {
    return dropped == 0 ? ""
                        : "vexatouch daemon: lines dropped because nobody read those before: " +
                              std::to_string(dropped) + '\n';
}

}  // namespace

LogLines::LogLines(std::ostream& to) : to_(to), queue_(kQueueLabel) {}

LogLines::~LogLines() {
    queue_.drain();
    to_ << droppedText(dropped_) << std::flush;
}

int LogLines::sync() {
    std::string line = str();
    str("");
    if (waiting_ >= kMostWaiting) {
        ++dropped_;
        return 0;
    }
    ++waiting_;
    try {
        queue_.submit([this, text = droppedText(dropped_) + std::move(line)]() noexcept {
            to_ << text << std::flush;
            --waiting_;
        });
        dropped_ = 0;
    } catch (const std::bad_alloc&) {
        --waiting_;
        ++dropped_;
    }
    return 0;
}

}  // namespace VexaTouch::Tools::Daemon
