#include "Platform/JsonValueBuilder.h"

#include <gtest/gtest.h>

namespace Vexa {
namespace {

PropertyValue value(JsonValueBuilder& builder) {
    EXPECT_TRUE(builder.isComplete());
    return builder.take();
}

TEST(JsonValueBuilderTest, BuildsWhatItIsTold) {
    JsonValueBuilder builder;
    builder.onObjectBegin();
    builder.onKey("list", true);
    builder.onArrayBegin();
    builder.onNumber({.kind = JsonNumber::Kind::Unsigned, .unsignedValue = 7});
    builder.onString("te", false);
    builder.onString("xt", true);
    builder.onBoolean(true);
    builder.onNull();
    builder.onArrayEnd();
    builder.onKey("em", false);
    builder.onKey("pty", true);
    builder.onObjectBegin();
    EXPECT_FALSE(builder.isComplete());
    builder.onObjectEnd();
    builder.onObjectEnd();
    EXPECT_EQ(value(builder),
              PropertyValue(PropertyValue::Dictionary{
                  {"list", PropertyValue::Array{7u, "text", true, PropertyValue::null()}},
                  {"empty", PropertyValue::Dictionary{}}}));
}

TEST(JsonValueBuilderTest, KeepsEachKindOfNumber) {
    JsonValueBuilder builder;
    builder.onNumber({.kind = JsonNumber::Kind::Signed, .signedValue = -1});
    EXPECT_EQ(value(builder).type(), PropertyValue::Type::Signed);
    builder.onNumber({.kind = JsonNumber::Kind::Unsigned, .unsignedValue = 1});
    EXPECT_EQ(value(builder).type(), PropertyValue::Type::Unsigned);
    builder.onNumber({.kind = JsonNumber::Kind::Double, .doubleValue = 1});
    EXPECT_EQ(value(builder).type(), PropertyValue::Type::Double);
}

TEST(JsonValueBuilderTest, TheLastOfDuplicateMembersStands) {
    JsonValueBuilder builder;
    builder.onObjectBegin();
    for (const char* text : {"first", "second", "third"}) {
        builder.onKey("a", true);
        builder.onString(text, true);
    }
    builder.onObjectEnd();
    EXPECT_EQ(value(builder), PropertyValue(PropertyValue::Dictionary{{"a", "third"}}));
}

TEST(JsonValueBuilderTest, NullIsACompleteValue) {
    JsonValueBuilder builder;
    EXPECT_FALSE(builder.isComplete());
    builder.onNull();
    EXPECT_EQ(value(builder), PropertyValue::null());
}

TEST(JsonValueBuilderTest, TakingHalfAValueGivesNoneAndStartsAgain) {
    JsonValueBuilder builder;
    builder.onArrayBegin();
    builder.onString("half", false);
    EXPECT_FALSE(builder.isComplete());
    EXPECT_FALSE(builder.take());
    builder.onString("whole", true);
    EXPECT_EQ(value(builder), PropertyValue("whole"));
    EXPECT_FALSE(builder.take());
}

}  // namespace
}  // namespace Vexa
