#include "Tools/TerminalText.h"

#include <gtest/gtest.h>

namespace VexaTouch::Tools {
namespace {

TEST(TerminalText, KeepsTextOfAnyLanguage) {
    EXPECT_EQ(forTerminal("Algs.X = 1, \u00e9 \u6f22 \U0001f600 \u00a0"),
              "Algs.X = 1, \u00e9 \u6f22 \U0001f600 \u00a0");
}

TEST(TerminalText, ReplacesWhatATerminalActsOn) {
    EXPECT_EQ(forTerminal("\x1b[2Jgone\x07\n\x7f"), "?[2Jgone???");
    EXPECT_EQ(forTerminal("\u009b2J \u0080\u009f"), "?2J ??");
    EXPECT_EQ(forTerminal("cut \xc2"), "cut \xc2");
}

}  // namespace
}  // namespace VexaTouch::Tools
