#include "Service/PropertyKeys.h"
#include "Tests/Support/LiveObjects.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include "Pipeline/PipelineRecording.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Vexa::PropertyValue;
using Vexa::ScriptedDevice;

const PropertyValue kNothing;

class ServicePropertiesTest : public testing::Test {
protected:
    ServicePropertiesTest() { EXPECT_EQ(stand.service.start(stand.registration.service()), 0U); }

    /// The keys that the device was asked for, or told, since the beginning.
    [[nodiscard]] std::vector<std::string> deviceKeys(std::string_view operation) const {
        std::vector<std::string> keys;
        for (const ScriptedDevice::Call& call : stand.device->calls()) {
            if (call.operation == operation) keys.emplace_back(*call.key.asString());
        }
        return keys;
    }
    [[nodiscard]] std::vector<std::pair<std::uint32_t, std::size_t>> reportsAsked() const {
        std::vector<std::pair<std::uint32_t, std::size_t>> reports;
        for (const ScriptedDevice::Call& call : stand.device->calls()) {
            if (call.operation != ScriptedDevice::kGetReport) continue;
            EXPECT_EQ(call.type, VEXA_REPORT_FEATURE);
            reports.emplace_back(call.reportId, call.room);
        }
        return reports;
    }
    [[nodiscard]] PropertyValue get(const PropertyValue& key) const {
        return stand.service.get(key);
    }

    ServiceStand stand{VEXATOUCH_PLUGIN_FILE};
};

TEST_F(ServicePropertiesTest, VersionIsThirteen) {
    EXPECT_EQ(get("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    EXPECT_THAT(stand.device->calls(), IsEmpty());
}

TEST_F(ServicePropertiesTest, FeatureReportsAreReadAndParsed) {
    stand.device->setFeatureReport(4, {4, 0xFE, 7});
    stand.device->setFeatureReport(31, {31, 0x78, 0x56, 0x34, 0xF2});
    stand.device->setFeatureReport(63, {63, 0xFF, 0xFF, 0xFF, 0xFF});
    EXPECT_EQ(get("FirmwareVersion"), PropertyValue(PropertyValue::Array{0xFE, 7}));
    EXPECT_EQ(get("FactoryResetHoldDuration"), PropertyValue(0xF2345678U));
    EXPECT_EQ(get("CriticalErrors"), PropertyValue(0xFFFFFFFFU));
    EXPECT_THAT(reportsAsked(),
                ElementsAre(std::pair(4U, 32U), std::pair(31U, 32U), std::pair(63U, 32U)));
    EXPECT_THAT(deviceKeys(ScriptedDevice::kProperty), IsEmpty());
}

TEST_F(ServicePropertiesTest, LongFeatureReportsAreCutAndStillRead) {
    ScriptedDevice::Bytes longReport(40, 0xAA);
    longReport[0] = 4;
    stand.device->setFeatureReport(4, longReport);
    EXPECT_EQ(get("FirmwareVersion"), PropertyValue(PropertyValue::Array{0xAA, 0xAA}));
}

TEST_F(ServicePropertiesTest, ShortFeatureReportsYieldNothing) {
    const LogCapture log;
    stand.device->setFeatureReport(4, {4, 1});
    stand.device->setFeatureReport(31, {31, 1, 2, 3});
    stand.device->setFeatureReport(63, {});
    EXPECT_EQ(get("FirmwareVersion"), kNothing);
    EXPECT_EQ(get("FactoryResetHoldDuration"), kNothing);
    EXPECT_EQ(get("CriticalErrors"), kNothing);
}

TEST_F(ServicePropertiesTest, FeatureReportsWithAnotherIdYieldNothing) {
    stand.device->setFeatureReport(4, {5, 1, 2});
    stand.device->setFeatureReport(31, {4, 1, 2, 3, 4});
    EXPECT_EQ(get("FirmwareVersion"), kNothing);
    EXPECT_EQ(get("FactoryResetHoldDuration"), kNothing);
}

TEST_F(ServicePropertiesTest, FailedFeatureReportsYieldNothingAndAreNotLogged) {
    LogCapture log;
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.device->setFeatureReportStatus(4, VEXA_STATUS_IO_ERROR);
    EXPECT_EQ(get("FirmwareVersion"), kNothing);
    EXPECT_EQ(get("CriticalErrors"), kNothing);
    EXPECT_THAT(log.take(), ElementsAre(debug("getPropertyForKey:FirmwareVersion"),
                                        debug("getPropertyForKey:CriticalErrors")));
}

TEST_F(ServicePropertiesTest, OtherKeysAreTheDevices) {
    stand.device->setPropertyValue("Product", "surface");
    EXPECT_EQ(get("Product"), PropertyValue("surface"));
    EXPECT_EQ(get("Nothing"), kNothing);
    EXPECT_EQ(get(""), kNothing);
    EXPECT_TRUE(stand.service.set("Product", 3));
    EXPECT_EQ(get("Product"), PropertyValue(3));
    stand.device->setWrites(ScriptedDevice::Writes::Refused);
    EXPECT_FALSE(stand.service.set("Product", 4));
    EXPECT_EQ(get("Product"), PropertyValue(3));
}

TEST_F(ServicePropertiesTest, ValuesOfEveryTypePassThrough) {
    const std::vector<PropertyValue> values = {
        PropertyValue::null(),
        true,
        -5,
        0xFFFFFFFFFFFFFFFFU,
        1.5F,
        0.1,
        "text",
        std::string("zero\0inside", 11),
        PropertyValue::Bytes{1, 2, 3},
        PropertyValue::Array{1, "two", PropertyValue::Array{}},
        PropertyValue::Dictionary{{"a", 1}, {"b", PropertyValue::Bytes{}}},
    };
    for (const PropertyValue& value : values) {
        EXPECT_TRUE(stand.service.set("Any", value));
        EXPECT_EQ(get("Any"), value);
        EXPECT_EQ(get("Any").type(), value.type());
    }
}

TEST_F(ServicePropertiesTest, KeysAreComparedWhole) {
    const std::vector<std::string> strangers = {"Versio",
                                                "Versions",
                                                "version",
                                                std::string("Version\0", 8),
                                                "DebugInfo",
                                                "Pipeline",
                                                "Pipelines.Algs",
                                                "pipeline.Algs.ActivationThreshold",
                                                "Algs.ActivationThreshold",
                                                "ActivationThreshold",
                                                " Version"};
    for (const std::string& key : strangers) {
        stand.device->setPropertyValue(key, "the device's");
        EXPECT_EQ(get(key), PropertyValue("the device's")) << key;
    }
    EXPECT_THAT(deviceKeys(ScriptedDevice::kProperty), testing::ElementsAreArray(strangers));
}

TEST_F(ServicePropertiesTest, KeysOfTheServiceAreTheDevicesOnWrite) {
    const std::vector<std::string> keys = {"Version",
                                           "Recording",
                                           "DisjointImageCount",
                                           "FirmwareVersion",
                                           "FactoryResetHoldDuration",
                                           "CriticalErrors",
                                           "ServicePluginDebug"};
    for (const std::string& key : keys) EXPECT_TRUE(stand.service.set(key, 99)) << key;
    EXPECT_THAT(deviceKeys(ScriptedDevice::kSetProperty), testing::ElementsAreArray(keys));
    EXPECT_EQ(get("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    EXPECT_EQ(get("DisjointImageCount"), PropertyValue(0U));
}

TEST_F(ServicePropertiesTest, KeysWithoutTheDomainAreTheDevicesOnWrite) {
    const PropertyValue threshold = get("Pipeline.Algs.ActivationThreshold");
    ASSERT_EQ(threshold.type(), PropertyValue::Type::Float);
    EXPECT_TRUE(stand.service.set("DebugInfo", 98));
    EXPECT_TRUE(stand.service.set("Algs.ActivationThreshold", 99));
    EXPECT_THAT(stand.device->calls(),
                ElementsAre(
                    ScriptedDevice::Call{
                        .operation = ScriptedDevice::kSetProperty, .key = "DebugInfo", .value = 98},
                    ScriptedDevice::Call{.operation = ScriptedDevice::kSetProperty,
                                         .key = "Algs.ActivationThreshold",
                                         .value = 99}));
    EXPECT_EQ(get("Pipeline.Algs.ActivationThreshold"), threshold);
}

TEST_F(ServicePropertiesTest, PipelineKeysReachTheAlgorithm) {
    EXPECT_TRUE(stand.service.set("Pipeline.Algs.ActivationThreshold", 123));
    EXPECT_EQ(get("Pipeline.Algs.ActivationThreshold").toDouble(), 123.0);
    EXPECT_THAT(stand.device->calls(), IsEmpty());
}

TEST_F(ServicePropertiesTest, UnknownPipelineKeysAreTakenAndReadAsNothing) {
    for (const char* key :
         {"Pipeline.", "Pipeline.Unknown", "Pipeline.DebugInfo", "Pipeline.ActivationThreshold",
          "Pipeline.Algs.Unknown", "Pipeline.Pipeline.Algs.ActivationThreshold"}) {
        EXPECT_TRUE(stand.service.set(key, 1)) << key;
        EXPECT_EQ(get(key), kNothing) << key;
    }
    EXPECT_TRUE(stand.service.set("Pipeline.Algs.ActivationThreshold", kNothing));
    EXPECT_THAT(stand.device->calls(), IsEmpty());
}

TEST_F(ServicePropertiesTest, KeysThatAreNoStringsAreNone) {
    const std::vector<PropertyValue> keys = {
        kNothing, PropertyValue::null(),     4,
        true,     PropertyValue::Bytes{'V'}, PropertyValue::Array{}};
    for (const PropertyValue& key : keys) {
        EXPECT_EQ(get(key), kNothing);
        EXPECT_FALSE(stand.service.set(key, 1));
    }
    EXPECT_THAT(stand.device->calls(), IsEmpty());
}

TEST_F(ServicePropertiesTest, RecordingIsTheTextOfAContainer) {
    stand.startUp();
    stand.service.set("Pipeline.Algs.HoldTimeoutMilliseconds", 300);
    const std::vector<std::uint8_t> image = imageReport(touch("A").at(350), 1, 10);
    ASSERT_TRUE(stand.feed({image, {9, 9}, {}}));
    const PropertyValue value = get("Recording");
    ASSERT_EQ(value.type(), PropertyValue::Type::String);
    const PipelineRecording recording{std::string_view(*value.asString())};
    std::vector<std::vector<std::uint8_t>> reports;
    std::vector<std::string> keys;
    for (const auto& frame : recording.frames()) {
        if (frame.type == PipelineRecording::Frame::Type::State) {
            keys.push_back(frame.key);
            EXPECT_EQ(frame.value, PropertyValue(300));
        } else {
            reports.emplace_back(frame.report.begin(), frame.report.end());
        }
    }
    EXPECT_THAT(keys, ElementsAre("Algs.HoldTimeoutMilliseconds"));
    EXPECT_THAT(reports, ElementsAre(image, std::vector<std::uint8_t>{9, 9}, IsEmpty()));
    stand.tearDown();
}

TEST_F(ServicePropertiesTest, RecordingKeepsTheNewest1350Reports) {
    stand.startUp();
    std::vector<std::vector<std::uint8_t>> reports;
    for (std::uint32_t frame = 0; frame < 2699; ++frame) {
        reports.push_back(imageReport(nothing(), frame, frame * 10));
    }
    ASSERT_TRUE(stand.feed(reports));
    const PropertyValue value = get("Recording");
    const PipelineRecording recording{std::string_view(*value.asString())};
    ASSERT_EQ(recording.frames().size(), 1350U);
    const auto& oldest = recording.frames().front().report;
    EXPECT_EQ(std::vector<std::uint8_t>(oldest.begin(), oldest.end()), reports[1349]);
    const auto& newest = recording.frames().back().report;
    EXPECT_EQ(std::vector<std::uint8_t>(newest.begin(), newest.end()), reports.back());
    stand.tearDown();
}

TEST_F(ServicePropertiesTest, DebugInfoTellsAllButTheHoldDuration) {
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.device->setFeatureReport(31, {31, 1, 0, 0, 0});
    stand.device->setFeatureReport(63, {63, 5, 0, 0, 0});
    const PropertyValue info = get("ServicePluginDebug");
    const auto members = info.asDictionary();
    ASSERT_TRUE(members);
    std::vector<std::string> keys;
    for (const auto& member : *members) keys.emplace_back(member.first);
    EXPECT_THAT(keys, ElementsAre("CriticalErrors", "DisjointImageCount", "FirmwareVersion",
                                  "Pipeline.Algs.DebugInfo", "Recording", "Version"));
    EXPECT_EQ(info.member("Pipeline.DebugInfo"), kNothing);
    EXPECT_EQ(info.member("FactoryResetHoldDuration"), kNothing);
    EXPECT_EQ(info.member("Version"), get("Version"));
    EXPECT_EQ(info.member("Recording"), get("Recording"));
    EXPECT_EQ(info.member("DisjointImageCount"), PropertyValue(0U));
    EXPECT_EQ(info.member("FirmwareVersion"), PropertyValue(PropertyValue::Array{1, 2}));
    EXPECT_EQ(info.member("CriticalErrors"), PropertyValue(5U));
    const PropertyValue algorithm = info.member("Pipeline.Algs.DebugInfo");
    EXPECT_EQ(algorithm.type(), PropertyValue::Type::Dictionary);
    EXPECT_EQ(algorithm, get("Pipeline.Algs.DebugInfo"));
    EXPECT_EQ(algorithm.member("EventStats"), get("Pipeline.Algs.EventStats"));
}

TEST_F(ServicePropertiesTest, DebugInfoAsksInItsOrderAndLeavesOutWhatFails) {
    LogCapture log;
    const PropertyValue info = get("ServicePluginDebug");
    EXPECT_EQ(info.member("FirmwareVersion"), kNothing);
    EXPECT_EQ(info.member("CriticalErrors"), kNothing);
    EXPECT_EQ(info.member("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    EXPECT_THAT(log.take(), ElementsAre(debug("getPropertyForKey:ServicePluginDebug"),
                                        debug("getPropertyForKey:Version"),
                                        debug("getPropertyForKey:Recording"),
                                        debug("getPropertyForKey:DisjointImageCount"),
                                        debug("getPropertyForKey:FirmwareVersion"),
                                        debug("getPropertyForKey:CriticalErrors"),
                                        debug("getPropertyForKey:Pipeline.DebugInfo"),
                                        debug("getPropertyForKey:Pipeline.Algs.DebugInfo")));
    EXPECT_THAT(reportsAsked(), ElementsAre(std::pair(4U, 32U), std::pair(63U, 32U)));
}

TEST_F(ServicePropertiesTest, LogShowsKeysAndValues) {
    LogCapture log;
    for (const PropertyValue& key : {PropertyValue("Some key"), kNothing, PropertyValue(5)}) {
        EXPECT_EQ(get(key), kNothing);
    }
    stand.service.set("Some key", "text");
    stand.service.set("Some key", PropertyValue::Array{1, "x"});
    stand.service.set(kNothing, kNothing);
    stand.service.set("Pipeline.Algs.ActivationThreshold", 200);
    EXPECT_THAT(log.take(),
                ElementsAre(debug("getPropertyForKey:Some key"), debug("getPropertyForKey:(null)"),
                            debug("getPropertyForKey:5"), debug("setProperty:text forKey:Some key"),
                            debug("setProperty:[1, \"x\"] forKey:Some key"),
                            debug("setProperty:(null) forKey:(null)"),
                            debug("setProperty:200 forKey:Pipeline.Algs.ActivationThreshold")));
}

TEST(ServiceWithoutDeviceTest, AnswersWhatItKnowsItself) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const ServiceUnderTest service(plugin.make());
    EXPECT_EQ(service.get("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    EXPECT_EQ(service.get("DisjointImageCount"), PropertyValue(0U));
    EXPECT_EQ(service.get("Recording").type(), PropertyValue::Type::String);
    EXPECT_EQ(service.get("FirmwareVersion"), kNothing);
    EXPECT_EQ(service.get("Product"), kNothing);
    EXPECT_FALSE(service.set("Product", 1));
    EXPECT_TRUE(service.set("Pipeline.Algs.ActivationThreshold", 100));
    EXPECT_EQ(service.get("Pipeline.Algs.ActivationThreshold").toDouble(), 100.0);
}

}  // namespace
}  // namespace VexaTouch::Testing
