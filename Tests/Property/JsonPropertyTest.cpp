// JSON held to an independent reader and writer, on random values and texts. On failure rapidcheck
// prints the seed and the smallest case it found; RC_PARAMS="seed=..." repeats it.

#include "Platform/Json.h"

#include <gtest/gtest.h>
#include <rapidcheck.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using Peer = nlohmann::json;
using Type = PropertyValue::Type;

/// As rc::check, with more rounds than its default unless RC_PARAMS asks for still more.
template <class Property>
bool holds(const std::string& description, Property&& property) {
    constexpr int kRounds = 2000;
    rc::detail::TestMetadata metadata;
    metadata.id = description;
    metadata.description = description;
    rc::detail::TestParams params = rc::detail::configuration().testParams;
    params.maxSuccess = std::max(params.maxSuccess, kRounds);
    const auto result =
        rc::detail::checkTestable(std::forward<Property>(property), metadata, params);
    if (result.template is<rc::detail::SuccessResult>()) return true;
    std::cerr << description << ": ";
    rc::detail::printResultMessage(result, std::cerr);
    std::cerr << std::endl;
    return false;
}

/// Which values a generator may make.
enum class Domain : std::uint8_t {
    JsonForm,  ///< only what reads back as it was written
    Any,
};

rc::Gen<std::string> utf8Text() {
    const auto codePoint = rc::gen::weightedOneOf<std::uint32_t>(
        {{8, rc::gen::inRange<std::uint32_t>(0x20, 0x7F)},
         {2, rc::gen::inRange<std::uint32_t>(0, 0x20)},
         {1, rc::gen::element<std::uint32_t>('"', '\\', '/', 0x7F)},
         {1, rc::gen::inRange<std::uint32_t>(0x80, 0xD800)},
         {1, rc::gen::inRange<std::uint32_t>(0xE000, 0x10000)},
         {1, rc::gen::inRange<std::uint32_t>(0x10000, 0x110000)}});
    return rc::gen::map(rc::gen::container<std::vector<std::uint32_t>>(codePoint),
                        [](const std::vector<std::uint32_t>& codes) {
                            std::string text;
                            const auto add = [&text](std::uint32_t byte) {
                                text += static_cast<char>(byte);
                            };
                            for (const std::uint32_t code : codes) {
                                if (code < 0x80) {
                                    add(code);
                                } else if (code < 0x800) {
                                    add(0xC0 | code >> 6);
                                    add(0x80 | (code & 0x3F));
                                } else if (code < 0x10000) {
                                    add(0xE0 | code >> 12);
                                    add(0x80 | (code >> 6 & 0x3F));
                                    add(0x80 | (code & 0x3F));
                                } else {
                                    add(0xF0 | code >> 18);
                                    add(0x80 | (code >> 12 & 0x3F));
                                    add(0x80 | (code >> 6 & 0x3F));
                                    add(0x80 | (code & 0x3F));
                                }
                            }
                            return text;
                        });
}

/// Bytes of which many begin or continue a UTF-8 sequence, rightly or wrongly.
rc::Gen<std::string> nearlyUtf8Text() {
    const auto byte = rc::gen::map(
        rc::gen::oneOf(
            rc::gen::element<int>(0x41, 0x80, 0x8F, 0x90, 0x9F, 0xA0, 0xBF, 0xC1, 0xC2, 0xDF, 0xE0,
                                  0xE1, 0xEC, 0xED, 0xEE, 0xEF, 0xF0, 0xF1, 0xF3, 0xF4, 0xF5, 0xFF),
            rc::gen::inRange(0, 256)),
        [](int code) { return static_cast<char>(code); });
    return rc::gen::container<std::string>(byte);
}

rc::Gen<std::uint64_t> anyBits() {
    return rc::gen::oneOf(
        rc::gen::map(rc::gen::pair(rc::gen::inRange<std::uint64_t>(0, 1ull << 32),
                                   rc::gen::inRange<std::uint64_t>(0, 1ull << 32)),
                     [](const auto& halves) { return halves.first << 32 | halves.second; }),
        rc::gen::inRange<std::uint64_t>(0, 1000),
        rc::gen::element<std::uint64_t>(0, 1ull << 63, (1ull << 63) - 1, ~0ull, 0x7FEFFFFFFFFFFFFF,
                                        0x0010000000000000, 0x000FFFFFFFFFFFFF));
}

rc::Gen<double> anyDouble() {
    return rc::gen::oneOf(
        rc::gen::map(anyBits(), [](std::uint64_t bits) { return std::bit_cast<double>(bits); }),
        rc::gen::map(rc::gen::inRange(-100'000, 100'000), [](int value) { return value / 100.0; }));
}

rc::Gen<PropertyValue> scalar(Domain domain) {
    using rc::gen::map;
    std::vector<rc::Gen<PropertyValue>> kinds = {
        rc::gen::just(PropertyValue::null()),
        map(rc::gen::arbitrary<bool>(), [](bool value) { return PropertyValue(value); }),
        map(anyBits(),
            [](std::uint64_t bits) { return PropertyValue(std::bit_cast<std::int64_t>(bits)); }),
        map(anyBits(), [](std::uint64_t bits) { return PropertyValue(bits); }),
        map(anyDouble(),
            [domain](double value) {
                const bool isFine = domain == Domain::Any || std::isfinite(value);
                return PropertyValue(isFine ? value : 0.0);
            }),
        map(utf8Text(), [](std::string text) { return PropertyValue(std::move(text)); }),
    };
    if (domain == Domain::Any) {
        kinds.push_back(rc::gen::just(PropertyValue()));
        kinds.push_back(map(rc::gen::inRange<std::uint64_t>(0, 1ull << 32), [](std::uint64_t bits) {
            return PropertyValue(std::bit_cast<float>(static_cast<std::uint32_t>(bits)));
        }));
        kinds.push_back(
            map(rc::gen::arbitrary<std::vector<std::uint8_t>>(),
                [](PropertyValue::Bytes bytes) { return PropertyValue(std::move(bytes)); }));
        kinds.push_back(
            map(nearlyUtf8Text(), [](std::string text) { return PropertyValue(std::move(text)); }));
    }
    return rc::gen::mapcat(rc::gen::inRange<std::size_t>(0, kinds.size()),
                           [kinds](std::size_t index) { return kinds[index]; });
}

rc::Gen<PropertyValue> anyValue(Domain domain, int depth = 4) {
    if (depth == 0) return scalar(domain);
    const auto inner = rc::gen::lazy([=] { return anyValue(domain, depth - 1); });
    const auto array = rc::gen::map(
        rc::gen::scale(0.3, rc::gen::container<std::vector<PropertyValue>>(inner)),
        [](PropertyValue::Array elements) { return PropertyValue(std::move(elements)); });
    // Keys are repaired like other text; with valid ones no two of them become one.
    const auto dictionary = rc::gen::map(
        rc::gen::scale(0.3, rc::gen::container<std::vector<std::pair<std::string, PropertyValue>>>(
                                rc::gen::pair(utf8Text(), inner))),
        [](const std::vector<std::pair<std::string, PropertyValue>>& members) {
            return PropertyValue(PropertyValue::Dictionary(members.begin(), members.end()));
        });
    return rc::gen::weightedOneOf<PropertyValue>(
        {{3, scalar(domain)}, {1, array}, {1, dictionary}});
}

/// The text as the peer repairs it.
std::string repaired(const std::string& text) {
    return Peer::parse(Peer(text).dump(-1, ' ', false, Peer::error_handler_t::replace))
        .get<std::string>();
}

/// What is read back when the value was written.
PropertyValue normalForm(const PropertyValue& value) {
    switch (value.type()) {
        case Type::None:
            return PropertyValue::null();
        case Type::Float:
        case Type::Double:
            if (!std::isfinite(value.toDouble())) return PropertyValue::null();
            return value.toDouble();
        case Type::String:
            return repaired(std::string(*value.asString()));
        case Type::Bytes: {
            std::string text;
            for (const std::uint8_t byte : *value.asBytes()) {
                char part[4];
                std::snprintf(part, sizeof part, "%02x ", byte);
                text += part;
            }
            return text;
        }
        case Type::Array: {
            PropertyValue::Array elements;
            for (const PropertyValue element : *value.asArray()) {
                elements.push_back(normalForm(element));
            }
            return elements;
        }
        case Type::Dictionary: {
            PropertyValue::Dictionary members;
            for (const auto [name, member] : *value.asDictionary()) {
                members.emplace(name, normalForm(member));
            }
            return members;
        }
        default:
            return value;
    }
}

PropertyValue fromPeer(const Peer& peer) {
    switch (peer.type()) {
        case Peer::value_t::null:
            return PropertyValue::null();
        case Peer::value_t::boolean:
            return peer.get<bool>();
        case Peer::value_t::number_integer:
            return peer.get<std::int64_t>();
        case Peer::value_t::number_unsigned:
            return peer.get<std::uint64_t>();
        case Peer::value_t::number_float:
            return peer.get<double>();
        case Peer::value_t::string:
            return peer.get<std::string>();
        case Peer::value_t::array: {
            PropertyValue::Array elements;
            for (const Peer& element : peer) elements.push_back(fromPeer(element));
            return elements;
        }
        case Peer::value_t::object: {
            PropertyValue::Dictionary members;
            for (const auto& [name, member] : peer.items()) members[name] = fromPeer(member);
            return members;
        }
        default:
            return {};
    }
}

/// The peer's answer; nothing where its rules differ from ours (it refuses a number that
/// overflows, skips a byte order mark and has no limit of depth).
std::optional<PropertyValue> peerAnswer(const std::string& text) {
    if (text.starts_with("\xEF\xBB\xBF")) return std::nullopt;
    try {
        return fromPeer(Peer::parse(text));
    } catch (const Peer::out_of_range&) {
        return std::nullopt;
    } catch (const Peer::parse_error&) {
        return PropertyValue();
    }
}

/// The value of a text that is handed over in pieces of these sizes, over and over.
PropertyValue readInPieces(std::string_view text, const std::vector<std::size_t>& sizes) {
    JsonValueBuilder builder;
    JsonParser parser(builder);
    for (std::size_t piece = 0; !text.empty(); ++piece) {
        const std::size_t size = std::min(text.size(), sizes[piece % sizes.size()]);
        if (!parser.write(text.substr(0, size))) return {};
        text.remove_prefix(size);
    }
    return parser.finish() ? builder.take() : PropertyValue();
}

rc::Gen<std::vector<std::size_t>> pieceSizes() {
    return rc::gen::nonEmpty(
        rc::gen::container<std::vector<std::size_t>>(rc::gen::inRange<std::size_t>(1, 9)));
}

rc::Gen<JsonWriter::Style> anyStyle() {
    return rc::gen::element(JsonWriter::Style::Indented, JsonWriter::Style::Compact);
}

/// JSON text with a few bytes changed, put in or left out.
std::string damagedText() {
    std::string text = writeJson(*anyValue(Domain::JsonForm, 3), *anyStyle());
    static const std::string kBytes = "{}[]:,\"\\/ \n\t0123456789+-.eEutrfalsn\x7F\xC3\xA9\x80\x01";
    const int edits = *rc::gen::inRange(0, 4);
    for (int edit = 0; edit < edits && !text.empty(); ++edit) {
        const std::size_t at = *rc::gen::inRange<std::size_t>(0, text.size());
        const char byte = *rc::gen::elementOf(kBytes);
        switch (*rc::gen::inRange(0, 3)) {
            case 0:
                text[at] = byte;
                break;
            case 1:
                text.insert(at, 1, byte);
                break;
            default:
                text.erase(at, 1);
                break;
        }
    }
    return text;
}

std::string digits(int fewest, int most) {
    const int count = *rc::gen::inRange(fewest, most);
    std::string text;
    while (static_cast<int>(text.size()) < count) text += *rc::gen::inRange<char>('0', '9' + 1);
    return text;
}

/// The text of a number that is no integer, often long, tiny, huge or padded with zeros.
std::string floatingPointText() {
    const int zeros = *rc::gen::weightedElement<int>({{6, 0}, {1, 20}, {1, 330}, {1, 700}});
    std::string text = *rc::gen::element<std::string>("", "-");
    if (*rc::gen::arbitrary<bool>()) {
        text += "0." + std::string(static_cast<std::size_t>(zeros), '0') + digits(1, 40);
    } else {
        text += *rc::gen::inRange<char>('1', '9' + 1);
        text += digits(0, 40) + std::string(static_cast<std::size_t>(zeros), '0') + ".";
        text += digits(1, 20);
    }
    if (*rc::gen::arbitrary<bool>()) {
        text += *rc::gen::element<std::string>("e", "E", "e+", "E-", "e-");
        text += std::to_string(*rc::gen::oneOf(rc::gen::inRange(0, 1100), rc::gen::inRange(0, 30)));
    }
    return text;
}

TEST(JsonPropertyTest, AValueWithAJsonFormReadsBackTheSame) {
    EXPECT_TRUE(holds("write, then read", [] {
        const PropertyValue value = *anyValue(Domain::JsonForm);
        const std::string text = writeJson(value, *anyStyle());
        RC_LOG() << text;
        RC_ASSERT(readJson(text) == value);
    }));
}

TEST(JsonPropertyTest, APeerReadsWhatIsWritten) {
    EXPECT_TRUE(holds("write, then read by the peer", [] {
        const PropertyValue value = *anyValue(Domain::Any);
        const std::string text = writeJson(value, *anyStyle());
        RC_LOG() << text << "\nfor " << value.description();
        RC_ASSERT(fromPeer(Peer::parse(text)) == normalForm(value));
        RC_ASSERT(readJson(text) == normalForm(value));
    }));
}

TEST(JsonPropertyTest, TextIsRepairedAsThePeerRepairsIt) {
    EXPECT_TRUE(holds("invalid UTF-8", [] {
        const std::string text = *nearlyUtf8Text();
        RC_ASSERT(Peer::parse(writeJson(text)).get<std::string>() == repaired(text));
    }));
}

TEST(JsonPropertyTest, APeersTextIsRead) {
    EXPECT_TRUE(holds("written by the peer, then read", [] {
        const Peer peer = Peer::parse(writeJson(*anyValue(Domain::JsonForm)));
        const std::string text =
            peer.dump(*rc::gen::inRange(-1, 5), ' ', *rc::gen::arbitrary<bool>());
        RC_LOG() << text;
        RC_ASSERT(readJson(text) == fromPeer(peer));
    }));
}

TEST(JsonPropertyTest, DamagedTextIsReadOrRefusedAsByThePeer) {
    EXPECT_TRUE(holds("damaged text", [] {
        const std::string text = damagedText();
        RC_LOG() << text;
        const std::optional<PropertyValue> expected = peerAnswer(text);
        if (expected) RC_ASSERT(readJson(text) == *expected);
    }));
}

TEST(JsonPropertyTest, PiecesDoNotChangeTheAnswer) {
    EXPECT_TRUE(holds("damaged text in pieces", [] {
        const std::string text = damagedText();
        RC_LOG() << text;
        RC_ASSERT(readInPieces(text, *pieceSizes()) == readJson(text));
    }));
}

TEST(JsonPropertyTest, ANumberIsTheNearestDouble) {
    EXPECT_TRUE(holds("floating-point text", [] {
        const std::string text = floatingPointText();
        RC_LOG() << text;
        const PropertyValue expected = std::strtod(text.c_str(), nullptr);
        RC_ASSERT(readJson(text) == expected);
        RC_ASSERT(readInPieces("[" + text + "]", *pieceSizes()) ==
                  PropertyValue(PropertyValue::Array{expected}));
    }));
}

TEST(JsonPropertyTest, AnOverflowingExponentIsReadWhereverItStands) {
    EXPECT_TRUE(holds("exponents beyond 32 bits", [] {
        // Each of these stands for a member whose number the library alone would refuse.
        std::string text = "[";
        PropertyValue::Array expected;
        const int count = *rc::gen::inRange(1, 6);
        for (int index = 0; index < count; ++index) {
            const bool isNegative = *rc::gen::arbitrary<bool>();
            const bool isZero = *rc::gen::arbitrary<bool>();
            const bool isTiny = *rc::gen::arbitrary<bool>();
            if (index > 0) text += ",";
            text += "{\"a\":[null," + std::string(isNegative ? "-" : "") + (isZero ? "0" : "7") +
                    "e" + (isTiny ? "-" : "") + "2147483648" + digits(0, 20) + " ],\"b\":1.5}";
            double value = isZero || isTiny ? 0.0 : std::numeric_limits<double>::infinity();
            if (isNegative) value = -value;
            expected.emplace_back(PropertyValue::Dictionary{
                {"a", PropertyValue::Array{PropertyValue::null(), value}}, {"b", 1.5}});
        }
        text += "]";
        RC_LOG() << text;
        RC_ASSERT(readJson(text) == PropertyValue(expected));
        RC_ASSERT(readInPieces(text, *pieceSizes()) == PropertyValue(expected));
    }));
}

}  // namespace
}  // namespace Vexa
