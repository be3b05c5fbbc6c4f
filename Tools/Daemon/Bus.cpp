#include "Tools/Daemon/Bus.h"

#include "Tools/Failure.h"

#include <systemd/sd-bus.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

/// An error of the bus, freed with it.
class BusErrorHolder {
public:
    BusErrorHolder() = default;
    ~BusErrorHolder() { sd_bus_error_free(&error_); }
    BusErrorHolder(const BusErrorHolder&) = delete;
    BusErrorHolder& operator=(const BusErrorHolder&) = delete;

    sd_bus_error* get() noexcept { return &error_; }

private:
    sd_bus_error error_{};
};

BusError errorOf(const sd_bus_error* error) {
    return {error->name == nullptr ? SD_BUS_ERROR_FAILED : error->name,
            error->message == nullptr ? "no reason was given" : error->message};
}

/// Of libsystemd's own making, for what nobody expects to fail.
void check(int result, const char* what) {
    if (result < 0) {
        throw Failure(std::string(what) + ": " + std::strerror(-result));
    }
}

std::string variable(const char* name, const std::string& otherwise) {
    const char* value = std::getenv(name);
    return value == nullptr || *value == '\0' ? otherwise : value;
}

/// Where libsystemd looks.
std::string addressOf(const std::string& where) {
    if (where == "system") {
        return variable("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/run/dbus/system_bus_socket");
    }
    if (where == "session") {
        const std::string folder = variable("XDG_RUNTIME_DIR", "");
        return variable("DBUS_SESSION_BUS_ADDRESS",
                        folder.empty() ? "no address: neither DBUS_SESSION_BUS_ADDRESS nor "
                                         "XDG_RUNTIME_DIR is set"
                                       : "unix:path=" + folder + "/bus");
    }
    return where;
}

/// For messages.
std::string nameOf(const std::string& where) {
    const std::string address = addressOf(where);
    return address == where     ? "the bus " + where
           : where == "session" ? "the session's bus (" + address + ')'
                                : "the " + where + " bus (" + address + ')';
}

int openBus(sd_bus** bus, const std::string& where) {
    if (where == "system") {
        return sd_bus_open_system(bus);
    }
    if (where == "session") {
        return sd_bus_open_user(bus);
    }
    int result = sd_bus_new(bus);
    result = result < 0 ? result : sd_bus_set_address(*bus, where.c_str());
    result = result < 0 ? result : sd_bus_set_bus_client(*bus, 1);
    result = result < 0 ? result : sd_bus_negotiate_fds(*bus, 1);
    return result < 0 ? result : sd_bus_start(*bus);
}

}  // namespace

void BusSlot::Release::operator()(sd_bus_slot* slot) const noexcept {
    sd_bus_slot_unref(slot);
}

void Bus::Release::operator()(sd_bus* bus) const noexcept {
    sd_bus_flush_close_unref(bus);
}

Bus::Bus(const std::string& where) {
    sd_bus* bus = nullptr;
    int result = openBus(&bus, where);
    if (result >= 0) {
        // The greeting is over when the bus has told our name.
        const char* name = nullptr;
        result = sd_bus_get_unique_name(bus, &name);
    }
    if (result < 0) {
        sd_bus_close_unref(bus);
        throw Failure(nameOf(where) + " does not answer: " + std::strerror(-result));
    }
    bus_.reset(bus);
}

Bus::~Bus() {
    if (attached_) {
        sd_bus_detach_event(get());
    }
}

void Bus::attach(EventLoop& loop, std::function<void()> onLost) {
    check(sd_bus_attach_event(get(), loop.get(), SD_EVENT_PRIORITY_NORMAL),
          "the bus cannot be watched");
    attached_ = true;
    // As long as the bus takes nothing from us it gets no answers either: what would only make them
    // wait in line is not even looked at.
    const auto refuseWhileFull = [](sd_bus_message* message, void* context, sd_bus_error*) -> int {
        std::uint64_t queued = 0;
        static_cast<void>(sd_bus_get_n_queued_write(static_cast<sd_bus*>(context), &queued));
        return sd_bus_message_is_method_call(message, nullptr, nullptr) > 0 &&
                       queued >= kMostQueued * 4
                   ? 1
                   : 0;
    };
    sd_bus_slot* filter = nullptr;
    check(sd_bus_add_filter(get(), &filter, refuseWhileFull, get()), "the bus cannot be watched");
    filter_ = BusSlot(filter);
    lost_ = match(
        "type='signal',sender='org.freedesktop.DBus.Local',interface='org.freedesktop.DBus.Local',"
        "member='Disconnected'",
        [onLost = std::move(onLost)](const BusMessage&) { onLost(); });
}

void Bus::requestName(const std::string& name) {
    const int result = sd_bus_request_name(get(), name.c_str(), 0);
    if (result == -EEXIST || result == -EALREADY) {
        throw Failure("the name " + name + " is taken: another daemon runs on this bus");
    }
    if (result == -EACCES || result == -EPERM) {
        throw Failure("the bus does not let us have the name " + name +
                      ": run as root or the daemon's user, with its policy file installed");
    }
    check(result, ("the name " + name).c_str());
}

BusSlot Bus::addObject(const std::string& path, const char* interface, const sd_bus_vtable* table,
                       void* context) {
    sd_bus_slot* slot = nullptr;
    check(sd_bus_add_object_vtable(get(), &slot, path.c_str(), interface, table, context),
          ("the object " + path).c_str());
    return BusSlot(slot);
}

BusSlot Bus::addObjectManager(const std::string& path) {
    sd_bus_slot* slot = nullptr;
    check(sd_bus_add_object_manager(get(), &slot, path.c_str()), ("the object " + path).c_str());
    return BusSlot(slot);
}

void Bus::announceAdded(const std::string& path, const char* interface) {
    static_cast<void>(sd_bus_emit_interfaces_added(get(), path.c_str(), interface, nullptr));
}

void Bus::announceRemoved(const std::string& path, const char* interface) {
    static_cast<void>(sd_bus_emit_interfaces_removed(get(), path.c_str(), interface, nullptr));
}

void Bus::announceChanged(const std::string& path, const char* interface, const char* property) {
    static_cast<void>(
        sd_bus_emit_properties_changed(get(), path.c_str(), interface, property, nullptr));
}

int Bus::serve(sd_bus_message* call, const std::function<void(BusMessage call)>& handler) noexcept {
    try {
        handler(BusMessage::share(call));
    } catch (const BusError& wrong) {
        fail(BusMessage::share(call), wrong);
    } catch (const std::exception& wrong) {
        fail(BusMessage::share(call), BusError(ErrorName::kFailed, wrong.what()));
    }
    return 1;
}

int Bus::writeProperty(sd_bus_message* reply,
                       const std::function<void(BusMessage& reply)>& write) noexcept {
    try {
        BusMessage message = BusMessage::share(reply);
        write(message);
        return 1;
    } catch (const std::exception&) {
        return -EIO;
    }
}

void Bus::reply(const BusMessage& call, const std::function<void(BusMessage& reply)>& write) {
    try {
        sd_bus_message* made = nullptr;
        check(sd_bus_message_new_method_return(call.get(), &made), "no answer");
        BusMessage answer = BusMessage::adopt(made);
        write(answer);
        // Who has left does not get it.
        static_cast<void>(sd_bus_send(nullptr, made, nullptr));
    } catch (const BusError& wrong) {
        fail(call, wrong);
    } catch (const std::exception& wrong) {
        fail(call, BusError(ErrorName::kFailed, wrong.what()));
    }
}

void Bus::fail(const BusMessage& call, const BusError& error) {
    static_cast<void>(
        sd_bus_reply_method_errorf(call.get(), error.name().c_str(), "%s", error.what()));
}

void Bus::answer(const BusMessage& call, const std::optional<BusError>& error,
                 const std::function<void(BusMessage& reply)>& write) {
    if (error) {
        fail(call, *error);
    } else {
        reply(call, write);
    }
}

void Bus::demandRoom(std::size_t bytes) {
    constexpr std::size_t kLarge = 4096;
    if (bytes < kLarge) {
        return;
    }
    std::uint64_t queued = 0;
    static_cast<void>(sd_bus_get_n_queued_write(get(), &queued));
    queuedBytes_ = queued == 0 ? 0 : queuedBytes_;
    if (queuedBytes_ > 0 && queuedBytes_ + bytes > kMostQueuedBytes) {
        throw BusError(ErrorName::kBusy, "too many large answers wait for the bus; try again");
    }
    queuedBytes_ += bytes;
}

BusMessage Bus::signal(const std::string& path, const char* interface, const char* member) const {
    sd_bus_message* message = nullptr;
    check(sd_bus_message_new_signal(get(), &message, path.c_str(), interface, member), "no signal");
    return BusMessage::adopt(message);
}

bool Bus::send(const BusMessage& message) {
    std::uint64_t queued = 0;
    static_cast<void>(sd_bus_get_n_queued_write(get(), &queued));
    return queued < kMostQueued && sd_bus_send(get(), message.get(), nullptr) >= 0;
}

BusMessage Bus::call(const std::string& destination, const std::string& path, const char* interface,
                     const char* member) const {
    sd_bus_message* message = nullptr;
    check(sd_bus_message_new_method_call(get(), &message, destination.c_str(), path.c_str(),
                                         interface, member),
          "no call");
    return BusMessage::adopt(message);
}

BusMessage Bus::ask(const BusMessage& call) {
    BusErrorHolder error;
    sd_bus_message* reply = nullptr;
    const int result = sd_bus_call(get(), call.get(), 0, error.get(), &reply);
    if (result < 0) {
        if (sd_bus_error_is_set(error.get()) > 0) {
            throw errorOf(error.get());
        }
        throw Failure(std::string("the bus: ") + std::strerror(-result));
    }
    return BusMessage::adopt(reply);
}

namespace {

struct Waiting {
    std::function<void(BusMessage reply)> onReply;
    std::function<void(const BusError& error)> onError;
};

/// Owned by its slot.
template <typename Context>
void ownedBy(sd_bus_slot* slot, std::unique_ptr<Context> context) {
    static_cast<void>(sd_bus_slot_set_userdata(slot, context.release()));
    static_cast<void>(sd_bus_slot_set_destroy_callback(
        slot, [](void* owned) { std::unique_ptr<Context>(static_cast<Context*>(owned)); }));
}

}  // namespace

BusSlot Bus::askLater(const BusMessage& call, std::function<void(BusMessage reply)> onReply,
                      std::function<void(const BusError& error)> onError) {
    auto waiting = std::make_unique<Waiting>(Waiting{std::move(onReply), std::move(onError)});
    sd_bus_slot* slot = nullptr;
    const auto answered = [](sd_bus_message* reply, void* context, sd_bus_error*) -> int {
        // The callbacks may give the slot back.
        const Waiting callbacks = *static_cast<Waiting*>(context);
        try {
            if (sd_bus_message_is_method_error(reply, nullptr) > 0) {
                callbacks.onError(errorOf(sd_bus_message_get_error(reply)));
            } else {
                callbacks.onReply(BusMessage::share(reply));
            }
        } catch (const BusError& error) {
            callbacks.onError(error);
        }
        return 1;
    };
    check(sd_bus_call_async(get(), &slot, call.get(), answered, waiting.get(), 0), "no call");
    BusSlot owner(slot);
    ownedBy(slot, std::move(waiting));
    return owner;
}

BusSlot Bus::match(const std::string& rule, std::function<void(BusMessage message)> callback) {
    using Callback = std::function<void(BusMessage message)>;
    auto kept = std::make_unique<Callback>(std::move(callback));
    sd_bus_slot* slot = nullptr;
    const auto matched = [](sd_bus_message* message, void* context, sd_bus_error*) -> int {
        const Callback called = *static_cast<Callback*>(context);
        try {
            called(BusMessage::share(message));
        } catch (const BusError&) {
            // A signal of another shape than ours is none of ours.
        }
        return 0;
    };
    check(sd_bus_add_match(get(), &slot, rule.c_str(), matched, kept.get()), "no match");
    BusSlot owner(slot);
    ownedBy(slot, std::move(kept));
    return owner;
}

}  // namespace VexaTouch::Tools::Daemon
