#include "Tools/KeysCommand.h"

#include "Host/KeyMap.h"
#include "Host/KeyName.h"
#include "Platform/Json.h"
#include "Tools/KeyOptions.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 2> kOptions = {{
    kKeyOption,
    {.name = "--json",
     .help = "Print one JSON array, an object with gesture, region, key and code for each gesture; "
             "key and code are null where no key is sent"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch keys", "Prints what each gesture sends"},
    {"vexatouch keys --key tap:1=KEY_NEXTSONG --key hold:1=none",
     "Checks a mapping before it is used"},
    {"vexatouch keys --json | jq -r '.[].key'", "Lists the keys for a program"},
}};

constexpr std::string_view kDescription =
    "Prints the key that each gesture sends, as run --keys sends it: the default keys, and what "
    "--key makes of them. Sends nothing and needs no device.\n"
    "\n"
    "A tap presses its key and releases it. A hold keeps its key down until it ends or moves to "
    "another region, whose key then is down; the kernel repeats what is down as it does for any "
    "keyboard. Region 1 is play, 2 volume down, 3 volume up.";

std::string_view nameOf(const Host::KeyMap::Entry& entry) {
    return entry.key ? Host::keyName(*entry.key) : "none";
}

std::string_view effectOf(const Host::KeyMap::Entry& entry) {
    if (!entry.key) {
        return "nothing";
    }
    return entry.gesture == Host::KeyGesture::Tap ? "pressed and released"
                                                  : "down as long as the hold";
}

void printTable(const Host::KeyMap& map, Streams& streams) {
    constexpr std::string_view kKeyHeading = "key";
    std::size_t width = kKeyHeading.size();
    for (const Host::KeyMap::Entry& entry : map.entries()) {
        width = std::max(width, nameOf(entry).size());
    }
    const auto line = [&](std::string_view trigger, std::string_view key, std::string_view effect) {
        constexpr std::size_t kTriggerWidth = 7;
        std::string text(trigger);
        text.resize(kTriggerWidth + 2, ' ');
        text += key;
        text.resize(kTriggerWidth + 2 + width + 2, ' ');
        text += effect;
        streams.out << text << '\n';
    };
    line("gesture", kKeyHeading, "effect");
    for (const Host::KeyMap::Entry& entry : map.entries()) {
        line(entry.trigger, nameOf(entry), effectOf(entry));
    }
}

void printJson(const Host::KeyMap& map, Streams& streams) {
    std::string text;
    Vexa::JsonWriter json(text);
    json.beginArray();
    for (const Host::KeyMap::Entry& entry : map.entries()) {
        json.beginObject();
        json.key("gesture");
        json.string(Host::keyGestureName(entry.gesture));
        json.key("region");
        json.number(std::uint64_t{entry.region});
        json.key("key");
        if (entry.key) {
            json.string(Host::keyName(*entry.key));
        } else {
            json.null();
        }
        json.key("code");
        if (entry.key) {
            json.number(std::uint64_t{*entry.key});
        } else {
            json.null();
        }
        json.endObject();
    }
    json.endArray();
    streams.out << text << '\n';
}

int runKeys(const Arguments& arguments, Streams& streams) {
    const Host::KeyMap map = parseKeyMap(arguments.values(kKeyOption.name));
    if (arguments.given("--json")) {
        printJson(map, streams);
    } else {
        printTable(map, streams);
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command keysCommand = {
    .name = "keys",
    .summary = "Print the key that each gesture sends",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runKeys,
};

}  // namespace VexaTouch::Tools
