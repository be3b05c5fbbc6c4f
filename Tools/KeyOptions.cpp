#include "Tools/KeyOptions.h"

#include "Host/HostFailure.h"
#include "Host/VirtualKeyboard.h"
#include "Tools/Failure.h"

#include <cstdlib>
#include <stdexcept>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr const char* kNodeVariable = "VEXATOUCH_UINPUT";

}  // namespace

Host::KeyMap parseKeyMap(std::span<const std::string> texts) {
    Host::KeyMap map;
    for (const std::string& text : texts) {
        try {
            map.assign(text);
        } catch (const std::invalid_argument& error) {
            throw UsageError(std::string(kKeyOption.name) + ' ' + text + ": " + error.what());
        }
    }
    return map;
}

std::unique_ptr<Host::SharedKeyboard> makeKeyboard(const Host::KeyMap& map,
                                                   std::string_view command, Streams& streams) {
    const char* named = std::getenv(kNodeVariable);
    // An empty variable names nothing.
    const bool isNamed = named != nullptr && *named != '\0';
    const std::string node = isNamed ? named : Host::VirtualKeyboard::kNode;
    streams.error << "vexatouch " << command << ": ";
    try {
        auto keyboard = std::make_unique<Host::VirtualKeyboard>(map.keys(), node);
        const std::string eventNode = keyboard->eventNode();
        streams.error << "keys are sent by \"" << Host::VirtualKeyboard::kName << '"'
                      << (eventNode.empty() ? "" : ", " + eventNode) << std::endl;
        return std::make_unique<Host::SharedKeyboard>(std::move(keyboard));
    } catch (const Host::HostFailure& failure) {
        streams.error << failure.what() << "; going on without keys" << std::endl;
        return nullptr;
    }
}

}  // namespace VexaTouch::Tools
