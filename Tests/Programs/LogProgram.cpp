// A process of its own for tests of the log: does what its arguments say.
#include "Platform/Log.h"

#include <sched.h>
#include <sys/wait.h>
#include <unistd.h>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

namespace {

using Vexa::Log;
using Vexa::LogCategory;
using Vexa::LogLevel;

/// The level of each category, a line each.
void printLevels() {
    for (int i = 0; i < Vexa::kLogCategoryCount; ++i) {
        const auto category = static_cast<LogCategory>(i);
        std::puts((std::string(logCategoryName(category)) + "=" +
                   std::string(logLevelName(Log::level(category))))
                      .c_str());
    }
}

/// Logs numbered messages on a thread that must not block, and leaves at once.
void logWithoutBlocking(int count, LogLevel level = LogLevel::Error) {
    std::thread([count, level] {
        const Vexa::LogWithoutBlocking here;
        for (int i = 0; i < count; ++i) {
            Log(LogCategory::HIDService).write(level, "message " + std::to_string(i));
        }
    }).join();
}

/// The same in a forked process, after the first one has logged.
int logInForkedProcess() {
    logWithoutBlocking(1);
    Log::flush();
    const pid_t child = fork();
    if (child == 0) {
        logWithoutBlocking(3);
        std::exit(EXIT_SUCCESS);
    }
    int status = EXIT_FAILURE;
    waitpid(child, &status, 0);
    return status;
}

/// The scheduling policy of the log's own thread, started by a thread with another policy.
void printScheduling() {
    std::thread([] {
        const sched_param parameter{};
        if (sched_setscheduler(0, SCHED_BATCH, &parameter) != 0) std::puts("not changed");
        const Vexa::LogWithoutBlocking here;
    }).join();
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        std::string name;
        std::getline(std::ifstream(task.path() / "comm"), name);
        if (name != "vexa-log") continue;
        const int policy = sched_getscheduler(std::stoi(task.path().filename()));
        std::puts(policy == SCHED_OTHER ? "ordinary" : "inherited");
    }
}

int usage() {
    std::fputs(
        "usage: LogProgram levels | write CATEGORY LEVEL TEXT | unblocked LEVEL COUNT | "
        "forked | scheduling\n",
        stderr);
    return EXIT_FAILURE;
}

}  // namespace

int main(int count, char** values) {
    const std::vector<std::string_view> arguments(values + 1, values + count);
    if (arguments.size() == 1 && arguments[0] == "levels") {
        printLevels();
    } else if (arguments.size() == 4 && arguments[0] == "write") {
        const auto category = Vexa::logCategoryFromName(arguments[1]);
        const auto level = Vexa::logLevelFromName(arguments[2]);
        if (!category || !level) return usage();
        Log(*category).write(*level, arguments[3]);
    } else if (arguments.size() == 3 && arguments[0] == "unblocked") {
        const auto level = Vexa::logLevelFromName(arguments[1]);
        if (!level) return usage();
        logWithoutBlocking(std::atoi(values[3]), *level);
    } else if (arguments.size() == 1 && arguments[0] == "forked") {
        return logInForkedProcess();
    } else if (arguments.size() == 1 && arguments[0] == "scheduling") {
        printScheduling();
    } else {
        return usage();
    }
    return EXIT_SUCCESS;
}
