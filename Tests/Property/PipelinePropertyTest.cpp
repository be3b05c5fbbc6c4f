#include "Pipeline/Pipeline.h"
#include "Tests/Reference/Algs.h"
#include "Tests/Support/AnySession.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/StateSnapshot.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <optional>
#include <random>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Bytes = std::vector<std::uint8_t>;

/// What a pipeline does, read literally: one algorithm, told apart by the report's id and length.
class LiteralPipeline {
public:
    void handleInputReport(const Bytes& report) {
        const bool firmware = report.size() >= 10 && report[0] == 2;
        if (firmware) {
            if (report[1] == 0) {
                send(algs.handleReset(), true);
            }
            return;
        }
        if (report.size() >= 73 && report[0] == 1) {
            send(algs.handleImage(*InputReport::Image::parse(report.data(), report.size())), false);
            return;
        }
        ++invalid;
    }
    void setState(const std::string& key, const Vexa::PropertyValue& value) {
        if (key.starts_with("Algs.")) {
            algs.setState(key.substr(5), value);
        }
    }
    Vexa::PropertyValue getState(const std::string& key) {
        return key.starts_with("Algs.") ? algs.getState(key.substr(5)) : Vexa::PropertyValue();
    }

    std::uint64_t time = 0;
    Reference::Algs algs;
    std::vector<std::string> sent;  ///< one text a batch
    int invalid = 0;

private:
    void send(const std::vector<Vexa::HidEvent>& events, bool afterReset) {
        std::string batch;
        for (const Vexa::HidEvent& event : events) {
            event.setTimestamp(time);
            batch.append(event.description()).append("\n");
        }
        if (afterReset) {
            Vexa::VendorEventRecord record;
            record.timestamp = time;
            record.usagePage = 0xFF60;
            record.usage = 2;
            batch.append(Vexa::HidEvent::vendorDefined(record).description()).append("\n");
        }
        if (!batch.empty()) {
            sent.push_back(batch);
        }
    }
};

/// The bytes of an image, mostly; else a firmware event, or something like one of the two.
Bytes anyReport(SeededRandom& random, const Step& step) {
    Bytes report = imageReport(step.samples, step.frame, step.timeMs);
    if (random.oneIn(100)) {
        report =
            firmwareReport(static_cast<std::uint8_t>(random.oneIn(2) ? 0 : random.between(1, 255)));
    }
    if (random.oneIn(50)) {
        report.resize(static_cast<std::size_t>(random.between(0, 120)));
    }
    if (random.oneIn(50) && !report.empty()) {
        report[0] = static_cast<std::uint8_t>(random.between(0, 3));
    }
    return report;
}

TEST(PipelineProperty, AnyReportsAndSettingsGiveTheEventsOfTheLiteralReading) {
    const char* given = std::getenv("VEXA_PROPERTY_SEED");
    const std::uint64_t seed =
        given == nullptr ? std::random_device{}() : std::strtoull(given, nullptr, 10);
    std::cout << "seed " << seed << "\n";
    SeededRandom random(seed);
    std::size_t batches = 0;
    int invalid = 0;
    for (int session = 0; session < 40; ++session) {
        AnySession steps(random.next());
        Pipeline pipeline;
        LiteralPipeline literal;
        std::vector<std::string> sent;
        int invalidReports = 0;
        pipeline.hidEventsProbe = [&](const std::vector<Vexa::HidEvent>& events) {
            std::string batch;
            for (const Vexa::HidEvent& event : events) {
                batch.append(event.description()).append("\n");
            }
            sent.push_back(batch);
        };
        pipeline.invalidInputReportProbe = [&](const std::uint8_t*, std::uint64_t) {
            ++invalidReports;
        };
        for (int i = 0; i < 1000; ++i) {
            const Step step = steps.next();
            if (random.oneIn(3)) {
                literal.time = random.next();
                pipeline.setTime(literal.time);
            }
            switch (step.kind) {
                case Step::Kind::Setting: {
                    const std::string key = random.oneIn(5) ? step.key : "Algs." + step.key;
                    pipeline.setState(key, step.value);
                    literal.setState(key, step.value);
                    ASSERT_EQ(pipeline.getState(key), literal.getState(key))
                        << key << ", seed " << seed;
                    break;
                }
                case Step::Kind::Copy: {
                    const Pipeline copy = pipeline;
                    pipeline = copy;
                    break;
                }
                default: {
                    const Bytes report = step.kind == Step::Kind::Reset ? firmwareReport(0)
                                                                        : anyReport(random, step);
                    pipeline.handleInputReport(report.data(), report.size());
                    literal.handleInputReport(report);
                }
            }
            ASSERT_EQ(firstDifference(pipeline.algs(), literal.algs), std::nullopt)
                << "seed " << seed;
        }
        ASSERT_EQ(sent, literal.sent) << "seed " << seed;
        ASSERT_EQ(invalidReports, literal.invalid) << "seed " << seed;
        batches += sent.size();
        invalid += invalidReports;
    }
    EXPECT_GT(batches, 100U);
    EXPECT_GT(invalid, 100);
}

}  // namespace
}  // namespace VexaTouch::Testing
