// JSON both ways, on a text such as a recording is. `BoostParserToNothing` is the yardstick: the
// library alone, with a handler that does nothing.

#include "Platform/Json.h"

#include <benchmark/benchmark.h>
#include <boost/json/basic_parser_impl.hpp>

#include <cstdint>
#include <string>
#include <string_view>

namespace Vexa {
namespace {

constexpr int kFrames = 20'000;
constexpr std::size_t kReportBytes = 73;
constexpr std::size_t kPieceBytes = 65'536;

std::string reportText(std::uint32_t frame) {
    constexpr std::string_view kDigits = "0123456789abcdef";
    std::string text;
    std::uint32_t state = frame * 2654435761u + 1;
    for (std::size_t index = 0; index < kReportBytes; ++index) {
        state = state * 1664525u + 1013904223u;
        text += kDigits[state >> 28];
        text += kDigits[(state >> 24) & 15];
        text += ' ';
    }
    return text;
}

std::string recordingText(JsonWriter::Style style) {
    std::string text;
    JsonWriter writer(text, style);
    writer.beginObject();
    writer.key("Frames");
    writer.beginArray();
    for (std::uint32_t frame = 0; frame < kFrames; ++frame) {
        writer.beginObject();
        writer.key("Report");
        writer.plainString(reportText(frame));
        writer.key("Timestamp");
        writer.number(std::uint64_t{frame} * 16'666'667 + 1'000'000'000);
        writer.key("Type");
        writer.string("InputReport");
        writer.endObject();
    }
    writer.endArray();
    writer.key("Version");
    writer.number(std::int64_t{1});
    writer.endObject();
    return text;
}

const std::string& recording() {
    static const std::string text = recordingText(JsonWriter::Style::Indented);
    return text;
}

/// Numbers of all kinds, such as settings and statistics hold.
const std::string& numbers() {
    static const std::string text = [] {
        PropertyValue::Array values;
        for (int index = 0; index < 50'000; ++index) {
            values.emplace_back(index * 7919);
            values.emplace_back(index / 7.0);
            values.emplace_back(static_cast<float>(index) * 0.1f);
        }
        return writeJson(PropertyValue(std::move(values)));
    }();
    return text;
}

void setBytes(benchmark::State& state, std::size_t bytes) {
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) *
                            static_cast<std::int64_t>(bytes));
}

namespace json = boost::json;

struct BoostNothing {
    static constexpr std::size_t max_array_size = static_cast<std::size_t>(-1);
    static constexpr std::size_t max_object_size = static_cast<std::size_t>(-1);
    static constexpr std::size_t max_string_size = static_cast<std::size_t>(-1);
    static constexpr std::size_t max_key_size = static_cast<std::size_t>(-1);
    bool on_document_begin(json::error_code&) { return true; }
    bool on_document_end(json::error_code&) { return true; }
    bool on_object_begin(json::error_code&) { return true; }
    bool on_object_end(std::size_t, json::error_code&) { return true; }
    bool on_array_begin(json::error_code&) { return true; }
    bool on_array_end(std::size_t, json::error_code&) { return true; }
    bool on_key_part(json::string_view, std::size_t, json::error_code&) { return true; }
    bool on_key(json::string_view, std::size_t, json::error_code&) { return true; }
    bool on_string_part(json::string_view, std::size_t, json::error_code&) { return true; }
    bool on_string(json::string_view, std::size_t, json::error_code&) { return true; }
    bool on_number_part(json::string_view, json::error_code&) { return true; }
    bool on_int64(std::int64_t, json::string_view, json::error_code&) { return true; }
    bool on_uint64(std::uint64_t, json::string_view, json::error_code&) { return true; }
    bool on_double(double, json::string_view, json::error_code&) { return true; }
    bool on_bool(bool, json::error_code&) { return true; }
    bool on_null(json::error_code&) { return true; }
    bool on_comment_part(json::string_view, json::error_code&) { return true; }
    bool on_comment(json::string_view, json::error_code&) { return true; }
};

class Nothing final : public JsonHandler {
public:
    void onObjectBegin() override {}
    void onObjectEnd() override {}
    void onArrayBegin() override {}
    void onArrayEnd() override {}
    void onKey(std::string_view /*piece*/, bool /*last*/) override {}
    void onString(std::string_view /*piece*/, bool /*last*/) override {}
    void onNumber(const JsonNumber& /*number*/) override {}
    void onBoolean(bool /*value*/) override {}
    void onNull() override {}
};

void boostToNothing(benchmark::State& state, const std::string& text, std::size_t pieceBytes) {
    for (auto _ : state) {
        json::basic_parser<BoostNothing> parser{json::parse_options()};
        json::error_code error;
        for (std::size_t at = 0; at < text.size() && !error; at += pieceBytes) {
            const std::string_view piece = std::string_view(text).substr(at, pieceBytes);
            parser.write_some(true, piece.data(), piece.size(), error);
        }
        if (!error) parser.write_some(false, "", 0, error);
        if (error) state.SkipWithError("not read");
    }
    setBytes(state, text.size());
}

void readToNothing(benchmark::State& state, const std::string& text, std::size_t pieceBytes) {
    for (auto _ : state) {
        Nothing nothing;
        JsonParser parser(nothing);
        bool isGood = true;
        for (std::size_t at = 0; at < text.size() && isGood; at += pieceBytes) {
            isGood = parser.write(std::string_view(text).substr(at, pieceBytes));
        }
        if (!isGood || !parser.finish()) state.SkipWithError("not read");
    }
    setBytes(state, text.size());
}

void readToValues(benchmark::State& state, const std::string& text) {
    for (auto _ : state) {
        PropertyValue value = readJson(text);
        if (!value) state.SkipWithError("not read");
        benchmark::DoNotOptimize(value);
    }
    setBytes(state, text.size());
}

void BoostParserToNothing(benchmark::State& state) {
    boostToNothing(state, recording(), recording().size());
}
BENCHMARK(BoostParserToNothing)->Unit(benchmark::kMillisecond);

void JsonReadToNothing(benchmark::State& state) {
    readToNothing(state, recording(), recording().size());
}
BENCHMARK(JsonReadToNothing)->Unit(benchmark::kMillisecond);

void BoostParserToNothingInPieces(benchmark::State& state) {
    boostToNothing(state, recording(), kPieceBytes);
}
BENCHMARK(BoostParserToNothingInPieces)->Unit(benchmark::kMillisecond);

void JsonReadToNothingInPieces(benchmark::State& state) {
    readToNothing(state, recording(), kPieceBytes);
}
BENCHMARK(JsonReadToNothingInPieces)->Unit(benchmark::kMillisecond);

void JsonReadToValues(benchmark::State& state) {
    readToValues(state, recording());
}
BENCHMARK(JsonReadToValues)->Unit(benchmark::kMillisecond);

void JsonReadNumbersToValues(benchmark::State& state) {
    readToValues(state, numbers());
}
BENCHMARK(JsonReadNumbersToValues)->Unit(benchmark::kMillisecond);

void JsonWriteRecording(benchmark::State& state) {
    const std::string report = reportText(1);
    std::string text;
    for (auto _ : state) {
        text.clear();
        JsonWriter writer(text);
        writer.beginArray();
        for (std::uint64_t frame = 0; frame < kFrames; ++frame) {
            writer.beginObject();
            writer.key("Report");
            writer.plainString(report);
            writer.key("Timestamp");
            writer.number(frame * 16'666'667 + 1'000'000'000);
            writer.key("Type");
            writer.string("InputReport");
            writer.endObject();
        }
        writer.endArray();
        benchmark::DoNotOptimize(text.data());
    }
    setBytes(state, text.size());
}
BENCHMARK(JsonWriteRecording)->Unit(benchmark::kMillisecond);

void JsonWriteValues(benchmark::State& state) {
    const PropertyValue value = readJson(recording());
    for (auto _ : state) {
        std::string text = writeJson(value);
        benchmark::DoNotOptimize(text.data());
    }
    setBytes(state, recording().size());
}
BENCHMARK(JsonWriteValues)->Unit(benchmark::kMillisecond);

void JsonWriteNumbers(benchmark::State& state) {
    const PropertyValue value = readJson(numbers());
    for (auto _ : state) {
        std::string text = writeJson(value);
        benchmark::DoNotOptimize(text.data());
    }
    setBytes(state, numbers().size());
}
BENCHMARK(JsonWriteNumbers)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace Vexa
