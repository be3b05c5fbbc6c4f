#include "Tools/Daemon/CallerRights.h"

#include "Tools/Daemon/SeatRule.h"

#include <grp.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <exception>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

constexpr const char* kBusName = "org.freedesktop.DBus";

std::optional<gid_t> groupNamed(const std::string& name) {
    group found{};
    group* result = nullptr;
    std::array<char, 4096> buffer{};
    // A group with more members than fit is there all the same, and only its number is wanted.
    std::vector<char> large;
    int error = getgrnam_r(name.c_str(), &found, buffer.data(), buffer.size(), &result);
    constexpr std::size_t kMost = std::size_t{1} << 20U;
    for (std::size_t size = 2 * buffer.size(); error == ERANGE && size <= kMost; size *= 2) {
        large.resize(size);
        error = getgrnam_r(name.c_str(), &found, large.data(), large.size(), &result);
    }
    return result == nullptr ? std::nullopt : std::optional(found.gr_gid);
}

}  // namespace

RightsPolicy RightsPolicy::ofThisSystem() {
    RightsPolicy policy;
    policy.group = groupNamed(policy.groupName);
    policy.isOnSeat = &isOnASeat;
    policy.ownUser = geteuid();
    return policy;
}

Right RightsPolicy::rightOf(uid_t user, const std::vector<gid_t>& groups) const {
    if (user == 0 || user == ownUser ||
        (group && std::ranges::find(groups, *group) != groups.end())) {
        return Right::Control;
    }
    return isOnSeat && isOnSeat(user) ? Right::Watch : Right::None;
}

void CallerRights::admit(BusMessage& call) {
    if (waiting_.size() > kMostKnown) {
        std::erase_if(waiting_, [](const auto& entry) { return entry.second.use_count() == 1; });
    }
    std::shared_ptr<const char>& waiting = waiting_[call.sender()];
    if (!waiting) {
        waiting = std::make_shared<const char>();
    }
    if (waiting.use_count() > kMostOfOne) {
        throw BusError(ErrorName::kBusy, "too many of your calls wait; try again");
    }
    // Copies of the message share one reference.
    call.hold(std::make_shared<const std::shared_ptr<const char>>(waiting));
}

void CallerRights::demand(const BusMessage& call, Right right,
                          std::function<void(const Caller& caller)> granted) {
    const std::string sender = call.sender();
    Asked asked{.slot = {}, .call = call, .right = right, .granted = std::move(granted)};
    if (const auto found = known_.find(sender); found != known_.end()) {
        decide(asked, found->second);
        return;
    }
    if (asked_.size() >= kMostAsked) {
        throw BusError(ErrorName::kBusy, "too many callers at once; try again");
    }
    const std::uint64_t number = next_++;
    BusMessage question =
        bus_.call(kBusName, "/org/freedesktop/DBus", kBusName, "GetConnectionCredentials");
    question.string(sender);
    const auto finish = [this, number, sender](const Caller& caller, bool keep) {
        const auto node = asked_.extract(number);
        if (keep) {
            know(sender, caller);
        }
        decide(node.mapped(), caller);
    };
    asked.slot = bus_.askLater(
        question, [this, finish](BusMessage credentials) { finish(callerFrom(credentials), true); },
        // The caller has left meanwhile, or the bus does not tell.
        [finish](const BusError&) { finish(Caller{}, false); });
    asked_.emplace(number, std::move(asked));
}

void CallerRights::know(const std::string& sender, const Caller& caller) {
    if (known_.emplace(sender, caller).second) {
        oldest_.push_back(sender);
    }
    if (oldest_.size() > kMostKnown) {
        known_.erase(oldest_.front());
        oldest_.pop_front();
    }
}

void CallerRights::decide(const Asked& asked, const Caller& caller) const {
    if (caller.right < asked.right) {
        const std::string who =
            asked.right == Right::Control
                ? "this needs root or the group " + policy_.groupName
                : "this needs a user on a seat, root or the group " + policy_.groupName;
        Bus::fail(asked.call, BusError(ErrorName::kAccessDenied, asked.call.member() + ": " + who));
        return;
    }
    try {
        asked.granted(caller);
    } catch (const BusError& error) {
        Bus::fail(asked.call, error);
    } catch (const std::exception& error) {
        // No memory or descriptor is left, which is the caller's affair and not the daemon's end.
        Bus::fail(asked.call, BusError(ErrorName::kFailed, error.what()));
    }
}

Caller CallerRights::callerFrom(BusMessage& credentials) const {
    std::optional<uid_t> user;
    std::vector<gid_t> groups;
    credentials.enter('a', "{sv}");
    while (!credentials.atEnd()) {
        credentials.enter('e', "sv");
        const std::string key = credentials.readString();
        if (key == "UnixUserID") {
            user = static_cast<uid_t>(credentials.readValue().toUnsigned64());
        } else if (key == "UnixGroupIDs") {
            const Vexa::PropertyValue numbers = credentials.readValue();
            if (const auto array = numbers.asArray()) {
                for (const Vexa::PropertyValue& number : *array) {
                    groups.push_back(static_cast<gid_t>(number.toUnsigned64()));
                }
            }
        } else {
            credentials.skip("v");
        }
        credentials.leave();
    }
    credentials.leave();
    return user ? Caller{.right = policy_.rightOf(*user, groups), .user = *user} : Caller{};
}

}  // namespace VexaTouch::Tools::Daemon
