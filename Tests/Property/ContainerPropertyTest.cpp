// The reader of containers held to the slow way, by a tree of the whole text and its migration, on
// random documents: well formed, with wrong, missing and duplicate members in any order, and
// damaged. Whatever the text, both give the same frames or the same exception, and so does the
// reader however the text is cut.
//
// VEXA_PROPERTY_SEED repeats a run.

#include "Pipeline/ContainerReader.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/Json.h"
#include "Tests/Support/ContainerAnswer.h"
#include "Tests/Support/SeededRandom.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <iterator>
#include <map>
#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

std::uint64_t seedOfThisRun() {
    const char* text = std::getenv("VEXA_PROPERTY_SEED");
    const std::uint64_t seed =
        text != nullptr ? std::strtoull(text, nullptr, 10) : std::random_device{}();
    std::cout << "VEXA_PROPERTY_SEED=" << seed << '\n';
    return seed;
}

/// Makes texts that are containers, or nearly.
class ContainerTexts {
public:
    explicit ContainerTexts(std::uint64_t seed) : random_(seed) {}

    /// `oddity`: one in so many choices is not the usual one.
    std::string document(int oddity) {
        oddity_ = oddity;
        std::vector<std::string> members;
        const bool old = random_.oneIn(3);
        if (!odd()) {
            members.push_back("\"Version\":" + version(old));
        }
        if (!odd()) {
            members.push_back(old ? "\"Reports\":" + reports() : "\"Frames\":" + frames());
        }
        while (odd() || random_.oneIn(6)) {
            switch (random_.between(0, 3)) {
                case 0:
                    members.push_back("\"Version\":" + version(old));
                    break;
                case 1:
                    members.push_back("\"Frames\":" + frames());
                    break;
                case 2:
                    members.push_back("\"Reports\":" + reports());
                    break;
                default:
                    members.push_back(name() + ":" + any(3));
            }
        }
        return odd() && odd() ? any(4) : object(members);
    }

    /// The text with one thing wrong, or right by chance.
    std::string damaged(std::string text) {
        if (text.empty()) {
            return text;
        }
        const std::size_t at = random_.next() % text.size();
        switch (random_.between(0, 4)) {
            case 0:
                text.erase(at);
                break;
            case 1:
                text.erase(at, 1 + random_.next() % 8);
                break;
            case 2:
                text[at] = "{}[],:\"\\0 \x80-et"[random_.next() % 15];
                break;
            case 3:
                text.insert(at, 1, "{}[],:\"\\0 \x80-et"[random_.next() % 15]);
                break;
            default: {
                const std::string part = text.substr(at, random_.next() % 40);
                text.insert(random_.next() % text.size(), part);
            }
        }
        return text;
    }

private:
    bool odd() { return random_.oneIn(oddity_); }

    std::string version(bool old) {
        if (odd()) {
            return random_.oneOf(
                std::vector<std::string>{"2", "-1", "4294967295", "18446744073709551615", "1e400",
                                         "\"1\"", "true", "null", "[1]", "{\"Version\":1}"});
        }
        return old ? random_.oneOf(std::vector<std::string>{"0", "0", "0.0", "-0.5", "4294967296"})
                   : random_.oneOf(std::vector<std::string>{"1", "1", "1.0", "1.75", "4294967297",
                                                            "-4294967295"});
    }
    std::string frames() {
        return list([this] { return frame(); });
    }
    std::string reports() {
        return list([this] { return report(); });
    }
    template <typename Element>
    std::string list(Element&& element) {
        if (odd()) {
            return any(2);
        }
        std::string text = "[" + space();
        for (int i = random_.between(0, 4), first = i; i > 0; --i) {
            text += (i == first ? "" : ",") + space() + (odd() ? any(2) : element()) + space();
        }
        return text + "]";
    }
    std::string frame() {
        const bool state = random_.oneIn(2);
        std::vector<std::string> members = {"\"Type\":" + (odd()   ? any(2)
                                                           : state ? std::string("\"State\"")
                                                                   : "\"InputReport\"")};
        members.push_back("\"Timestamp\":" + timestamp());
        if (state) {
            members.push_back("\"Key\":" + (odd() ? any(2) : string()));
            members.push_back("\"Value\":" + any(3));
        } else {
            members.push_back("\"Report\":" + (odd() ? any(2) : hex()));
        }
        return changedObject(std::move(members));
    }
    std::string report() {
        return changedObject(
            {"\"Timestamp\":" + timestamp(), "\"ReportData\":" + (odd() ? any(2) : hex())});
    }
    /// Without one, with others, with one twice.
    std::string changedObject(std::vector<std::string> members) {
        if (odd()) {
            members.erase(members.begin() +
                          static_cast<std::ptrdiff_t>(random_.next() % members.size()));
        }
        while (odd()) {
            members.push_back(name() + ":" + any(3));
        }
        return object(std::move(members));
    }
    std::string object(std::vector<std::string> members) {
        for (std::size_t i = members.size(); i > 1; --i) {
            std::swap(members[i - 1], members[random_.next() % i]);
        }
        std::string text = "{" + space();
        for (std::size_t i = 0; i < members.size(); ++i) {
            text += (i == 0 ? "" : ",") + space() + members[i] + space();
        }
        return text + "}";
    }
    std::string name() {
        return random_.oneOf(std::vector<std::string>{
            "\"Version\"", "\"Frames\"", "\"Reports\"", "\"Type\"", "\"Timestamp\"", "\"Key\"",
            "\"Value\"", "\"Report\"", "\"ReportData\"", "\"\"", "\"Valu\\u0065\"", "\"Other\""});
    }
    std::string timestamp() {
        return odd() ? any(2)
                     : random_.oneOf(std::vector<std::string>{"0", "5", "16666667", "1.5", "-1",
                                                              "18446744073709551615", "1e30"});
    }
    std::string hex() {
        if (odd()) {
            return random_.oneOf(std::vector<std::string>{"\"01 100 \"", "\"-1\""});
        }
        return random_.oneOf(std::vector<std::string>{
            "\"\"", "\"01 ab 00 \"", "\"1 2 3\"", "\"ab,cd\"", "\"0x10\\t-ff01\"", "\"01 zz 02\"",
            "\"01 02 03 04 05 06 07 08 09 \"", "\"01 02 \\u00303 04 05 06 07 08 09 0a 0b\""});
    }
    std::string string() {
        return random_.oneOf(std::vector<std::string>{"\"\"", "\"a\"", "\"Algs.Key\"",
                                                      "\"\\u00e9\\n\\\\\"", "\"\xC3\xA9\"",
                                                      "\"State\"", "\"InputReport\""});
    }
    std::string any(int depth) {
        switch (random_.between(0, depth > 0 ? 8 : 5)) {
            case 0:
                return "null";
            case 1:
                return random_.oneIn(2) ? "true" : "false";
            case 2:
                return random_.oneOf(
                    std::vector<std::string>{"0", "1", "-2.5", "200.0", "18446744073709551615"});
            case 3:
                return string();
            case 4:
                return "[]";
            case 5:
                return "{}";
            case 6:
                return "[" + any(depth - 1) + "," + any(depth - 1) + "]";
            case 7:
                return random_.oneIn(2) ? frame() : report();
            default:
                return object({name() + ":" + any(depth - 1), name() + ":" + any(depth - 1)});
        }
    }
    std::string space() { return random_.oneIn(8) ? random_.oneIn(2) ? " " : "\n\t" : ""; }

    SeededRandom random_;
    int oddity_ = 20;
};

/// What both ways give for a text.
ContainerAnswer sameAnswer(const std::string& text, SeededRandom& random) {
    const ContainerAnswer expected = readByTree(text);
    EXPECT_EQ(streamed(text), expected) << text;
    EXPECT_EQ(streamed(text, static_cast<std::size_t>(random.between(1, 40))), expected) << text;
    return expected;
}

/// How often each answer came: a kind of fault, or frames.
using Answers = std::map<std::string, int>;

void count(Answers& answers, const ContainerAnswer& answer) {
    const bool wrongVersion = answer.fault.find("container version: ") != std::string::npos;
    ++answers[wrongVersion           ? "wrong version"
              : answer.fault.empty() ? answer.frames.empty() ? "no frames" : "frames"
                                     : answer.fault];
}

const char* const kAllAnswers[] = {
    "frames",
    "no frames",
    "wrong version",
    "runtime_error: migrateSerializedContainer failed: invalid container",
    "runtime_error: migrateSerializedContainer failed: invalid version",
    "runtime_error: migrateSerializedContainer failed: frame lacks Timestamp",
    "runtime_error: migrateSerializedContainer failed: frame lacks ReportData",
    "invalid_argument: invalid frames",
    "invalid_argument: invalid frame type",
    "invalid_argument: invalid frame timestamp",
    "invalid_argument: invalid state key",
    "invalid_argument: invalid state value class",
    "invalid_argument: invalid report",
    "invalid_argument: invalid hex string",
};

TEST(ContainerPropertyTest, RandomDocumentsReadByStreamAsByTree) {
    const std::uint64_t seed = seedOfThisRun();
    ContainerTexts texts(seed);
    SeededRandom random(seed + 1);
    Answers answers;
    for (int i = 0; i < 20'000 && !HasFailure(); ++i) {
        count(answers, sameAnswer(texts.document(random.oneIn(2) ? 40 : 8), random));
    }
    // Every kind of answer was among them.
    for (const char* answer : kAllAnswers) {
        EXPECT_GT(answers[answer], 10) << answer;
    }
    EXPECT_EQ(answers.size(), std::size(kAllAnswers));
}

TEST(ContainerPropertyTest, DamagedDocumentsReadByStreamAsByTree) {
    const std::uint64_t seed = seedOfThisRun();
    ContainerTexts texts(seed);
    SeededRandom random(seed + 1);
    Answers answers;
    for (int i = 0; i < 20'000 && !HasFailure(); ++i) {
        std::string text = texts.document(60);
        for (int damages = random.between(1, 3); damages > 0; --damages) {
            text = texts.damaged(text);
        }
        count(answers, sameAnswer(text, random));
    }
    EXPECT_GT(answers["frames"], 100);
    EXPECT_GT(answers[kAllAnswers[3]], 1000);
}

/// What the system writes of a few random frames: the form that readers meet nearly always.
std::string writtenContainer(SeededRandom& random) {
    std::list<PipelineRecording::Frame> frames;
    for (int i = random.between(0, 5); i > 0; --i) {
        const std::uint64_t timestamp = random.next() >> random.between(0, 63);
        if (random.oneIn(3)) {
            static const Vexa::PropertyValue kValues[] = {
                200.0, true, "text \"\n", Vexa::PropertyValue::null(),
                Vexa::PropertyValue::Array{1, Vexa::PropertyValue::Dictionary{{"Type", "State"}}}};
            frames.push_back(stateFrame(timestamp, random.oneIn(2) ? "Algs.Key" : "\xC3\xA9\\",
                                        random.oneOf(kValues)));
        } else {
            std::vector<std::uint8_t> report(static_cast<std::size_t>(random.between(0, 80)));
            for (std::uint8_t& byte : report) {
                byte = static_cast<std::uint8_t>(random.next());
            }
            frames.push_back(reportFrame(timestamp, std::move(report)));
        }
    }
    return PipelineRecording(std::move(frames)).json();
}

TEST(ContainerPropertyTest, WrittenContainersReadByStreamAsByTreeDamagedOrNot) {
    const std::uint64_t seed = seedOfThisRun();
    ContainerTexts texts(seed);
    SeededRandom random(seed + 1);
    Answers answers;
    for (int i = 0; i < 20'000 && !HasFailure(); ++i) {
        std::string text = writtenContainer(random);
        for (int damages = random.between(0, 2); damages > 0; --damages) {
            text = texts.damaged(text);
        }
        count(answers, sameAnswer(text, random));
    }
    EXPECT_GT(answers["frames"], 5000);
    EXPECT_GT(answers[kAllAnswers[3]], 1000);
    EXPECT_GT(answers["invalid_argument: invalid frame type"], 10);
    EXPECT_GT(answers["invalid_argument: invalid hex string"], 10);
}

TEST(ContainerPropertyTest, AWrittenContainerReadsTheSameWhereverItIsCutInTwo) {
    SeededRandom random(seedOfThisRun());
    for (int i = 0; i < 30 && !HasFailure(); ++i) {
        const std::string text = writtenContainer(random);
        const ContainerAnswer expected = readByTree(text);
        ASSERT_EQ(expected.fault, "");
        for (std::size_t cut = 0; cut <= text.size(); ++cut) {
            ContainerReader reader;
            EXPECT_TRUE(reader.write(std::string_view(text).substr(0, cut)));
            EXPECT_TRUE(reader.write(std::string_view(text).substr(cut)));
            ASSERT_EQ(answerOf([&] { return reader.finish(); }), expected) << cut;
        }
    }
}

/// Where a reader of JSON finds the fault of a whole text, if it has one.
std::optional<std::uint64_t> jsonErrorOffset(std::string_view text) {
    Vexa::JsonValueBuilder builder;
    Vexa::JsonParser parser(builder);
    return parser.write(text) && parser.finish() ? std::nullopt
                                                 : std::optional(parser.errorOffset());
}

TEST(ContainerPropertyTest, ASyntaxErrorIsWhereAReaderOfJsonFindsIt) {
    const std::uint64_t seed = seedOfThisRun();
    ContainerTexts texts(seed);
    SeededRandom random(seed + 1);
    for (int i = 0; i < 5'000 && !HasFailure(); ++i) {
        const std::string text = texts.damaged(writtenContainer(random));
        ContainerReader reader;
        reader.write(text);
        answerOf([&] { return reader.finish(); });
        const std::optional<std::uint64_t> expected = jsonErrorOffset(text);
        ASSERT_EQ(reader.errorOffset().has_value(), expected.has_value()) << text;
        if (expected) {
            // Within a character, escape or literal it may depend on how the text was cut.
            constexpr double kLongestToken = 6;
            EXPECT_NEAR(static_cast<double>(*reader.errorOffset()), static_cast<double>(*expected),
                        kLongestToken)
                << text;
        }
    }
}

TEST(ContainerPropertyTest, RecoveryKeepsEveryWholeFrameOfAWrittenContainerCutOffAnywhere) {
    SeededRandom random(seedOfThisRun());
    for (int i = 0; i < 30 && !HasFailure(); ++i) {
        const std::string text = writtenContainer(random);
        const FrameList all = readByTree(text).frames;
        for (std::size_t length = 0; length <= text.size(); ++length) {
            const std::string_view cut = std::string_view(text).substr(0, length);
            // A frame ends where a bracket closes at a frame's indentation.
            std::size_t whole = 0;
            for (std::size_t at = 0; (at = cut.find("\n    }", at)) != std::string_view::npos;
                 ++at) {
                ++whole;
            }
            ContainerReader reader;
            reader.write(cut);
            const std::list<PipelineRecording::Frame> expected(
                all.begin(), std::next(all.begin(), static_cast<std::ptrdiff_t>(whole)));
            ASSERT_EQ(reader.recover(), expected) << cut;
        }
    }
}

TEST(ContainerPropertyTest, RecoveryKeepsWhatReadingAWholeTextGives) {
    const std::uint64_t seed = seedOfThisRun();
    ContainerTexts texts(seed);
    int read = 0;
    for (int i = 0; i < 5'000 && !HasFailure(); ++i) {
        const std::string text = texts.document(60);
        const ContainerAnswer expected = readByTree(text);
        if (!expected.fault.empty()) {
            continue;
        }
        ++read;
        // All but the last bracket is there. (A number is only known once something follows it.)
        ContainerReader cut;
        cut.write(text.substr(0, text.rfind('}')) + " ");
        EXPECT_EQ(cut.recover(), expected.frames) << text;
        ContainerReader whole;
        whole.write(text);
        EXPECT_EQ(whole.recover(), expected.frames) << text;
        EXPECT_EQ(whole.refusedFrames(), 0U) << text;
    }
    EXPECT_GT(read, 1000);
}

}  // namespace
}  // namespace VexaTouch::Testing
