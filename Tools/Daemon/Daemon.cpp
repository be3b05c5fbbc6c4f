#include "Tools/Daemon/Daemon.h"

#include "Tools/Daemon/BusNames.h"
#include "Tools/TerminalText.h"

#include <sys/epoll.h>

#include <algorithm>
#include <chrono>
#include <optional>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

/// How long the daemon's end waits for those who read recordings.
constexpr std::chrono::seconds kStreamPatience{1};

/// "2 gaps, 14 frames lost".
std::string gapsText(const ReportCounts& counts) {
    const auto counted = [](std::uint64_t count, const char* thing) {
        return std::to_string(count) + ' ' + thing + (count == 1 ? "" : "s");
    };
    return counted(counts.gaps, "gap") + ", " + counted(counts.framesLost, "frame") + " lost";
}

}  // namespace

struct Daemon::Device {
    unsigned number = 0;
    bool plugged = true;
    Settings settings;                   // as they were when it was unplugged
    bool hasComeBack = false;            // another one has taken over
    std::optional<PluggedSurface> news;  // that came while it was starting
    std::unique_ptr<EventListener> listener;
    std::unique_ptr<SurfaceInstance> instance;
    std::unique_ptr<DeviceObject> object;

    [[nodiscard]] std::string title() const {
        const PluggedSurface& surface = instance->surface();
        std::string text = "surface " + std::to_string(number);
        text += surface.node.empty() ? "" : ", " + surface.node;
        // The device says its own name, to terminals and logs as well.
        text += surface.name.empty() ? "" : ", " + surface.name;
        return forTerminal(std::move(text));
    }
};

Daemon::Daemon(EventLoop& loop, Bus& bus, const Host::PluginLibrary& library, DeviceSource& source,
               DaemonOptions options, std::ostream& log)
    : loop_(loop),
      bus_(bus),
      library_(library),
      source_(source),
      options_(std::move(options)),
      log_(log),
      rights_(bus, options_.rights),
      streams_(loop),
      manager_(bus, rights_, [this] { return paths(); }) {
    // Who sees the name finds everything that was there at start, since calls are served later.
    bus_.requestName(BusNames::kService);
    takeChanges();
    if (source_.descriptor() >= 0) {
        sourceWatch_ =
            loop_.watch(source_.descriptor(), EPOLLIN, [this](std::uint32_t) { takeChanges(); });
    }
}

Daemon::~Daemon() = default;

void Daemon::takeChanges() {
    for (PlugChange& change : source_.takeChanges()) {
        switch (change.kind) {
            case PlugChange::Kind::Added:
                add(std::move(change.surface));
                break;
            case PlugChange::Kind::Removed:
                remove(change.surface.id);
                break;
            case PlugChange::Kind::Changed:
                tryAgain(std::move(change.surface));
                break;
        }
    }
}

void Daemon::add(PluggedSurface surface) {
    RememberedSettings::Arrival arrival = remembered_.arrive(surface.identity());
    for (const auto& before : devices_) {
        before->hasComeBack |= before->instance->surface().identity() == arrival.before;
    }
    Device& device = *devices_.emplace_back(std::make_unique<Device>());
    device.number = ++lastNumber_;
    device.listener = options_.listener ? options_.listener() : nullptr;
    SurfaceInstance::Hooks hooks;
    hooks.onState = [this, &device] { stateChanged(device); };
    hooks.onGestures = [this, &device](const Gestures& gestures) {
        device.object->announceGestures(gestures);
        tellFailure(device);
        if (onGestures) {
            onGestures();
        }
    };
    hooks.onGaps = [this, &device](const ReportCounts& counts) {
        log_ << device.title() << ": so far " << gapsText(counts) << std::endl;
        if (onChange) {
            onChange();
        }
    };
    if (device.listener) {
        hooks.onEvent = [&listener = *device.listener](const Vexa::HidEvent& event) {
            listener.handle(event);
        };
    }
    device.instance = std::make_unique<SurfaceInstance>(loop_, library_, std::move(surface),
                                                        std::move(arrival.settings),
                                                        std::move(hooks), options_.times);
    device.object = std::make_unique<DeviceObject>(bus_, rights_, streams_, *device.instance,
                                                   BusNames::devicePath(device.number));
    manager_.announceAdded(device.object->path());
    if (onChange) {
        onChange();
    }
}

void Daemon::stateChanged(Device& device) {
    switch (device.instance->state()) {
        case SurfaceInstance::State::Running:
            device.news.reset();
            log_ << device.title() << ": running" << std::endl;
            break;
        case SurfaceInstance::State::Failed:
            if (device.listener) {
                device.listener->surfaceEnding();
            }
            log_ << device.title() << ": " << forTerminal(device.instance->reason()) << std::endl;
            if (device.news) {
                // Not from within the list of devices that may be being gone through.
                loop_.post(
                    [this, news = *std::exchange(device.news, std::nullopt)] { tryAgain(news); });
            }
            break;
        case SurfaceInstance::State::Starting:
        case SurfaceInstance::State::Ending:
            break;
    }
    tellFailure(device);
    if (device.object) {
        device.object->announceState();
    }
    if (onChange) {
        onChange();
    }
}

void Daemon::tellFailure(const Device& device) {
    if (!device.listener) {
        return;
    }
    if (const auto failure = device.listener->takeFailure()) {
        log_ << "vexatouch daemon: " << *failure << std::endl;
    }
}

void Daemon::remove(const std::string& id) {
    if (Device* device = find(id)) {
        takeDown(*device, true);
        // Whoever reads the log slowly holds up only the line.
        log_ << device->title() << ": unplugged" << std::endl;
    }
}

void Daemon::tryAgain(PluggedSurface surface) {
    Device* device = find(surface.id);
    if (device == nullptr) {
        return;
    }
    if (device->instance->state() == SurfaceInstance::State::Failed) {
        takeDown(*device, false);
        add(std::move(surface));
    } else if (device->instance->state() == SurfaceInstance::State::Starting) {
        // It may fail for what was so before the news.
        device->news = std::move(surface);
    }
}

Daemon::Device* Daemon::find(const std::string& id) const {
    const auto found = std::ranges::find_if(devices_, [&](const auto& device) {
        return device->plugged && device->instance->surface().id == id;
    });
    return found == devices_.end() ? nullptr : found->get();
}

void Daemon::takeDown(Device& device, bool isUnplugged) {
    if (device.listener) {
        device.listener->surfaceEnding();
    }
    device.plugged = false;
    manager_.announceRemoved(device.object->path());
    device.object->withdraw();
    device.settings = device.instance->settings();
    remembered_.leave(device.instance->surface().identity(), device.settings);
    device.instance->end(isUnplugged, [this, &device] { taken(device); });
}

void Daemon::taken(Device& device) {
    if (device.listener) {
        device.listener->surfaceGone();
    }
    tellFailure(device);
    const ReportCounts counts = device.instance->counts();
    reportsOfGone_ += counts.reports;
    framesLostOfGone_ += counts.framesLost;
    if (counts.gaps > device.instance->gapsTold()) {
        log_ << device.title() << ": in all " << gapsText(counts) << std::endl;
    }
    // What was asked for before the unplug and taken only afterwards is in force as well, unless
    // the surface was back before: then what was set since is.
    if (!device.hasComeBack && device.instance->settings() != device.settings) {
        remembered_.correct(device.instance->surface().identity(), device.instance->settings());
    }
    std::erase_if(devices_, [&](const auto& each) { return each.get() == &device; });
    if (onChange) {
        onChange();
    }
    if (devices_.empty() && ended_) {
        std::exchange(ended_, nullptr)();
    }
}

void Daemon::end(std::function<void()> done) {
    sourceWatch_.reset();
    done = [this, done = std::move(done)]() mutable {
        streams_.end(kStreamPatience, std::move(done));
    };
    if (devices_.empty()) {
        done();
        return;
    }
    ended_ = std::move(done);
    for (const auto& device : devices_) {
        if (device->plugged) {
            takeDown(*device, false);
        }
    }
}

void Daemon::ping(std::function<void()> answered) {
    struct Round {
        std::function<void()> answered;
        std::size_t missing = 1;
        void arrive() {
            if (--missing == 0) {
                answered();
            }
        }
    };
    const auto round = std::make_shared<Round>(Round{.answered = std::move(answered)});
    for (const auto& device : devices_) {
        ++round->missing;
        device->instance->ping([round] { round->arrive(); });
    }
    round->arrive();
}

std::size_t Daemon::surfaces() const noexcept {
    return static_cast<std::size_t>(
        std::ranges::count_if(devices_, [](const auto& device) { return device->plugged; }));
}

std::uint64_t Daemon::reports() const noexcept {
    std::uint64_t reports = reportsOfGone_;
    for (const auto& device : devices_) {
        reports += device->instance->counts().reports;
    }
    return reports;
}

std::uint64_t Daemon::framesLost() const noexcept {
    std::uint64_t lost = framesLostOfGone_;
    for (const auto& device : devices_) {
        lost += device->instance->counts().framesLost;
    }
    return lost;
}

std::vector<std::string> Daemon::paths() const {
    std::vector<std::string> all;
    for (const auto& device : devices_) {
        if (device->plugged) {
            all.push_back(device->object->path());
        }
    }
    return all;
}

}  // namespace VexaTouch::Tools::Daemon
