#include "Tools/GestureScript.h"

#include "Platform/Json.h"
#include "Shared/InputReport.h"
#include "Shared/Util.h"

#include <algorithm>
#include <charconv>
#include <utility>

namespace VexaTouch::Tools {

namespace {

using Kind = GestureParameter::Kind;

constexpr std::string_view kBlanks = " \t\r\v\f";

/// The commands in the order of their kinds, so that a kind is an index.
constexpr bool isInOrderOfKinds() {
    for (std::size_t i = 0; i < kGestureCommands.size(); ++i) {
        if (static_cast<std::size_t>(kGestureCommands[i].kind) != i) {
            return false;
        }
    }
    return true;
}
static_assert(isInOrderOfKinds());

/// A token as a person can read it in a message: short and printable.
std::string quoted(std::string_view token) {
    constexpr std::size_t kLongest = 40;
    std::string text = "\"";
    for (const char c : token.substr(0, kLongest)) {
        text += c >= ' ' && c <= '~' ? c : '?';
    }
    text += token.size() > kLongest ? "...\"" : "\"";
    return text;
}

/// The whole text as a decimal number from 0 to 2^64-1.
std::optional<std::uint64_t> numberFromText(std::string_view text) {
    std::uint64_t value = 0;
    const char* end = text.data() + text.size();
    const auto [read, error] = std::from_chars(text.data(), end, value);
    return error == std::errc{} && read == end && !text.empty() ? std::optional(value)
                                                                : std::nullopt;
}

/// Milliseconds of "120ms" or "2s".
std::optional<std::uint64_t> durationFromText(std::string_view text) {
    std::uint64_t scale = 1;
    if (text.ends_with("ms")) {
        text.remove_suffix(2);
    } else if (text.ends_with("s")) {
        text.remove_suffix(1);
        scale = 1000;
    } else {
        return std::nullopt;
    }
    const auto value = numberFromText(text);
    // Anything this large is out of every bound, and must not wrap into one.
    return value ? std::optional(*value > kMaximumDurationMs * 2 ? kMaximumDurationMs * 2
                                                                 : *value * scale)
                 : std::nullopt;
}

bool looksLikeDuration(std::string_view token) {
    return !token.empty() && token[0] >= '0' && token[0] <= '9' && token.ends_with('s');
}

std::string describe(const GestureParameter& parameter) {
    const std::string range =
        std::to_string(parameter.lowest) + " to " + std::to_string(parameter.highest);
    switch (parameter.kind) {
        case Kind::Place:
            return "a place such as B3, K, vol+ or -10,4";
        case Kind::Duration:
            return "a duration such as 120ms or 2s (" + std::to_string(parameter.lowest) +
                   "ms to " + std::to_string(parameter.highest) + "ms)";
        case Kind::Number:
            return "a number from " + range;
        case Kind::Key:
            return "a setting's key such as HoldTimeoutMilliseconds";
        case Kind::Json:
            return "a JSON value";
        case Kind::Bytes:
            return "bytes as pairs of hexadecimal digits, at most " +
                   std::to_string(parameter.highest);
        case Kind::None:
            break;
    }
    return "the end of the line";
}

/// One line, taken apart token by token.
class Line {
public:
    Line(std::size_t number, std::string_view text) : number_(number), rest_(text) { skipBlanks(); }

    /// True at the end of the line or at a comment.
    [[nodiscard]] bool atEnd() const { return rest_.empty() || rest_[0] == '#'; }
    [[nodiscard]] std::string_view peek() const {
        return atEnd() ? std::string_view() : rest_.substr(0, rest_.find_first_of(kBlanks));
    }
    std::string_view take() {
        const std::string_view token = peek();
        rest_.remove_prefix(token.size());
        skipBlanks();
        return token;
    }
    /// The rest up to a comment; a `#` in a JSON string begins none.
    std::string_view takeJson() {
        bool inString = false;
        std::size_t end = 0;
        for (; end < rest_.size() && (inString || rest_[end] != '#'); ++end) {
            if (rest_[end] == '"') {
                inString = !inString;
            } else if (inString && rest_[end] == '\\') {
                ++end;
            }
        }
        return std::exchange(rest_, {}).substr(0, end);
    }
    [[nodiscard]] std::size_t number() const { return number_; }

    [[noreturn]] void fail(const std::string& text) const {
        throw GestureScriptError(number_, text);
    }

private:
    void skipBlanks() {
        rest_.remove_prefix(std::min(rest_.find_first_not_of(kBlanks), rest_.size()));
    }

    std::size_t number_;
    std::string_view rest_;
};

const GestureCommandInfo* findGesture(std::string_view name) {
    const auto* found =
        std::find_if(kGestureCommands.begin(), kGestureCommands.end(),
                     [name](const GestureCommandInfo& command) { return command.name == name; });
    return found == kGestureCommands.end() ? nullptr : found;
}

[[noreturn]] void failExpecting(const Line& line, const GestureCommandInfo& info,
                                const GestureParameter& parameter, std::string_view found) {
    line.fail(std::string(info.name) + ": expected " + describe(parameter) +
              (found.empty() ? " for " + std::string(parameter.name) : ", found " + quoted(found)) +
              " (usage: " + gestureUsage(info) + ")");
}

std::uint64_t takeNumber(Line& line, const GestureCommandInfo& info,
                         const GestureParameter& parameter) {
    const std::string_view token = line.peek();
    const bool isDuration = parameter.kind == Kind::Duration;
    if (parameter.optional && (token.empty() || looksLikeDuration(token) != isDuration)) {
        return parameter.fallback;
    }
    const auto value = isDuration ? durationFromText(token) : numberFromText(token);
    if (!value || *value < parameter.lowest || *value > parameter.highest) {
        failExpecting(line, info, parameter, token);
    }
    line.take();
    return *value;
}

SurfacePlace takePlace(Line& line, const GestureCommandInfo& info,
                       const GestureParameter& parameter) {
    const std::string_view token = line.peek();
    const auto place = placeFromText(token);
    if (!place) {
        failExpecting(line, info, parameter, token);
    }
    line.take();
    return *place;
}

std::optional<std::uint8_t> hexDigit(char c) {
    if (c >= '0' && c <= '9') {
        return static_cast<std::uint8_t>(c - '0');
    }
    const char lower = static_cast<char>(c | 0x20);
    return lower >= 'a' && lower <= 'f' ? std::optional(static_cast<std::uint8_t>(lower - 'a' + 10))
                                        : std::nullopt;
}

std::vector<std::uint8_t> takeBytes(Line& line, const GestureCommandInfo& info,
                                    const GestureParameter& parameter) {
    std::vector<std::uint8_t> bytes;
    while (!line.atEnd()) {
        const std::string_view token = line.take();
        for (std::size_t i = 0; i < token.size(); i += 2) {
            const auto high = hexDigit(token[i]);
            const auto low = i + 1 < token.size() ? hexDigit(token[i + 1]) : std::nullopt;
            if (!high || !low || bytes.size() == parameter.highest) {
                failExpecting(line, info, parameter, token);
            }
            bytes.push_back(static_cast<std::uint8_t>(*high << 4U | *low));
        }
    }
    return bytes;
}

/// The key as a pipeline takes it. The host's own form and the algorithm's bare key are accepted.
std::string takeKey(Line& line, const GestureCommandInfo& info, const GestureParameter& parameter) {
    if (line.atEnd()) {
        failExpecting(line, info, parameter, {});
    }
    std::string key(line.take());
    Util::stripDomainFromKey(key, "Pipeline");
    return key.starts_with("Algs.") ? key : "Algs." + key;
}

Vexa::PropertyValue takeJson(Line& line, const GestureCommandInfo& info,
                             const GestureParameter& parameter) {
    const std::string_view text = line.takeJson();
    Vexa::PropertyValue value = Vexa::readJson(text);
    if (!value) {
        failExpecting(line, info, parameter, text);
    }
    return value;
}

GestureCommand readCommand(Line& line, const GestureCommandInfo& info) {
    GestureCommand command;
    command.kind = info.kind;
    command.line = line.number();
    bool hasPlace = false;
    for (const GestureParameter& parameter : info.parameters) {
        switch (parameter.kind) {
            case Kind::Place:
                (hasPlace ? command.target : command.place) = takePlace(line, info, parameter);
                hasPlace = true;
                break;
            case Kind::Duration:
                command.durationMs = static_cast<std::uint32_t>(takeNumber(line, info, parameter));
                break;
            case Kind::Number:
                command.number = takeNumber(line, info, parameter);
                break;
            case Kind::Key:
                command.key = takeKey(line, info, parameter);
                break;
            case Kind::Json:
                command.value = takeJson(line, info, parameter);
                break;
            case Kind::Bytes:
                command.bytes = takeBytes(line, info, parameter);
                break;
            case Kind::None:
                break;
        }
    }
    if (!line.atEnd()) {
        line.fail(std::string(info.name) + ": expected the end of the line, found " +
                  quoted(line.peek()) + " (usage: " + gestureUsage(info) + ")");
    }
    return command;
}

/// What makes sense only after what came before: one finger, reports that are what they say, and
/// the size of the whole.
class ScriptChecker {
public:
    void check(const Line& line, const GestureCommand& command) {
        checkFinger(line, command);
        checkReport(line, command);
        frames_ += framesOf(command);
        if (frames_ > kMaximumScriptFrames) {
            line.fail("the script asks for more than " + std::to_string(kMaximumScriptFrames) +
                      " frames");
        }
    }

    [[nodiscard]] std::uint64_t frames() const { return frames_; }

private:
    void checkFinger(const Line& line, const GestureCommand& command) {
        switch (command.kind) {
            case GestureKind::Tap:
            case GestureKind::Hold:
            case GestureKind::Slide:
            case GestureKind::Palm:
            case GestureKind::Hover:
            case GestureKind::Press:
                if (isPressed_) {
                    line.fail("the finger is still pressed: expected release before another touch");
                }
                isPressed_ = command.kind == GestureKind::Press;
                break;
            case GestureKind::Move:
            case GestureKind::Release:
                if (!isPressed_) {
                    line.fail("no finger is pressed: expected press before move and release");
                }
                isPressed_ = command.kind == GestureKind::Move;
                break;
            default:
                break;
        }
    }

    static void checkReport(const Line& line, const GestureCommand& command) {
        const auto& bytes = command.bytes;
        if (command.kind == GestureKind::Invalid &&
            (InputReport::Image::parse(bytes.data(), bytes.size()) ||
             InputReport::FirmwareEvent::parse(bytes.data(), bytes.size()))) {
            line.fail("invalid: expected bytes that are no report, these are a valid one");
        }
    }

    std::uint64_t framesOf(const GestureCommand& command) {
        const std::uint64_t gap = imagesIn(gapMs_, rate_);
        switch (command.kind) {
            case GestureKind::Tap:
            case GestureKind::Hold:
            case GestureKind::Slide:
            case GestureKind::Palm:
            case GestureKind::Hover:
                return imagesIn(command.durationMs, rate_) + gap;
            case GestureKind::Press:
                return imagesIn(approachMs_, rate_);
            case GestureKind::Release:
                return imagesIn(liftoffMs_, rate_) + gap;
            case GestureKind::Move:
            case GestureKind::Idle:
                return imagesIn(command.durationMs, rate_);
            case GestureKind::Approach:
                approachMs_ = command.durationMs;
                return 0;
            case GestureKind::Liftoff:
                liftoffMs_ = command.durationMs;
                return 0;
            case GestureKind::Gap:
                gapMs_ = command.durationMs;
                return 0;
            case GestureKind::Rate:
                rate_ = command.number;
                return 0;
            case GestureKind::Reset:
            case GestureKind::Firmware:
            case GestureKind::Invalid:
            case GestureKind::Set:
                return 1;
            default:
                return 0;
        }
    }

    bool isPressed_ = false;
    std::uint64_t approachMs_ = kDefaultApproachMs;
    std::uint64_t liftoffMs_ = kDefaultLiftoffMs;
    std::uint64_t gapMs_ = kDefaultGapMs;
    std::uint64_t rate_ = kDefaultRate;
    std::uint64_t frames_ = 0;
};

const GestureCommandInfo& commandOf(Line& line) {
    const std::string_view name = line.take();
    if (const GestureCommandInfo* info = findGesture(name)) {
        return *info;
    }
    std::string text = "expected a command (";
    for (const GestureCommandInfo& info : kGestureCommands) {
        text += info.name;
        text += &info == &kGestureCommands.back() ? ")" : ", ";
    }
    line.fail(text + ", found " + quoted(name));
}

/// The sentence in lines of a terminal's width, indented below its command.
void appendWrapped(std::string& text, std::string_view sentence) {
    constexpr std::size_t kIndent = 6;
    constexpr std::size_t kWidth = 72;
    while (!sentence.empty()) {
        const bool fits = sentence.size() <= kWidth;
        const std::size_t end = fits ? sentence.size() : sentence.rfind(' ', kWidth);
        text += std::string(kIndent, ' ') + std::string(sentence.substr(0, end)) + "\n";
        sentence.remove_prefix(std::min(end + 1, sentence.size()));
    }
}

std::string markdownCode(std::string_view text) {
    return "`" + std::string(text) + "`";
}

}  // namespace

GestureScriptError::GestureScriptError(std::size_t line, const std::string& text)
    : std::runtime_error("line " + std::to_string(line) + ": " + text), line_(line) {}

GestureScript GestureScript::parse(std::string_view text) {
    if (text.size() > kMaximumScriptBytes) {
        throw GestureScriptError(
            1, "the script is larger than " + std::to_string(kMaximumScriptBytes) + " bytes");
    }
    GestureScript script;
    ScriptChecker checker;
    for (std::size_t number = 1; !text.empty(); ++number) {
        const std::size_t end = std::min(text.find('\n'), text.size());
        Line line(number, text.substr(0, end));
        text.remove_prefix(std::min(end + 1, text.size()));
        if (line.atEnd()) {
            continue;
        }
        script.commands.push_back(readCommand(line, commandOf(line)));
        checker.check(line, script.commands.back());
    }
    script.frames = checker.frames();
    return script;
}

std::uint64_t imagesIn(std::uint64_t durationMs, std::uint64_t rate) noexcept {
    return (durationMs * rate + 999) / 1000;
}

std::string gestureUsage(const GestureCommandInfo& command) {
    std::string text(command.name);
    for (const GestureParameter& parameter : command.parameters) {
        if (parameter.kind != Kind::None) {
            const std::string name(parameter.name);
            text += parameter.optional ? " [" + name + "]" : " " + name;
        }
    }
    return text;
}

std::string gestureCommandHelp() {
    std::string text;
    for (const GestureCommandInfo& command : kGestureCommands) {
        text += "  " + gestureUsage(command) + "\n";
        appendWrapped(text, command.help);
    }
    return text;
}

std::string gestureCommandMarkdown() {
    std::string text = "| command | what it does | example |\n|---|---|---|\n";
    for (const GestureCommandInfo& command : kGestureCommands) {
        std::string defaults;
        for (const GestureParameter& parameter : command.parameters) {
            if (parameter.kind == Kind::Duration && parameter.optional) {
                defaults = " (`DURATION`: " + std::to_string(parameter.fallback) + "ms.)";
            }
        }
        text += "| " + markdownCode(gestureUsage(command)) + " | " + std::string(command.help) +
                defaults + " | " + markdownCode(command.example) + " |\n";
    }
    return text;
}

}  // namespace VexaTouch::Tools
