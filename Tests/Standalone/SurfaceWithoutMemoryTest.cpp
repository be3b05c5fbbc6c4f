// A process of its own, since it replaces a function that the surface's instance calls.

#include "Host/PluginLibrary.h"
#include "Platform/ScriptedDevice.h"
#include "Tools/Daemon/BusError.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/SurfaceInstance.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vexa/queue.h>
#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace {

/// Tasks of this thread for which there is no memory.
thread_local std::size_t refused = 0;

}  // namespace

extern "C" {

VEXA_API bool vexa_queue_submit(vexa_queue* queue, vexa_task task, void* context) noexcept {
    static const auto submit = reinterpret_cast<bool (*)(vexa_queue*, vexa_task, void*)>(
        ::dlsym(RTLD_NEXT, "vexa_queue_submit"));
    if (refused > 0) {
        --refused;
        return false;
    }
    return submit(queue, task, context);
}

}  // extern "C"

namespace VexaTouch::Tools::Daemon {
namespace {

using ::testing::ElementsAre;

constexpr const char* kOfTheService = "Version";
constexpr const char* kOfTheDevice = "FirmwareVersion";
constexpr Caller kRoot = {.right = Right::Control, .user = 0};
constexpr Caller kWatcher = {.right = Right::Watch, .user = 1000};

class SurfaceWithoutMemoryTest : public ::testing::Test {
protected:
    /// Calls once the surface runs, and returns when everything that was asked has been answered.
    void whenRunning(const std::function<void()>& act) {
        const auto device = std::make_shared<Vexa::ScriptedDevice>();
        device->setFeatureReport(4, {4, 1, 2});
        PluggedSurface surface;
        surface.open = [device] { return device; };
        SurfaceInstance::Hooks hooks;
        hooks.onState = [&] {
            EXPECT_EQ(instance->stateText(), "running");
            act();
        };
        hooks.onGestures = [](const Gestures&) {};
        instance = std::make_unique<SurfaceInstance>(loop, library, surface, Settings(), hooks);
        loop.run();
    }

    /// Asks for a property; the answer is written down.
    void ask(const Caller& caller, const char* key, const std::string& name) {
        ++open;
        instance->get(caller, key, [this, name](const Outcome<Vexa::PropertyValue>& outcome) {
            answers.push_back(name + (outcome.error ? ' ' + outcome.error->name() : std::string()));
            if (--open == 0) {
                loop.stop();
            }
        });
    }

    Host::PluginLibrary library{VEXATOUCH_PLUGIN_FILE};
    EventLoop loop;
    std::unique_ptr<SurfaceInstance> instance;
    std::size_t open = 0;
    std::vector<std::string> answers;
};

TEST_F(SurfaceWithoutMemoryTest, ACallThatFindsNoMemoryTakesNoPlace) {
    whenRunning([this] {
        for (std::size_t i = 0; i < 2 * SurfaceInstance::kMostWaiting; ++i) {
            for (const auto& [caller, key] :
                 {std::pair(kRoot, kOfTheService), std::pair(kWatcher, kOfTheDevice)}) {
                refused = 1;
                try {
                    ask(caller, key, "never");
                    ADD_FAILURE() << "was taken";
                } catch (const BusError& error) {
                    EXPECT_EQ(error.name(), ErrorName::kBusy);
                    EXPECT_STREQ(error.what(), "there is no memory for the call; try again");
                }
                --open;
            }
        }
        ask(kRoot, kOfTheService, "root");
        ask(kWatcher, kOfTheDevice, "watcher");
    });
    EXPECT_THAT(answers, ElementsAre("root", "watcher"));
}

TEST_F(SurfaceWithoutMemoryTest, OneThatWaitedAndFindsNoMemoryIsToldSoAndTheNextIsAsked) {
    whenRunning([this] {
        ask(kWatcher, kOfTheDevice, "first");
        ask(kWatcher, kOfTheDevice, "second");
        ask(kWatcher, kOfTheDevice, "third");
        // The next that this thread hands over is the second.
        refused = 1;
    });
    EXPECT_THAT(answers, ElementsAre("second " + std::string(ErrorName::kBusy), "first", "third"));
}

}  // namespace
}  // namespace VexaTouch::Tools::Daemon
