#pragma once

#include "Host/PluginLibrary.h"
#include "Tests/Daemon/PrivateBus.h"
#include "Tools/Daemon/Bus.h"
#include "Tools/Daemon/Daemon.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DeviceSource.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/Watchdog.h"
#include "Tools/DeviceChoice.h"
#include "Tools/FileDescriptor.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <future>
#include <iostream>
#include <memory>
#include <mutex>
#include <ostream>
#include <sstream>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {

/// Surfaces that a test plugs in and out. Any thread.
class PluggedByHand final : public Tools::Daemon::DeviceSource {
public:
    PluggedByHand() : event_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

    void plug(Tools::Daemon::PluggedSurface surface) {
        put({.kind = Kind::Added, .surface = std::move(surface)});
    }
    /// There is news of this surface.
    void touch(Tools::Daemon::PluggedSurface surface) {
        put({.kind = Kind::Changed, .surface = std::move(surface)});
    }
    void unplug(const std::string& id) {
        Tools::Daemon::PlugChange change{.kind = Kind::Removed, .surface = {}};
        change.surface.id = id;
        put(std::move(change));
    }

    [[nodiscard]] int descriptor() const noexcept override { return event_.get(); }
    [[nodiscard]] std::vector<Tools::Daemon::PlugChange> takeChanges() override {
        std::uint64_t count = 0;
        static_cast<void>(::read(event_.get(), &count, sizeof count) == sizeof count);
        const std::lock_guard guard(lock_);
        return std::exchange(changes_, {});
    }

private:
    using Kind = Tools::Daemon::PlugChange::Kind;

    void put(Tools::Daemon::PlugChange change) {
        const std::lock_guard guard(lock_);
        changes_.push_back(std::move(change));
        const std::uint64_t one = 1;
        static_cast<void>(::write(event_.get(), &one, sizeof one) == sizeof one);
    }

    Tools::FileDescriptor event_;
    std::mutex lock_;
    std::vector<Tools::Daemon::PlugChange> changes_;
};

/// A surface that plays what --device names.
inline Tools::Daemon::PluggedSurface playedSurface(const std::string& id, const std::string& device,
                                                   bool endless = false) {
    Tools::Daemon::PluggedSurface surface;
    surface.id = id;
    surface.name = "Surface " + id;
    surface.node = "/dev/hidraw" + id;
    surface.serial = "serial " + id;
    surface.physicalPath = "usb-" + id;
    surface.vendor = 0x5658;
    surface.product = 0x5454;
    surface.open = [device, endless] {
        Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
        Tools::DeviceWishes wishes{.announceSeed = false};
        wishes.endless = endless;
        return Tools::makeDevice(Tools::DeviceChoice::parse(device), wishes, streams);
    };
    return surface;
}

inline std::string example(const std::string& name) {
    return "recording:" VEXA_SOURCE_DIR "/Examples/" + name + ".json@max";
}

/// A log that can be waited for. Any thread.
class LogOfLines final : public std::stringbuf {
public:
    void waitFor(const std::string& text) {
        std::unique_lock guard(lock_);
        more_.wait(guard, [&] { return text_.find(text) != std::string::npos; });
    }
    /// All of it, which begins anew.
    [[nodiscard]] std::string take() {
        const std::lock_guard guard(lock_);
        return std::exchange(text_, {});
    }
    [[nodiscard]] std::size_t count(const std::string& text) {
        const std::lock_guard guard(lock_);
        std::size_t found = 0;
        for (std::size_t at = 0; (at = text_.find(text, at)) != std::string::npos; ++at) {
            ++found;
        }
        return found;
    }

protected:
    int sync() override {
        const std::lock_guard guard(lock_);
        text_ += str();
        str("");
        more_.notify_all();
        return 0;
    }

private:
    std::mutex lock_;
    std::condition_variable more_;
    std::string text_;
};

/// The daemon on a thread of this process, and its source.
class DaemonUnderTest {
public:
    using Listener = std::function<std::unique_ptr<Tools::Daemon::EventListener>()>;

    explicit DaemonUnderTest(const std::string& bus,
                             Tools::Daemon::RightsPolicy rights = rightsOfThisUser(),
                             Listener listener = {})
        : DaemonUnderTest(bus, Tools::Daemon::DaemonOptions{.rights = std::move(rights),
                                                            .listener = std::move(listener)}) {}
    DaemonUnderTest(const std::string& bus, Tools::Daemon::DaemonOptions options,
                    const std::string& plugin = VEXATOUCH_PLUGIN_FILE, std::ostream* log = nullptr)
        : library_(plugin), logTo_(log != nullptr ? *log : log_) {
        std::promise<void> ready;
        thread_ = std::thread(
            [this, bus, options = std::move(options), &ready] { serve(bus, options, ready); });
        ready.get_future().get();
    }
    ~DaemonUnderTest() { stop(); }
    DaemonUnderTest(const DaemonUnderTest&) = delete;
    DaemonUnderTest& operator=(const DaemonUnderTest&) = delete;

    void stop() {
        if (thread_.joinable()) {
            loop_.post([this] { daemon_->end([this] { loop_.stop(); }); });
            thread_.join();
        }
    }
    /// Calls on the daemon's thread and waits.
    void call(const std::function<void(Tools::Daemon::Daemon& daemon)>& what) {
        std::promise<void> done;
        loop_.post([&] {
            what(*daemon_);
            done.set_value();
        });
        done.get_future().get();
    }
    /// Returns when the daemon's loop has seen this interval pass so often.
    void waitForTicks(int count, std::chrono::microseconds interval) {
        std::promise<void> done;
        Tools::Daemon::EventLoop::WatchHandle ticks;
        loop_.post([&] {
            ticks = loop_.every(interval, [&] {
                if (--count == 0) {
                    ticks.reset();
                    done.set_value();
                }
            });
        });
        done.get_future().get();
    }

    PluggedByHand source;

    static Tools::Daemon::RightsPolicy rightsOfThisUser() {
        Tools::Daemon::RightsPolicy rights;
        rights.ownUser = geteuid();
        return rights;
    }

    /// All that was logged; once stopped.
    [[nodiscard]] std::string log() const { return log_.str(); }

private:
    void serve(const std::string& address, const Tools::Daemon::DaemonOptions& options,
               std::promise<void>& ready) {
        Tools::Daemon::Bus bus(address);
        bus.attach(loop_, [this] { loop_.stop(); });
        Tools::Daemon::Daemon daemon(loop_, bus, library_, source, options, logTo_);
        daemon_ = &daemon;
        const Tools::Daemon::Watchdog watchdog(loop_, daemon, [] {});
        ready.set_value();
        loop_.run();
    }

    Host::PluginLibrary library_;
    Tools::Daemon::EventLoop loop_;
    Tools::Daemon::Daemon* daemon_ = nullptr;
    std::ostringstream log_;
    std::ostream& logTo_;
    std::thread thread_;
};

}  // namespace VexaTouch::Testing
