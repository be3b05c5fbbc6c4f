#pragma once

#include "Tools/Daemon/BusError.h"
#include "Tools/Daemon/BusMessage.h"
#include "Tools/Daemon/EventLoop.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

struct sd_bus;
struct sd_bus_slot;
struct sd_bus_vtable;

namespace VexaTouch::Tools::Daemon {

/// What is bound to a connection, until this is destroyed: an object, a call that waits, a match.
class BusSlot {
public:
    BusSlot() noexcept = default;
    explicit BusSlot(sd_bus_slot* owned) noexcept : slot_(owned) {}

private:
    struct Release {
        void operator()(sd_bus_slot* slot) const noexcept;
    };
    std::unique_ptr<sd_bus_slot, Release> slot_;
};

/// A connection to a message bus, for those who offer objects and those who use them. One thread.
class Bus {
public:
    /// Signals that wait here while the bus takes no more; what comes beyond is dropped.
    static constexpr std::uint64_t kMostQueued = 256;
    /// Bytes of large answers that wait here meanwhile.
    static constexpr std::size_t kMostQueuedBytes = std::size_t{8} << 20U;

    /// "system", "session" or the address of a bus ("unix:path=/run/..."). Throws Failure.
    explicit Bus(const std::string& where);
    ~Bus();
    Bus(const Bus&) = delete;
    Bus(Bus&&) = delete;
    Bus& operator=(const Bus&) = delete;
    Bus& operator=(Bus&&) = delete;

    /// Serves the connection from this loop; `onLost` is called when the bus has gone. Calls that
    /// come while four times kMostQueued messages wait for the bus are passed over.
    void attach(EventLoop& loop, std::function<void()> onLost);
    /// Throws Failure when the name is taken or the bus does not let us have it.
    void requestName(const std::string& name);

    // Offering.

    /// The table, the path's interface and the context are <systemd/sd-bus.h>'s.
    [[nodiscard]] BusSlot addObject(const std::string& path, const char* interface,
                                    const sd_bus_vtable* table, void* context);
    [[nodiscard]] BusSlot addObjectManager(const std::string& path);
    void announceAdded(const std::string& path, const char* interface);
    void announceRemoved(const std::string& path, const char* interface);
    void announceChanged(const std::string& path, const char* interface, const char* property);

    /// Runs a method's handler on a call; what it throws is answered as an error. For handlers of
    /// tables, which return the result.
    static int serve(sd_bus_message* call,
                     const std::function<void(BusMessage call)>& handler) noexcept;
    /// Writes the value of a property. For getters of tables, which return the result.
    static int writeProperty(sd_bus_message* reply,
                             const std::function<void(BusMessage& reply)>& write) noexcept;
    /// Answers a call, now or later.
    static void reply(const BusMessage& call, const std::function<void(BusMessage& reply)>& write);
    static void fail(const BusMessage& call, const BusError& error);
    /// The error if there is one, else what is written.
    static void answer(const BusMessage& call, const std::optional<BusError>& error,
                       const std::function<void(BusMessage& reply)>& write);

    /// Before an answer that may be large is written. Throws BusError (Busy) while the bus does not
    /// take what waits already; one answer has room always.
    void demandRoom(std::size_t bytes);

    [[nodiscard]] BusMessage signal(const std::string& path, const char* interface,
                                    const char* member) const;
    /// False when the message was dropped because too many wait.
    [[nodiscard]] bool send(const BusMessage& message);

    // Using.

    [[nodiscard]] BusMessage call(const std::string& destination, const std::string& path,
                                  const char* interface, const char* member) const;
    /// Waits for the answer. Throws BusError.
    BusMessage ask(const BusMessage& call);
    /// Calls back with the answer or with what was wrong.
    [[nodiscard]] BusSlot askLater(const BusMessage& call,
                                   std::function<void(BusMessage reply)> onReply,
                                   std::function<void(const BusError& error)> onError);
    /// Calls back with each message that fits the rule.
    [[nodiscard]] BusSlot match(const std::string& rule,
                                std::function<void(BusMessage message)> callback);

    [[nodiscard]] sd_bus* get() const noexcept { return bus_.get(); }

private:
    struct Release {
        void operator()(sd_bus* bus) const noexcept;
    };

    std::unique_ptr<sd_bus, Release> bus_;
    BusSlot filter_;
    BusSlot lost_;
    bool attached_ = false;
    std::size_t queuedBytes_ = 0;  // of large answers since nothing waited
};

}  // namespace VexaTouch::Tools::Daemon
