// Values by the C interface, as a host or plug-in in another language meets them.

#include "Platform/Handle.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <vexa/abi.h>
#include <vexa/value.h>

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

namespace Vexa {
namespace {

using testing::Each;
using testing::ElementsAre;

using Value = Handle<const vexa_value, vexa_value_retain, vexa_value_release>;

Value text(std::string_view content) {
    return Value::adopt(vexa_value_create_string(content.data(), content.size()));
}

Value number(std::int64_t content) {
    return Value::adopt(vexa_value_create_signed(content));
}

Value array(const std::vector<const vexa_value*>& elements) {
    return Value::adopt(vexa_value_create_array(elements.data(), elements.size()));
}

vexa_member member(std::string_view key, const vexa_value* value) {
    return {key.data(), key.size(), value};
}

Value dictionary(const std::vector<vexa_member>& members) {
    return Value::adopt(vexa_value_create_dictionary_of(members.data(), members.size()));
}

/// The array in an array and so on, around the innermost value.
Value nested(int depth, Value innermost) {
    for (int level = 0; level < depth; ++level) innermost = array({innermost.get()});
    return innermost;
}

/// One of each type, in the order of types.
std::vector<Value> oneOfEach() {
    const Value one = number(1);
    constexpr std::array<std::uint8_t, 2> kBytes{0x0F, 0xA0};
    return {Value(),
            Value::adopt(vexa_value_create_null()),
            Value::adopt(vexa_value_create_boolean(true)),
            number(-1),
            Value::adopt(vexa_value_create_unsigned(2)),
            Value::adopt(vexa_value_create_float(0.1f)),
            Value::adopt(vexa_value_create_double(2.5)),
            text("text"),
            Value::adopt(vexa_value_create_bytes(kBytes.data(), kBytes.size())),
            array({one.get()}),
            dictionary({member("one", one.get())})};
}

std::string stringOf(const vexa_value* value) {
    std::size_t length = 0;
    const char* content = vexa_value_get_string(value, &length);
    return content ? std::string(content, length) : "(no string)";
}

std::string description(const vexa_value* value) {
    return stringOf(Value::adopt(vexa_value_create_description(value)).get());
}

std::vector<std::string> keysOf(const Value& value) {
    std::vector<std::string> keys;
    for (std::size_t index = 0; index < vexa_value_get_count(value.get()); ++index) {
        std::size_t length = 0;
        const char* key = vexa_value_get_key(value.get(), index, &length);
        EXPECT_EQ(key[length], '\0');
        keys.emplace_back(key, length);
    }
    return keys;
}

/// Every test ends with as many values as it began with.
class VexaValueTest : public testing::Test {
protected:
    void TearDown() override { EXPECT_EQ(live(), 0); }

    /// How many values live that the test made.
    [[nodiscard]] std::int64_t live() const {
        return vexa_live_objects(VEXA_OBJECT_VALUE) - before_;
    }

private:
    std::int64_t before_ = vexa_live_objects(VEXA_OBJECT_VALUE);
};

TEST_F(VexaValueTest, EachTypeIsMadeAndTold) {
    int type = VEXA_VALUE_NONE;
    for (const Value& value : oneOfEach()) {
        EXPECT_EQ(static_cast<int>(vexa_value_get_type(value.get())), type++);
    }
    EXPECT_EQ(type, VEXA_VALUE_DICTIONARY + 1);
}

TEST_F(VexaValueTest, EachIsCountedWhileItLives) {
    const Value value = number(1);
    EXPECT_EQ(live(), 1);
    {
        const Value list = array({value.get(), value.get()});
        EXPECT_EQ(live(), 2);
        const Value same = list;  // NOLINT(performance-unnecessary-copy-initialization)
        EXPECT_EQ(live(), 2);
    }
    EXPECT_EQ(live(), 1);
}

TEST_F(VexaValueTest, NullTrueAndFalseAreSharedAndNotCounted) {
    vexa_value* const null = vexa_value_create_null();
    vexa_value* const yes = vexa_value_create_boolean(true);
    vexa_value* const no = vexa_value_create_boolean(false);
    EXPECT_EQ(live(), 0);
    EXPECT_EQ(null, vexa_value_create_null());
    EXPECT_EQ(yes, vexa_value_create_boolean(true));
    EXPECT_EQ(no, vexa_value_create_boolean(false));
    EXPECT_NE(yes, no);
    for (int time = 0; time < 10; ++time) {
        for (vexa_value* constant : {null, yes, no}) vexa_value_release(constant);
    }
    EXPECT_TRUE(vexa_value_to_boolean(vexa_value_retain(yes)));
}

TEST_F(VexaValueTest, RetainGivesItsArgumentAndOneMoreReference) {
    vexa_value* const value = vexa_value_create_string("kept", 4);
    EXPECT_EQ(vexa_value_retain(value), value);
    vexa_value_release(value);
    EXPECT_EQ(stringOf(value), "kept");
    vexa_value_release(value);
    EXPECT_EQ(live(), 0);
}

TEST_F(VexaValueTest, NullArgumentsReadAsNoValue) {
    EXPECT_EQ(vexa_value_retain(nullptr), nullptr);
    vexa_value_release(nullptr);
    EXPECT_EQ(vexa_value_get_type(nullptr), VEXA_VALUE_NONE);
    EXPECT_FALSE(vexa_value_to_boolean(nullptr));
    EXPECT_EQ(vexa_value_to_unsigned(nullptr), 0u);
    EXPECT_EQ(vexa_value_to_float(nullptr), 0.0f);
    EXPECT_EQ(vexa_value_to_double(nullptr), 0.0);
    std::int64_t narrow = 7;
    EXPECT_FALSE(vexa_value_get_signed(nullptr, &narrow));
    std::uint64_t wide = 7;
    EXPECT_FALSE(vexa_value_get_unsigned(nullptr, &wide));
    std::size_t length = 7;
    EXPECT_EQ(vexa_value_get_string(nullptr, &length), nullptr);
    EXPECT_EQ(vexa_value_get_bytes(nullptr, &length), nullptr);
    EXPECT_EQ(vexa_value_get_count(nullptr), 0u);
    EXPECT_EQ(vexa_value_get_element(nullptr, 0), nullptr);
    EXPECT_EQ(vexa_value_get_key(nullptr, 0, &length), nullptr);
    EXPECT_EQ(vexa_value_get_elements(nullptr, &length), nullptr);
    EXPECT_EQ(vexa_value_get_members(nullptr, &length), nullptr);
    EXPECT_EQ(vexa_value_find_key(nullptr, "", 0), SIZE_MAX);
    EXPECT_EQ(narrow, 7);
    EXPECT_EQ(wide, 7u);
    EXPECT_EQ(length, 7u);
    EXPECT_EQ(description(nullptr), "no value");
}

TEST_F(VexaValueTest, AMissingContentMakesNoValue) {
    EXPECT_EQ(vexa_value_create_string(nullptr, 1), nullptr);
    EXPECT_EQ(vexa_value_create_bytes(nullptr, 1), nullptr);
    EXPECT_EQ(vexa_value_create_array(nullptr, 1), nullptr);
    EXPECT_EQ(vexa_value_create_array_adopting(nullptr, 1), nullptr);
    EXPECT_EQ(vexa_value_create_dictionary(nullptr, nullptr, 1), nullptr);
    EXPECT_EQ(vexa_value_create_dictionary_of(nullptr, 1), nullptr);
    const vexa_member nameless{nullptr, 1, nullptr};
    EXPECT_EQ(vexa_value_create_dictionary_of(&nameless, 1), nullptr);
    const Value key = text("key");
    const vexa_value* const one = key.get();
    EXPECT_EQ(vexa_value_create_dictionary(&one, nullptr, 1), nullptr);
    EXPECT_EQ(vexa_value_create_dictionary(nullptr, &one, 1), nullptr);
}

TEST_F(VexaValueTest, ASizeBeyondAllMemoryMakesNoValue) {
    const char byte = 'x';
    EXPECT_EQ(vexa_value_create_string(&byte, SIZE_MAX), nullptr);
    EXPECT_EQ(vexa_value_create_string(&byte, SIZE_MAX / 2), nullptr);
    const vexa_value* const none = nullptr;
    EXPECT_EQ(vexa_value_create_array_adopting(&none, SIZE_MAX), nullptr);
    EXPECT_EQ(vexa_value_create_array_adopting(&none, SIZE_MAX / 8 + 2), nullptr);
}

TEST_F(VexaValueTest, NothingMakesEmptyValues) {
    const Value string = Value::adopt(vexa_value_create_string(nullptr, 0));
    std::size_t length = 7;
    EXPECT_STREQ(vexa_value_get_string(string.get(), &length), "");
    EXPECT_EQ(length, 0u);

    const Value bytes = Value::adopt(vexa_value_create_bytes(nullptr, 0));
    length = 7;
    EXPECT_NE(vexa_value_get_bytes(bytes.get(), &length), nullptr);
    EXPECT_EQ(length, 0u);

    const Value list = Value::adopt(vexa_value_create_array(nullptr, 0));
    length = 7;
    EXPECT_NE(vexa_value_get_elements(list.get(), &length), nullptr);
    EXPECT_EQ(length, 0u);
    EXPECT_EQ(vexa_value_get_count(list.get()), 0u);

    const Value table = Value::adopt(vexa_value_create_dictionary(nullptr, nullptr, 0));
    const Value same = Value::adopt(vexa_value_create_dictionary_of(nullptr, 0));
    length = 7;
    EXPECT_NE(vexa_value_get_members(table.get(), &length), nullptr);
    EXPECT_EQ(length, 0u);
    EXPECT_TRUE(vexa_value_equal(table.get(), same.get()));
}

TEST_F(VexaValueTest, ReadingsFollowTheTypes) {
    struct Read {
        bool boolean;
        std::uint64_t integer;
        float single;
        double real;
        bool operator==(const Read&) const = default;
    };
    std::vector<Read> reads;
    for (const Value& value : oneOfEach()) {
        reads.push_back({vexa_value_to_boolean(value.get()), vexa_value_to_unsigned(value.get()),
                         vexa_value_to_float(value.get()), vexa_value_to_double(value.get())});
    }
    const Read zero{false, 0, 0, 0};
    EXPECT_THAT(reads, ElementsAre(zero, zero, Read{true, 1, 1, 1}, Read{true, UINT64_MAX, -1, -1},
                                   Read{true, 2, 2, 2}, Read{true, 0, 0.1f, double{0.1f}},
                                   Read{true, 2, 2.5f, 2.5}, zero, zero, zero, zero));
}

TEST_F(VexaValueTest, ContentIsGivenForItsOwnTypeOnly) {
    for (const Value& value : oneOfEach()) {
        const vexa_value* const it = value.get();
        const vexa_value_type type = vexa_value_get_type(it);
        std::int64_t narrow = 7;
        EXPECT_EQ(vexa_value_get_signed(it, &narrow), type == VEXA_VALUE_SIGNED);
        EXPECT_EQ(narrow, type == VEXA_VALUE_SIGNED ? -1 : 7);
        std::uint64_t wide = 7;
        EXPECT_EQ(vexa_value_get_unsigned(it, &wide), type == VEXA_VALUE_UNSIGNED);
        EXPECT_EQ(wide, type == VEXA_VALUE_UNSIGNED ? 2u : 7u);
        std::size_t length = 7;
        EXPECT_EQ(vexa_value_get_string(it, &length) != nullptr, type == VEXA_VALUE_STRING);
        EXPECT_EQ(length, type == VEXA_VALUE_STRING ? 4u : 7u);
        length = 7;
        EXPECT_EQ(vexa_value_get_bytes(it, &length) != nullptr, type == VEXA_VALUE_BYTES);
        EXPECT_EQ(length, type == VEXA_VALUE_BYTES ? 2u : 7u);
        const bool isContainer = type == VEXA_VALUE_ARRAY || type == VEXA_VALUE_DICTIONARY;
        EXPECT_EQ(vexa_value_get_count(it), isContainer ? 1u : 0u);
        EXPECT_EQ(vexa_value_get_element(it, 0) != nullptr, isContainer);
        length = 7;
        EXPECT_EQ(vexa_value_get_elements(it, &length) != nullptr, type == VEXA_VALUE_ARRAY);
        EXPECT_EQ(length, type == VEXA_VALUE_ARRAY ? 1u : 7u);
        length = 7;
        EXPECT_EQ(vexa_value_get_members(it, &length) != nullptr, type == VEXA_VALUE_DICTIONARY);
        EXPECT_EQ(length, type == VEXA_VALUE_DICTIONARY ? 1u : 7u);
        length = 7;
        EXPECT_EQ(vexa_value_get_key(it, 0, &length) != nullptr, type == VEXA_VALUE_DICTIONARY);
        EXPECT_EQ(length, type == VEXA_VALUE_DICTIONARY ? 3u : 7u);
        EXPECT_EQ(vexa_value_find_key(it, "one", 3), type == VEXA_VALUE_DICTIONARY ? 0 : SIZE_MAX);
    }
}

TEST_F(VexaValueTest, LengthsNeedNotBeAskedFor) {
    const std::vector<Value> values = oneOfEach();
    EXPECT_STREQ(vexa_value_get_string(values[VEXA_VALUE_STRING].get(), nullptr), "text");
    EXPECT_EQ(vexa_value_get_bytes(values[VEXA_VALUE_BYTES].get(), nullptr)[1], 0xA0);
    EXPECT_NE(vexa_value_get_elements(values[VEXA_VALUE_ARRAY].get(), nullptr), nullptr);
    const Value& table = values[VEXA_VALUE_DICTIONARY];
    EXPECT_STREQ(vexa_value_get_members(table.get(), nullptr)->key, "one");
    EXPECT_STREQ(vexa_value_get_key(table.get(), 0, nullptr), "one");
}

TEST_F(VexaValueTest, TextIsCopiedWithItsZeroBytesAndEndsInOne) {
    std::string source("a\0b", 3);
    const Value value = text(source);
    source[0] = 'x';
    std::size_t length = 0;
    const char* content = vexa_value_get_string(value.get(), &length);
    EXPECT_EQ(std::string(content, length + 1), std::string("a\0b\0", 4));
}

TEST_F(VexaValueTest, AnArrayKeepsItsElementsAndItsGaps) {
    const vexa_value* borrowed = nullptr;
    Value list;
    {
        const Value element = text("element");
        borrowed = element.get();
        list = array({borrowed, nullptr, borrowed});
    }
    EXPECT_EQ(live(), 2);
    EXPECT_EQ(vexa_value_get_count(list.get()), 3u);
    EXPECT_EQ(vexa_value_get_element(list.get(), 0), borrowed);
    EXPECT_EQ(vexa_value_get_element(list.get(), 1), nullptr);
    EXPECT_EQ(vexa_value_get_element(list.get(), 2), borrowed);
    EXPECT_EQ(vexa_value_get_element(list.get(), 3), nullptr);
    EXPECT_EQ(vexa_value_get_element(list.get(), SIZE_MAX), nullptr);
    std::size_t count = 0;
    const vexa_value* const* elements = vexa_value_get_elements(list.get(), &count);
    EXPECT_EQ(std::vector(elements, elements + count),
              (std::vector<const vexa_value*>{borrowed, nullptr, borrowed}));
    EXPECT_EQ(vexa_value_get_key(list.get(), 0, nullptr), nullptr);
    EXPECT_EQ(description(list.get()), R"(["element", no value, "element"])");
}

TEST_F(VexaValueTest, AnAdoptingArrayTakesReferencesOver) {
    const std::array<const vexa_value*, 3> owned{vexa_value_create_signed(1), nullptr,
                                                 vexa_value_create_string("two", 3)};
    vexa_value* const list = vexa_value_create_array_adopting(owned.data(), owned.size());
    EXPECT_EQ(description(list), R"([1, no value, "two"])");
    EXPECT_EQ(live(), 3);
    vexa_value_release(list);
    EXPECT_EQ(live(), 0);
}

TEST_F(VexaValueTest, MembersStandInTheOrderOfTheirBytes) {
    const Value one = number(1);
    const std::string_view zero("a\0", 2);
    const Value table =
        dictionary({member("b", one.get()), member("\xFF", nullptr), member("", one.get()),
                    member(zero, one.get()), member("a", one.get()), member("ab", one.get())});
    EXPECT_THAT(keysOf(table), ElementsAre("", "a", std::string(zero), "ab", "b", "\xFF"));
    for (std::size_t place = 0; place < 6; ++place) {
        const std::string key = keysOf(table)[place];
        EXPECT_EQ(vexa_value_find_key(table.get(), key.data(), key.size()), place);
        EXPECT_EQ(vexa_value_get_element(table.get(), place), place == 5 ? nullptr : one.get());
    }
    EXPECT_EQ(vexa_value_find_key(table.get(), "abc", 3), SIZE_MAX);
    EXPECT_EQ(vexa_value_find_key(table.get(), "abc", 2), 3u);
    EXPECT_EQ(vexa_value_find_key(table.get(), nullptr, 0), 0u);
    EXPECT_EQ(vexa_value_find_key(table.get(), nullptr, 1), SIZE_MAX);
    EXPECT_EQ(vexa_value_get_element(table.get(), 6), nullptr);
    EXPECT_EQ(vexa_value_get_key(table.get(), 6, nullptr), nullptr);
    std::size_t count = 0;
    const vexa_member* members = vexa_value_get_members(table.get(), &count);
    ASSERT_EQ(count, 6u);
    EXPECT_STREQ(members[4].key, "b");
    EXPECT_EQ(members[4].key_length, 1u);
    EXPECT_EQ(members[4].value, one.get());
}

TEST_F(VexaValueTest, OfEqualKeysTheLastOneCounts) {
    const Value first = number(1);
    const Value second = number(2);
    const Value third = number(3);
    const Value table = dictionary({member("b", first.get()), member("a", first.get()),
                                    member("b", second.get()), member("b", third.get())});
    EXPECT_EQ(description(table.get()), R"({"a": 1, "b": 3})");
    EXPECT_EQ(description(dictionary({member("k", first.get()), member("k", nullptr)}).get()),
              R"({"k": no value})");
}

TEST_F(VexaValueTest, KeysMayBeValues) {
    Value table;
    {
        const Value b = text("b");
        const Value a = text("a");
        const Value one = number(1);
        const std::array<const vexa_value*, 3> keys{b.get(), a.get(), b.get()};
        const std::array<const vexa_value*, 3> members{nullptr, one.get(), a.get()};
        table = Value::adopt(vexa_value_create_dictionary(keys.data(), members.data(), 3));
    }
    EXPECT_EQ(description(table.get()), R"({"a": 1, "b": "a"})");
    EXPECT_EQ(live(), 3);
}

TEST_F(VexaValueTest, AKeyThatIsNoStringMakesNoDictionary) {
    const Value good = text("a");
    for (const Value& bad : oneOfEach()) {
        if (vexa_value_get_type(bad.get()) == VEXA_VALUE_STRING) continue;
        const std::array<const vexa_value*, 2> keys{good.get(), bad.get()};
        EXPECT_EQ(vexa_value_create_dictionary(keys.data(), keys.data(), 2), nullptr);
    }
}

TEST_F(VexaValueTest, EqualityIsByContent) {
    const std::vector<Value> values = oneOfEach();
    const std::vector<Value> same = oneOfEach();
    for (std::size_t a = 0; a < values.size(); ++a) {
        for (std::size_t b = 0; b < same.size(); ++b) {
            EXPECT_EQ(vexa_value_equal(values[a].get(), same[b].get()), a == b) << a << " " << b;
        }
    }
    const Value wide = Value::adopt(vexa_value_create_unsigned(5));
    const Value narrow = number(5);
    EXPECT_TRUE(vexa_value_equal(wide.get(), narrow.get()));
    const Value top = Value::adopt(vexa_value_create_unsigned(UINT64_MAX));
    const Value minusOne = number(-1);
    EXPECT_FALSE(vexa_value_equal(top.get(), minusOne.get()));
    EXPECT_FALSE(vexa_value_equal(array({nullptr}).get(), array({}).get()));
    EXPECT_TRUE(vexa_value_equal(array({nullptr}).get(), array({nullptr}).get()));
}

TEST_F(VexaValueTest, EachTypeIsDescribed) {
    std::vector<std::string> texts;
    for (const Value& value : oneOfEach()) texts.push_back(description(value.get()));
    EXPECT_THAT(texts, ElementsAre("no value", "null", "true", "-1", "2", "0.1", "2.5", "\"text\"",
                                   "<0fa0>", "[1]", "{\"one\": 1}"));
}

TEST_F(VexaValueTest, AnyDepthIsComparedDescribedAndFreed) {
    constexpr int kDepth = 300'000;  // far beyond what a recursion could do
    const Value value = nested(kDepth, text("end"));
    const Value same = nested(kDepth, text("end"));
    const Value other = nested(kDepth, text("other"));
    EXPECT_EQ(live(), 3 * (kDepth + 1));
    EXPECT_TRUE(vexa_value_equal(value.get(), same.get()));
    EXPECT_FALSE(vexa_value_equal(value.get(), other.get()));
    const std::string shown = description(value.get());
    EXPECT_EQ(shown.size(), std::size_t{2} * kDepth + std::strlen("\"end\""));
}

TEST_F(VexaValueTest, NumbersHaveTheShortestTextThatReadsBack) {
    const auto shortest = [](double value) {
        std::array<char, VEXA_NUMBER_TEXT_SIZE> out;
        out.fill('#');
        const std::size_t length = vexa_number_text_of_double(value, out.data());
        EXPECT_EQ(std::strlen(out.data()), length);
        return std::string(out.data());
    };
    EXPECT_EQ(shortest(0.1), "0.1");
    EXPECT_EQ(shortest(-3), "-3.0");
    EXPECT_EQ(shortest(std::numeric_limits<double>::quiet_NaN()), "nan");
    EXPECT_EQ(shortest(-std::numeric_limits<double>::infinity()), "-inf");
    EXPECT_EQ(shortest(-std::numeric_limits<double>::max()), "-1.7976931348623157e+308");
    EXPECT_EQ(shortest(-std::numeric_limits<double>::denorm_min()), "-5e-324");
    std::array<char, VEXA_NUMBER_TEXT_SIZE> out;
    EXPECT_EQ(vexa_number_text_of_float(0.1f, out.data()), 3u);
    EXPECT_STREQ(out.data(), "0.1");
}

TEST_F(VexaValueTest, AnUnknownKindHasNoCount) {
    EXPECT_EQ(vexa_live_objects(static_cast<vexa_object_kind>(VEXA_OBJECT_RUN_LOOP + 1)), -1);
}

TEST_F(VexaValueTest, ThreadsShareOneValue) {
    const Value list = array({number(1).get(), text("x").get()});
    Value shared = dictionary({member("list", list.get()), member("none", nullptr)});
    const Value expected = shared;
    constexpr std::size_t kThreads = 4;
    std::array<bool, kThreads> isGood{};
    std::atomic<std::size_t> ready{0};
    std::vector<std::thread> threads;
    threads.reserve(kThreads);
    for (bool& good : isGood) {
        threads.emplace_back([&good, &ready, mine = shared, &expected]() mutable {
            ++ready;
            while (ready < kThreads) std::this_thread::yield();
            good = true;
            for (int round = 0; round < 2000; ++round) {
                const Value around = array({mine.get(), expected.get()});
                const vexa_value* const inner = vexa_value_get_element(around.get(), 0);
                const std::size_t place = vexa_value_find_key(inner, "list", 4);
                mine = Value::share(inner);
                good = good && place == 0 && vexa_value_equal(mine.get(), expected.get()) &&
                       description(mine.get()) == R"({"list": [1, "x"], "none": no value})";
            }
        });
    }
    shared.reset();  // the last reference may go on any of the threads
    for (std::thread& thread : threads) thread.join();
    EXPECT_THAT(isGood, Each(true));
}

TEST_F(VexaValueTest, TheLastOfManyThreadsFreesTheValue) {
    constexpr std::size_t kThreads = 4;
    for (int round = 0; round < 200; ++round) {
        const vexa_value* const value = nested(3, text("innermost")).detach();
        for (std::size_t thread = 1; thread < kThreads; ++thread) vexa_value_retain(value);
        std::atomic<std::size_t> ready{0};
        std::vector<std::thread> threads;
        threads.reserve(kThreads);
        for (std::size_t thread = 0; thread < kThreads; ++thread) {
            threads.emplace_back([value, &ready] {
                ++ready;
                while (ready < kThreads) std::this_thread::yield();
                vexa_value_release(value);
            });
        }
        for (std::thread& thread : threads) thread.join();
        ASSERT_EQ(live(), 0);
    }
}

}  // namespace
}  // namespace Vexa
