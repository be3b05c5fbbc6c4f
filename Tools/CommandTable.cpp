#include "Tools/CommandTable.h"

#include "Tools/ConvertCommand.h"
#include "Tools/DevicesCommand.h"
#include "Tools/DiffCommand.h"
#include "Tools/GetCommand.h"
#include "Tools/InfoCommand.h"
#include "Tools/KeysCommand.h"
#include "Tools/LatencyCommand.h"
#include "Tools/ReplayCommand.h"
#include "Tools/RunCommand.h"
#include "Tools/SetCommand.h"
#include "Tools/ShowCommand.h"
#include "Tools/SynthCommand.h"
#include "Tools/ValidateCommand.h"

#include <algorithm>
#include <array>
#include <stdexcept>

namespace VexaTouch::Tools {
namespace {

// The order is that of the help text.
constexpr std::array kCommands = {
    &runCommand,     &devicesCommand,  &getCommand,    &setCommand,  &keysCommand,
    &latencyCommand, &validateCommand, &replayCommand, &infoCommand, &showCommand,
    &convertCommand, &synthCommand,    &diffCommand,
};

}  // namespace

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
