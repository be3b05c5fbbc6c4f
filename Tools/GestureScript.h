#pragma once

#include "Platform/PropertyValue.h"
#include "Tools/SurfaceLayout.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

enum class GestureKind : std::uint8_t {
    Tap,
    Hold,
    Slide,
    Palm,
    Hover,
    Press,
    Move,
    Release,
    Idle,
    Strength,
    Finger,
    Approach,
    Liftoff,
    Gap,
    Noise,
    Drift,
    Rate,
    Seed,
    Reset,
    Firmware,
    Invalid,
    Set,
    Clock,
    Frame,
    Skip,
};

/// What a parameter of a command is. The fallback of an optional one and the bounds are numbers
/// (of a duration: milliseconds).
struct GestureParameter {
    enum class Kind : std::uint8_t { None, Place, Duration, Number, Key, Json, Bytes };

    Kind kind = Kind::None;
    std::string_view name{};
    bool optional = false;
    std::uint64_t fallback = 0;
    std::uint64_t lowest = 0;
    std::uint64_t highest = 0;
};

/// One command of the language: parser, help and documentation read this table.
struct GestureCommandInfo {
    GestureKind kind;
    std::string_view name;
    std::array<GestureParameter, 4> parameters;
    std::string_view help;
    std::string_view example;
};

/// What a script starts with; each has a command that changes it.
inline constexpr std::uint32_t kDefaultStrength = 350;
inline constexpr std::uint32_t kDefaultFinger = 12;
inline constexpr std::uint32_t kDefaultApproachMs = 40;
inline constexpr std::uint32_t kDefaultLiftoffMs = 40;
inline constexpr std::uint32_t kDefaultGapMs = 100;
inline constexpr std::uint32_t kDefaultNoise = 4;
inline constexpr std::uint32_t kDefaultDrift = 3;
inline constexpr std::uint32_t kDefaultRate = 100;
inline constexpr std::uint64_t kDefaultSeed = 1;

// Limits, so that a slip of the finger asks for no endless recording.
inline constexpr std::size_t kMaximumScriptBytes = 1'048'576;
inline constexpr std::uint64_t kMaximumScriptFrames = 2'000'000;  ///< 5.5 hours at 100 Hz
inline constexpr std::uint64_t kMaximumDurationMs = 3'600'000;    ///< of one command
inline constexpr std::uint64_t kMaximumStrength = 20'000;

namespace Detail {

using Kind = GestureParameter::Kind;
inline constexpr std::uint64_t kWord = 0xFFFFFFFFU;

constexpr GestureParameter place(std::string_view name) {
    return {Kind::Place, name};
}
constexpr GestureParameter duration(std::uint64_t lowest = 0) {
    return {Kind::Duration, "DURATION", false, 0, lowest, kMaximumDurationMs};
}
constexpr GestureParameter durationOr(std::uint64_t fallback) {
    return {Kind::Duration, "DURATION", true, fallback, 1, kMaximumDurationMs};
}
constexpr GestureParameter number(std::string_view name, std::uint64_t lowest,
                                  std::uint64_t highest) {
    return {Kind::Number, name, false, 0, lowest, highest};
}
/// Falls back to what the command `strength` set.
inline constexpr GestureParameter kStrengthOrCurrent = {Kind::Number,    "STRENGTH", true, 0, 1,
                                                        kMaximumStrength};

}  // namespace Detail

inline constexpr std::array<GestureCommandInfo, 25> kGestureCommands = {{
    {GestureKind::Tap,
     "tap",
     {Detail::place("PLACE"), Detail::durationOr(120), Detail::kStrengthOrCurrent},
     "A short touch, approach and lift-off included.",
     "tap B3 120ms 350"},
    {GestureKind::Hold,
     "hold",
     {Detail::place("PLACE"), Detail::durationOr(900), Detail::kStrengthOrCurrent},
     "A long touch.",
     "hold vol- 900ms"},
    {GestureKind::Slide,
     "slide",
     {Detail::place("FROM"), Detail::place("TO"), Detail::durationOr(600),
      Detail::kStrengthOrCurrent},
     "A touch that moves from one place to another, slowest at both ends.",
     "slide vol+ vol- 600ms"},
    {GestureKind::Palm,
     "palm",
     {Detail::durationOr(800), Detail::kStrengthOrCurrent},
     "A palm over the whole surface.",
     "palm 800ms"},
    {GestureKind::Hover,
     "hover",
     {Detail::place("PLACE"), Detail::durationOr(300)},
     "A finger that comes close, above noise, but never touches.",
     "hover K 300ms"},
    {GestureKind::Press,
     "press",
     {Detail::place("PLACE"), Detail::kStrengthOrCurrent},
     "The finger comes down and stays until `release`.",
     "press play 350"},
    {GestureKind::Move,
     "move",
     {Detail::place("PLACE"), Detail::durationOr(200)},
     "The pressed finger moves, slowest at both ends.",
     "move vol- 200ms"},
    {GestureKind::Release, "release", {}, "The pressed finger lifts off.", "release"},
    {GestureKind::Idle,
     "idle",
     {Detail::duration(1)},
     "Time passes; a pressed finger stays where it is.",
     "idle 300ms"},
    {GestureKind::Strength,
     "strength",
     {Detail::number("N", 1, kMaximumStrength)},
     "Scaled value of a pad right under a finger, for the gestures that name none (at first 350).",
     "strength 350"},
    {GestureKind::Finger,
     "finger",
     {Detail::number("SIZE", 1, 60)},
     "Radius of a finger's footprint in surface units (at first 12).",
     "finger 12"},
    {GestureKind::Approach,
     "approach",
     {Detail::duration()},
     "Time in which a finger comes down (at first 40ms, at most half a touch).",
     "approach 40ms"},
    {GestureKind::Liftoff,
     "liftoff",
     {Detail::duration()},
     "Time in which a finger lifts off (at first 40ms, at most half a touch).",
     "liftoff 40ms"},
    {GestureKind::Gap,
     "gap",
     {Detail::duration()},
     "Rest after each touch (at first 100ms).",
     "gap 100ms"},
    {GestureKind::Noise,
     "noise",
     {Detail::number("N", 0, 1000)},
     "Amplitude of the sensor's noise in raw counts (at first 4).",
     "noise 8"},
    {GestureKind::Drift,
     "drift",
     {Detail::number("N", 0, 1000)},
     "How far each pixel's zero may wander, in raw counts (at first 3).",
     "drift 10"},
    {GestureKind::Rate,
     "rate",
     {Detail::number("HZ", 1, 1000)},
     "Images a second (at first 100).",
     "rate 100"},
    {GestureKind::Seed,
     "seed",
     {Detail::number("N", 0, 0xFFFFFFFFFFFFFFFFU)},
     "Starts the random numbers anew (at first 1); ignored when the caller gives a seed.",
     "seed 7"},
    {GestureKind::Reset,
     "reset",
     {},
     "The firmware resets: its event, then frame numbers and device clock start from 0.",
     "reset"},
    {GestureKind::Firmware,
     "firmware",
     {Detail::number("CODE", 0, 255), {Detail::Kind::Bytes, "HEX...", true, 0, 0, 8}},
     "A firmware event with up to eight data bytes; nothing else changes.",
     "firmware 3 01 a0"},
    {GestureKind::Invalid,
     "invalid",
     {{{Detail::Kind::Bytes, "HEX...", true, 0, 0, 65'536}}},
     "A report that is neither image nor firmware event; without bytes an empty one.",
     "invalid 07 00 ff"},
    {GestureKind::Set,
     "set",
     {{{Detail::Kind::Key, "KEY"}, {Detail::Kind::Json, "JSON"}}},
     "A change of an algorithm setting, which takes effect at the next image.",
     "set HoldTimeoutMilliseconds 300"},
    {GestureKind::Clock,
     "clock",
     {Detail::number("MS", 0, Detail::kWord)},
     "Device time of the next image; it goes on from there and wraps.",
     "clock 4294967000"},
    {GestureKind::Frame,
     "frame",
     {Detail::number("N", 0, Detail::kWord)},
     "Frame number of the next image; it goes on from there and wraps.",
     "frame 500"},
    {GestureKind::Skip,
     "skip",
     {Detail::number("N", 1, Detail::kWord)},
     "Leaves out that many frame numbers.",
     "skip 3"},
}};

/// One command as read. Members that the command's parameters do not name keep their defaults.
struct GestureCommand {
    GestureKind kind = GestureKind::Idle;
    std::size_t line = 0;  ///< counted from 1
    SurfacePlace place;    ///< of `slide` where it begins
    SurfacePlace target;   ///< of `slide` where it ends
    std::uint32_t durationMs = 0;
    std::uint64_t number = 0;  ///< the parameter in capitals; a strength of 0 is the current one
    std::vector<std::uint8_t> bytes;
    std::string key;  ///< as a pipeline takes it, the domain "Algs" included
    Vexa::PropertyValue value;
};

/// A script that cannot be read: which line, what was wrong and what was expected.
class GestureScriptError : public std::runtime_error {
public:
    GestureScriptError(std::size_t line, const std::string& text);
    /// Counted from 1.
    [[nodiscard]] std::size_t line() const noexcept { return line_; }

private:
    std::size_t line_;
};

/// A script of gestures: one command a line, `#` begins a comment.
struct GestureScript {
    std::vector<GestureCommand> commands;
    std::uint64_t frames = 0;  ///< how many frames it makes

    /// Throws GestureScriptError; no script that it accepts is larger than the limits above.
    static GestureScript parse(std::string_view text);
};

/// How many images a duration takes, the last one begun included. `rate` in Hz, not 0.
std::uint64_t imagesIn(std::uint64_t durationMs, std::uint64_t rate) noexcept;

/// The command with its parameters: "tap PLACE [DURATION] [STRENGTH]".
std::string gestureUsage(const GestureCommandInfo& command);
/// All commands with what they do, in lines for a terminal, each indented by two spaces or more.
std::string gestureCommandHelp();
/// The same as a Markdown table.
std::string gestureCommandMarkdown();

}  // namespace VexaTouch::Tools
