#include "Tools/Validate/CheckRun.h"

#include "Tools/CommandTable.h"

#include <cstdlib>
#include <thread>

namespace VexaTouch::Tools {

std::string stepPrefix(std::string_view check) {
    return "vexatouch validate: " + std::string(check) + ": ";
}

void CheckRun::step(std::string_view what) const {
    std::string line = stepPrefix(check_);
    line += what;
    line += '\n';
    streams_.error << line << std::flush;
}

void CheckRun::warn(std::string_view what) {
    if (!warnings_.empty()) {
        warnings_ += "; ";
    }
    warnings_ += what;
}

void CheckRun::fail(std::string_view reason) const {
    print(CheckVerdict::Fail, std::string(reason));
    std::_Exit(kExitFailure);
}

void CheckRun::leave() const {
    print(verdict(), warnings_);
    std::_Exit(kExitSuccess);
}

int CheckRun::finish() const {
    print(verdict(), warnings_);
    return kExitSuccess;
}

void CheckRun::print(CheckVerdict verdict, const std::string& reason) const {
    const CheckResult result{.check = std::string(check_),
                             .verdict = verdict,
                             .reason = reason,
                             .seed = seed_,
                             .duration = std::chrono::steady_clock::now() - begin_};
    streams_.out << (json_ ? resultJson(result) : resultLine(result)) << '\n' << std::flush;
}

bool waitUntil(const std::function<bool()>& holds, std::chrono::milliseconds limit) {
    constexpr int kYields = 100;  // most of what is waited for is there after a few microseconds
    const auto end = std::chrono::steady_clock::now() + limit;
    for (int turn = 0; !holds(); ++turn) {
        if (turn < kYields) {
            std::this_thread::yield();
            continue;
        }
        if (std::chrono::steady_clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
    return true;
}

}  // namespace VexaTouch::Tools
