#include "Tools/Daemon/BusValue.h"

#include "Tools/Daemon/BusError.h"

#include <systemd/sd-bus.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <span>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

using Vexa::PropertyValue;
using Type = PropertyValue::Type;

void check(int result) {
    if (result < 0) {
        throw BusError(ErrorName::kInvalidValue,
                       std::string("the bus cannot carry the value: ") + std::strerror(-result));
    }
}

class Writer {
public:
    explicit Writer(sd_bus_message* message) : message_(message) {}

    void variant(const PropertyValue& value, int level) {
        if (level > BusValue::kMostLevels) {
            throw BusError(ErrorName::kInvalidValue, "the value is nested too deep for the bus");
        }
        switch (value.type()) {
            case Type::None:
                inside('v', "(g)", [&] { inside('r', "g", [&] { basic('g', ""); }); });
                return;
            case Type::Null:
                inside('v', "g", [&] { basic('g', ""); });
                return;
            case Type::Boolean: {
                const int truth = value.toBoolean() ? 1 : 0;
                inside('v', "b", [&] { basic('b', &truth); });
                return;
            }
            case Type::Signed: {
                const std::int64_t number = *value.asSigned();
                inside('v', "x", [&] { basic('x', &number); });
                return;
            }
            case Type::Unsigned: {
                const std::uint64_t number = *value.asUnsigned();
                inside('v', "t", [&] { basic('t', &number); });
                return;
            }
            case Type::Float: {
                const double number = value.toDouble();
                inside('v', "(d)", [&] { inside('r', "d", [&] { basic('d', &number); }); });
                return;
            }
            case Type::Double: {
                const double number = value.toDouble();
                inside('v', "d", [&] { basic('d', &number); });
                return;
            }
            case Type::String: {
                const std::string_view text = *value.asString();
                if (BusValue::isText(text)) {
                    inside('v', "s", [&] { basic('s', text.data()); });
                } else {
                    inside('v', "(ay)", [&] { inside('r', "ay", [&] { bytes(text); }); });
                }
                return;
            }
            case Type::Bytes: {
                const auto content = *value.asBytes();
                inside('v', "ay", [&] {
                    check(
                        sd_bus_message_append_array(message_, 'y', content.data(), content.size()));
                });
                return;
            }
            case Type::Array:
                inside('v', "av", [&] { array(value, level); });
                return;
            case Type::Dictionary:
                dictionary(value, level);
                return;
        }
    }

private:
    template <typename Content>
    void inside(char type, const char* contents, Content&& content) {
        check(sd_bus_message_open_container(message_, type, contents));
        content();
        check(sd_bus_message_close_container(message_));
    }
    void basic(char type, const void* value) {
        check(sd_bus_message_append_basic(message_, type, value));
    }
    void bytes(std::string_view text) {
        check(sd_bus_message_append_array(message_, 'y', text.data(), text.size()));
    }
    void array(const PropertyValue& value, int level) {
        inside('a', "v", [&] {
            for (const PropertyValue& element : *value.asArray()) {
                variant(element, level + 1);
            }
        });
    }
    void dictionary(const PropertyValue& value, int level) {
        const auto members = *value.asDictionary();
        bool plain = true;
        for (const auto& [key, member] : members) {
            plain = plain && BusValue::isText(key);
        }
        inside('v', plain ? "a{sv}" : "a(ayv)", [&] {
            inside('a', plain ? "{sv}" : "(ayv)", [&] {
                for (const auto& [name, element] : members) {
                    inside(plain ? 'e' : 'r', plain ? "sv" : "ayv", [&, key = name, m = element] {
                        if (plain) {
                            basic('s', key.data());
                        } else {
                            bytes(key);
                        }
                        variant(m, level + 1);
                    });
                }
            });
        });
    }

    sd_bus_message* message_;
};

class Reader {
public:
    Reader(sd_bus_message* message, std::size_t mostBytes)
        : message_(message), mostBytes_(mostBytes) {}

    PropertyValue any(int level) {
        if (level > BusValue::kMostLevels) {
            throw BusError(ErrorName::kInvalidValue, "the value is nested more than " +
                                                         std::to_string(BusValue::kMostLevels) +
                                                         " levels deep");
        }
        char type = 0;
        const char* contents = nullptr;
        if (sd_bus_message_peek_type(message_, &type, &contents) <= 0) {
            throw BusError(SD_BUS_ERROR_INVALID_ARGS, "a value is missing");
        }
        switch (type) {
            case 'v':
                count(std::strlen(contents));
                return inside(type, contents, [&] { return any(level); });
            case 'b':
                return read<int>(type) != 0;
            case 'y':
                return std::uint64_t{read<std::uint8_t>(type)};
            case 'q':
                return std::uint64_t{read<std::uint16_t>(type)};
            case 'u':
                return std::uint64_t{read<std::uint32_t>(type)};
            case 't':
                return read<std::uint64_t>(type);
            case 'n':
                return std::int64_t{read<std::int16_t>(type)};
            case 'i':
                return std::int64_t{read<std::int32_t>(type)};
            case 'x':
                return read<std::int64_t>(type);
            case 'd':
                return read<double>(type);
            case 's':
            case 'o':
                return PropertyValue(text(type));
            // A value that is next to nothing in the message is one in memory all the same.
            case 'g':
                count(sizeof(std::uint64_t));
                return empty(type) ? PropertyValue::null() : refused("g");
            case 'a':
                count(sizeof(std::uint64_t));
                return array(contents, level);
            case 'r':
                count(sizeof(std::uint64_t));
                return structure(contents);
            default:
                return refused(std::string(1, type));
        }
    }

private:
    [[noreturn]] static PropertyValue refused(const std::string& type) {
        throw BusError(ErrorName::kInvalidValue,
                       "the type " + type + " has no meaning as a property");
    }
    static void take(int result) {
        if (result <= 0) {
            throw BusError(SD_BUS_ERROR_INVALID_ARGS, "the value cannot be read");
        }
    }
    void count(std::size_t bytes) {
        bytes_ += bytes;
        if (bytes_ > mostBytes_) {
            throw BusError(ErrorName::kInvalidValue,
                           "the value is larger than " + std::to_string(mostBytes_) + " bytes");
        }
    }
    template <typename Content>
    PropertyValue inside(char type, const char* contents, Content&& content) {
        take(sd_bus_message_enter_container(message_, type, contents));
        PropertyValue value = content();
        if (sd_bus_message_exit_container(message_) < 0) {
            refused(contents);
        }
        return value;
    }
    template <typename Number>
    Number read(char type) {
        Number number{};
        count(sizeof(std::uint64_t));
        take(sd_bus_message_read_basic(message_, type, &number));
        return number;
    }
    std::string_view text(char type) {
        const char* content = nullptr;
        take(sd_bus_message_read_basic(message_, type, &content));
        const std::string_view view(content);
        count(sizeof(std::uint64_t) + view.size());
        return view;
    }
    std::span<const std::uint8_t> bytes() {
        const void* content = nullptr;
        std::size_t size = 0;
        if (sd_bus_message_read_array(message_, 'y', &content, &size) < 0) {
            refused("ay");
        }
        count(sizeof(std::uint64_t) + size);
        return {static_cast<const std::uint8_t*>(content), size};
    }
    bool empty(char type) {
        const char* content = nullptr;
        take(sd_bus_message_read_basic(message_, type, &content));
        return *content == '\0';
    }

    PropertyValue array(const char* contents, int level) {
        if (std::strcmp(contents, "y") == 0) {
            const auto content = bytes();
            return PropertyValue::Bytes(content.begin(), content.end());
        }
        if (contents[0] == '{' && contents[1] == 's') {
            return dictionary(contents, level, 'e');
        }
        if (std::strcmp(contents, "(ayv)") == 0) {
            return dictionary(contents, level, 'r');
        }
        if (contents[0] == '{') {
            refused(std::string("a") + contents);
        }
        return inside('a', contents, [&] {
            PropertyValue::Array elements;
            while (sd_bus_message_at_end(message_, 0) == 0) {
                elements.push_back(any(level + 1));
            }
            return PropertyValue(std::move(elements));
        });
    }

    PropertyValue dictionary(const char* contents, int level, char entry) {
        // Without the brackets around an entry.
        const std::string inner(contents + 1, std::strlen(contents) - 2);
        return inside('a', contents, [&] {
            PropertyValue::Dictionary members;
            while (sd_bus_message_at_end(message_, 0) == 0) {
                inside(entry, inner.c_str(), [&] {
                    std::string key;
                    if (entry == 'e') {
                        key = text('s');
                    } else {
                        const auto content = bytes();
                        key.assign(content.begin(), content.end());
                    }
                    members.insert_or_assign(std::move(key), any(level + 1));
                    return PropertyValue();
                });
            }
            return PropertyValue(members);
        });
    }

    PropertyValue structure(const char* contents) {
        const std::string inner(contents);
        return inside('r', contents, [&]() -> PropertyValue {
            if (inner == "d") {
                const auto number = read<double>('d');
                // Beyond the largest one, only infinity is one of them.
                constexpr double kLargest = std::numeric_limits<float>::max();
                const bool fits = std::abs(number) <= kLargest || !std::isfinite(number);
                const float single = fits ? static_cast<float>(number) : 0.0F;
                if (!std::isnan(number) && static_cast<double>(single) != number) {
                    throw BusError(ErrorName::kInvalidValue,
                                   "(d) is for numbers of single precision");
                }
                return single;
            }
            if (inner == "g") {
                return empty('g') ? PropertyValue() : refused("(g)");
            }
            if (inner == "ay") {
                const auto content = bytes();
                return std::string(content.begin(), content.end());
            }
            return refused('(' + inner + ')');
        });
    }

    sd_bus_message* message_;
    const std::size_t mostBytes_;
    std::size_t bytes_ = 0;
};

}  // namespace

bool BusValue::isText(std::string_view text) {
    std::size_t at = 0;
    while (at < text.size()) {
        const auto lead = static_cast<unsigned char>(text[at]);
        if (lead == 0) {
            return false;
        }
        const std::size_t length = lead < 0x80               ? 1
                                   : (lead & 0xE0U) == 0xC0U ? 2
                                   : (lead & 0xF0U) == 0xE0U ? 3
                                   : (lead & 0xF8U) == 0xF0U ? 4
                                                             : 0;
        if (length == 0 || at + length > text.size()) {
            return false;
        }
        std::uint32_t code = length == 1 ? lead : lead & (0xFFU >> (length + 1));
        for (std::size_t i = 1; i < length; ++i) {
            const auto byte = static_cast<unsigned char>(text[at + i]);
            if ((byte & 0xC0U) != 0x80U) {
                return false;
            }
            code = code << 6U | (byte & 0x3FU);
        }
        constexpr std::uint32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};
        if (code < kLeast[length] || code > 0x10FFFF || (code >= 0xD800 && code < 0xE000)) {
            return false;
        }
        at += length;
    }
    return true;
}

void BusValue::append(sd_bus_message* message, const PropertyValue& value) {
    Writer(message).variant(value, 0);
}

PropertyValue BusValue::read(sd_bus_message* message, std::size_t mostBytes) {
    return Reader(message, mostBytes).any(0);
}

}  // namespace VexaTouch::Tools::Daemon
