// A process of its own, since it replaces the heap's operators by ones that run out of memory.

#include <gtest/gtest.h>
#include <vexa/abi.h>
#include <vexa/event.h>
#include <vexa/value.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <limits>
#include <new>
#include <string>

namespace {

constexpr std::size_t kEnough = std::numeric_limits<std::size_t>::max();
std::size_t allocationsLeft = kEnough;

}  // namespace

// The other forms (arrays, sized) end in these, as does the one that does not throw, but for a
// sanitizer's. Not inlined, or g++ sees free()
// beside operator new and warns of a mismatch.
[[gnu::noinline]] void* operator new(std::size_t size) {
    if (allocationsLeft == 0) throw std::bad_alloc();
    if (allocationsLeft != kEnough) --allocationsLeft;
    void* memory = std::malloc(size == 0 ? 1 : size);
    if (memory == nullptr) throw std::bad_alloc();
    return memory;
}
[[gnu::noinline]] void* operator new(std::size_t size, const std::nothrow_t& /*tag*/) noexcept {
    try {
        return operator new(size);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace {

/// Makes the object with ever more memory until it is there; before that there is nothing, and
/// nothing is left over. Returns how many allocations it took.
template <class Object>
std::size_t allocationsNeeded(const std::function<Object*()>& make, void (*release)(Object*)) {
    const std::int64_t values = vexa_live_objects(VEXA_OBJECT_VALUE);
    const std::int64_t events = vexa_live_objects(VEXA_OBJECT_EVENT);
    constexpr std::size_t kMost = 1000;
    for (std::size_t count = 0; count < kMost; ++count) {
        allocationsLeft = count;
        Object* const made = make();
        allocationsLeft = kEnough;
        if (made) {
            release(made);
            EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_VALUE), values);
            EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_EVENT), events);
            return count;
        }
        EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_VALUE), values);
        EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_EVENT), events);
    }
    ADD_FAILURE() << "never made";
    return kMost;
}

std::size_t valueAllocations(const std::function<vexa_value*()>& make) {
    return allocationsNeeded<vexa_value>(make, [](vexa_value* it) { vexa_value_release(it); });
}

std::size_t eventAllocations(const std::function<vexa_event*()>& make) {
    return allocationsNeeded<vexa_event>(make, vexa_event_release);
}

TEST(ValueMemoryTest, AConstantNeedsNone) {
    EXPECT_EQ(valueAllocations(vexa_value_create_null), 0u);
    EXPECT_EQ(valueAllocations([] { return vexa_value_create_boolean(true); }), 0u);
    EXPECT_EQ(valueAllocations([] { return vexa_value_create_boolean(false); }), 0u);
}

TEST(ValueMemoryTest, AValueIsOneBlockOrNothing) {
    EXPECT_EQ(valueAllocations([] { return vexa_value_create_signed(1); }), 1u);
    EXPECT_EQ(valueAllocations([] { return vexa_value_create_unsigned(1); }), 1u);
    EXPECT_EQ(valueAllocations([] { return vexa_value_create_float(1); }), 1u);
    EXPECT_EQ(valueAllocations([] { return vexa_value_create_double(1); }), 1u);
    const std::string text(100, 'x');
    EXPECT_EQ(valueAllocations([&] { return vexa_value_create_string(text.data(), text.size()); }),
              1u);
    const std::array<std::uint8_t, 100> bytes{};
    EXPECT_EQ(valueAllocations([&] { return vexa_value_create_bytes(bytes.data(), bytes.size()); }),
              1u);
}

TEST(ValueMemoryTest, AContainerIsMadeWholeOrItsPartsAreAsTheyWere) {
    vexa_value* const part = vexa_value_create_string("part", 4);
    const std::array<const vexa_value*, 2> parts{part, part};
    EXPECT_EQ(valueAllocations([&] { return vexa_value_create_array(parts.data(), 2); }), 1u);
    EXPECT_EQ(valueAllocations([&] {
                  vexa_value* const made = vexa_value_create_array_adopting(parts.data(), 2);
                  // What was taken over is given back with the array.
                  if (made) {
                      vexa_value_retain(part);
                      vexa_value_retain(part);
                  }
                  return made;
              }),
              1u);
    const std::array<vexa_member, 2> inOrder{{{"a", 1, part}, {"b", 1, part}}};
    EXPECT_EQ(valueAllocations([&] { return vexa_value_create_dictionary_of(inOrder.data(), 2); }),
              1u);
    const std::array<vexa_member, 2> notInOrder{{{"b", 1, part}, {"a", 1, part}}};
    EXPECT_GE(
        valueAllocations([&] { return vexa_value_create_dictionary_of(notInOrder.data(), 2); }),
        2u);
    EXPECT_GE(valueAllocations(
                  [&] { return vexa_value_create_dictionary(parts.data(), parts.data(), 2); }),
              2u);
    EXPECT_STREQ(vexa_value_get_string(part, nullptr), "part");
    vexa_value_release(part);
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_VALUE), 0);
}

TEST(ValueMemoryTest, ADescriptionIsThereOrNot) {
    vexa_value* const text = vexa_value_create_string("a text that is no short string", 30);
    const vexa_value* const one = text;
    vexa_value* const list = vexa_value_create_array(&one, 1);
    EXPECT_GE(valueAllocations([&] { return vexa_value_create_description(list); }), 2u);
    vexa_value_release(list);
    vexa_value_release(text);
}

TEST(ValueMemoryTest, WithoutMemoryDeepValuesDiffer) {
    const auto nested = [](int depth) {
        const vexa_value* value = vexa_value_create_string("end", 3);
        for (int level = 0; level < depth; ++level) {
            value = vexa_value_create_array_adopting(&value, 1);
        }
        return value;
    };
    for (const int depth : {100, 1000}) {
        const vexa_value* const value = nested(depth);
        const vexa_value* const same = nested(depth);
        allocationsLeft = 0;
        const bool areEqual = vexa_value_equal(value, same);
        allocationsLeft = kEnough;
        EXPECT_EQ(areEqual, depth == 100);
        EXPECT_TRUE(vexa_value_equal(value, same));
        vexa_value_release(value);
        vexa_value_release(same);
    }
}

TEST(ValueMemoryTest, AnEventIsMadeWholeOrNotAtAll) {
    const vexa_digitizer_record touch{};
    EXPECT_EQ(eventAllocations([&] { return vexa_event_create_digitizer(&touch); }), 1u);
    const std::array<std::uint8_t, 3> payload{1, 2, 3};
    vexa_vendor_record vendor{};
    vendor.payload = payload.data();
    vendor.payload_length = payload.size();
    EXPECT_EQ(eventAllocations([&] { return vexa_event_create_vendor_defined(&vendor); }), 2u);
    vexa_event* const event = vexa_event_create_vendor_defined(&vendor);
    EXPECT_GE(valueAllocations([&] { return vexa_event_create_description(event); }), 2u);
    vexa_event_release(event);
}

}  // namespace
