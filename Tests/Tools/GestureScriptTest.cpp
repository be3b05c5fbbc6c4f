#include "Tools/GestureScript.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <sstream>
#include <string>

namespace VexaTouch::Tools {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;
using Vexa::PropertyValue;

constexpr std::int32_t kUnit = SurfacePlace::kUnit;

GestureCommand onlyCommand(std::string_view line) {
    const GestureScript script = GestureScript::parse(line);
    EXPECT_EQ(script.commands.size(), 1U) << line;
    return script.commands.empty() ? GestureCommand{} : script.commands[0];
}

std::string errorOf(std::string_view text) {
    try {
        GestureScript::parse(text);
    } catch (const GestureScriptError& error) {
        return error.what();
    }
    return "no error";
}

TEST(GestureScriptTest, ReadsPlaceDurationAndStrength) {
    const GestureCommand tap = onlyCommand("tap B3 120ms 350");
    EXPECT_EQ(tap.kind, GestureKind::Tap);
    EXPECT_EQ(tap.line, 1U);
    EXPECT_EQ(tap.place, (SurfacePlace{-10 * kUnit, -4 * kUnit}));
    EXPECT_EQ(tap.durationMs, 120U);
    EXPECT_EQ(tap.number, 350U);
}

TEST(GestureScriptTest, LeftOutParametersHaveTheirDefaults) {
    EXPECT_EQ(onlyCommand("tap K").durationMs, 120U);
    EXPECT_EQ(onlyCommand("tap K").number, 0U);
    EXPECT_EQ(onlyCommand("hold K").durationMs, 900U);
    EXPECT_EQ(onlyCommand("slide K L").durationMs, 600U);
    EXPECT_EQ(onlyCommand("palm").durationMs, 800U);
}

TEST(GestureScriptTest, StrengthMayFollowAPlaceWithoutADuration) {
    const GestureCommand tap = onlyCommand("tap K 500");
    EXPECT_EQ(tap.durationMs, 120U);
    EXPECT_EQ(tap.number, 500U);
    EXPECT_EQ(onlyCommand("palm 500").number, 500U);
}

TEST(GestureScriptTest, SlideHasTwoPlaces) {
    const GestureCommand slide = onlyCommand("slide vol+ vol- 2s");
    EXPECT_EQ(slide.place, (SurfacePlace{0, -11 * kUnit}));
    EXPECT_EQ(slide.target, (SurfacePlace{0, 11 * kUnit}));
    EXPECT_EQ(slide.durationMs, 2000U);
}

TEST(GestureScriptTest, PlacesAreNamesLettersGridPlacesAndCoordinates) {
    EXPECT_EQ(placeFromText("play"), (SurfacePlace{-13 * kUnit, 0}));
    EXPECT_EQ(placeFromText("K"), (SurfacePlace{0, 0}));
    EXPECT_EQ(placeFromText("A"), (SurfacePlace{11 * kUnit, -8 * kUnit})) << "the upper pad";
    EXPECT_EQ(placeFromText("L"), (SurfacePlace{-7 * kUnit, 6 * kUnit})) << "the left pad";
    EXPECT_EQ(placeFromText("A1"), (SurfacePlace{-15 * kUnit, -12 * kUnit}));
    EXPECT_EQ(placeFromText("D4"), (SurfacePlace{0, 0}));
    EXPECT_EQ(placeFromText("G7"), (SurfacePlace{15 * kUnit, 12 * kUnit}));
    EXPECT_EQ(placeFromText("-20,20"), (SurfacePlace{-20 * kUnit, 20 * kUnit}));
    for (const char* wrong : {"", "P", "a", "H1", "A8", "A0", "B33", "21,0", "0,-21", "1,", ",1",
                              "1,2,3", "1.5,2", "vol", "Play", "+1,2", "1 ,2"}) {
        EXPECT_EQ(placeFromText(wrong), std::nullopt) << wrong;
    }
}

TEST(GestureScriptTest, EveryPixelLetterIsAPlaceOnAPadOfThatPixel) {
    for (char letter = 'A'; letter <= 'O'; ++letter) {
        const auto place = placeFromText(std::string_view(&letter, 1));
        ASSERT_TRUE(place) << letter;
        int pads = 0;
        for (const SurfacePad& pad : kSurfacePads) {
            pads += pad.letter == letter && pad.place() == *place ? 1 : 0;
        }
        EXPECT_EQ(pads, 1) << letter;
    }
}

TEST(GestureScriptTest, CommentsAndEmptyLinesAreSkippedAndLinesKeepTheirNumbers) {
    const GestureScript script =
        GestureScript::parse("# a comment\n\n  \t\r\ntap K # another\r\n#tap L\n  press O\n");
    ASSERT_EQ(script.commands.size(), 2U);
    EXPECT_EQ(script.commands[0].kind, GestureKind::Tap);
    EXPECT_EQ(script.commands[0].line, 4U);
    EXPECT_EQ(script.commands[1].kind, GestureKind::Press);
    EXPECT_EQ(script.commands[1].line, 6U);
    EXPECT_THAT(GestureScript::parse("").commands, IsEmpty());
}

TEST(GestureScriptTest, BytesArePairsOfDigits) {
    EXPECT_EQ(onlyCommand("invalid 07 00Ff").bytes, (std::vector<std::uint8_t>{7, 0, 255}));
    EXPECT_THAT(onlyCommand("invalid").bytes, IsEmpty());
    const GestureCommand firmware = onlyCommand("firmware 255 0102030405060708");
    EXPECT_EQ(firmware.number, 255U);
    EXPECT_EQ(firmware.bytes.size(), 8U);
}

TEST(GestureScriptTest, SettingsKeysMayBeTheHostsThePipelinesOrBare) {
    EXPECT_EQ(onlyCommand("set Pipeline.Algs.ActivationThreshold 1").key,
              "Algs.ActivationThreshold");
    EXPECT_EQ(onlyCommand("set Algs.ActivationThreshold 1").key, "Algs.ActivationThreshold");
    EXPECT_EQ(onlyCommand("set ActivationThreshold 1").key, "Algs.ActivationThreshold");
    EXPECT_EQ(onlyCommand("set VirtualNormalizationFactors.3 1").key,
              "Algs.VirtualNormalizationFactors.3");
}

TEST(GestureScriptTest, SettingsValuesAreJsonUpToAComment) {
    EXPECT_EQ(onlyCommand("set K 200.0").value, PropertyValue(200.0));
    EXPECT_EQ(onlyCommand("set K 18446744073709551615 # all").value, PropertyValue(UINT64_MAX));
    EXPECT_EQ(onlyCommand("set K null").value, PropertyValue::null());
    EXPECT_EQ(onlyCommand(R"(set K "a # and \" # in a string" # a comment)").value,
              PropertyValue("a # and \" # in a string"));
    EXPECT_EQ(onlyCommand("set K [1, true]").value,
              PropertyValue(PropertyValue::Array{PropertyValue(1), PropertyValue(true)}));
}

TEST(GestureScriptTest, WideNumbersKeepAllTheirBits) {
    EXPECT_EQ(onlyCommand("seed 18446744073709551615").number, UINT64_MAX);
    EXPECT_EQ(onlyCommand("clock 4294967295").number, 4294967295U);
}

struct ErrorCase {
    std::string_view script;
    std::string_view text;
};

TEST(GestureScriptTest, ErrorsSayTheLineAndWhatWasExpected) {
    const ErrorCase cases[] = {
        {"tap K\ntip K", "line 2: expected a command (tap, hold, slide, "},
        {"tap K\ntip K", "skip), found \"tip\""},
        {"tap", "line 1: tap: expected a place such as B3, K, vol+ or -10,4 for PLACE"},
        {"\n\ntap Z9", "line 3: tap: expected a place such as B3, K, vol+ or -10,4, found \"Z9\""},
        {"tap Z9", "(usage: tap PLACE [DURATION] [STRENGTH])"},
        {"slide K", "slide: expected a place such as B3, K, vol+ or -10,4 for TO"},
        {"tap K 0ms", "expected a duration such as 120ms or 2s (1ms to 3600000ms), found \"0ms\""},
        {"tap K 3601s", "found \"3601s\""},
        {"idle 18446744073709551615s", "found \"18446744073709551615s\""},
        {"idle 18446744073709551616ms", "found \"18446744073709551616ms\""},
        {"idle", "idle: expected a duration such as 120ms or 2s (1ms to 3600000ms) for DURATION"},
        {"idle 12", "found \"12\""},
        {"idle ms", "found \"ms\""},
        {"tap K 120ms 0", "expected a number from 1 to 20000, found \"0\""},
        {"tap K 120ms x", "expected a number from 1 to 20000, found \"x\""},
        {"tap K 120ms 5 5", "tap: expected the end of the line, found \"5\""},
        {"release now", "release: expected the end of the line, found \"now\""},
        {"reset now", "reset: expected the end of the line, found \"now\""},
        {"noise 1001", "expected a number from 0 to 1000, found \"1001\""},
        {"noise -1", "found \"-1\""},
        {"rate 0", "expected a number from 1 to 1000, found \"0\""},
        {"clock 4294967296", "expected a number from 0 to 4294967295"},
        {"firmware 256", "expected a number from 0 to 255"},
        {"firmware 1 010203040506070809",
         "expected bytes as pairs of hexadecimal digits, at most 8"},
        {"invalid 0", "expected bytes as pairs of hexadecimal digits"},
        {"invalid 0g", "found \"0g\""},
        {"invalid 02 00 00 00 00 00 00 00 00 00", "these are a valid one"},
        {"set", "set: expected a setting's key such as HoldTimeoutMilliseconds for KEY"},
        {"set K", "set: expected a JSON value for JSON"},
        {"set K {", "set: expected a JSON value, found \"{\""},
        {"set K 1 2", "found \"1 2\""},
        {"press K\ntap K", "line 2: the finger is still pressed: expected release before"},
        {"press K\npress K", "line 2: the finger is still pressed"},
        {"move K", "no finger is pressed: expected press before move and release"},
        {"press K\nrelease\nrelease", "line 3: no finger is pressed"},
        {"\x1b[31m\n", "found \"?[31m\""},
        {"tap AAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAA",
         "found \"AAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAAA...\""},
    };
    for (const ErrorCase& wrong : cases) {
        EXPECT_THAT(errorOf(wrong.script), HasSubstr(wrong.text)) << wrong.script;
    }
}

TEST(GestureScriptTest, AnErrorKnowsItsLine) {
    try {
        GestureScript::parse("tap K\n\ntap");
        FAIL() << "no error";
    } catch (const GestureScriptError& error) {
        EXPECT_EQ(error.line(), 3U);
    }
}

TEST(GestureScriptTest, AScriptCannotAskForMoreThanTheLimits) {
    EXPECT_EQ(errorOf("rate 500\nidle 3600s"), "no error");
    EXPECT_THAT(errorOf("rate 500\nidle 3600s\nidle 3600s"),
                StartsWith("line 3: the script asks for more than 2000000 frames"));
    EXPECT_THAT(errorOf("rate 1000\nidle 1999s\ngap 2s\ntap K"), StartsWith("line 4: the script"));
    EXPECT_EQ(errorOf(std::string(kMaximumScriptBytes, '\n')), "no error");
    EXPECT_THAT(errorOf(std::string(kMaximumScriptBytes + 1, '\n')),
                HasSubstr("larger than 1048576 bytes"));
}

TEST(GestureScriptTest, EveryCommandsExampleReadsAsThatCommand) {
    for (const GestureCommandInfo& command : kGestureCommands) {
        const bool needsFinger =
            command.kind == GestureKind::Move || command.kind == GestureKind::Release;
        const std::string text = (needsFinger ? "press K\n" : "") + std::string(command.example);
        const GestureScript script = GestureScript::parse(text);
        ASSERT_FALSE(script.commands.empty()) << command.name;
        EXPECT_EQ(script.commands.back().kind, command.kind) << command.name;
    }
}

TEST(GestureScriptTest, HelpNamesTheDefaultsThatAScriptStartsWith) {
    const auto help = [](GestureKind kind) {
        return std::string(kGestureCommands[static_cast<std::size_t>(kind)].help);
    };
    const auto atFirst = [](std::uint64_t value) { return "(at first " + std::to_string(value); };
    EXPECT_THAT(help(GestureKind::Strength), HasSubstr(atFirst(kDefaultStrength) + ")"));
    EXPECT_THAT(help(GestureKind::Finger), HasSubstr(atFirst(kDefaultFinger) + ")"));
    EXPECT_THAT(help(GestureKind::Approach), HasSubstr(atFirst(kDefaultApproachMs) + "ms"));
    EXPECT_THAT(help(GestureKind::Liftoff), HasSubstr(atFirst(kDefaultLiftoffMs) + "ms"));
    EXPECT_THAT(help(GestureKind::Gap), HasSubstr(atFirst(kDefaultGapMs) + "ms)"));
    EXPECT_THAT(help(GestureKind::Noise), HasSubstr(atFirst(kDefaultNoise) + ")"));
    EXPECT_THAT(help(GestureKind::Drift), HasSubstr(atFirst(kDefaultDrift) + ")"));
    EXPECT_THAT(help(GestureKind::Rate), HasSubstr(atFirst(kDefaultRate) + ")"));
    EXPECT_THAT(help(GestureKind::Seed), HasSubstr(atFirst(kDefaultSeed) + ")"));
}

TEST(GestureScriptTest, TerminalHelpNamesEveryCommandInNarrowLines) {
    const std::string help = gestureCommandHelp();
    for (const GestureCommandInfo& command : kGestureCommands) {
        EXPECT_THAT(help, HasSubstr("  " + gestureUsage(command) + "\n"));
    }
    std::istringstream lines(help);
    for (std::string line; std::getline(lines, line);) {
        EXPECT_LE(line.size(), 79U) << line;
        EXPECT_THAT(line, StartsWith("  "));
    }
}

TEST(GestureScriptTest, TheDocumentationHoldsTheTableOfCommands) {
    std::ifstream file(VEXA_SOURCE_DIR "/docs/gesture-scripts.md");
    const std::string text((std::istreambuf_iterator<char>(file)),
                           std::istreambuf_iterator<char>());
    EXPECT_THAT(text, HasSubstr(gestureCommandMarkdown()));
}

}  // namespace
}  // namespace VexaTouch::Tools
