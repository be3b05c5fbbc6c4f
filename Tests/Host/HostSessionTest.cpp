#include "Host/HostFailure.h"
#include "Host/HostSession.h"
#include "Host/PluginLibrary.h"
#include "Tests/Host/SamplePlugin.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Host::HostFailure;
using Host::HostSession;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Vexa::PropertyValue;

constexpr std::uint32_t kDevice = 7;
constexpr std::uint32_t kOptions = 3;
constexpr const char* kFile = VEXATOUCH_SAMPLE_PLUGIN_FILE;

/// Finds the sample plug-in's own door; the caller keeps the library loaded.
sample_plugin& samplePlugin(const Host::PluginLibrary& library) {
    void* handle = dlopen(library.file().c_str(), RTLD_NOW | RTLD_NOLOAD);
    const auto access =
        reinterpret_cast<sample_plugin_access_function>(dlsym(handle, SAMPLE_PLUGIN_ACCESS_NAME));
    dlclose(handle);
    return *access();
}

class HostSessionTest : public ::testing::Test {
protected:
    HostSessionTest() {
        sample.failure = SAMPLE_FAILS_NOWHERE;
        sample.journal[0] = '\0';
        sample.live = 0;
    }

    Host::PluginLibrary library{kFile};
    sample_plugin& sample = samplePlugin(library);

    HostSession::EventSink notingSink() {
        return [this](const Vexa::HidEvent& event) {
            sample.note(event.type() == Vexa::HidEventType::VendorDefined ? "event" : "odd event");
        };
    }

    /// The calls since the last time that this was asked.
    std::vector<std::string> calls() {
        std::vector<std::string> lines;
        std::istringstream stream(sample.journal);
        for (std::string line; std::getline(stream, line);) {
            lines.push_back(line);
        }
        sample.journal[0] = '\0';
        return lines;
    }

    /// What making a session fails with.
    std::string failureOf(sample_failure failure) {
        sample.failure = failure;
        try {
            const HostSession session(library, kDevice, notingSink());
        } catch (const HostFailure& fault) {
            return fault.what();
        }
        return "nothing";
    }

    static std::string message(const std::string& text) { return kFile + (": " + text); }
};

TEST_F(HostSessionTest, WalksTheWholeLifeInItsOrder) {
    HostSession session(library, kDevice, notingSink(),
                        PropertyValue::Dictionary{{"Transport", "test"}});
    EXPECT_THAT(calls(),
                ElementsAre("factory", "QueryInterface", "Probe device 7, 1 properties, score 0",
                            "Start device 7, 1 properties", "setEventCallback"));
    EXPECT_EQ(session.score(), 5);
    session.begin(kOptions);
    EXPECT_THAT(calls(), ElementsAre("schedule", "open 3"));
    session.end();
    EXPECT_THAT(calls(),
                ElementsAre("close 3", "unschedule", "event", "Stop", "Release", "Release"));
    EXPECT_EQ(sample.live, 0U);
}

TEST_F(HostSessionTest, EndsOnceHoweverOftenItIsAsked) {
    {
        HostSession session(library, kDevice, notingSink());
        session.begin();
        session.end();
        calls();
        session.end();
    }
    EXPECT_THAT(calls(), IsEmpty());
}

TEST_F(HostSessionTest, GoingAwayEndsIt) {
    {
        HostSession session(library, kDevice, notingSink());
        session.begin();
        calls();
    }
    EXPECT_THAT(calls(),
                ElementsAre("close 0", "unschedule", "event", "Stop", "Release", "Release"));
    EXPECT_EQ(sample.live, 0U);
}

TEST_F(HostSessionTest, WithoutBeginThereIsNothingToCloseOrUnschedule) {
    {
        const HostSession session(library, kDevice, notingSink());
        calls();
    }
    EXPECT_THAT(calls(), ElementsAre("Stop", "Release", "Release"));
}

TEST_F(HostSessionTest, PropertiesGoThroughTheSlots) {
    HostSession session(library, kDevice, notingSink());
    calls();
    EXPECT_EQ(session.property("Some.Key"), PropertyValue("Some.Key"));
    EXPECT_TRUE(session.setProperty("A", 12));
    EXPECT_FALSE(session.setProperty("B", 0));
    EXPECT_THAT(calls(), ElementsAre("setProperty A = 12", "setProperty B = 0"));
}

TEST_F(HostSessionTest, EventQueriesGoThroughTheSlots) {
    const HostSession session(library, kDevice, notingSink());
    const auto event = Vexa::HidEvent::vendorDefined(Vexa::VendorEventRecord());
    EXPECT_EQ(session.service().copyEvent(1, &event, 0), event);
    EXPECT_EQ(session.service().copyEvent(1, nullptr, 0), std::nullopt);
    EXPECT_EQ(session.service().setOutputEvent(event), VEXA_STATUS_UNSUPPORTED);
}

TEST_F(HostSessionTest, FactoryThatMakesNothing) {
    EXPECT_EQ(failureOf(SAMPLE_FACTORY_MAKES_NOTHING), message("its factory makes no HID service"));
    EXPECT_THAT(calls(), IsEmpty());
}

TEST_F(HostSessionTest, InterfaceWithoutATableIsLeftAlone) {
    EXPECT_EQ(failureOf(SAMPLE_TABLE_IS_MISSING), message("its plug-in interface has no table"));
    EXPECT_THAT(calls(), ElementsAre("factory"));
}

TEST_F(HostSessionTest, InterfaceOfAnotherVersionIsGivenBack) {
    EXPECT_EQ(failureOf(SAMPLE_VERSION_IS_2),
              message("its plug-in interface has version 2, this host knows version 1"));
    EXPECT_THAT(calls(), ElementsAre("factory", "Release"));
}

TEST_F(HostSessionTest, EmptySlotIsNamedAndNotCalled) {
    EXPECT_EQ(failureOf(SAMPLE_SLOT_IS_EMPTY),
              message("the slot Start of its plug-in interface is empty"));
    EXPECT_THAT(calls(), ElementsAre("factory", "Release"));
    EXPECT_EQ(failureOf(SAMPLE_SERVICE_SLOT_IS_EMPTY),
              message("the slot copyProperty of its service interface is empty"));
    EXPECT_THAT(calls(), ElementsAre("factory", "QueryInterface", "Release", "Release"));
    EXPECT_EQ(sample.live, 0U);
}

TEST_F(HostSessionTest, WithoutAServiceInterfaceThePluginIsGivenBack) {
    EXPECT_EQ(failureOf(SAMPLE_HAS_NO_SERVICE_INTERFACE),
              message("QueryInterface gives no service interface: status 0x80000004 (no such "
                      "interface)"));
    EXPECT_THAT(calls(), ElementsAre("factory", "QueryInterface", "Release"));
}

TEST_F(HostSessionTest, FailedProbeReleasesAndDoesNotStop) {
    EXPECT_EQ(failureOf(SAMPLE_PROBE_FAILS),
              message("Probe failed: status 0xE00002C7 (unsupported)"));
    EXPECT_THAT(calls(),
                ElementsAre("factory", "QueryInterface", "Probe device 7, 0 properties, score 0",
                            "Release", "Release"));
    EXPECT_EQ(sample.live, 0U);
}

TEST_F(HostSessionTest, FailedStartReleasesAndDoesNotStop) {
    EXPECT_EQ(failureOf(SAMPLE_START_FAILS),
              message("Start failed: status 0xE00002BE (no resources)"));
    EXPECT_THAT(calls(),
                ElementsAre("factory", "QueryInterface", "Probe device 7, 0 properties, score 0",
                            "Start device 7, 0 properties", "Release", "Release"));
    EXPECT_EQ(sample.live, 0U);
}

TEST_F(HostSessionTest, FailedOpenUnschedulesAndDoesNotClose) {
    sample.failure = SAMPLE_OPEN_FAILS;
    HostSession session(library, kDevice, notingSink());
    calls();
    try {
        session.begin();
        ADD_FAILURE() << "open did not fail";
    } catch (const HostFailure& fault) {
        EXPECT_EQ(fault.what(), message("open failed: the service could not open its device"));
    }
    EXPECT_THAT(calls(), ElementsAre("schedule", "open 0", "unschedule", "event"));
    session.end();
    EXPECT_THAT(calls(), ElementsAre("Stop", "Release", "Release"));
}

TEST_F(HostSessionTest, BeginningTwiceIsRefusedAndChangesNothing) {
    HostSession session(library, kDevice, notingSink());
    session.begin(kOptions);
    calls();
    EXPECT_THROW(session.begin(), std::logic_error);
    EXPECT_THAT(calls(), IsEmpty());
    session.halt();
    EXPECT_THAT(calls(), ElementsAre("close 3", "unschedule", "event"));
    session.begin();
    EXPECT_THAT(calls(), ElementsAre("schedule", "open 0"));
}

TEST_F(HostSessionTest, FailedStopIsToldOnceAllElseIsDone) {
    sample.failure = SAMPLE_STOP_FAILS;
    HostSession session(library, kDevice, notingSink());
    session.begin();
    calls();
    try {
        session.end();
        ADD_FAILURE() << "Stop did not fail";
    } catch (const HostFailure& fault) {
        EXPECT_EQ(fault.what(), message("Stop failed: status 0xA7510004 (transfer failed)"));
    }
    EXPECT_THAT(calls(),
                ElementsAre("close 0", "unschedule", "event", "Stop", "Release", "Release"));
    EXPECT_EQ(sample.live, 0U);
}

}  // namespace
}  // namespace VexaTouch::Testing
