#include "Tools/CommandTable.h"

#include "Tools/DiffCommand.h"
#include "Tools/ReplayCommand.h"

#include <algorithm>
#include <array>
#include <stdexcept>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<ExitCodeEntry, 3> kUsualExitCodes = {{
    {kExitSuccess, "done"},
    {kExitFailure, "failed; one line on standard error says with what and why"},
    {kExitUsage, "the command line is wrong"},
}};

// The order is that of the help text.
constexpr std::array kCommands = {
    &replayCommand,
    &diffCommand,
};

}  // namespace

constinit const std::span<const ExitCodeEntry> usualExitCodes = kUsualExitCodes;

std::span<const Command* const> commandTable() {
    return kCommands;
}

const Command* findCommand(std::string_view name) {
    const auto found =
        std::ranges::find(kCommands, name, [](const Command* command) { return command->name; });
    return found == kCommands.end() ? nullptr : *found;
}

const Arguments::Entry& Arguments::entry(std::string_view name) const {
    const auto found = entries_.find(name);
    if (found == entries_.end()) {
        throw std::logic_error("no such argument in the command table: " + std::string(name));
    }
    return found->second;
}

bool Arguments::given(std::string_view name) const {
    return entry(name).given;
}

std::string Arguments::value(std::string_view name) const {
    const Entry& found = entry(name);
    return found.values.empty() ? found.defaultValue : found.values.back();
}

const std::vector<std::string>& Arguments::values(std::string_view name) const {
    return entry(name).values;
}

}  // namespace VexaTouch::Tools
