#include "Tools/HidRecorderReader.h"

#include "Platform/Json.h"
#include "Tools/HidRecorderFormat.h"

#include <algorithm>
#include <charconv>
#include <limits>
#include <stdexcept>
#include <utility>

namespace VexaTouch::Tools {
namespace {

using namespace HidRecorderFormat;
using Frame = PipelineRecording::Frame;

constexpr bool isBlank(char c) noexcept {
    return c == ' ' || c == '\t' || c == '\r';
}

// What a faulty line throws; the line's number is added where it is known.
[[noreturn]] void fault(const std::string& what) {
    throw std::invalid_argument(what);
}

// A piece of the text for a message: short, and nothing that a terminal would act on.
std::string quoted(std::string_view text) {
    constexpr std::size_t kLongest = 32;
    std::string shown = "'";
    for (const char c : text.substr(0, kLongest)) {
        shown += c >= ' ' && c <= '~' ? c : '?';
    }
    return shown + (text.size() > kLongest ? "...'" : "'");
}

// Reads a line word by word.
class Words {
public:
    explicit Words(std::string_view text) : rest_(text) { skipBlanks(); }

    [[nodiscard]] bool atEnd() const noexcept { return rest_.empty(); }

    std::string_view next() {
        const auto end = std::ranges::find_if(rest_, isBlank);
        const auto word = rest_.substr(0, static_cast<std::size_t>(end - rest_.begin()));
        rest_.remove_prefix(word.size());
        skipBlanks();
        return word;
    }

    [[nodiscard]] std::string_view rest() const noexcept { return rest_; }
    void skip(std::size_t count) {
        rest_.remove_prefix(count);
        skipBlanks();
    }

private:
    void skipBlanks() {
        while (!rest_.empty() && isBlank(rest_.front())) {
            rest_.remove_prefix(1);
        }
    }

    std::string_view rest_;
};

std::optional<std::uint64_t> readNumber(std::string_view word) {
    std::uint64_t value = 0;
    const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), value);
    if (error != std::errc() || end != word.data() + word.size()) {
        return std::nullopt;
    }
    return value;
}

std::uint64_t expectNumber(Words& words, const char* name) {
    const std::string_view word = words.next();
    const auto value = readNumber(word);
    if (!value) {
        fault(std::string(name) + " " + quoted(word) + " is no number");
    }
    return *value;
}

void expectEnd(const Words& words) {
    if (!words.atEnd()) {
        fault("unexpected " + quoted(words.rest()));
    }
}

// "SECONDS.MICROSECONDS", two whole numbers, in ns.
std::uint64_t readTime(std::string_view word) {
    const auto point = word.find('.');
    const auto seconds = readNumber(word.substr(0, point));
    const auto microseconds = point == std::string_view::npos ? std::optional<std::uint64_t>()
                                                              : readNumber(word.substr(point + 1));
    if (!seconds || !microseconds || *microseconds > 999'999) {
        fault("time " + quoted(word) + " is not seconds.microseconds");
    }
    constexpr auto kMaximum = std::numeric_limits<std::uint64_t>::max();
    if (*seconds > (kMaximum - *microseconds * 1000) / kNanosecondsPerSecond) {
        fault("time " + quoted(word) + " is too large");
    }
    return *seconds * kNanosecondsPerSecond + *microseconds * 1000;
}

std::uint64_t addTimes(std::uint64_t a, std::uint64_t b) {
    if (a > std::numeric_limits<std::uint64_t>::max() - b) {
        fault("the event's time does not fit into 64 bits of nanoseconds");
    }
    return a + b;
}

std::uint8_t readByte(std::string_view word) {
    std::uint8_t value = 0;
    // Two digits always: a line that was cut in the middle of a byte shows.
    const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), value, 16);
    if (word.size() != 2 || error != std::errc() || end != word.data() + word.size()) {
        fault(quoted(word) + " is no byte");
    }
    return value;
}

// The length of the JSON string that the text begins with, quotes included.
std::size_t jsonStringLength(std::string_view text) {
    if (!text.starts_with('"')) {
        fault("state without a key");
    }
    for (std::size_t i = 1; i < text.size(); ++i) {
        if (text[i] == '\\') {
            ++i;
        } else if (text[i] == '"') {
            return i + 1;
        }
    }
    fault("state key without its closing quote");
}

}  // namespace

HidRecorderReader::HidRecorderReader(FaultHandler onFault) : onFault_(std::move(onFault)) {}

void HidRecorderReader::write(std::string_view piece) {
    for (auto end = piece.find('\n'); end != std::string_view::npos; end = piece.find('\n')) {
        if (pending_.empty()) {
            readLine(piece.substr(0, end), true);
        } else {
            pending_.append(piece.substr(0, end));
            readLine(pending_, true);
            pending_.clear();
        }
        piece.remove_prefix(end + 1);
    }
    pending_.append(piece);
}

FrameList HidRecorderReader::finish() {
    if (!pending_.empty()) {
        readLine(pending_, false);
        pending_.clear();
    }
    if (!recognised_) {
        throw std::invalid_argument("no line of a HID recording");
    }
    return std::exchange(frames_, {});
}

void HidRecorderReader::readLine(std::string_view line, bool whole) {
    ++lineNumber_;
    try {
        if (line.starts_with(kCommentPrefix)) {
            recognised_ = true;
            readComment(line.substr(kCommentPrefix.size()), whole);
        } else if (line.starts_with("E:")) {
            recognised_ = true;
            readEvent(line.substr(2));
        } else if (line.starts_with("D:")) {
            recognised_ = true;
            readDevice(line.substr(2));
        } else if (line.starts_with("R:") || line.starts_with("N:") || line.starts_with("P:") ||
                   line.starts_with("I:")) {
            recognised_ = true;  // what device it was makes no difference to its reports
        }
    } catch (const std::invalid_argument& error) {
        nanoseconds_ = 0;
        if (!onFault_) {
            throw std::invalid_argument("line " + std::to_string(lineNumber_) + ": " +
                                        error.what());
        }
        onFault_(lineNumber_, error.what());
    }
}

void HidRecorderReader::readEvent(std::string_view text) {
    Words words(text);
    const std::uint64_t time =
        addTimes(addTimes(start_, readTime(words.next())), std::exchange(nanoseconds_, 0));
    const std::uint64_t length = expectNumber(words, "length");
    Frame frame{
        .type = Frame::Type::InputReport, .timestamp = time, .key = {}, .value = {}, .report = {}};
    frame.report.reserve(words.rest().size() / 3 + 1);
    while (!words.atEnd()) {
        frame.report.push_back(readByte(words.next()));
    }
    if (frame.report.size() != length) {
        fault("an event of " + std::to_string(length) + " bytes has " +
              std::to_string(frame.report.size()));
    }
    if (otherDevice_) {
        ++otherEvents_;
    } else {
        frames_.push_back(std::move(frame));
    }
}

void HidRecorderReader::readComment(std::string_view text, bool whole) {
    Words words(text);
    const std::string_view word = words.next();
    if (word != kStart && word != kNanoseconds && word != kState && word != kEmptyReport) {
        return;
    }
    if (!whole) {
        fault("cut off");  // a number or value may have lost its end and still read as one
    }
    if (word == kState) {
        readState(words.rest());
        return;
    }
    const std::uint64_t number = expectNumber(words, "time");
    expectEnd(words);
    if (word == kStart) {
        start_ = number;
    } else if (word == kEmptyReport) {
        frames_.push_back({.type = Frame::Type::InputReport,
                           .timestamp = number,
                           .key = {},
                           .value = {},
                           .report = {}});
    } else if (number <= 999) {
        nanoseconds_ = number;
    } else {
        fault("more than 999 nanoseconds");
    }
}

void HidRecorderReader::readState(std::string_view text) {
    Words words(text);
    Frame frame{.type = Frame::Type::State,
                .timestamp = expectNumber(words, "time"),
                .key = {},
                .value = {},
                .report = {}};
    const std::size_t keyLength = jsonStringLength(words.rest());
    const Vexa::PropertyValue key = Vexa::readJson(words.rest().substr(0, keyLength));
    words.skip(keyLength);
    frame.value = Vexa::readJson(words.rest());
    if (!key) {
        fault("state key is no JSON string");
    }
    if (!frame.value) {
        fault(words.atEnd() ? "state without a value" : "state value is no JSON");
    }
    frame.key = *key.asString();
    frames_.push_back(std::move(frame));
}

void HidRecorderReader::readDevice(std::string_view text) {
    Words words(text);
    const std::uint64_t device = expectNumber(words, "device");
    expectEnd(words);
    otherDevice_ = firstDevice_.value_or(device) != device;
    if (!firstDevice_) {
        firstDevice_ = device;
    }
}

}  // namespace VexaTouch::Tools
