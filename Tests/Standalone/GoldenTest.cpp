#include "Pipeline/Pipeline.h"
#include "Tests/Reference/Algs.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tools/SeededNumbers.h"
#include "Tools/SurfaceSynthesizer.h"

#include <gtest/gtest.h>

#include <bit>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

// The whole state of the algorithm after every frame of a long session, as one number. It is the
// same on every compiler, at every optimisation and on every machine; a change of the arithmetic,
// of the order of two float operations even, shows here.

namespace VexaTouch {
namespace {

using Frame = PipelineRecording::Frame;
using Tools::SeededNumbers;
using Vexa::PropertyValue;

constexpr std::uint64_t kSeed = 20'260'101;
constexpr std::uint64_t kDurationMs = 640'000;
constexpr std::size_t kLeastFrames = 60'000;
constexpr std::size_t kLeastEvents = 1'000;

// What the session hashes to. To be changed only together with a change of the algorithm that is
// meant; then the literal reading in Tests/Reference gives the same new number.
constexpr std::uint64_t kExpectedHash = 4'590'875'984'189'760'676U;

class Hash {
public:
    void add(std::uint64_t bits) { value_ = std::rotl((value_ ^ bits) * 0x9E3779B97F4A7C15U, 29); }
    [[nodiscard]] std::uint64_t value() const { return value_; }

private:
    std::uint64_t value_ = 0xCBF29CE484222325U;
};

/// Settings that no one should choose, each followed some frames later by a sane one.
struct Settings {
    const char* key;
    PropertyValue odd;
    PropertyValue sane;
};

std::vector<Settings> oddSettings() {
    constexpr float kInfinity = std::numeric_limits<float>::infinity();
    const PropertyValue threshold(200.0F);
    const PropertyValue timeout(500);
    const char* const activation = "Algs.ActivationThreshold";
    const char* const hold = "Algs.HoldTimeoutMilliseconds";
    return {
        {activation, 0.0F, threshold},
        {activation, -0.0F, threshold},
        {activation, -200.0, threshold},
        {activation, kInfinity, threshold},
        {activation, -kInfinity, threshold},
        {activation, std::numeric_limits<float>::quiet_NaN(), threshold},
        {activation, std::numeric_limits<float>::denorm_min(), threshold},
        {activation, 1e-30, threshold},
        {activation, 3e38, threshold},
        {activation, 0.1, threshold},
        {activation, "no number", threshold},
        {activation, 75, threshold},
        {activation, 133.7, threshold},
        {hold, 0, timeout},
        {hold, 4294967295U, timeout},
        {hold, std::uint64_t{1} << 32U, timeout},
        {hold, -1, timeout},
        {hold, 12.9, timeout},
        {"Algs.EnableHoldSuppression", false, true},
        {"Algs.EnableHoldSuppression", PropertyValue::null(), 0.5},
        {"Algs.EnableTapSuppression", false, true},
        {"Algs.EnableTapSuppression", "", 2},
        {"Algs.VirtualNormalizationFactors.7", kInfinity, 0.4651},
        {"Algs.VirtualNormalizationFactors.-1", 1, 1},
        {"Algs.ResetEventStats", PropertyValue(), 1},
        {"Algs.NoSuchKey", 1, 1},
    };
}

/// The session: plausible touches, in between settings of any value and images of any content.
std::vector<Frame> goldenSession() {
    std::vector<Frame> session;
    SeededNumbers random(kSeed);
    const std::vector<Settings> settings = oddSettings();
    const Settings* toRestore = nullptr;
    std::size_t nextSetting = 0;
    std::uint32_t wildImages = 0;
    const auto addState = [&session](const char* key, const PropertyValue& value) {
        Frame frame;
        frame.type = Frame::Type::State;
        frame.key = key;
        frame.value = value;
        session.push_back(std::move(frame));
    };
    Tools::SurfaceSynthesizer synthesizer([&](Frame frame) {
        const std::uint32_t chance = random.below(400);
        if (chance == 0 && !toRestore) {
            toRestore = &settings[nextSetting++ % settings.size()];
            addState(toRestore->key, toRestore->odd);
        } else if (chance < 4 && toRestore) {
            addState(toRestore->key, toRestore->sane);
            toRestore = nullptr;
        } else if (chance == 5) {
            wildImages = 1 + random.below(30);
        }
        if (wildImages > 0 && frame.report.size() == InputReport::Image::minimumLength) {
            --wildImages;
            const std::size_t samples = InputReport::Image::minimumLength - 2 * kPixelCount;
            for (std::size_t i = samples; i < frame.report.size(); ++i) {
                frame.report[i] = static_cast<std::uint8_t>(random.next() >> 56U);
            }
        }
        session.push_back(std::move(frame));
    });
    synthesizer.perform(Tools::GestureScript::parse(Tools::randomScript(kSeed, kDurationMs)));
    EXPECT_GE(nextSetting, settings.size()) << "every odd setting is tried";
    return session;
}

void addState(Hash& hash, const auto& algs) {
    Testing::forEachStateField(
        algs, [&hash](std::string_view, std::size_t, std::string_view, const auto& value) {
            hash.add(Testing::fieldBits(value));
        });
}

void addEvents(Hash& hash, const std::vector<Vexa::HidEvent>& events) {
    for (const Vexa::HidEvent& event : events) {
        hash.add(static_cast<std::uint64_t>(event.type()));
        hash.add(static_cast<std::uint64_t>(event.phase()));
        hash.add(static_cast<std::uint64_t>(
            event.integerField(Vexa::HidEventField::DigitizerFrameNumber)));
        if (const auto record = event.digitizerRecord()) {
            hash.add(record->eventMask);
            hash.add(std::bit_cast<std::uint64_t>(record->y));
        }
    }
}

TEST(GoldenTest, TheStateOfEveryFrameIsTheSameEverywhere) {
    const std::vector<Frame> session = goldenSession();
    ASSERT_GE(session.size(), kLeastFrames);
    Hash hash;
    std::size_t eventCount = 0;
    Pipeline pipeline;
    pipeline.hidEventsProbe = [&](const std::vector<Vexa::HidEvent>& events) {
        eventCount += events.size();
        addEvents(hash, events);
    };
    for (const Frame& frame : session) {
        if (frame.type == Frame::Type::State) {
            pipeline.setState(frame.key, frame.value);
        } else {
            pipeline.handleInputReport(frame.report.data(), frame.report.size());
        }
        addState(hash, pipeline.algs());
    }
    EXPECT_GE(eventCount, kLeastEvents);
    EXPECT_EQ(hash.value(), kExpectedHash);
}

TEST(GoldenTest, TheLiteralReadingGivesTheSameHash) {
    Hash hash;
    Reference::Algs algs;
    for (const Frame& frame : goldenSession()) {
        const std::uint8_t* bytes = frame.report.data();
        if (frame.type == Frame::Type::State) {
            algs.setState(frame.key.substr(frame.key.find('.') + 1), frame.value);
        } else if (const auto event =
                       InputReport::FirmwareEvent::parse(bytes, frame.report.size())) {
            if (event->code == 0) {
                std::vector<Vexa::HidEvent> events = algs.handleReset();
                events.push_back(Vexa::HidEvent::vendorDefined({}));
                addEvents(hash, events);
            }
        } else if (const auto image = InputReport::Image::parse(bytes, frame.report.size())) {
            addEvents(hash, algs.handleImage(*image));
        }
        addState(hash, algs);
    }
    EXPECT_EQ(hash.value(), kExpectedHash);
}

}  // namespace
}  // namespace VexaTouch
