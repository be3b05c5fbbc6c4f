#include "Tools/Validate/InterfaceChecks.h"

#include "Platform/HidEvent.h"
#include "Platform/PropertyValue.h"
#include "Tools/Validate/CheckStand.h"
#include "Tools/Validate/CheckTexts.h"
#include "Tools/Validate/CheckedService.h"
#include "Tools/Validate/ExportedSymbols.h"
#include "Tools/Validate/InterfaceSelf.h"
#include "Tools/Validate/LoadedPlugin.h"
#include "Tools/Validate/ProcessResources.h"

#include <vexa/plugin.h>
#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <latch>
#include <limits>
#include <span>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

// The identifier that other component interfaces answer with the object itself:
// 00000000-0000-0000-c000-000000000046.
constexpr vexa_identifier kBaseInterface = {{0, 0, 0, 0, 0, 0, 0, 0, 0xC0, 0, 0, 0, 0, 0, 0, 0x46}};

struct NamedIdentifier {
    std::string name;
    vexa_identifier identifier;
};

vexa_identifier randomIdentifier(SeededNumbers& numbers) {
    vexa_identifier identifier{};
    for (std::uint8_t& byte : identifier.bytes) {
        byte = static_cast<std::uint8_t>(numbers.below(256));
    }
    return identifier;
}

/// Those that differ from it in one bit, and those with its bytes in another order.
std::vector<NamedIdentifier> nearly(const vexa_identifier& right, const std::string& name) {
    std::vector<NamedIdentifier> all;
    for (std::size_t bit = 0; bit < 8 * sizeof right.bytes; ++bit) {
        vexa_identifier other = right;
        other.bytes[bit / 8] = static_cast<std::uint8_t>(other.bytes[bit / 8] ^ (1U << (bit % 8)));
        all.push_back({"one bit off " + name, other});
    }
    vexa_identifier turned = right;
    std::ranges::reverse(turned.bytes);
    all.push_back({"the reverse of " + name, turned});
    vexa_identifier swapped = right;
    std::reverse(swapped.bytes, swapped.bytes + 4);
    std::reverse(swapped.bytes + 4, swapped.bytes + 6);
    std::reverse(swapped.bytes + 6, swapped.bytes + 8);
    all.push_back({"the other byte order of " + name, swapped});
    return all;
}

/// Identifiers that neither a factory nor a service answers.
std::vector<NamedIdentifier> strangeIdentifiers(SeededNumbers numbers) {
    constexpr int kRandom = 64;
    std::vector<NamedIdentifier> all = {{"the base interface", kBaseInterface},
                                        {"the identifier of zeros", vexa_identifier{}}};
    vexa_identifier ones{};
    std::ranges::fill(ones.bytes, std::uint8_t{0xFF});
    all.push_back({"the identifier of ones", ones});
    for (int count = 0; count < kRandom; ++count) {
        all.push_back({"a random identifier", randomIdentifier(numbers)});
    }
    return all;
}

void append(std::vector<NamedIdentifier>& all, std::vector<NamedIdentifier> more) {
    all.insert(all.end(), more.begin(), more.end());
}

std::int64_t liveDevices() {
    return vexa_live_objects(VEXA_OBJECT_DEVICE);
}

void warnOfExports(CheckRun& run) {
    const auto symbols = exportedSymbols(run.plugin());
    if (!symbols) {
        run.warn("its exported symbols cannot be read");
        return;
    }
    std::string others;
    for (const std::string& symbol : *symbols) {
        if (symbol != VEXA_PLUGIN_FACTORY_NAME) {
            others += (others.empty() ? "" : ", ") + symbol;
        }
    }
    if (!others.empty()) {
        run.warn("exports more than its factory: " + others);
    }
}

template <typename Table>
std::vector<std::byte> bytesOf(const Table& table) {
    const auto bytes = std::as_bytes(std::span(&table, 1));
    return {bytes.begin(), bytes.end()};
}

std::string asking(const std::string& from, const std::string& name) {
    return from + " asked for " + name;
}

/// A reference to a service, whichever of the two it is: both tables begin alike.
using AnyReference = vexa_plugin_interface**;

void checkAnswers(CheckRun& run, const CheckedService& service, AnyReference from,
                  const std::string& fromName) {
    const std::array<std::pair<vexa_identifier, void*>, 2> known = {{
        {VEXA_PLUGIN_INTERFACE, selfOf(service.plugin())},
        {VEXA_SERVICE_INTERFACE, selfOf(service.service())},
    }};
    for (const auto& [identifier, expected] : known) {
        const std::string what =
            asking(fromName, expected == selfOf(service.plugin()) ? "the plug-in interface"
                                                                  : "the service interface");
        run.step("asking: " + what);
        void* out = nullptr;
        const vexa_status status = (*from)->QueryInterface(selfOf(from), identifier, &out);
        run.require(status == VEXA_STATUS_SUCCESS, what + " gives " + statusText(status));
        run.require(out == expected, what + " gives another reference than before");
        (*from)->Release(selfOf(from));
    }
}

void checkRefusals(CheckRun& run, AnyReference from, const std::string& fromName) {
    std::vector<NamedIdentifier> unknown = strangeIdentifiers(run.random());
    unknown.push_back({"the type of HID services", VEXA_HID_SERVICE_PLUGIN_TYPE});
    append(unknown, nearly(VEXA_PLUGIN_INTERFACE, "the plug-in interface"));
    append(unknown, nearly(VEXA_SERVICE_INTERFACE, "the service interface"));
    int untouched = 0;
    for (const auto& [name, identifier] : unknown) {
        const std::string what = asking(fromName, name) + " (" + identifierText(identifier) + ")";
        run.step("asking: " + what);
        void* out = &untouched;
        const vexa_status status = (*from)->QueryInterface(selfOf(from), identifier, &out);
        run.require(status == VEXA_STATUS_NO_INTERFACE, what + " gives " + statusText(status) +
                                                            ", expected " +
                                                            statusText(VEXA_STATUS_NO_INTERFACE));
        run.require(out == &untouched, what + " changes the out pointer");
    }
}

/// The references that a host holds, changed at random and held against what is answered.
class CountedReferences {
public:
    CountedReferences(CheckRun& run, AnyReference plugin, AnyReference service)
        : run_(run), references_{plugin, service} {}

    /// Something that needs a reference and leaves at least one.
    void change(SeededNumbers& numbers) {
        AnyReference through = references_.at(numbers.below(2));
        switch (numbers.below(4)) {
            case 0:
                add(through);
                break;
            case 1: {
                run_.step("asking for an interface");
                void* out = nullptr;
                const bool plugin = numbers.below(2) == 0;
                (*through)->QueryInterface(
                    selfOf(through), plugin ? VEXA_PLUGIN_INTERFACE : VEXA_SERVICE_INTERFACE, &out);
                ++held_;
                break;
            }
            case 2: {
                run_.step("asking for an unknown interface");
                void* out = nullptr;
                (*through)->QueryInterface(selfOf(through), randomIdentifier(numbers), &out);
                break;
            }
            default:
                if (held_ > 1) {
                    drop(through);
                }
                break;
        }
    }
    void add(AnyReference through) {
        run_.step("calling AddRef");
        const std::uint32_t count = (*through)->AddRef(selfOf(through));
        requirePlausible("AddRef", count, ++held_);
    }
    void drop(AnyReference through) {
        run_.step("calling Release");
        const std::uint32_t count = (*through)->Release(selfOf(through));
        requirePlausible("Release", count, --held_);
    }
    /// All but one.
    void dropToLast() {
        while (held_ > 1) {
            drop(references_.at(held_ % 2));
        }
    }
    [[nodiscard]] AnyReference any() const { return references_.front(); }

private:
    // For information only, and the service may hold some itself; but no fewer than the host has.
    void requirePlausible(const std::string& slot, std::uint32_t count, std::uint32_t held) const {
        constexpr std::uint32_t kOwn = 1000;
        run_.require(count >= held && count <= held + kOwn,
                     slot + " gives " + std::to_string(count) + " while the host holds " +
                         countText(held, "reference"));
    }

    CheckRun& run_;
    std::array<AnyReference, 2> references_;
    std::uint32_t held_ = 2;
};

/// Calls `last`, which gives the last reference back, and wants the service to go with it.
template <typename Last>
void requireDestroyedBy(CheckRun& run, std::int64_t devicesBefore, const Last& last) {
    run.require(liveDevices() > devicesBefore,
                "the service gave its device back while the host holds a reference");
    last();
    run.require(waitUntil([&] { return liveDevices() <= devicesBefore; }, kSettleTime),
                "the service lives on after the last reference was released");
}

}  // namespace

void checkLoad(CheckRun& run) {
    constexpr std::chrono::seconds kSlow{1};
    const auto begin = std::chrono::steady_clock::now();
    const LoadedPlugin plugin(run);
    const auto took = std::chrono::steady_clock::now() - begin;
    if (took > kSlow) {
        run.warn(
            "takes " +
            std::to_string(std::chrono::duration_cast<std::chrono::milliseconds>(took).count()) +
            " ms to load");
    }
    CheckedService(run, plugin).release();
    warnOfExports(run);
}

void checkFactory(CheckRun& run) {
    const LoadedPlugin plugin(run);
    run.step("calling the factory twice");
    int allocator = 0;
    vexa_plugin_interface** first = plugin.make(VEXA_HID_SERVICE_PLUGIN_TYPE, nullptr);
    run.require(first != nullptr, "gives nothing for the right type and a NULL allocator");
    vexa_plugin_interface** second = plugin.make(VEXA_HID_SERVICE_PLUGIN_TYPE, &allocator);
    run.require(second != nullptr, "gives nothing for the right type and some allocator");
    run.require(first != second, "gives the same service twice");
    (*first)->Release(selfOf(first));
    (*second)->Release(selfOf(second));

    std::vector<NamedIdentifier> wrong = strangeIdentifiers(run.random());
    wrong.push_back({"the plug-in interface", VEXA_PLUGIN_INTERFACE});
    wrong.push_back({"the service interface", VEXA_SERVICE_INTERFACE});
    append(wrong, nearly(VEXA_HID_SERVICE_PLUGIN_TYPE, "the type of HID services"));
    for (const auto& [name, identifier] : wrong) {
        const std::string what = name + " (" + identifierText(identifier) + ")";
        run.step("asking the factory for " + what);
        run.require(plugin.make(identifier) == nullptr, "gives a service for " + what);
    }
}

void checkQueryInterface(CheckRun& run) {
    const LoadedPlugin plugin(run);
    const CheckedService service(run, plugin);
    const auto fromService = reinterpret_cast<AnyReference>(service.service());
    checkAnswers(run, service, service.plugin(), "the plug-in reference");
    checkAnswers(run, service, fromService, "the service reference");
    checkRefusals(run, service.plugin(), "the plug-in reference");
    checkRefusals(run, fromService, "the service reference");
}

void checkSlots(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    const vexa_plugin_interface& pluginTable = **stand.service().plugin();
    const vexa_service_interface& serviceTable = **stand.service().service();
    const std::array<std::pair<const char*, bool>, 20> present = {{
        {"reserved (plug-in interface)", pluginTable._reserved != nullptr},
        {"QueryInterface (plug-in interface)", pluginTable.QueryInterface != nullptr},
        {"AddRef (plug-in interface)", pluginTable.AddRef != nullptr},
        {"Release (plug-in interface)", pluginTable.Release != nullptr},
        {"Probe", pluginTable.Probe != nullptr},
        {"Start", pluginTable.Start != nullptr},
        {"Stop", pluginTable.Stop != nullptr},
        {"reserved (service interface)", serviceTable._reserved != nullptr},
        {"QueryInterface (service interface)", serviceTable.QueryInterface != nullptr},
        {"AddRef (service interface)", serviceTable.AddRef != nullptr},
        {"Release (service interface)", serviceTable.Release != nullptr},
        {"open", serviceTable.open != nullptr},
        {"close", serviceTable.close != nullptr},
        {"copyProperty", serviceTable.copyProperty != nullptr},
        {"setProperty", serviceTable.setProperty != nullptr},
        {"setEventCallback", serviceTable.setEventCallback != nullptr},
        {"scheduleWithDispatchQueue", serviceTable.scheduleWithDispatchQueue != nullptr},
        {"unscheduleFromDispatchQueue", serviceTable.unscheduleFromDispatchQueue != nullptr},
        {"copyEvent", serviceTable.copyEvent != nullptr},
        {"setOutputEvent", serviceTable.setOutputEvent != nullptr},
    }};
    for (const auto& [name, isPresent] : present) {
        run.require(isPresent, std::string("the slot is empty: ") + name);
    }
    run.require(pluginTable.version == 1 && pluginTable.revision == 0,
                "version " + std::to_string(pluginTable.version) + " revision " +
                    std::to_string(pluginTable.revision) + ", expected version 1 revision 0");

    // They never change while the service lives.
    const std::vector<std::byte> pluginBytes = bytesOf(pluginTable);
    const std::vector<std::byte> serviceBytes = bytesOf(serviceTable);
    stand.service().probe(stand.handle());
    stand.begin();
    stand.end();
    run.require(&pluginTable == *stand.service().plugin() &&
                    &serviceTable == *stand.service().service() &&
                    bytesOf(pluginTable) == pluginBytes && bytesOf(serviceTable) == serviceBytes,
                "a table has changed since the service was made");
}

void checkReferenceCounts(CheckRun& run) {
    constexpr int kChanges = 400;
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    const std::int64_t devices = liveDevices();
    stand.start();
    vexa_plugin_interface** reference = stand.service().plugin();
    CountedReferences held(run, reference,
                           reinterpret_cast<AnyReference>(stand.service().service()));
    SeededNumbers numbers = run.random();
    for (int change = 0; change < kChanges; ++change) {
        held.change(numbers);
    }
    held.dropToLast();
    requireDestroyedBy(run, devices, [&] { held.drop(held.any()); });
    stand.service().forget();
}

void checkReferenceThreads(CheckRun& run) {
    constexpr std::uint32_t kPairs = 2;  // of threads, one that adds and one that releases
    constexpr std::uint32_t kRounds = 20'000;
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    const std::int64_t devices = liveDevices();
    stand.start();
    vexa_plugin_interface** reference = stand.service().plugin();
    vexa_service_interface** other = stand.service().service();
    // So many that those who release never reach the last one, even if every addition is lost.
    constexpr std::uint32_t kSpare = 2 * kPairs * kRounds;
    run.step("calling AddRef often");
    for (std::uint32_t count = 0; count < kSpare; ++count) {
        (*reference)->AddRef(selfOf(reference));
    }
    run.step("calling AddRef and Release on several threads");
    std::latch together(2 * std::ptrdiff_t{kPairs});
    std::vector<std::jthread> threads;
    threads.reserve(2 * std::size_t{kPairs});
    for (std::uint32_t pair = 0; pair < kPairs; ++pair) {
        threads.emplace_back([&] {
            together.arrive_and_wait();
            for (std::uint32_t round = 0; round < kRounds; ++round) {
                (*reference)->AddRef(selfOf(reference));
            }
        });
        threads.emplace_back([&] {
            together.arrive_and_wait();
            for (std::uint32_t round = 0; round < kRounds; ++round) {
                (*other)->Release(selfOf(other));
            }
        });
    }
    threads.clear();
    run.step("calling Release often");
    constexpr std::uint32_t kHeld = kSpare + 2;
    const std::uint32_t left = (*other)->Release(selfOf(other));
    run.require(left >= kHeld - 1,
                countText(kHeld - 1 - left, "reference") + " got lost on several threads");
    for (std::uint32_t held = kHeld - 1; held > 1; --held) {
        (*reference)->Release(selfOf(reference));
    }
    requireDestroyedBy(run, devices, [&] { (*reference)->Release(selfOf(reference)); });
    stand.service().forget();
}

void checkArgumentOrder(CheckRun& run) {
    const LoadedPlugin plugin(run);
    // The right handle stands between two others.
    const auto before = std::make_shared<Vexa::ScriptedDevice>();
    const Vexa::DeviceRegistration registrationBefore(before);
    CheckStand stand(run, plugin);
    const auto after = std::make_shared<Vexa::ScriptedDevice>();
    const Vexa::DeviceRegistration registrationAfter(after);
    vexa_plugin_interface** reference = stand.service().plugin();

    const Vexa::PropertyValue properties = serviceProperties();
    const std::int64_t values = vexa_live_objects(VEXA_OBJECT_VALUE);
    const auto requireProperties = [&](const std::string& slot) {
        run.require(vexa_live_objects(VEXA_OBJECT_VALUE) >= values,
                    slot + " releases the properties, which it only borrows");
    };
    struct {
        std::int32_t before = 0x5A5A5A5A;
        std::int32_t score = 17;
        std::int32_t after = 0x5A5A5A5A;
    } room;
    run.step("calling Probe");
    const vexa_status probed =
        (*reference)->Probe(selfOf(reference), properties.handle(), stand.handle(), &room.score);
    run.require(probed == VEXA_STATUS_SUCCESS, "Probe gives " + statusText(probed));
    run.require(room.before == 0x5A5A5A5A && room.after == 0x5A5A5A5A,
                "Probe writes more than a score of 32 bits");
    requireProperties("Probe");
    run.step("calling Start");
    const vexa_status started =
        (*reference)->Start(selfOf(reference), properties.handle(), stand.handle());
    run.require(
        started == VEXA_STATUS_SUCCESS,
        "Start gives " + statusText(started) + " (the properties come before the service handle)");
    requireProperties("Start");
    stand.service().open();
    run.require(!before->isOpen() && !after->isOpen(),
                "Start takes the device of another service handle");
    run.require(stand.device().isOpen(), "open does not open the device of the service handle");
    stand.service().close();
    stand.service().stop();
}

void checkUnknownService(CheckRun& run) {
    const LoadedPlugin plugin(run);
    std::uint32_t gone = 0;
    {
        const Vexa::DeviceRegistration registration(std::make_shared<Vexa::ScriptedDevice>());
        gone = registration.service();
    }
    for (const std::uint32_t handle : {0U, gone, std::numeric_limits<std::uint32_t>::max()}) {
        const CheckedService service(run, plugin);
        const std::int64_t devices = liveDevices();
        run.require(service.tryStart(handle) != VEXA_STATUS_SUCCESS,
                    "Start succeeds for " + std::to_string(handle) + ", which is no service");
        run.require(liveDevices() == devices, "Start makes a device for no service");
        run.require(!service.tryOpen(), "open succeeds without a device");
        service.close();
        service.stop();
    }
}

void checkEventQueries(CheckRun& run) {
    const LoadedPlugin plugin(run);
    CheckStand stand(run, plugin);
    stand.start();
    vexa_service_interface** service = stand.service().service();
    const ProcessResources before = ProcessResources::now();
    {
        const Vexa::HidEvent digitizer = Vexa::HidEvent::digitizer({});
        const Vexa::HidEvent vendor = Vexa::HidEvent::vendorDefined({});
        for (const std::uint32_t type :
             {0U, VEXA_EVENT_TYPE_VENDOR_DEFINED, VEXA_EVENT_TYPE_DIGITIZER, 0xFFFFFFFFU}) {
            for (vexa_event* matching :
                 {static_cast<vexa_event*>(nullptr), digitizer.handle(), vendor.handle()}) {
                run.step("calling copyEvent with type " + std::to_string(type));
                vexa_event* found = (*service)->copyEvent(selfOf(service), type, matching, 0);
                run.require(found == nullptr || type == 0 || vexa_event_get_type(found) == type,
                            "copyEvent gives an event of another type");
                vexa_event_release(found);
            }
        }
        for (const Vexa::HidEvent& event : {digitizer, vendor}) {
            run.step("calling setOutputEvent");
            (*service)->setOutputEvent(selfOf(service), event.handle());
        }
    }
    stand.service().stop();
    requireGivenBack(run, before, "event queries");
}

}  // namespace VexaTouch::Tools
