#include "Tools/Daemon/OwnStatistics.h"

#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/PlayedSource.h"
#include "Tools/Daemon/SurfaceInstance.h"
#include "Tools/Failure.h"
#include "Tools/ReportWatch.h"

#include <cstdint>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

using std::chrono::microseconds;

/// A surface from its start to its end, on a loop of its own.
class OwnRun {
public:
    OwnRun(const Host::PluginLibrary& library, const std::string& name,
           std::shared_ptr<ObservedDevice> device, std::optional<std::chrono::nanoseconds> duration,
           const SignalWatch& signals, const WakeUp& wake, std::chrono::nanoseconds patience)
        : device_(std::move(device)), duration_(duration), reportWatch_(*device_, patience) {
        signalWatch_ = loop_.watch(wake, [this, &signals] {
            if (signals.endWanted()) {
                finish();
            }
        });
        DeviceHooks hooks;
        hooks.onFinished = [this] { loop_.post([this] { finish(); }); };
        SurfaceInstance::Hooks instanceHooks;
        instanceHooks.onState = [this] { stateChanged(); };
        instanceHooks.onGestures = [](const Gestures&) {};
        instance_.emplace(loop_, library, surfaceOf(name, device_, std::move(hooks)), Settings(),
                          std::move(instanceHooks));
    }

    OwnStatistics run() {
        loop_.run();
        if (!failure_.empty()) {
            throw Failure(failure_);
        }
        const PluggedSurface& surface = instance_->surface();
        return {
            .properties = Vexa::PropertyValue::Dictionary{{"Name", surface.name},
                                                          {"Node", ""},
                                                          {"PhysicalPath", surface.physicalPath},
                                                          {"Product", surface.product},
                                                          {"Reason", ""},
                                                          {"Serial", surface.serial},
                                                          {"State", "running"},
                                                          {"Vendor", surface.vendor}},
            .statistics = statisticsOf(instance_->counts(), instance_->gestures(), counters_)};
    }

private:
    void stateChanged() {
        if (instance_->state() == SurfaceInstance::State::Failed) {
            fail(instance_->reason());
        }
        if (instance_->state() != SurfaceInstance::State::Running) {
            return;
        }
        if (duration_) {
            deadline_ = loop_.after(*duration_, [this] { finish(); });
        }
        lookWatch_ =
            loop_.every(std::chrono::duration_cast<microseconds>(reportWatch_.interval()), [this] {
                if (reportWatch_.look()) {
                    fail(ReportWatch::kFault);
                }
            });
        if (const int hangUp = device_->hangUpDescriptor(); hangUp >= 0) {
            hangUpWatch_ = loop_.watch(hangUp, 0, [this](std::uint32_t) {
                isUnplugged_ = true;
                fail("the device was unplugged");
            });
        }
        if (finishWanted_) {
            finish();
        }
    }

    /// Asks for the service's counters, and then takes everything down.
    void finish() {
        finishWanted_ = true;
        if (isEnding_ || instance_->state() != SurfaceInstance::State::Running) {
            return;
        }
        isEnding_ = true;
        instance_->getCounters({.right = Right::Control},
                               [this](const Outcome<Vexa::PropertyValue::Dictionary>& outcome) {
                                   counters_ =
                                       outcome.value.value_or(Vexa::PropertyValue::Dictionary());
                                   end();
                               });
    }
    void fail(const std::string& reason) {
        failure_ = failure_.empty() ? reason : failure_;
        if (!std::exchange(isEnding_, true)) {
            end();
        }
    }
    void end() {
        deadline_.reset();
        lookWatch_.reset();
        hangUpWatch_.reset();
        instance_->end(isUnplugged_, [this] { loop_.stop(); });
    }

    std::shared_ptr<ObservedDevice> device_;
    std::optional<std::chrono::nanoseconds> duration_;
    ReportWatch reportWatch_;
    bool finishWanted_ = false;
    bool isEnding_ = false;
    bool isUnplugged_ = false;
    std::string failure_;
    Vexa::PropertyValue::Dictionary counters_;
    EventLoop loop_;
    EventLoop::WatchHandle signalWatch_;
    EventLoop::WatchHandle deadline_;
    EventLoop::WatchHandle lookWatch_;
    EventLoop::WatchHandle hangUpWatch_;
    std::optional<SurfaceInstance> instance_;
};

}  // namespace

OwnStatistics gatherStatistics(const Host::PluginLibrary& library, const std::string& name,
                               const std::shared_ptr<ObservedDevice>& device,
                               std::optional<std::chrono::nanoseconds> duration,
                               const SignalWatch& signals, const WakeUp& wake,
                               std::chrono::nanoseconds patience) {
    return OwnRun(library, name, device, duration, signals, wake, patience).run();
}

}  // namespace VexaTouch::Tools::Daemon
