#include "Tools/Daemon/DeviceObject.h"

#include "Tools/Daemon/BusNames.h"
#include "Tools/Daemon/PropertyRules.h"
#include "Tools/Daemon/SealedFile.h"

#include <systemd/sd-bus.h>

#include <array>
#include <cstddef>
#include <cstring>
#include <exception>
#include <memory>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

using Vexa::PropertyValue;

const std::string kRecordingKey = "Recording";

/// Of the texts and bytes in it, which are what can be large.
std::size_t sizeInMemory(const PropertyValue& value) {
    std::size_t size = 0;
    if (const auto text = value.asString()) {
        size = text->size();
    } else if (const auto bytes = value.asBytes()) {
        size = bytes->size();
    } else if (const auto elements = value.asArray()) {
        for (const PropertyValue& element : *elements) {
            size += sizeInMemory(element);
        }
    } else if (const auto members = value.asDictionary()) {
        for (const auto& [key, member] : *members) {
            size += key.size() + sizeInMemory(member);
        }
    }
    return size;
}

template <void (DeviceObject::*Method)(BusMessage)>
int serveValue(sd_bus_message* call, void* context, sd_bus_error* /*error*/) {
    return Bus::serve(call, [context](BusMessage message) {
        auto& object = *static_cast<DeviceObject*>(context);
        object.admit(message);
        (object.*Method)(std::move(message));
    });
}

template <void (DeviceObject::*Method)(const BusMessage&)>
int serve(sd_bus_message* call, void* context, sd_bus_error* /*error*/) {
    return Bus::serve(call, [context](BusMessage message) {
        auto& object = *static_cast<DeviceObject*>(context);
        object.admit(message);
        (object.*Method)(message);
    });
}

int readProperty(sd_bus* /*bus*/, const char* /*path*/, const char* /*interface*/,
                 const char* property, sd_bus_message* reply, void* context,
                 sd_bus_error* /*error*/) {
    const SurfaceInstance& instance = static_cast<DeviceObject*>(context)->instance();
    const PluggedSurface& surface = instance.surface();
    return Bus::writeProperty(reply, [&](BusMessage& answer) {
        const std::string_view name = property;
        if (name == "Vendor") {
            answer.number32(surface.vendor);
        } else if (name == "Product") {
            answer.number32(surface.product);
        } else if (name == "State") {
            answer.string(instance.stateText());
        } else if (name == "Reason") {
            answer.text(instance.reason());
        } else if (name == "Name") {
            answer.text(surface.name);
        } else if (name == "Serial") {
            answer.text(surface.serial);
        } else if (name == "PhysicalPath") {
            answer.text(surface.physicalPath);
        } else {
            answer.text(surface.node);
        }
    });
}

// The macros of the library leave out what is not needed.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wpedantic"
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"
constexpr std::uint64_t kForAll = SD_BUS_VTABLE_UNPRIVILEGED;
const sd_bus_vtable kTable[] = {
    SD_BUS_VTABLE_START(0),
    SD_BUS_PROPERTY("Node", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("Name", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("Serial", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("PhysicalPath", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("Vendor", "u", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("Product", "u", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("State", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_EMITS_CHANGE),
    SD_BUS_PROPERTY("Reason", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_EMITS_CHANGE),
    SD_BUS_METHOD_WITH_ARGS("Get", SD_BUS_ARGS("s", key), SD_BUS_RESULT("v", value),
                            serveValue<&DeviceObject::get>, kForAll),
    SD_BUS_METHOD_WITH_ARGS("Set", SD_BUS_ARGS("s", key, "v", value), SD_BUS_RESULT("v", now),
                            serveValue<&DeviceObject::set>, kForAll),
    SD_BUS_METHOD_WITH_ARGS("Reset", SD_BUS_NO_ARGS, SD_BUS_NO_RESULT, serve<&DeviceObject::reset>,
                            kForAll),
    SD_BUS_METHOD_WITH_ARGS("GetRecording", SD_BUS_NO_ARGS, SD_BUS_RESULT("h", file),
                            serve<&DeviceObject::getRecording>, kForAll),
    SD_BUS_METHOD_WITH_ARGS("RecordStream", SD_BUS_NO_ARGS, SD_BUS_RESULT("h", stream),
                            serve<&DeviceObject::recordStream>, kForAll),
    SD_BUS_METHOD_WITH_ARGS("GetStatistics", SD_BUS_NO_ARGS, SD_BUS_RESULT("a{sv}", statistics),
                            serve<&DeviceObject::getStatistics>, kForAll),
    SD_BUS_SIGNAL_WITH_ARGS("Gesture",
                            SD_BUS_ARGS("s", kind, "u", region, "u", phase, "u", mask, "u", frame,
                                        "t", event_time_ns, "t", host_time_ns),
                            0),
    SD_BUS_SIGNAL_WITH_ARGS("GesturesLost", SD_BUS_ARGS("t", count), 0),
    SD_BUS_VTABLE_END,
};
#pragma GCC diagnostic pop

}  // namespace

DeviceObject::DeviceObject(Bus& bus, CallerRights& rights, RecordStreams& streams,
                           SurfaceInstance& instance, const std::string& path)
    : bus_(bus),
      rights_(rights),
      streams_(streams),
      instance_(instance),
      path_(path),
      isOnBus_(std::make_shared<bool>(true)),
      slot_(bus.addObject(path, BusNames::kDevice, kTable, this)) {}

void DeviceObject::withdraw() {
    isOnBus_.reset();
    slot_ = {};
}

void DeviceObject::demand(const BusMessage& call, Right right,
                          std::function<void(const Caller& caller)> granted) {
    rights_.demand(
        call, right,
        [isOnBus = std::weak_ptr(isOnBus_), granted = std::move(granted)](const Caller& caller) {
            if (isOnBus.expired()) {
                throw BusError(ErrorName::kNotRunning, "the surface was unplugged");
            }
            granted(caller);
        });
}

void DeviceObject::announceState() {
    if (!isOnBus_) {
        return;
    }
    bus_.announceChanged(path_, BusNames::kDevice, "State");
    bus_.announceChanged(path_, BusNames::kDevice, "Reason");
}

void DeviceObject::announceGestures(const Gestures& gestures) {
    untold_ += gestures.lost;
    dropped_ += gestures.lost;
    for (std::size_t i = 0; i < gestures.events.size(); ++i) {
        const EventRecord& record = gestures.events[i].record;
        sayLost();
        BusMessage signal = bus_.signal(path_, BusNames::kDevice, "Gesture");
        signal.string(eventKindName(record.kind))
            .number32(record.region)
            .number32(record.phase)
            .number32(record.mask)
            .number32(record.frame)
            .number64(record.timeNs)
            .number64(gestures.hostTimesNs[i]);
        if (untold_ > 0 || !bus_.send(signal)) {
            ++untold_;
            ++dropped_;
        }
    }
}

void DeviceObject::sayLost() {
    if (untold_ == 0) {
        return;
    }
    BusMessage signal = bus_.signal(path_, BusNames::kDevice, "GesturesLost");
    signal.number64(untold_);
    if (bus_.send(signal)) {
        untold_ = 0;
    }
}

void DeviceObject::get(BusMessage call) {
    const std::string key = call.readKey();
    PropertyRules::checkRead(key);
    demand(call, PropertyRules::rightToRead(key), [this, call, key](const Caller& caller) {
        instance_.get(caller, key, [this, call](const Outcome<PropertyValue>& outcome) {
            Bus::answer(call, outcome.error, [&](BusMessage& reply) {
                bus_.demandRoom(sizeInMemory(*outcome.value));
                reply.value(*outcome.value);
            });
        });
    });
}

void DeviceObject::set(BusMessage call) {
    const std::string key = call.readKey();
    const PropertyValue value = call.readValue();
    demand(call, Right::Control, [this, call, key, value](const Caller& caller) {
        PropertyRules::checkWrite(key, value);
        instance_.set(caller, key, value, [call](const Outcome<PropertyValue>& outcome) {
            Bus::answer(call, outcome.error,
                        [&](BusMessage& reply) { reply.value(*outcome.value); });
        });
    });
}

void DeviceObject::reset(const BusMessage& call) {
    demand(call, Right::Control, [this, call](const Caller& caller) {
        instance_.reset(caller, [call](const Outcome<bool>& outcome) {
            Bus::answer(call, outcome.error, [](BusMessage&) {});
        });
    });
}

void DeviceObject::getRecording(const BusMessage& call) {
    demand(call, Right::Control, [this, call](const Caller& caller) {
        instance_.get(caller, kRecordingKey, [this, call](const Outcome<PropertyValue>& outcome) {
            Bus::answer(call, outcome.error, [&](BusMessage& reply) {
                bus_.demandRoom(sizeInMemory(*outcome.value));
                const auto text = outcome.value->asString();
                reply.descriptor(sealedFile(text ? *text : std::string_view()));
            });
        });
    });
}

void DeviceObject::recordStream(const BusMessage& call) {
    demand(call, Right::Control, [this, call](const Caller& caller) {
        RecordStreams::Opened opened = streams_.open(path_);
        const auto reader = std::make_shared<FileDescriptor>(std::move(opened.reader));
        RecordStreams& streams = streams_;
        try {
            instance_.addFeed(caller, opened.feed,
                              [&streams, call, feed = opened.feed,
                               reader](const Outcome<std::shared_ptr<InputTap>>& outcome) {
                                  if (outcome.value) {
                                      streams.started(feed, *outcome.value);
                                  } else {
                                      streams.abandon(feed);
                                  }
                                  Bus::answer(call, outcome.error, [&](BusMessage& reply) {
                                      reply.descriptor(*reader);
                                  });
                              });
        } catch (const std::exception&) {
            streams_.abandon(opened.feed);
            throw;
        }
    });
}

void DeviceObject::getStatistics(const BusMessage& call) {
    demand(call, Right::Watch, [this, call](const Caller& caller) {
        const auto answer = [this, call](const PropertyValue::Dictionary& counters) {
            const PropertyValue all = statistics(counters);
            Bus::reply(call, [&all](BusMessage& reply) { reply.dictionary(all); });
        };
        if (instance_.state() != SurfaceInstance::State::Running) {
            answer({});
            return;
        }
        instance_.getCounters(caller, [answer](const Outcome<PropertyValue::Dictionary>& outcome) {
            answer(outcome.value.value_or(PropertyValue::Dictionary()));
        });
    });
}

PropertyValue DeviceObject::statistics(const PropertyValue::Dictionary& counters) const {
    PropertyValue::Dictionary all =
        statisticsOf(instance_.counts(), instance_.gestures(), counters);
    all.emplace("GesturesDropped", dropped_);
    all.emplace("RecordStreams", std::uint64_t{streams_.count(path_)});
    all.emplace("RecordReportsLost", streams_.lost(path_));
    return all;
}

}  // namespace VexaTouch::Tools::Daemon
