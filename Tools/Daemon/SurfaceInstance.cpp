#include "Tools/Daemon/SurfaceInstance.h"

#include "Platform/HostClock.h"
#include "Shared/Util.h"
#include "Tools/Daemon/PropertyRules.h"
#include "Tools/Failure.h"
#include "Tools/MissingValue.h"
#include "Tools/ObservedDevice.h"
#include "Tools/SettingKeys.h"

#include <algorithm>
#include <chrono>
#include <exception>
#include <new>
#include <string_view>
#include <thread>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

constexpr const char* kWorkerLabel = "vexa-surface";
constexpr std::string_view kPipelineDomain = "Pipeline.";
constexpr const char* kNoThread =
    "the service's input thread did not start or has ended, and takes no reports; its log says "
    "why. Plug the surface in anew, or restart the daemon";

bool isSetting(const std::string& key) {
    if (!key.starts_with(kPipelineDomain)) {
        return false;
    }
    const std::vector<std::string> keys = pipelineSettingKeys();
    return std::ranges::find(keys, key.substr(kPipelineDomain.size())) != keys.end();
}

std::chrono::nanoseconds steadyNow() {
    return std::chrono::steady_clock::now().time_since_epoch();
}

BusError notTaken(const std::string& key) {
    return {ErrorName::kFailed, key + ": the device did not take the value"};
}

BusError noMemory() {
    return {ErrorName::kBusy, "there is no memory for the call; try again"};
}

/// Returns when the service has read an unplugged device to its end, or when it does not get there
/// in time: the kernel keeps what was sent, and closing the device would throw it away.
void waitForLastReports(const Host::HostSession& session) {
    constexpr auto kPatience = std::chrono::seconds(5);
    constexpr auto kInterval = std::chrono::milliseconds(1);
    const auto until = std::chrono::steady_clock::now() + kPatience;
    while (session.property(ObservedDevice::kReadsOnKey) &&
           std::chrono::steady_clock::now() < until) {
        std::this_thread::sleep_for(kInterval);
    }
}

}  // namespace

Vexa::PropertyValue::Dictionary statisticsOf(const ReportCounts& counts, std::uint64_t gestures,
                                             const Vexa::PropertyValue::Dictionary& counters) {
    Vexa::PropertyValue::Dictionary all = {
        {"Reports", counts.reports},
        {"Images", counts.images},
        {"FirmwareEvents", counts.firmwareEvents},
        {"InvalidReports", counts.invalid},
        {"Gaps", counts.gaps},
        {"FramesLost", counts.framesLost},
        {"Gestures", gestures},
    };
    all.insert(counters.begin(), counters.end());
    return all;
}

/// What lives on the worker, in the order in which it is made.
struct SurfaceInstance::Parts {
    std::shared_ptr<InputTap> tap;
    std::optional<Vexa::DeviceRegistration> registration;
    std::unique_ptr<Host::HostSession> session;
    Settings defaults;                            // of what was written since
    std::vector<std::weak_ptr<FrameFeed>> feeds;  // those that the tap fills have an owner there
};

SurfaceInstance::SurfaceInstance(EventLoop& loop, const Host::PluginLibrary& library,
                                 PluggedSurface surface, Settings settings, Hooks hooks,
                                 SurfaceTimes times)
    : loop_(loop),
      library_(library),
      surface_(std::move(surface)),
      settings_(std::move(settings)),
      hooks_(std::move(hooks)),
      times_(times),
      inputWatch_(loop.watch(inputWake_,
                             [this] {
                                 lookForThread();
                                 tellGaps();
                             })),
      parts_(std::make_unique<Parts>()),
      worker_(kWorkerLabel) {
    worker_.submit([this, wanted = settings_]() noexcept {
        std::string reason;
        std::shared_ptr<LoopDevice> device;
        try {
            parts_->tap = std::make_shared<InputTap>();
            device = std::make_shared<LoopDevice>(
                std::make_shared<TappedDevice>(surface_.open(), parts_->tap),
                LoopDevice::Hooks{.onLeft = [this] { inputWake_.notify(); },
                                  .onGap =
                                      [this] {
                                          if (steadyNow() >= nextGaps_.load()) {
                                              inputWake_.notify();
                                          }
                                      }});
            parts_->registration.emplace(device);
            parts_->session = std::make_unique<Host::HostSession>(
                library_, parts_->registration->service(),
                [this](const Vexa::HidEvent& event) { deliver(event); });
            for (const auto& [key, value] : wanted) {
                parts_->defaults.emplace(key, parts_->session->property(key));
                parts_->session->setProperty(key, value);
            }
            if (surface_.useSetter) {
                surface_.useSetter([parts = parts_.get()](const std::string& key,
                                                          const Vexa::PropertyValue& value) {
                    parts->tap->setProperty(*parts->session, std::string(kPipelineDomain) + key,
                                            value);
                });
            }
            parts_->session->begin();
            // The service does not say whether it has the thread that is to take the reports.
            if (!device->waitUntilScheduled(times_.patience)) {
                throw Failure(kNoThread);
            }
            const Vexa::MutexLock guard(deviceLock_);
            device_ = std::move(device);
        } catch (const std::exception& error) {
            reason = error.what();
            parts_->session.reset();
            parts_->registration.reset();
            device.reset();
        }
        loop_.post([this, reason] {
            if (state_ == State::Starting) {
                setState(reason.empty() ? State::Running : State::Failed, reason);
                lookForThread();
            }
        });
    });
}

SurfaceInstance::~SurfaceInstance() {
    worker_.drain();
    // Without an end before, what is still running goes while there is somebody to take its events.
    parts_.reset();
}

void SurfaceInstance::end(bool isUnplugged, std::function<void()> done) {
    ending_ = true;
    setState(State::Ending, reason_);
    // They are told so; nothing may come behind the end.
    while (!held_.empty()) {
        submitHeld();
    }
    worker_.submit([this, isUnplugged, done = std::move(done)]() mutable noexcept {
        try {
            if (parts_->session) {
                if (isUnplugged && isServed()) {
                    waitForLastReports(*parts_->session);
                }
                parts_->session->end();
            }
        } catch (const std::exception&) {
            // All that could be taken back has been.
        }
        parts_->session.reset();
        parts_->registration.reset();
        for (const auto& feed : parts_->feeds) {
            if (const auto open = feed.lock()) {
                parts_->tap->remove(open);
            }
        }
        std::shared_ptr<LoopDevice> device;
        {
            const Vexa::MutexLock guard(deviceLock_);
            counted_ = device_ ? device_->counts() : ReportCounts{};
            device = std::move(device_);
        }
        // A close waits for the feature requests of every surface, and the loop must not.
        device.reset();
        loop_.post(std::move(done));
    });
}

std::string SurfaceInstance::stateText() const {
    switch (state_) {
        case State::Starting:
            return "starting";
        case State::Running:
            return "running";
        case State::Failed:
            return "failed";
        case State::Ending:
            return "ending";
    }
    return "";
}

ReportCounts SurfaceInstance::counts() const noexcept {
    const Vexa::MutexLock guard(deviceLock_);
    return device_ ? device_->counts() : counted_;
}

void SurfaceInstance::setState(State state, const std::string& reason) {
    state_ = state;
    reason_ = reason;
    hooks_.onState();
}

void SurfaceInstance::lookForThread() {
    if (state_ == State::Running && !isServed()) {
        setState(State::Failed, kNoThread);
    }
}

bool SurfaceInstance::isServed() const {
    const Vexa::MutexLock guard(deviceLock_);
    return device_ && device_->isScheduled();
}

void SurfaceInstance::deliver(const Vexa::HidEvent& event) {
    if (hooks_.onEvent) {
        hooks_.onEvent(event);
    }
    const std::uint64_t now = Vexa::HostClock::system().now();
    bool post = false;
    {
        const Vexa::MutexLock guard(lock_);
        if (inbox_.events.size() < kMostGestures) {
            inbox_.events.push_back(DeliveredEvent::of(event, event.timestamp(), now));
            inbox_.hostTimesNs.push_back(Util::nanosecondsFromMachTime(now));
        } else {
            ++inbox_.lost;
        }
        post = !std::exchange(inboxPosted_, true);
    }
    if (post) {
        loop_.post([this] { takeGestures(); });
    }
}

void SurfaceInstance::takeGestures() {
    Gestures taken;
    {
        const Vexa::MutexLock guard(lock_);
        taken = std::exchange(inbox_, {});
        inboxPosted_ = false;
    }
    gestures_ += taken.events.size();
    hooks_.onGestures(taken);
    tellGaps();
}

void SurfaceInstance::tellGaps() {
    const ReportCounts counts = this->counts();
    const std::chrono::nanoseconds now = steadyNow();
    if (counts.gaps == gapsTold_ || now < nextGaps_.load() || !hooks_.onGaps) {
        return;
    }
    gapsTold_ = counts.gaps;
    nextGaps_ = now + times_.betweenGaps;
    hooks_.onGaps(counts);
}

void SurfaceInstance::takePlace(const Question& question) {
    const auto found = waitingOf_.find(question.caller.user);
    const std::size_t ofUser = found == waitingOf_.end() ? 0 : found->second;
    if (question.isWatchers() && waitingOfWatchers_ >= kMostOfWatchers) {
        throw BusError(
            ErrorName::kBusy,
            "too many calls of users who may only watch wait for this surface; try again");
    }
    if (ofUser >= kMostOfUser) {
        throw BusError(ErrorName::kBusy, "too many of your calls wait for this surface; try again");
    }
    if (waiting_ >= kMostWaiting) {
        throw BusError(ErrorName::kBusy, "too many calls wait for this surface; try again");
    }
    ++waitingOf_[question.caller.user];
    ++waiting_;
    waitingOfWatchers_ += question.isWatchers() ? 1 : 0;
}

void SurfaceInstance::leavePlace(const Question& question) noexcept {
    --waiting_;
    if (const auto ofUser = waitingOf_.find(question.caller.user); --ofUser->second == 0) {
        waitingOf_.erase(ofUser);
    }
    waitingOfWatchers_ -= question.isWatchers() ? 1 : 0;
}

void SurfaceInstance::submitHeld() {
    isOneAsked_ = false;
    while (!isOneAsked_ && !held_.empty()) {
        const Held next = std::move(held_.front());
        held_.pop_front();
        try {
            worker_.submit([task = next.task]() noexcept { task(); });
            isOneAsked_ = true;
        } catch (const std::bad_alloc&) {
            leavePlace(next.question);
            next.refuse(noMemory());
        }
    }
}

template <typename Value, typename Work>
void SurfaceInstance::ask(const Question& question, Work work,
                          std::function<void(const Outcome<Value>& outcome)> done) {
    if (state_ != State::Running) {
        throw BusError(
            ErrorName::kNotRunning,
            "the surface is not running: " + (reason_.empty() ? "it is " + stateText() : reason_));
    }
    struct Asked {
        Work work;
        std::function<void(const Outcome<Value>& outcome)> done;
    };
    takePlace(question);
    try {
        const auto asked = std::make_shared<Asked>(std::move(work), std::move(done));
        const auto task = [this, question, asked]() noexcept {
            Outcome<Value> outcome;
            try {
                if (ending_ && !question.isOfSettings) {
                    throw BusError(ErrorName::kNotRunning, "the surface is being taken down");
                }
                outcome.value = asked->work(*parts_);
            } catch (const BusError& error) {
                outcome.error = error;
            } catch (const std::exception& error) {
                outcome.error = BusError(ErrorName::kFailed, error.what());
            }
            // Moved, since what it holds is the loop's and may not go on this thread.
            loop_.post(
                [this, question, outcome = std::move(outcome), done = std::move(asked->done)] {
                    leavePlace(question);
                    if (question.isOneByOne()) {
                        submitHeld();
                    }
                    done(outcome);
                });
        };
        if (question.isOneByOne() && isOneAsked_) {
            held_.push_back(
                {.question = question, .task = task, .refuse = [asked](const BusError& error) {
                     asked->done({.value = {}, .error = error});
                 }});
            return;
        }
        worker_.submit(task);
        isOneAsked_ |= question.isOneByOne();
    } catch (const std::bad_alloc&) {
        leavePlace(question);
        throw noMemory();
    }
}

void SurfaceInstance::get(const Caller& caller, const std::string& key,
                          std::function<void(const Outcome<Vexa::PropertyValue>& outcome)> done) {
    ask<Vexa::PropertyValue>(
        {.caller = caller, .asksDevice = PropertyRules::asksDevice(key)},
        [key](Parts& parts) {
            Vexa::PropertyValue value = parts.session->property(key);
            if (!value) {
                throw BusError(isReadFromDevice(key) ? ErrorName::kFailed : ErrorName::kUnknownKey,
                               missingValueText(key));
            }
            return value;
        },
        std::move(done));
}

void SurfaceInstance::getCounters(
    const Caller& caller,
    std::function<void(const Outcome<Vexa::PropertyValue::Dictionary>& outcome)> done) {
    ask<Vexa::PropertyValue::Dictionary>(
        {.caller = caller},
        [](Parts& parts) {
            return Vexa::PropertyValue::Dictionary{
                {"DisjointImageCount", parts.session->property("DisjointImageCount")},
                {"EventStats", parts.session->property("Pipeline.Algs.EventStats")},
            };
        },
        std::move(done));
}

void SurfaceInstance::set(const Caller& caller, const std::string& key,
                          const Vexa::PropertyValue& value,
                          std::function<void(const Outcome<Vexa::PropertyValue>& outcome)> done) {
    const bool keeps = isSetting(key);
    ask<Vexa::PropertyValue>(
        {.caller = caller, .asksDevice = PropertyRules::asksDevice(key), .isOfSettings = keeps},
        [key, value, keeps](Parts& parts) {
            const Vexa::PropertyValue before = parts.session->property(key);
            if (!key.starts_with(kPipelineDomain) && !before) {
                throw BusError(ErrorName::kUnknownKey, key + ": the device has no such property");
            }
            if (keeps) {
                parts.defaults.emplace(key, before);
            }
            if (!parts.tap->setProperty(*parts.session, key, value)) {
                throw notTaken(key);
            }
            return parts.session->property(key);
        },
        [this, key, value, keeps,
         done = std::move(done)](const Outcome<Vexa::PropertyValue>& outcome) {
            if (keeps && outcome.value) {
                settings_.insert_or_assign(key, value);
            }
            done(outcome);
        });
}

void SurfaceInstance::reset(const Caller& caller,
                            std::function<void(const Outcome<bool>& outcome)> done) {
    ask<bool>(
        {.caller = caller, .isOfSettings = true},
        [](Parts& parts) {
            for (const auto& [key, value] : parts.defaults) {
                if (!parts.tap->setProperty(*parts.session, key, value)) {
                    throw notTaken(key);
                }
            }
            return true;
        },
        [this, done = std::move(done)](const Outcome<bool>& outcome) {
            if (outcome.value) {
                settings_.clear();
            }
            done(outcome);
        });
}

void SurfaceInstance::addFeed(
    const Caller& caller, const std::shared_ptr<FrameFeed>& feed,
    std::function<void(const Outcome<std::shared_ptr<InputTap>>& outcome)> done) {
    ask<std::shared_ptr<InputTap>>(
        {.caller = caller},
        [feed](Parts& parts) {
            std::erase_if(parts.feeds, [](const auto& each) { return each.expired(); });
            parts.feeds.push_back(feed);
            parts.tap->add(feed, *parts.session);
            return parts.tap;
        },
        std::move(done));
}

void SurfaceInstance::ping(std::function<void()> answered) {
    // Its end is the answer, so that a thread that has ended in order does not owe one.
    const std::shared_ptr<void> token(
        nullptr, [&loop = loop_, answered = std::move(answered)](void*) { loop.post(answered); });
    bool canAnswer = true;
    {
        const Vexa::MutexLock guard(deviceLock_);
        canAnswer = !device_ || device_->submit([token]() noexcept {});
    }
    if (state_ == State::Running && !canAnswer) {
        setState(State::Failed, kNoThread);
    }
}

}  // namespace VexaTouch::Tools::Daemon
