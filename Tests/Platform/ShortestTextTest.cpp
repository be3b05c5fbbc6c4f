#include "Platform/ShortestText.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <limits>
#include <string>

namespace Vexa {
namespace {

template <class Real>
std::string shortest(Real value) {
    std::string text = ">";
    appendShortest(text, value);
    return text.substr(1);
}

TEST(ShortestTextTest, IsAsShortAsItsTypeAllows) {
    EXPECT_EQ(shortest(0.1f), "0.1");
    EXPECT_EQ(shortest(static_cast<double>(0.1f)), "0.10000000149011612");
    EXPECT_EQ(shortest(0.1), "0.1");
    EXPECT_EQ(shortest(0.30000000000000004), "0.30000000000000004");
    EXPECT_EQ(shortest(16777216.0f), "16777216.0");
}

TEST(ShortestTextTest, AlwaysHasAPointOrAnExponent) {
    EXPECT_EQ(shortest(200.0), "200.0");
    EXPECT_EQ(shortest(0.0f), "0.0");
    EXPECT_EQ(shortest(-0.0), "-0.0");
    EXPECT_EQ(shortest(-3.0f), "-3.0");
    EXPECT_EQ(shortest(1e300), "1e+300");
    EXPECT_EQ(shortest(5e-324), "5e-324");
    EXPECT_EQ(shortest(0x1p64), "18446744073709551616.0");
}

TEST(ShortestTextTest, NamesWhatIsNotFinite) {
    EXPECT_EQ(shortest(std::numeric_limits<float>::infinity()), "inf");
    EXPECT_EQ(shortest(-std::numeric_limits<double>::infinity()), "-inf");
    EXPECT_EQ(shortest(std::numeric_limits<float>::quiet_NaN()), "nan");
    EXPECT_EQ(shortest(-std::numeric_limits<double>::quiet_NaN()), "nan");
}

TEST(ShortestTextTest, AppendsBehindWhatIsThere) {
    std::string text = "x=";
    appendShortest(text, 1.5f);
    text += ", y=";
    appendShortest(text, 2.0);
    EXPECT_EQ(text, "x=1.5, y=2.0");
}

TEST(ShortestTextTest, ReadsBackAtTheEdgesOfTheTypes) {
    for (const double value :
         {std::numeric_limits<double>::max(), std::numeric_limits<double>::lowest(),
          std::numeric_limits<double>::min(), std::numeric_limits<double>::denorm_min()}) {
        EXPECT_EQ(std::strtod(shortest(value).c_str(), nullptr), value);
    }
    for (const float value :
         {std::numeric_limits<float>::max(), std::numeric_limits<float>::lowest(),
          std::numeric_limits<float>::min(), std::numeric_limits<float>::denorm_min()}) {
        EXPECT_EQ(std::strtof(shortest(value).c_str(), nullptr), value);
    }
}

}  // namespace
}  // namespace Vexa
