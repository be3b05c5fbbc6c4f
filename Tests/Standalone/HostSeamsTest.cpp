// A process of its own, since it replaces functions that the host and the plug-in call.

#include "Host/HostFailure.h"
#include "Host/HostSession.h"
#include "Host/PluginLibrary.h"
#include "Host/RegisteredDevice.h"
#include "Platform/ScriptedDevice.h"
#include "Tests/Support/LiveObjects.h"
#include "Tests/Tools/CommandRun.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <vexa/abi.h>
#include <vexa/device.h>
#include <vexa/queue.h>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

constexpr std::uint32_t kOtherVersion = 0x0007'0003;

bool abiServes = true;
std::uint32_t askedFor = 0;
bool haveQueues = true;
bool haveHandles = true;

template <typename Function>
Function* original(const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {

VEXA_API bool vexa_abi_serves(uint32_t built_for) noexcept {
    askedFor = built_for;
    return abiServes;
}

VEXA_API uint32_t vexa_abi_version(void) noexcept {
    return abiServes ? VEXA_ABI_VERSION : kOtherVersion;
}

VEXA_API vexa_queue* vexa_queue_create(const char* label) noexcept {
    static const auto create = original<vexa_queue*(const char*)>("vexa_queue_create");
    return haveQueues ? create(label) : nullptr;
}

VEXA_API uint32_t vexa_service_register(const vexa_device_backend* backend,
                                        void* context) noexcept {
    static const auto make =
        original<uint32_t(const vexa_device_backend*, void*)>("vexa_service_register");
    return haveHandles ? make(backend, context) : 0;
}

}  // extern "C"

namespace VexaTouch::Testing {
namespace {

using Host::HostFailure;
using ::testing::EndsWith;

constexpr const char* kFile = VEXATOUCH_PLUGIN_FILE;

class HostSeamsTest : public ::testing::Test {
protected:
    HostSeamsTest() { setenv("VEXATOUCH_PLUGIN", kFile, 1); }
    ~HostSeamsTest() override {
        unsetenv("VEXATOUCH_PLUGIN");
        abiServes = true;
        haveQueues = true;
        haveHandles = true;
    }

    static std::string versionText(std::uint32_t version) {
        return std::to_string(version >> 16U) + '.' + std::to_string(version & 0xFFFFU);
    }
    /// What is said of a platform of the wrong version.
    static std::string platformFault() {
        return "libvexaplatform has ABI 7.3, this program needs " + versionText(VEXA_ABI_VERSION);
    }
    template <typename Operation>
    static std::string failureOf(const Operation& operation) {
        try {
            operation();
        } catch (const HostFailure& failure) {
            return failure.what();
        }
        return "nothing";
    }
};

TEST_F(HostSeamsTest, APlatformThatDoesNotServeTheHostLoadsNoPlugin) {
    abiServes = false;
    EXPECT_EQ(failureOf([] { const Host::PluginLibrary library(kFile); }), platformFault());
    EXPECT_EQ(askedFor, VEXA_ABI_VERSION);
    EXPECT_EQ(runCommand({"get", "--device", "sim", "Version"}),
              (CommandResult{1, "", "vexatouch get: " + platformFault() + '\n'}));
    abiServes = true;
    EXPECT_EQ(failureOf([] { const Host::PluginLibrary library(kFile); }), "nothing");
}

/// Runs one check of the real plug-in in this process, which it ends when the check fails.
void validateHere(const std::string& check) {
    std::istringstream in;
    Tools::Streams streams{.in = in, .out = std::cerr, .error = std::cerr};
    std::exit(Tools::CommandLine::run(
        std::vector<std::string>{"validate", kFile, "--here", "--only", check}, streams));
}

using HostSeamsDeathTest = HostSeamsTest;

TEST_F(HostSeamsDeathTest, APlatformThatDoesNotServeTheValidatorChecksNoPlugin) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(validateHere("slots"), ::testing::ExitedWithCode(0), "pass +slots");
    abiServes = false;
    for (const std::string check : {"load", "slots", "unload"}) {
        EXPECT_EXIT(validateHere(check), ::testing::ExitedWithCode(1),
                    ::testing::ContainsRegex("fail +" + check +
                                             " .*cannot be checked: " + platformFault()));
    }
}

TEST_F(HostSeamsTest, ASessionWithoutAThreadForItsQueueSaysSo) {
    const Host::PluginLibrary library(kFile);
    const auto registration = Host::registeredDevice(std::make_shared<Vexa::ScriptedDevice>());
    const LiveObjects before = LiveObjects::now();
    const std::string fault =
        kFile + std::string(": no thread or no descriptors (it takes four) for the events' queue");
    haveQueues = false;
    EXPECT_EQ(failureOf([&] {
                  const Host::HostSession session(library, registration.service(),
                                                  [](const Vexa::HidEvent&) {});
              }),
              fault);
    EXPECT_EQ(LiveObjects::now(), before);
    const CommandResult run = runCommand({"run"});
    EXPECT_EQ(run.exitCode, 1);
    EXPECT_THAT(run.error, EndsWith("\nvexatouch run: " + fault + '\n'));
    EXPECT_EQ(runCommand({"get", "--device", "sim", "Version"}),
              (CommandResult{1, "", "vexatouch get: " + fault + '\n'}));
    haveQueues = true;
    EXPECT_EQ(runCommand({"get", "--device", "sim", "Version"}),
              (CommandResult{0, "[13,0,0]\n", ""}));
}

TEST_F(HostSeamsTest, ADeviceThatCannotBeRegisteredSaysSo) {
    const std::string fault = "the device cannot be registered: no memory for its service handle";
    const auto device = std::make_shared<Vexa::ScriptedDevice>();
    haveHandles = false;
    EXPECT_EQ(failureOf([&] { static_cast<void>(Host::registeredDevice(device)); }), fault);
    EXPECT_EQ(device.use_count(), 1);
    const CommandResult run = runCommand({"run"});
    EXPECT_EQ(run.exitCode, 1);
    EXPECT_THAT(run.error, EndsWith("\nvexatouch run: " + fault + '\n'));
    EXPECT_EQ(runCommand({"get", "--device", "sim", "Version"}),
              (CommandResult{1, "", "vexatouch get: " + fault + '\n'}));
}

}  // namespace
}  // namespace VexaTouch::Testing
