#include "Tools/ValidateCommand.h"

#include "Platform/JsonWriter.h"
#include "Platform/Log.h"
#include "Tools/Failure.h"
#include "Tools/Validate/CheckResult.h"
#include "Tools/Validate/CheckRun.h"
#include "Tools/Validate/ChildProcess.h"
#include "Tools/Validate/PluginCheck.h"

#include <sys/prctl.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "PLUGIN", .help = "The plug-in, a shared object", .required = false},
}};

std::string joinedCheckNames(std::string_view separator) {
    std::string names;
    for (const PluginCheck& check : pluginChecks()) {
        names += names.empty() ? std::string_view() : separator;
        names += check.name;
    }
    return names;
}

const std::string& checkChoices() {
    static const std::string choices = joinedCheckNames(" ");
    return choices;
}

const std::array<OptionEntry, 6> kOptions = {{
    {.name = "--list", .help = "Say which checks there are and what each asks for"},
    {.name = "--only",
     .valueName = "NAME[,NAME]",
     .help = "Run these checks only (and first of all load the plug-in)",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = checkChoices()},
    {.name = "--seed",
     .valueName = "N",
     .help = "Seed of all that is random, as an earlier run has printed it"},
    {.name = "--time-limit",
     .valueName = "SECONDS",
     .help = "Time for each check instead of its own, which --list tells"},
    {.name = "--here",
     .help = "Run the one check that --only names in this process and without a time limit, for a "
             "debugger; what it does is written to standard error"},
    {.name = "--json", .help = "Write one JSON object a line"},
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "every check passed, perhaps with a warning"},
    {kExitFailure, "a check failed, or the plug-in cannot be loaded"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch validate libVexaTouchHIDService.so", "Runs every check"},
    {"vexatouch validate ./sample.so --only random-reports --seed 42",
     "Repeats one check with the seed that made it fail"},
    {"gdb --args vexatouch validate ./sample.so --only unplug --here",
     "Looks into one check with a debugger"},
}};

constexpr std::string_view kDescription =
    "Checks that a plug-in keeps to the interface between host and plug-in: loads it, gives it a "
    "scripted device and drives it through its tables. Each check runs in a process of its own "
    "with a time limit, so a plug-in that crashes or hangs fails that check only. A line a check "
    "goes to standard output: the result, the check, the time it took, and what was wrong. A "
    "warning is no failure.\n\nWhat a failing plug-in writes to standard error is shown there.";

std::uint64_t numberFrom(const std::string& text, std::string_view option, std::uint64_t lowest,
                         std::uint64_t highest) {
    std::uint64_t value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc{} || end != text.data() + text.size() || value < lowest ||
        value > highest) {
        throw UsageError(std::string(option) + ": expected a number from " +
                         std::to_string(lowest) + " to " + std::to_string(highest) + ", found \"" +
                         text + "\"");
    }
    return value;
}

/// What is asked for on the command line.
struct Validation {
    std::string plugin;
    std::vector<const PluginCheck*> checks;  ///< in the order of the table
    std::uint64_t seed = 0;
    std::optional<std::chrono::seconds> limit;
    bool json = false;
};

std::vector<const PluginCheck*> chosenChecks(const Arguments& arguments) {
    std::vector<std::string_view> names;
    for (std::string_view list : arguments.values("--only")) {
        for (std::size_t end = 0; end != std::string_view::npos;) {
            end = list.find(',');
            const std::string_view name = list.substr(0, end);
            if (findPluginCheck(name) == nullptr) {
                throw UsageError("--only: there is no check '" + std::string(name) + "', only " +
                                 joinedCheckNames(", "));
            }
            names.push_back(name);
            list.remove_prefix(end == std::string_view::npos ? 0 : end + 1);
        }
    }
    std::vector<const PluginCheck*> checks;
    for (const PluginCheck& check : pluginChecks()) {
        if (names.empty() || std::ranges::find(names, check.name) != names.end()) {
            checks.push_back(&check);
        }
    }
    return checks;
}

std::uint64_t freshSeed() {
    // Short enough to be typed again.
    return std::random_device()();
}

Validation readArguments(const Arguments& arguments) {
    constexpr std::uint64_t kLongestSeconds = 86'400;
    Validation asked;
    asked.checks = chosenChecks(arguments);
    asked.seed = arguments.given("--seed")
                     ? numberFrom(arguments.value("--seed"), "--seed", 0, UINT64_MAX)
                     : freshSeed();
    if (arguments.given("--time-limit")) {
        asked.limit = std::chrono::seconds(
            numberFrom(arguments.value("--time-limit"), "--time-limit", 1, kLongestSeconds));
    }
    asked.json = arguments.given("--json");
    if (!arguments.given("PLUGIN")) {
        throw UsageError("PLUGIN is required");
    }
    asked.plugin = arguments.value("PLUGIN");
    if (asked.plugin.find('/') == std::string::npos) {
        // A name without a folder would be looked for in the system's library folders.
        asked.plugin.insert(0, "./");
    }
    return asked;
}

int listChecks(bool json, Streams& streams) {
    for (const PluginCheck& check : pluginChecks()) {
        if (!json) {
            std::string name(check.name);
            name.resize(std::max<std::size_t>(name.size(), 18), ' ');
            streams.out << name << "  " << check.limit.count() << " s  " << check.summary << '\n';
            continue;
        }
        std::string text;
        Vexa::JsonWriter writer(text, Vexa::JsonWriter::Style::Compact);
        writer.beginObject();
        writer.key("check");
        writer.string(check.name);
        writer.key("summary");
        writer.string(check.summary);
        writer.key("time_limit_s");
        writer.number(std::int64_t{check.limit.count()});
        writer.endObject();
        streams.out << text << '\n';
    }
    return kExitSuccess;
}

/// One check in this process, started by hand or by `runApart` in another.
int runHere(const Validation& asked, Streams& streams) {
    if (asked.checks.size() != 1) {
        throw UsageError("--here goes with --only and one check");
    }
    // Whoever waits for this process may be killed; a plug-in that hangs is not to stay behind.
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (std::getenv("VEXATOUCH_LOG") == nullptr) {
        // Thousands of odd reports would each be told of.
        for (const auto category : {Vexa::LogCategory::HIDService, Vexa::LogCategory::Pipeline,
                                    Vexa::LogCategory::Recording, Vexa::LogCategory::Algs}) {
            Vexa::Log::setLevel(category, Vexa::LogLevel::Off);
        }
    }
    const PluginCheck& check = *asked.checks.front();
    CheckRun run(check.name, asked.plugin, asked.seed, asked.json, streams);
    check.run(run);
    return run.finish();
}

std::string signalName(int signal) {
    const char* name = sigabbrev_np(signal);
    return name == nullptr ? "signal " + std::to_string(signal) : "SIG" + std::string(name);
}

/// The last of the lines that begin with this, without it.
std::string_view lastLine(std::string_view text, std::string_view prefix) {
    const std::size_t found = text.rfind(prefix);
    if (found == std::string_view::npos) {
        return {};
    }
    text.remove_prefix(found + prefix.size());
    return text.substr(0, text.find('\n'));
}

/// What a sanitizer says it ended the process for, or nothing.
std::string_view sanitizerSummary(std::string_view error) {
    const std::string_view line = lastLine(error, "SUMMARY: ");
    return line.find("Sanitizer: ") == std::string_view::npos ? std::string_view() : line;
}

CheckResult judge(const PluginCheck& check, const ProcessEnd& end, std::chrono::seconds limit,
                  std::uint64_t seed) {
    std::optional<CheckResult> found = findResult(end.out, check.name);
    CheckResult result{.check = std::string(check.name),
                       .verdict = CheckVerdict::Fail,
                       .reason = {},
                       .seed = seed,
                       .duration = end.duration};
    const bool clean = end.kind == ProcessEnd::Kind::Exited && end.code == kExitSuccess;
    if (found && (clean || found->verdict == CheckVerdict::Fail)) {
        result.verdict = found->verdict;
        result.reason = found->reason;
        return result;
    }
    if (const std::string_view summary = sanitizerSummary(end.error); !summary.empty()) {
        result.reason = "ended by a sanitizer: " + std::string(summary);
    } else if (end.kind == ProcessEnd::Kind::TimedOut) {
        result.reason = "hangs: not done after " + std::to_string(limit.count()) + " s";
    } else if (end.kind == ProcessEnd::Kind::Signalled) {
        result.reason = "crashes: " + signalName(end.code);
    } else {
        result.reason = "ends the process with exit code " + std::to_string(end.code);
    }
    if (found) {
        result.reason += ", after the check was done";
    } else if (const std::string_view step = lastLine(end.error, stepPrefix(check.name));
               !step.empty()) {
        result.reason += ", while " + std::string(step);
    }
    return result;
}

/// What the plug-in itself wrote, and not the steps.
void showErrors(const PluginCheck& check, const std::string& error, Streams& streams) {
    constexpr std::size_t kLinesShown = 40;
    const std::string prefix = stepPrefix(check.name);
    std::vector<std::string_view> lines;
    for (std::string_view rest = error; !rest.empty();) {
        const std::size_t end = rest.find('\n');
        const std::string_view line = rest.substr(0, end);
        if (!line.empty() && !line.starts_with(prefix)) {
            lines.push_back(line);
        }
        rest.remove_prefix(end == std::string_view::npos ? rest.size() : end + 1);
    }
    const std::size_t first = lines.size() > kLinesShown ? lines.size() - kLinesShown : 0;
    for (std::size_t index = first; index < lines.size(); ++index) {
        streams.error << check.name << ": " << lines[index] << '\n';
    }
}

/// One check in a process of its own.
CheckResult runApart(const PluginCheck& check, const Validation& asked, Streams& streams) {
    const std::vector<std::string> arguments = {"validate",
                                                "--here",
                                                "--json",
                                                "--seed",
                                                std::to_string(asked.seed),
                                                "--only",
                                                std::string(check.name),
                                                "--",
                                                asked.plugin};
    const std::chrono::seconds limit = asked.limit.value_or(check.limit);
    const ProcessEnd end = runSelf(arguments, limit);
    CheckResult result = judge(check, end, limit, asked.seed);
    if (result.verdict == CheckVerdict::Fail) {
        showErrors(check, end.error, streams);
    }
    return result;
}

int runAll(const Validation& asked, Streams& streams) {
    std::size_t warnings = 0;
    std::size_t failures = 0;
    std::size_t done = 0;
    const auto run = [&](const PluginCheck& check, bool shown) {
        const CheckResult result = runApart(check, asked, streams);
        const bool failed = result.verdict == CheckVerdict::Fail;
        if (shown || failed) {
            ++done;
            warnings += result.verdict == CheckVerdict::Warning ? 1 : 0;
            failures += failed ? 1 : 0;
            streams.out << (asked.json ? resultJson(result) : resultLine(result)) << '\n'
                        << std::flush;
        }
        return !failed;
    };
    const PluginCheck& first = pluginChecks().front();
    const bool firstAsked = asked.checks.front() == &first;
    const bool loads = run(first, firstAsked);
    if (loads) {
        for (const PluginCheck* check : asked.checks) {
            if (check != &first) {
                run(*check, true);
            }
        }
    } else {
        streams.error << asked.plugin << ": not loaded, so nothing else was checked\n";
    }
    streams.error << done << (done == 1 ? " check: " : " checks: ") << done - warnings - failures
                  << " passed, " << warnings << " with a warning, " << failures
                  << " failed (--seed " << asked.seed << ")\n";
    return failures == 0 ? kExitSuccess : kExitFailure;
}

int runValidate(const Arguments& arguments, Streams& streams) {
    if (arguments.given("--list")) {
        for (const std::string_view other :
             {"PLUGIN", "--only", "--seed", "--time-limit", "--here"}) {
            if (arguments.given(other)) {
                throw UsageError("--list lists all checks, " + std::string(other) +
                                 " has no place there");
            }
        }
        return listChecks(arguments.given("--json"), streams);
    }
    const Validation asked = readArguments(arguments);
    return arguments.given("--here") ? runHere(asked, streams) : runAll(asked, streams);
}

}  // namespace

const Command validateCommand = {
    .name = "validate",
    .summary = "Check that a plug-in keeps to its interface",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runValidate,
};

}  // namespace VexaTouch::Tools
