#pragma once

#include "Tools/Daemon/Bus.h"

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// What a caller may do.
enum class Right : std::uint8_t {
    None,
    Watch,    ///< see gestures, states and settings
    Control,  ///< change settings, and see raw touches
};

/// Who calls, as far as it matters here.
struct Caller {
    Right right = Right::None;
    uid_t user = 0;
};

/// Who may do what: root, the daemon's own user and the members of a group may control, users on a
/// seat may watch.
struct RightsPolicy {
    std::string groupName = "vexatouch";  ///< for messages
    std::optional<gid_t> group = {};      ///< none: there is no such group
    std::function<bool(uid_t user)> isOnSeat = {};
    uid_t ownUser = 0;

    /// Of this system and process. The group is looked up once.
    static RightsPolicy ofThisSystem();

    [[nodiscard]] Right rightOf(uid_t user, const std::vector<gid_t>& groups) const;
};

/// Asks the bus who a caller is, once for each connection, without waiting for it. The groups are
/// those that the caller had when it connected, supplementary ones included, which the kernel told
/// the bus.
class CallerRights {
public:
    /// Callers that the bus is being asked about at the same time; beyond that they are told Busy.
    static constexpr std::size_t kMostAsked = 64;
    /// Calls of one connection that wait for an answer at the same time, before it is known whose
    /// it is as well. SurfaceInstance bounds those of a user.
    static constexpr long kMostOfOne = 8;
    /// Connections whose right is remembered.
    static constexpr std::size_t kMostKnown = 256;

    CallerRights(Bus& bus, RightsPolicy policy) : bus_(bus), policy_(std::move(policy)) {}

    /// Counts the call as waiting as long as it, or a copy made from now on, is kept. Throws
    /// BusError (Busy) when too many of this caller wait.
    void admit(BusMessage& call);
    /// Calls `granted` now or later if the caller has the right; otherwise the call is answered
    /// with AccessDenied, or Busy. What `granted` throws is the answer as well.
    void demand(const BusMessage& call, Right right,
                std::function<void(const Caller& caller)> granted);

private:
    struct Asked {
        BusSlot slot;
        BusMessage call;
        Right right = Right::Control;
        std::function<void(const Caller& caller)> granted;
    };

    void know(const std::string& sender, const Caller& caller);
    void decide(const Asked& asked, const Caller& caller) const;
    [[nodiscard]] Caller callerFrom(BusMessage& credentials) const;

    Bus& bus_;
    RightsPolicy policy_;
    std::map<std::string, Caller> known_;  // a unique name is never given twice
    std::deque<std::string> oldest_;
    std::map<std::uint64_t, Asked> asked_;
    std::uint64_t next_ = 0;
    std::map<std::string, std::shared_ptr<const char>> waiting_;  // one reference a call
};

}  // namespace VexaTouch::Tools::Daemon
