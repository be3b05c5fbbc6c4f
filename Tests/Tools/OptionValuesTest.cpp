#include "Tools/OptionValues.h"

#include "Tests/Tools/CommandRun.h"

#include <gmock/gmock.h>

#include <string>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;

// Read through the commands that have such options: their values only come from a command line.
std::string complaint(const std::vector<std::string>& arguments) {
    const CommandResult result = runCommand(arguments);
    EXPECT_EQ(result.exitCode, 2) << result;
    return result.error;
}

TEST(OptionValuesTest, NumbersAreWholeAndWithinTheirBounds) {
    for (const char* wrong :
         {"0", "2000001", "-1", "1.5", "1x", "", " 1", "99999999999999999999"}) {
        SCOPED_TRACE(wrong);
        EXPECT_THAT(complaint({"latency", "--count", wrong}),
                    HasSubstr("--count: expected a number from 1 to 2000000, found \"" +
                              std::string(wrong) + "\"\n"));
    }
}

TEST(OptionValuesTest, RatesAreAbove0) {
    for (const char* wrong : {"0", "-5", "nan", "inf", "1e9", "fast", "10Hz", ""}) {
        SCOPED_TRACE(wrong);
        EXPECT_THAT(complaint({"latency", "--rate", wrong}),
                    HasSubstr("--rate: expected a number above 0, at most 100000, found \"" +
                              std::string(wrong) + "\"\n"));
    }
}

TEST(OptionValuesTest, TimesHaveAUnitOrAreSeconds) {
    for (const char* wrong : {"-1s", "1d", "s", "1 s", "nan", "inf", "1e300", "", "2minutes"}) {
        SCOPED_TRACE(wrong);
        EXPECT_THAT(complaint({"latency", "--duration", wrong}),
                    HasSubstr("--duration: expected a time such as 10, 10s, 500ms or 2min, found "
                              "\"" +
                              std::string(wrong) + "\"\n"));
    }
}

}  // namespace
}  // namespace VexaTouch::Testing
