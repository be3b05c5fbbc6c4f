#include "Tools/Validate/PropertyChecks.h"

#include "Platform/PropertyValue.h"
#include "Platform/ScriptedDevice.h"
#include "Tools/Validate/CheckStand.h"
#include "Tools/Validate/LoadedPlugin.h"
#include "Tools/Validate/ProcessResources.h"

#include <vexa/value.h>
#include <array>
#include <atomic>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Vexa::PropertyValue;

struct NamedValue {
    std::string name;
    PropertyValue value;
};

template <typename Number>
void appendNumbers(std::vector<NamedValue>& all, const std::string& type,
                   std::initializer_list<Number> numbers) {
    for (const Number number : numbers) {
        all.push_back({type + " " + PropertyValue(number).description(), PropertyValue(number)});
    }
}

template <typename Real>
std::initializer_list<Real> edgeReals() {
    using Limits = std::numeric_limits<Real>;
    static constexpr std::initializer_list<Real> kReals = {Real{0},
                                                           -Real{0},
                                                           Real{0.1F},
                                                           Limits::denorm_min(),
                                                           Limits::max(),
                                                           Limits::lowest(),
                                                           Limits::infinity(),
                                                           -Limits::infinity(),
                                                           Limits::quiet_NaN()};
    return kReals;
}

/// Every type, at its edges.
std::vector<NamedValue> valuesOfEveryType() {
    constexpr std::size_t kLong = 1'000'000;
    constexpr int kDeep = 200;
    std::vector<NamedValue> all = {
        {"null", PropertyValue::null()},
        {"false", PropertyValue(false)},
        {"true", PropertyValue(true)},
    };
    appendNumbers<std::int64_t>(all, "the signed number",
                                {0, 1, -1, std::numeric_limits<std::int64_t>::min(),
                                 std::numeric_limits<std::int64_t>::max()});
    appendNumbers<std::uint64_t>(all, "the unsigned number",
                                 {0, 1, std::numeric_limits<std::uint64_t>::max()});
    appendNumbers<float>(all, "the single-precision number", edgeReals<float>());
    appendNumbers<double>(all, "the double-precision number", edgeReals<double>());
    all.push_back({"the empty string", PropertyValue("")});
    all.push_back({"a string", PropertyValue("gr\xC3\xBC\xC3\x9F")});
    all.push_back({"a string that is not UTF-8", PropertyValue("\xFF\xFE\x80")});
    all.push_back({"a string with a zero byte", PropertyValue(std::string("a\0b", 3))});
    all.push_back({"a long string", PropertyValue(std::string(kLong, 'x'))});
    all.push_back({"no bytes", PropertyValue(PropertyValue::Bytes{})});
    all.push_back({"bytes", PropertyValue(PropertyValue::Bytes{0, 1, 127, 128, 255})});
    all.push_back({"many bytes", PropertyValue(PropertyValue::Bytes(kLong, 7))});
    all.push_back({"the empty array", PropertyValue(PropertyValue::Array{})});
    all.push_back({"an array", PropertyValue(PropertyValue::Array{
                                   1, 1U, 1.0F, 1.0, "1", PropertyValue::null(), PropertyValue(),
                                   PropertyValue::Array{true}})});
    all.push_back({"the empty dictionary", PropertyValue(PropertyValue::Dictionary{})});
    all.push_back(
        {"a dictionary",
         PropertyValue(PropertyValue::Dictionary{
             {"", 1},
             {std::string("a\0b", 3), 2.0F},
             {"nested", PropertyValue::Dictionary{{"bytes", PropertyValue::Bytes{1}}}}})});
    PropertyValue deep = 1;
    for (int level = 0; level < kDeep; ++level) {
        deep = PropertyValue(PropertyValue::Array{std::move(deep)});
    }
    all.push_back({"a deep array", deep});
    return all;
}

/// The same value in the same types all through, which equality does not ask for.
bool sameTypes(const vexa_value* a, const vexa_value* b) {
    const vexa_value_type type = vexa_value_get_type(a);
    if (type != vexa_value_get_type(b) || vexa_value_get_count(a) != vexa_value_get_count(b)) {
        return false;
    }
    for (std::size_t index = 0; index < vexa_value_get_count(a); ++index) {
        if (!sameTypes(vexa_value_get_element(a, index), vexa_value_get_element(b, index))) {
            return false;
        }
    }
    return true;
}

bool identical(const PropertyValue& a, const PropertyValue& b) {
    return a == b && sameTypes(a.handle(), b.handle());
}

std::string shortText(const PropertyValue& value) {
    constexpr std::size_t kLongest = 60;
    if (!value) {
        return "no value";
    }
    static constexpr std::array<std::string_view, 11> kTypes = {
        "none",   "null",   "boolean", "signed", "unsigned",  "single precision",
        "double", "string", "bytes",   "array",  "dictionary"};
    std::string text = value.description();
    if (text.size() > kLongest) {
        text = text.substr(0, kLongest) + "...";
    }
    return text + " (" + std::string(kTypes.at(static_cast<std::size_t>(value.type()))) + ")";
}

/// Through the service to the device, and from the device through the service.
void passValue(CheckRun& run, CheckStand& stand, const NamedValue& sample) {
    static const PropertyValue kWritten = "ValidateWritten";
    static const PropertyValue kRead = "ValidateRead";
    run.step("writing " + sample.name);
    run.require(stand.service().setProperty(kWritten, sample.value),
                "setProperty gives false for " + sample.name + ", which the device takes");
    const PropertyValue stored = stand.device().property(kWritten);
    run.require(identical(stored, sample.value),
                "writing " + sample.name + " gives the device " + shortText(stored));
    run.step("reading " + sample.name);
    stand.device().setPropertyValue("ValidateRead", sample.value);
    const PropertyValue read = stand.service().property(kRead);
    run.require(identical(read, sample.value),
                "the device has " + sample.name + " and copyProperty gives " + shortText(read));
}

/// Keys that no service knows as its own, some of them hard to take apart.
std::vector<std::string> unknownKeys(SeededNumbers numbers) {
    constexpr std::uint32_t kRandom = 200;
    constexpr std::uint32_t kLongestRandom = 40;
    constexpr std::size_t kLong = 100'000;
    std::vector<std::string> keys = {"ValidateNothing",
                                     "validate nothing",
                                     std::string("a\0b", 3),
                                     std::string(1, '\0'),
                                     "\xFF\xFE",
                                     std::string(kLong, 'k'),
                                     "Validate.",
                                     ".Validate",
                                     "Validate..Nothing",
                                     "Validate.Nothing.At.All"};
    for (std::uint32_t count = 0; count < kRandom; ++count) {
        std::string key = "Validate";
        const std::uint32_t length = numbers.below(kLongestRandom);
        for (std::uint32_t index = 0; index < length; ++index) {
            key += static_cast<char>(numbers.below(256));
        }
        keys.push_back(std::move(key));
    }
    return keys;
}

}  // namespace

void checkPropertyValues(CheckRun& run) {
    const LoadedPlugin plugin(run);
    const auto passAll = [&] {
        CheckStand stand(run, plugin);
        stand.start();
        for (const NamedValue& sample : valuesOfEveryType()) {
            passValue(run, stand, sample);
        }
        stand.service().stop();
    };
    // Once more, when all that is made once has been made: nothing may be left behind.
    passAll();
    const ProcessResources before = ProcessResources::now();
    passAll();
    requireGivenBack(run, before, "reading and writing properties");
}

void checkPropertyThreads(CheckRun& run) {
    constexpr int kThreads = 4;
    constexpr int kRounds = 500;
    constexpr int kReports = 200;
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.begin();
    run.step("reading and writing properties on " + std::to_string(kThreads) + " threads");
    std::atomic<int> wrong{0};
    std::vector<std::jthread> threads;
    threads.reserve(kThreads);
    for (int thread = 0; thread < kThreads; ++thread) {
        threads.emplace_back([&, thread] {
            const PropertyValue key = "ValidateThread" + std::to_string(thread);
            for (int round = 0; round < kRounds; ++round) {
                const PropertyValue value = "round " + std::to_string(round);
                if (!stand.service().setProperty(key, value) ||
                    !identical(stand.service().property(key), value)) {
                    ++wrong;
                }
            }
        });
    }
    for (int count = 0; count < kReports; ++count) {
        stand.resetReport();
    }
    threads.clear();
    run.require(wrong == 0, std::to_string(wrong) +
                                " values were lost when several threads read and write at once");
    stand.end();
}

void checkUnknownKeys(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.start();
    for (const std::string& text : unknownKeys(run.random())) {
        const PropertyValue key = text;
        run.step("reading the unknown key " + shortText(key));
        const PropertyValue found = stand.service().property(key);
        run.require(!found, "copyProperty gives " + shortText(found) + " for the key " +
                                shortText(key) + ", which the device does not know");
    }
    // Whatever these mean to a service, it survives them.
    for (const char* text : {"", ".", "..", "Pipeline", "Pipeline.", "Pipeline..", "Pipeline.Algs.",
                             "Pipeline.Algs.ValidateNothing", "Version", "DebugInfo"}) {
        run.step("reading and writing the key " + shortText(text));
        static_cast<void>(stand.service().property(text));
        static_cast<void>(stand.service().setProperty(text, 1));
    }
    stand.service().stop();
}

void checkNullKeys(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.start();
    // First NULL, then every value that is no string.
    std::vector<NamedValue> keys = {{"NULL", PropertyValue()}};
    for (NamedValue& sample : valuesOfEveryType()) {
        if (sample.value.type() != PropertyValue::Type::String) {
            keys.push_back(std::move(sample));
        }
    }
    const std::size_t before = stand.device().calls().size();
    for (const auto& [name, key] : keys) {
        run.step("reading with " + name + " as key");
        const PropertyValue found = stand.service().property(key);
        run.require(!found, "copyProperty gives " + shortText(found) + " for " + name + " as key");
        run.step("writing with " + name + " as key");
        run.require(!stand.service().setProperty(key, 1),
                    "setProperty gives true for " + name + " as key");
    }
    run.require(stand.device().calls().size() == before,
                "a key that is no string reaches the device");
    run.step("writing NULL");
    static_cast<void>(stand.service().setProperty("ValidateNothing", PropertyValue()));
    stand.service().stop();
}

}  // namespace VexaTouch::Tools
