#include "Host/KeyMap.h"

#include <algorithm>
#include <stdexcept>
#include <string>

namespace VexaTouch::Host {
namespace {

constexpr std::string_view kNoKey = "none";

struct GestureName {
    KeyGesture gesture;
    std::string_view name;
};

constexpr std::array<GestureName, 2> kGestureNames = {{
    {KeyGesture::Tap, "tap"},
    {KeyGesture::Hold, "hold"},
}};

std::string quoted(std::string_view text) {
    return '"' + std::string(text) + '"';
}

/// Names nearly right are the likeliest mistake: "nextsong", "NEXTSONG", "Key_NextSong".
std::string likelyName(std::string_view name) {
    constexpr std::string_view kPrefix = "KEY_";
    std::string likely(name);
    std::ranges::transform(likely, likely.begin(), [](char c) {
        return c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c;
    });
    if (!likely.starts_with(kPrefix)) {
        likely.insert(0, kPrefix);
    }
    return keyFromName(likely) ? likely : std::string();
}

std::optional<KeyCode> parseKey(std::string_view name) {
    if (name == kNoKey) {
        return std::nullopt;
    }
    const auto key = keyFromName(name);
    if (!key) {
        const std::string likely = likelyName(name);
        throw std::invalid_argument("there is no key " + quoted(name) +
                                    (likely.empty()
                                         ? "; keys have the kernel's names, such as KEY_NEXTSONG "
                                           "(linux/input-event-codes.h), and none sends no key"
                                         : "; " + likely + " is meant?"));
    }
    return key;
}

/// Says which part of what stands before the = is wrong.
[[noreturn]] void refuseTrigger(std::string_view trigger) {
    const std::size_t colon = trigger.find(':');
    const std::string_view gesture = trigger.substr(0, colon);
    if (std::ranges::find(kGestureNames, gesture, &GestureName::name) == kGestureNames.end()) {
        throw std::invalid_argument("there is no gesture " + quoted(gesture) +
                                    ", only tap and hold");
    }
    if (colon == std::string_view::npos) {
        throw std::invalid_argument("the region is missing: " + std::string(gesture) + ":1, " +
                                    std::string(gesture) + ":2 or " + std::string(gesture) + ":3");
    }
    throw std::invalid_argument("there is no region " + quoted(trigger.substr(colon + 1)) +
                                ", only 1 (play), 2 (volume down) and 3 (volume up)");
}

}  // namespace

std::string_view keyGestureName(KeyGesture gesture) noexcept {
    return std::ranges::find(kGestureNames, gesture, &GestureName::gesture)->name;
}

KeyMap::KeyMap() noexcept : entries_() {
    std::ranges::transform(kDefaultKeys, entries_.begin(), [](const DefaultKey& each) {
        return Entry{.trigger = each.trigger,
                     .gesture = each.gesture,
                     .region = each.region,
                     .key = each.key};
    });
}

void KeyMap::assign(std::string_view text) {
    const std::size_t equals = text.find('=');
    if (equals == std::string_view::npos) {
        throw std::invalid_argument(
            "GESTURE:REGION=KEY is needed, such as tap:1=KEY_NEXTSONG or hold:1=none");
    }
    const std::string_view trigger = text.substr(0, equals);
    const auto entry = std::ranges::find(entries_, trigger, &Entry::trigger);
    if (entry == entries_.end()) {
        refuseTrigger(trigger);
    }
    entry->key = parseKey(text.substr(equals + 1));
}

std::optional<KeyCode> KeyMap::key(KeyGesture gesture, std::uint32_t region) const noexcept {
    const auto entry = std::ranges::find_if(entries_, [&](const Entry& each) {
        return each.gesture == gesture && each.region == region;
    });
    return entry == entries_.end() ? std::nullopt : entry->key;
}

std::vector<KeyCode> KeyMap::keys() const {
    std::vector<KeyCode> keys;
    for (const Entry& entry : entries_) {
        if (entry.key) {
            keys.push_back(*entry.key);
        }
    }
    std::ranges::sort(keys);
    const auto repeated = std::ranges::unique(keys);
    keys.erase(repeated.begin(), repeated.end());
    return keys;
}

}  // namespace VexaTouch::Host
