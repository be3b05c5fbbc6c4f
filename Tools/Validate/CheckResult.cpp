#include "Tools/Validate/CheckResult.h"

#include "Platform/Json.h"
#include "Platform/JsonWriter.h"
#include "Platform/PropertyValue.h"

#include <array>
#include <cstdio>

namespace VexaTouch::Tools {
namespace {

struct VerdictName {
    CheckVerdict verdict;
    std::string_view name;
};
constexpr std::array<VerdictName, 3> kVerdictNames = {{
    {CheckVerdict::Pass, "pass"},
    {CheckVerdict::Warning, "warning"},
    {CheckVerdict::Fail, "fail"},
}};

std::string_view verdictName(CheckVerdict verdict) {
    for (const VerdictName& entry : kVerdictNames) {
        if (entry.verdict == verdict) {
            return entry.name;
        }
    }
    return {};
}

double milliseconds(std::chrono::nanoseconds duration) {
    return std::chrono::duration<double, std::milli>(duration).count();
}

std::string textOf(const Vexa::PropertyValue& value) {
    const auto text = value.asString();
    return text ? std::string(*text) : std::string();
}

}  // namespace

std::string resultLine(const CheckResult& result) {
    std::array<char, 96> head{};
    const std::string verdict(verdictName(result.verdict));
    static_cast<void>(std::snprintf(head.data(), head.size(), "%-7s  %-18s %8.1f ms",
                                    verdict.c_str(), result.check.c_str(),
                                    milliseconds(result.duration)));
    std::string line = head.data();
    if (!result.reason.empty()) {
        line += "  " + result.reason;
    }
    return line;
}

std::string resultJson(const CheckResult& result) {
    std::string text;
    Vexa::JsonWriter json(text, Vexa::JsonWriter::Style::Compact);
    json.beginObject();
    json.key("check");
    json.string(result.check);
    json.key("result");
    json.string(verdictName(result.verdict));
    json.key("reason");
    json.string(result.reason);
    json.key("seed");
    json.number(result.seed);
    json.key("duration_ms");
    json.number(milliseconds(result.duration));
    json.endObject();
    return text;
}

std::optional<CheckResult> findResult(std::string_view output, std::string_view check) {
    // The plug-in writes where it likes, so the result is looked for from its beginning.
    const std::string beginning = R"({"check":")" + std::string(check) + '"';
    const std::size_t begin = output.rfind(beginning);
    if (begin == std::string_view::npos) {
        return std::nullopt;
    }
    const std::string_view line = output.substr(begin, output.find('\n', begin) - begin);
    const Vexa::PropertyValue value = Vexa::readJson(line);
    const std::string verdict = textOf(value.member("result"));
    for (const VerdictName& entry : kVerdictNames) {
        if (entry.name == verdict) {
            return CheckResult{.check = std::string(check),
                               .verdict = entry.verdict,
                               .reason = textOf(value.member("reason")),
                               .seed = value.member("seed").toUnsigned64()};
        }
    }
    return std::nullopt;
}

}  // namespace VexaTouch::Tools
