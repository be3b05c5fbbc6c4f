#include "Tools/PlayedDevice.h"

#include "Platform/SignalsBlocked.h"
#include "Shared/Util.h"

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cassert>
#include <cerrno>
#include <cmath>
#include <ctime>
#include <exception>
#include <system_error>
#include <thread>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::uint64_t kNsPerSecond = 1'000'000'000;
constexpr std::uint64_t kNsPerMicrosecond = 1000;
constexpr std::uint64_t kForever = UINT64_MAX;

/// Ends the playing from within the source of frames.
struct Stopped {};

/// a + b, or the largest number.
std::uint64_t sum(std::uint64_t a, std::uint64_t b) {
    return a > UINT64_MAX - b ? UINT64_MAX : a + b;
}

std::uint64_t rounded(double nanoseconds) {
    constexpr double kTooLarge = 18'446'744'073'709'551'616.0;
    return nanoseconds < kTooLarge ? static_cast<std::uint64_t>(nanoseconds) : UINT64_MAX;
}

}  // namespace

/// One opening: the writing end of the socket pair and the thread.
class PlayedDevice::Player {
public:
    Player(PlayedDevice& device, FileDescriptor socket)
        : device_(device), socket_(std::move(socket)) {}

    /// Throws std::system_error.
    void start() {
        const Vexa::SignalsBlocked blocked;
        thread_ = std::thread([this] { run(); });
    }

    void join() {
        assert(std::this_thread::get_id() != thread_.get_id());
        thread_.join();
    }

    void stop() noexcept {
        stopping_.store(true);
        device_.wake();
    }

    void hangUp() noexcept {
        stop();
        shutdown(socket_.get(), SHUT_RDWR);
    }

private:
    void run() noexcept;
    void take(const Frame& frame);
    void takeState(const Frame& frame);
    void takeReport(const Frame& frame);

    [[nodiscard]] std::uint64_t momentOf(const Frame& frame);
    void waitUntil(std::uint64_t ns);
    void waitUntilAllHandled();
    void send(std::span<const std::uint8_t> report);
    [[nodiscard]] bool trySend(std::span<const std::uint8_t> report);

    void throwIfStopping() const {
        if (stopping_.load()) {
            throw Stopped();
        }
    }
    void pause(short socketEvents, std::uint64_t ns);
    [[nodiscard]] std::uint64_t nowNs() const {
        return Util::nanosecondsFromMachTime(device_.clock_.now());
    }

    PlayedDevice& device_;
    FileDescriptor socket_;
    std::atomic<bool> stopping_{false};

    // The player's thread only.
    std::uint64_t taken_ = 0;        ///< reports, the dropped ones included
    std::uint64_t startNs_ = 0;      ///< when the first report left
    std::uint64_t playedNs_ = 0;     ///< recorded time since then
    std::uint64_t timestampNs_ = 0;  ///< recorded time of the latest report

    std::thread thread_;
};

void PlayedDevice::Player::run() noexcept {
    pthread_setname_np(pthread_self(), "vexa-device");
    // Reports leave when it is time, not within the 50 microseconds that the kernel likes to add.
    prctl(PR_SET_TIMERSLACK, 1UL, 0UL, 0UL, 0UL);
    try {
        try {
            device_.source_([this](const Frame& frame) { take(frame); });
        } catch (const std::exception&) {
            // The frames are over: there is no memory for more.
        }
        waitUntilAllHandled();
    } catch (const Stopped&) {
        return;
    }
    if (device_.hooks_.onFinished) {
        device_.hooks_.onFinished();
    }
}

void PlayedDevice::Player::take(const Frame& frame) {
    throwIfStopping();
    if (frame.type == Frame::Type::InputReport) {
        takeReport(frame);
    } else {
        takeState(frame);
    }
}

void PlayedDevice::Player::takeState(const Frame& frame) {
    if (device_.hooks_.onStateFrame) {
        waitUntilAllHandled();
        device_.hooks_.onStateFrame(frame.key, frame.value);
    }
}

void PlayedDevice::Player::takeReport(const Frame& frame) {
    waitUntil(momentOf(frame));
    ++taken_;
    if (!device_.pace_.lossless &&
        device_.sent_.load() - device_.handled_.load() >= PlayedPace::kBacklog) {
        device_.dropped_.fetch_add(1);
        return;
    }
    const std::span report =
        std::span(frame.report).first(std::min(frame.report.size(), kLongestReport));
    if (device_.hooks_.onSend) {
        device_.hooks_.onSend(report);
    }
    send(report);
}

/// When the report has to leave, 0 for at once.
std::uint64_t PlayedDevice::Player::momentOf(const Frame& frame) {
    const PlayedPace& pace = device_.pace_;
    if (!pace.rate && std::isinf(pace.speed)) {
        return 0;
    }
    if (taken_ == 0) {
        startNs_ = nowNs();
    } else if (frame.timestamp > timestampNs_) {
        playedNs_ = sum(playedNs_, frame.timestamp - timestampNs_);
    }
    timestampNs_ = frame.timestamp;
    const double ns =
        pace.rate ? static_cast<double>(taken_) * static_cast<double>(kNsPerSecond) / *pace.rate
                  : static_cast<double>(playedNs_) / pace.speed;
    return sum(startNs_, rounded(ns));
}

/// The machine's clock is waited for in the kernel, and the waiting can be ended; any other clock
/// has to sleep itself.
void PlayedDevice::Player::waitUntil(std::uint64_t ns) {
    const bool isSystem = &device_.clock_ == &Vexa::HostClock::system();
    while (ns != 0) {
        throwIfStopping();
        const std::uint64_t now = nowNs();
        if (now >= ns) {
            return;
        }
        if (isSystem) {
            pause(0, ns - now);
        } else {
            device_.clock_.sleepMicroseconds((ns - now - 1) / kNsPerMicrosecond + 1);
        }
    }
}

void PlayedDevice::Player::waitUntilAllHandled() {
    const std::uint64_t sent = device_.sent_.load();
    device_.awaited_.store(sent);
    while (device_.handled_.load() < sent) {
        throwIfStopping();
        pause(0, kForever);
    }
    device_.awaited_.store(0);
    throwIfStopping();
}

void PlayedDevice::Player::send(std::span<const std::uint8_t> report) {
    // Counted before the reader can have handled it.
    device_.sent_.fetch_add(1);
    try {
        while (!trySend(report)) {
            if (!device_.pace_.lossless) {
                device_.sent_.fetch_sub(1);
                device_.dropped_.fetch_add(1);
                return;
            }
            pause(POLLOUT, kForever);
            throwIfStopping();
        }
    } catch (...) {
        device_.sent_.fetch_sub(1);
        throw;
    }
}

/// False when there is no room. A reader that is gone ends the playing.
bool PlayedDevice::Player::trySend(std::span<const std::uint8_t> report) {
    while (::send(socket_.get(), report.data(), report.size(), MSG_DONTWAIT | MSG_NOSIGNAL) < 0) {
        if (errno == EAGAIN) {
            return false;
        }
        if (errno != EINTR) {
            throw Stopped();
        }
    }
    return true;
}

/// Waits for something to happen: a wake, one of the events on the socket, or the end of the time.
void PlayedDevice::Player::pause(short socketEvents, std::uint64_t ns) {
    std::array<pollfd, 2> waited = {
        {{device_.wake_.get(), POLLIN, 0}, {socket_.get(), socketEvents, 0}}};
    timespec time{};
    time.tv_sec = static_cast<time_t>(ns / kNsPerSecond);
    time.tv_nsec = static_cast<long>(ns % kNsPerSecond);
    // Without events of its own, a socket that hung up would end the waiting over and over.
    ppoll(waited.data(), socketEvents == 0 ? 1 : 2, ns == kForever ? nullptr : &time, nullptr);
    if (waited[0].revents != 0) {
        eventfd_t count = 0;
        eventfd_read(device_.wake_.get(), &count);
    }
}

PlayedDevice::PlayedDevice(FrameSource source, PlayedPace pace, SurfaceIdentity identity,
                           Vexa::HostClock& clock)
    : source_(std::move(source)),
      pace_(pace),
      clock_(clock),
      answers_(std::move(identity)),
      wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

PlayedDevice::~PlayedDevice() {
    close(0);
}

void PlayedDevice::setHooks(DeviceHooks hooks) {
    hooks_ = std::move(hooks);
}

void PlayedDevice::setPace(const PlayedPace& pace) {
    pace_ = pace;
}

vexa_status PlayedDevice::open(std::uint32_t, int& descriptor) noexcept {
    const Vexa::MutexLock held(lock_);
    if (player_) {
        return VEXA_STATUS_ALREADY_OPEN;
    }
    std::array<int, 2> pair{};
    if (!wake_ || socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, pair.data()) != 0) {
        return VEXA_STATUS_NO_RESOURCES;
    }
    FileDescriptor reader(pair[0]);
    FileDescriptor writer(pair[1]);
    // Room for the longest report; where the system has a lower limit, it decides.
    const int room = static_cast<int>(4 * kLongestReport);
    setsockopt(writer.get(), SOL_SOCKET, SO_SNDBUF, &room, sizeof room);
    sent_.store(0);
    dropped_.store(0);
    handled_.store(0);
    awaited_.store(0);
    try {
        auto player = std::make_shared<Player>(*this, std::move(writer));
        player->start();
        player_ = std::move(player);
    } catch (const std::exception&) {
        return VEXA_STATUS_NO_RESOURCES;
    }
    descriptor = reader.release();
    return VEXA_STATUS_SUCCESS;
}

void PlayedDevice::close(std::uint32_t) noexcept {
    std::shared_ptr<Player> player;
    {
        const Vexa::MutexLock held(lock_);
        player = std::exchange(player_, nullptr);
    }
    if (player) {
        player->stop();
        player->join();
    }
}

vexa_status PlayedDevice::getReport(vexa_report_type type, std::uint32_t reportId,
                                    std::span<std::uint8_t> report, std::size_t& length) noexcept {
    return answers_.getReport(type, reportId, report, length);
}

Vexa::PropertyValue PlayedDevice::property(const Vexa::PropertyValue& key) noexcept {
    return answers_.property(key);
}

bool PlayedDevice::setProperty(const Vexa::PropertyValue& key,
                               const Vexa::PropertyValue& value) noexcept {
    return answers_.setProperty(key, value);
}

void PlayedDevice::reportArrived(std::span<const std::uint8_t> report,
                                 std::uint64_t timestamp) noexcept {
    if (hooks_.onArrived) {
        hooks_.onArrived(report, timestamp);
    }
}

std::string PlayedDevice::tally() const {
    const std::uint64_t reports = sent();
    return std::to_string(reports) + (reports == 1 ? " report" : " reports") + " sent, " +
           std::to_string(dropped()) + " dropped";
}

void PlayedDevice::reportHandled() noexcept {
    if (hooks_.onHandled) {
        hooks_.onHandled();
    }
    const std::uint64_t handled = handled_.fetch_add(1) + 1;
    const std::uint64_t awaited = awaited_.load();
    if (awaited != 0 && handled >= awaited) {
        wake();
    }
}

void PlayedDevice::unplug() noexcept {
    std::shared_ptr<Player> player;
    {
        const Vexa::MutexLock held(lock_);
        player = player_;
    }
    if (player) {
        player->hangUp();
        if (hooks_.onUnplugged) {
            hooks_.onUnplugged();
        }
    }
}

void PlayedDevice::wake() noexcept {
    eventfd_write(wake_.get(), 1);
}

}  // namespace VexaTouch::Tools
