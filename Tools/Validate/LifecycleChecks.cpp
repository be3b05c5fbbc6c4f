#include "Tools/Validate/LifecycleChecks.h"

#include "Platform/ScriptedDevice.h"
#include "Tools/Validate/CheckStand.h"
#include "Tools/Validate/CheckTexts.h"
#include "Tools/Validate/InterfaceSelf.h"
#include "Tools/Validate/LoadedPlugin.h"
#include "Tools/Validate/ProcessResources.h"

#include <malloc.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Vexa::ScriptedDevice;

constexpr std::array<std::uint8_t, 3> kOddReport = {77, 1, 2};

/// A whole life with something of everything.
void live(CheckRun& run, const LoadedPlugin& plugin) {
    CheckStand stand(run, plugin);
    CheckedService& service = stand.service();
    service.probe(stand.handle());
    stand.begin();
    run.step("reading and writing properties");
    static_cast<void>(service.setProperty("ValidateKey", "value"));
    static_cast<void>(service.property("ValidateKey"));
    static_cast<void>(service.property("ValidateNothing"));
    run.step("sending reports");
    stand.resetReport();
    stand.report(kOddReport);
    stand.report({});
    stand.end();
    service.release();
    stand.drain();
}

/// A state in a service's life and the way there.
struct State {
    std::string_view name;
    void (*reach)(CheckStand& stand);
};

/// Those in which no thread of the service runs.
constexpr std::array<State, 9> kQuietStates = {{
    {"the factory", [](CheckStand&) {}},
    {"Probe", [](CheckStand& stand) { stand.service().probe(stand.handle()); }},
    {"Start", [](CheckStand& stand) { stand.start(); }},
    {"setEventCallback",
     [](CheckStand& stand) {
         stand.start();
         stand.setCallback();
     }},
    {"open",
     [](CheckStand& stand) {
         stand.start();
         stand.service().open();
     }},
    {"close",
     [](CheckStand& stand) {
         stand.start();
         stand.service().open();
         stand.service().close();
     }},
    {"unscheduling an open device",
     [](CheckStand& stand) {
         stand.begin();
         stand.resetReport();
         stand.unschedule();
     }},
    {"unscheduling a closed device",
     [](CheckStand& stand) {
         stand.begin();
         stand.service().close();
         stand.unschedule();
     }},
    {"Stop",
     [](CheckStand& stand) {
         stand.begin();
         stand.end();
     }},
}};

constexpr std::array<State, 3> kScheduledStates = {{
    {"scheduling",
     [](CheckStand& stand) {
         stand.start();
         stand.setCallback();
         stand.schedule();
     }},
    {"open", [](CheckStand& stand) { stand.begin(); }},
    {"close",
     [](CheckStand& stand) {
         stand.begin();
         stand.service().close();
     }},
}};

/// A life in which the device refuses what it can.
void sufferFailures(CheckRun& run, CheckStand& stand) {
    const CheckedService& service = stand.service();
    ScriptedDevice& device = stand.device();
    stand.start();
    for (const vexa_status status :
         {VEXA_STATUS_NO_RESOURCES, VEXA_STATUS_IO_ERROR, VEXA_STATUS_GONE, 1U, ~0U}) {
        device.setNextOpenStatuses({status});
        run.require(!service.tryOpen(),
                    "open gives true, but the device gives " + statusText(status));
        service.close();
    }
    run.step("writing a property that the device refuses");
    device.setWrites(ScriptedDevice::Writes::Refused);
    run.require(!service.setProperty("ValidateKey", 1),
                "setProperty gives true, but the device refuses");
    // Whatever a service reads from its device, it survives failures and short answers.
    constexpr std::uint32_t kIds = 256;
    constexpr std::array<const char*, 5> kKeys = {"FirmwareVersion", "FactoryResetHoldDuration",
                                                  "CriticalErrors", "ServicePluginDebug",
                                                  "ValidateNothing"};
    const auto readAll = [&] {
        for (const char* key : kKeys) {
            static_cast<void>(service.property(key));
        }
    };
    run.step("reading properties while feature reports fail");
    for (std::uint32_t id = 0; id < kIds; ++id) {
        device.setFeatureReportStatus(id, VEXA_STATUS_IO_ERROR);
    }
    readAll();
    for (std::size_t length = 0; length <= 40; ++length) {
        run.step("reading properties while feature reports have " +
                 countText(static_cast<std::int64_t>(length), "byte"));
        for (std::uint32_t id = 0; id < kIds; ++id) {
            device.setFeatureReport(id, ScriptedDevice::Bytes(length, 0xFF));
        }
        readAll();
    }
    service.stop();
    device.setWrites(ScriptedDevice::Writes::Stored);
    stand.begin();
    stand.resetReport();
    stand.end();
}

/// Bytes of memory in use, of all threads; always 0 with a sanitizer, which looks by itself.
std::size_t memoryInUse() {
    return mallinfo2().uordblks;
}

}  // namespace

void checkBeforeStart(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    const CheckedService& service = stand.service();
    run.require(!service.tryOpen(), "open gives true before Start");
    service.close();
    run.step("reading a property");
    run.require(!service.property("ValidateNothing"), "an unknown key has a value before Start");
    run.step("writing a property");
    run.require(!service.setProperty("ValidateKey", 1), "setProperty gives true before Start");
    run.step("calling copyEvent");
    vexa_event_release((*service.service())->copyEvent(selfOf(service.service()), 0, nullptr, 0));
    stand.unschedule();
    stand.setCallback();
    stand.schedule();
    stand.unschedule();
    static_cast<void>(service.tryStop());
    // All that did no harm.
    stand.begin();
    stand.resetReport();
    stand.end();
}

void checkRepeatedCalls(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    CheckedService& service = stand.service();
    stand.start();
    service.close();
    stand.unschedule();
    service.open();
    static_cast<void>(service.tryOpen());
    service.close();
    service.close();
    run.require(!stand.device().isOpen(), "the device is open after opening twice and closing");
    stand.setCallback();
    stand.setCallback();
    stand.schedule();
    service.open();
    stand.resetReport();
    stand.unschedule();
    stand.unschedule();
    service.close();
    service.stop();
    static_cast<void>(service.tryStop());
    static_cast<void>(service.tryOpen());
    // A second device, and a second Start that takes the place of the first.
    const std::int64_t devices = vexa_live_objects(VEXA_OBJECT_DEVICE);
    stand.start();
    stand.start();
    stand.setCallback();
    stand.schedule();
    service.open();
    stand.resetReport();
    stand.end();
    run.require(
        waitUntil([&] { return vexa_live_objects(VEXA_OBJECT_DEVICE) <= devices; }, kSettleTime),
        "a device is left after Start, Start and Stop");
}

void checkSecondSchedule(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.begin();
    stand.resetReport();
    stand.schedule();
    stand.unschedule();
    stand.unschedule();
    stand.service().close();
    // A host must not do that; so a thread may be left, and it need not be waited for.
    run.leave();
}

void checkDeviceFailures(CheckRun& run) {
    const LoadedPlugin plugin(run);
    live(run, plugin);
    const ProcessResources before = ProcessResources::now();
    {
        CheckStand stand(run, plugin);
        sufferFailures(run, stand);
    }
    requireGivenBack(run, before, "a life whose device failed");
}

void checkUnplug(CheckRun& run) {
    constexpr int kRounds = 20;
    constexpr int kFlood = 8;
    constexpr std::chrono::milliseconds kToNotice{2};
    const LoadedPlugin plugin(run);
    SeededNumbers numbers = run.random();
    live(run, plugin);
    const ProcessResources before = ProcessResources::now();
    for (int round = 0; round < kRounds; ++round) {
        CheckStand stand(run, plugin);
        const CheckedService& service = stand.service();
        stand.begin();
        stand.resetReport();
        const auto flood = static_cast<int>(numbers.below(kFlood));
        for (int count = 0; count < flood; ++count) {
            stand.send(kOddReport);
        }
        run.step("unplugging the device");
        stand.device().unplug();
        if (round % 2 == 0) {
            std::this_thread::sleep_for(kToNotice);
        }
        run.step("reading and writing properties of an unplugged device");
        static_cast<void>(service.property("ValidateKey"));
        static_cast<void>(service.setProperty("ValidateKey", 1));
        static_cast<void>(service.property("FirmwareVersion"));
        stand.end();
        stand.start();
        run.require(!service.tryOpen(), "open gives true for an unplugged device");
        service.stop();
    }
    requireGivenBack(run, before, "lives whose device was unplugged");
}

void checkDestroy(CheckRun& run) {
    const LoadedPlugin plugin(run);
    live(run, plugin);
    for (const State& state : kQuietStates) {
        const ProcessResources before = ProcessResources::now();
        {
            CheckStand stand(run, plugin);
            state.reach(stand);
            stand.service().release();
            // An event that is still to be delivered keeps the service alive, and so does a thread
            // in its last instructions.
            stand.drain();
            run.require(waitUntil([&] { return !stand.device().isOpen(); }, kSettleTime),
                        "the device stays open when the service is destroyed after " +
                            std::string(state.name));
        }
        requireGivenBack(run, before, "being destroyed after " + std::string(state.name));
    }
}

void checkDestroyScheduled(CheckRun& run) {
    const LoadedPlugin plugin(run);
    std::deque<CheckStand> stands;
    for (const State& state : kScheduledStates) {
        CheckStand& stand = stands.emplace_back(run, plugin);
        state.reach(stand);
        run.step("releasing a service after " + std::string(state.name));
        stand.service().release();
        run.step("sending reports to a service released after " + std::string(state.name));
        static_cast<void>(stand.device().trySendReport(kOddReport));
        stand.device().unplug();
        stand.drain();
    }
    // Its thread may keep a service alive, and nobody is left who could end it.
    run.leave();
}

void checkCycles(CheckRun& run) {
    constexpr int kServices = 10;
    constexpr int kCycles = 100;
    const LoadedPlugin plugin(run);
    live(run, plugin);
    const ProcessResources before = ProcessResources::now();
    for (int services = 0; services < kServices; ++services) {
        CheckStand stand(run, plugin);
        for (int cycle = 0; cycle < kCycles; ++cycle) {
            stand.begin();
            stand.resetReport();
            stand.end();
        }
    }
    requireGivenBack(run, before, countText(std::int64_t{kServices} * kCycles, "cycle"));
}

void checkLeaks(CheckRun& run) {
    constexpr int kLives = 5;
    const LoadedPlugin plugin(run);
    // What is made once in a process is there after the first life.
    live(run, plugin);
    const ProcessResources before = ProcessResources::now();
    for (int lives = 0; lives < kLives; ++lives) {
        live(run, plugin);
    }
    requireGivenBack(run, before, std::to_string(kLives) + " whole lives");
}

void checkMemory(CheckRun& run) {
    constexpr int kWindows = 5;
    constexpr int kLives = 40;
    constexpr std::size_t kLeast = 16;  // bytes a life, what the smallest allocation takes
    const LoadedPlugin plugin(run);
    const auto liveOften = [&] {
        const ProcessResources before = ProcessResources::now();
        for (int lives = 0; lives < kLives; ++lives) {
            live(run, plugin);
        }
        // A thread that is not quite gone has its memory still.
        static_cast<void>(waitUntil(
            [&] { return !ProcessResources::now().hasMoreThreadsThan(before); }, kSettleTime));
    };
    liveOften();
    // A leak grows in every window; what caches and thread stacks do does not.
    std::size_t least = SIZE_MAX;
    for (int window = 0; window < kWindows && least > 0; ++window) {
        const std::size_t before = memoryInUse();
        liveOften();
        const std::size_t after = memoryInUse();
        least = std::min(least, after > before ? after - before : 0);
    }
    run.require(least < kLeast * kLives, "loses about " + std::to_string(least / kLives) +
                                             " bytes of memory in each life of a service");
}

void checkUnload(CheckRun& run) {
    constexpr int kRounds = 100;
    const auto loadAndUnload = [&] {
        LoadedPlugin plugin(run);
        live(run, plugin);
        plugin.unload();
        run.step("waiting for threads whose code has been unloaded");
    };
    loadAndUnload();
    for (int round = 0; round < kRounds; ++round) {
        const ProcessResources before = ProcessResources::now();
        loadAndUnload();
        requireGivenBack(run, before, "being unloaded");
    }
}

}  // namespace VexaTouch::Tools
