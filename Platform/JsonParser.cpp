#include "Platform/JsonParser.h"

// The one place that knows the parsing library; its compiled parts are built here too.
#include <boost/json/basic_parser_impl.hpp>
#include <boost/json/src.hpp>

#include <algorithm>
#include <bitset>
#include <charconv>
#include <limits>
#include <system_error>
#include <utility>

namespace Vexa {

namespace {

namespace json = boost::json;

bool isDigit(char character) {
    return character >= '0' && character <= '9';
}

/// Whether a number that no finite double, or none but 0, is near to is large. It is not 0.
bool isLargeNumber(std::string_view text) {
    const std::size_t exponentAt = text.find_first_of("eE");
    const std::string_view mantissa = text.substr(0, exponentAt);

    // The power of ten of the first digit that counts, or one more: nothing near 1 is asked about.
    const std::size_t point = std::min(mantissa.find('.'), mantissa.size());
    const std::size_t first = mantissa.find_first_of("123456789");
    auto power = static_cast<std::int64_t>(point) - static_cast<std::int64_t>(first);

    if (exponentAt != std::string_view::npos) {
        std::string_view digits = text.substr(exponentAt + 1);
        const bool isNegative = digits.front() == '-';
        if (isNegative || digits.front() == '+') digits.remove_prefix(1);
        // At most 19 digits that count, see resumeAfterExponentOverflow.
        std::int64_t exponent = 0;
        std::from_chars(digits.data(), digits.data() + digits.size(), exponent);
        power += isNegative ? -exponent : exponent;
    }
    return power >= 0;
}

/// What a number becomes that no finite double, or none but 0, is near to.
double outOfRangeValue(std::string_view text) {
    const std::string_view mantissa = text.substr(0, text.find_first_of("eE"));
    const bool isZero = mantissa.find_first_of("123456789") == std::string_view::npos;
    const double magnitude =
        !isZero && isLargeNumber(text) ? std::numeric_limits<double>::infinity() : 0.0;
    return text.front() == '-' ? -magnitude : magnitude;
}

/// The nearest double to a JSON number's text. The library's own conversion is not exact.
double nearestDouble(std::string_view text) {
    double value = 0;
    const auto result = std::from_chars(text.data(), text.data() + text.size(), value);
    return result.ec == std::errc() ? value : outOfRangeValue(text);
}

/// Stands in for the real handler while a position in the text is gone to a second time.
class SilentHandler final : public JsonHandler {
public:
    void onObjectBegin() override {}
    void onObjectEnd() override {}
    void onArrayBegin() override {}
    void onArrayEnd() override {}
    void onKey(std::string_view /*piece*/, bool /*last*/) override {}
    void onString(std::string_view /*piece*/, bool /*last*/) override {}
    void onNumber(const JsonNumber& /*number*/) override {}
    void onBoolean(bool /*value*/) override {}
    void onNull() override {}
};

/// Hands the library's events on. It also remembers what the parser keeps to itself and is needed
/// when an exponent overflows: the containers that are open, and the number's text so far.
class EventForwarder {
public:
    static constexpr std::size_t max_array_size = static_cast<std::size_t>(-1);
    static constexpr std::size_t max_object_size = static_cast<std::size_t>(-1);
    static constexpr std::size_t max_string_size = static_cast<std::size_t>(-1);
    static constexpr std::size_t max_key_size = static_cast<std::size_t>(-1);

    explicit EventForwarder(JsonHandler& handler) : handler_(&handler) {}

    bool on_document_begin(json::error_code&) { return true; }
    bool on_document_end(json::error_code&) { return true; }
    bool on_object_begin(json::error_code&) {
        isObject_[depth_++] = true;
        handler_->onObjectBegin();
        return true;
    }
    bool on_object_end(std::size_t, json::error_code&) {
        --depth_;
        handler_->onObjectEnd();
        return true;
    }
    bool on_array_begin(json::error_code&) {
        isObject_[depth_++] = false;
        handler_->onArrayBegin();
        return true;
    }
    bool on_array_end(std::size_t, json::error_code&) {
        --depth_;
        handler_->onArrayEnd();
        return true;
    }
    bool on_key_part(json::string_view piece, std::size_t, json::error_code&) {
        handler_->onKey({piece.data(), piece.size()}, false);
        return true;
    }
    bool on_key(json::string_view piece, std::size_t, json::error_code&) {
        handler_->onKey({piece.data(), piece.size()}, true);
        return true;
    }
    bool on_string_part(json::string_view piece, std::size_t, json::error_code&) {
        handler_->onString({piece.data(), piece.size()}, false);
        return true;
    }
    bool on_string(json::string_view piece, std::size_t, json::error_code&) {
        handler_->onString({piece.data(), piece.size()}, true);
        return true;
    }
    bool on_number_part(json::string_view piece, json::error_code&) {
        numberText_.append(piece.data(), piece.size());
        return true;
    }
    bool on_int64(std::int64_t value, json::string_view, json::error_code&) {
        numberText_.clear();
        handler_->onNumber({.kind = JsonNumber::Kind::Signed, .signedValue = value});
        return true;
    }
    bool on_uint64(std::uint64_t value, json::string_view, json::error_code&) {
        numberText_.clear();
        handler_->onNumber({.kind = JsonNumber::Kind::Unsigned, .unsignedValue = value});
        return true;
    }
    bool on_double(double, json::string_view piece, json::error_code&) {
        JsonNumber number{.kind = JsonNumber::Kind::Double};
        if (hasSubstitute_) {
            number.doubleValue = substitute_;
            hasSubstitute_ = false;
        } else if (numberText_.empty()) {
            number.doubleValue = nearestDouble({piece.data(), piece.size()});
        } else {
            numberText_.append(piece.data(), piece.size());
            number.doubleValue = nearestDouble(numberText_);
        }
        numberText_.clear();
        handler_->onNumber(number);
        return true;
    }
    bool on_bool(bool value, json::error_code&) {
        handler_->onBoolean(value);
        return true;
    }
    bool on_null(json::error_code&) {
        handler_->onNull();
        return true;
    }
    bool on_comment_part(json::string_view, json::error_code&) { return true; }
    bool on_comment(json::string_view, json::error_code&) { return true; }

    /// A text that opens the containers that are open now, up to the place of a value.
    [[nodiscard]] std::string openingText() const {
        std::string text;
        for (std::size_t level = 0; level < depth_; ++level) {
            text += isObject_[level] ? "{\"\":" : "[";
        }
        return text;
    }

    /// The text of the number at hand, of which `lastPiece` was not yet handed over.
    std::string takeNumberText(std::string_view lastPiece) {
        std::string text = std::move(numberText_);
        numberText_.clear();
        return text += lastPiece;
    }

    /// Gives the next floating-point number the value, whatever its text.
    void substituteNextDouble(double value) {
        hasSubstitute_ = true;
        substitute_ = value;
    }

    /// Sends events elsewhere, and begins at depth 0 again. Returns where they went before.
    JsonHandler& restart(JsonHandler& handler) {
        depth_ = 0;
        return redirect(handler);
    }
    JsonHandler& redirect(JsonHandler& handler) {
        JsonHandler& old = *handler_;
        handler_ = &handler;
        return old;
    }

private:
    JsonHandler* handler_;
    std::size_t depth_ = 0;
    std::bitset<kJsonMaxDepth> isObject_;  // by level, outermost first
    std::string numberText_;  // the pieces of a number that is cut across pieces of the text
    bool hasSubstitute_ = false;
    double substitute_ = 0;
};

json::parse_options parseOptions() {
    json::parse_options options;
    options.max_depth = kJsonMaxDepth;
    return options;
}

}  // namespace

struct JsonParser::State {
    explicit State(JsonHandler& handler) : parser(parseOptions(), handler) {}

    json::basic_parser<EventForwarder> parser;
    std::uint64_t offset = 0;          // bytes of the pieces before this one
    bool skipsExponentDigits = false;  // within an exponent that overflowed
    bool hasEnded = false;             // by a fault or by finish
    std::uint64_t errorOffset = 0;
    std::string errorMessage;

    bool fail(std::uint64_t at, std::string message) {
        hasEnded = true;
        errorOffset = at;
        errorMessage = std::move(message);
        return false;
    }

    /// The library refuses an exponent beyond 31 bits, where the value is simply infinite or 0.
    /// A fresh parser is brought to the same place, given a number without overflow, and the
    /// handler is given the value that it stands for. `readBefore` is the part of the present
    /// piece that was read when the fault was met.
    void resumeAfterExponentOverflow(std::string_view readBefore) {
        std::size_t begin = readBefore.size();
        constexpr std::string_view kNumberCharacters = "+-.0123456789Ee";
        while (begin > 0 && kNumberCharacters.find(readBefore[begin - 1]) != std::string_view::npos)
            --begin;
        EventForwarder& forwarder = parser.handler();
        // Digits of the exponent may follow. These stand for them: they outweigh any mantissa.
        const double value =
            outOfRangeValue(forwarder.takeNumberText(readBefore.substr(begin)) + "999999999");
        const std::string replay = forwarder.openingText() + "0e0";

        SilentHandler silent;
        JsonHandler& handler = forwarder.restart(silent);
        parser.reset();
        json::error_code error;
        parser.write_some(true, replay.data(), replay.size(), error);
        forwarder.redirect(handler);
        forwarder.takeNumberText({});
        forwarder.substituteNextDouble(value);
        skipsExponentDigits = true;
    }

    /// Reads a piece, the last one unless there is `more`.
    bool read(bool more, std::string_view piece) {
        std::size_t position = 0;
        while (true) {
            if (skipsExponentDigits) {
                while (position < piece.size() && isDigit(piece[position])) ++position;
                if (position == piece.size() && more) break;
                skipsExponentDigits = false;
            }
            const std::string_view rest = piece.substr(position);
            json::error_code error;
            const std::size_t read = parser.write_some(more, rest.data(), rest.size(), error);
            position += read;
            if (!error) {
                if (position < piece.size()) return fail(offset + position, "extra data");
                break;
            }
            if (error != json::error::exponent_overflow) {
                return fail(offset + position, error.message());
            }
            resumeAfterExponentOverflow(rest.substr(0, read));
        }
        offset += piece.size();
        return true;
    }
};

JsonParser::JsonParser(JsonHandler& handler) : state_(std::make_unique<State>(handler)) {}
JsonParser::~JsonParser() = default;

bool JsonParser::write(std::string_view piece) {
    if (state_->hasEnded) {
        if (state_->errorMessage.empty()) state_->fail(state_->offset, "extra data");
        return false;
    }
    return piece.empty() || state_->read(true, piece);
}

bool JsonParser::finish() {
    if (state_->hasEnded) return state_->errorMessage.empty();
    if (!state_->read(false, std::string_view(""))) return false;
    state_->hasEnded = true;
    return true;
}

std::uint64_t JsonParser::errorOffset() const noexcept {
    return state_->errorOffset;
}

std::string JsonParser::errorMessage() const {
    return state_->errorMessage;
}

}  // namespace Vexa
