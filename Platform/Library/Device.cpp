#include "Platform/Library/Device.h"

#include <vexa/clock.h>

#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>
#include <algorithm>
#include <cerrno>
#include <new>
#include <utility>

using Vexa::Library::FileDescriptor;
using Vexa::Library::MutexLock;

namespace {

bool setNonBlocking(int descriptor) noexcept {
    const int flags = ::fcntl(descriptor, F_GETFL);
    return flags >= 0 &&
           ((flags & O_NONBLOCK) != 0 || ::fcntl(descriptor, F_SETFL, flags | O_NONBLOCK) == 0);
}

// Of these each read gives one whole packet, and one of 0 bytes is a packet too.
bool isPacketSocket(int descriptor) noexcept {
    int type = 0;
    socklen_t size = sizeof type;
    return ::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &size) == 0 &&
           (type == SOCK_SEQPACKET || type == SOCK_DGRAM);
}

ssize_t readOnce(int descriptor, std::uint8_t* buffer, std::size_t length) noexcept {
    ssize_t count = 0;
    do {
        count = ::read(descriptor, buffer, length);
    } while (count < 0 && errno == EINTR);
    return count;
}

// Reads from a packet socket whose far end has hung up: what is still queued comes first, and an
// empty packet is not the end. Only a packet comes with its sender's credentials.
ssize_t readAfterHangUp(int descriptor, std::uint8_t* buffer, std::size_t length,
                        bool& isEnd) noexcept {
    const int on = 1;
    static_cast<void>(::setsockopt(descriptor, SOL_SOCKET, SO_PASSCRED, &on, sizeof on));
    // Room for the credentials and nothing else, so that no descriptors come in with them.
    alignas(cmsghdr) std::uint8_t control[CMSG_SPACE(sizeof(ucred))];
    iovec part{.iov_base = buffer, .iov_len = length};
    msghdr message{};
    message.msg_iov = &part;
    message.msg_iovlen = 1;
    message.msg_control = control;
    message.msg_controllen = sizeof control;
    ssize_t count = 0;
    do {
        count = ::recvmsg(descriptor, &message, MSG_CMSG_CLOEXEC);
    } while (count < 0 && errno == EINTR);
    isEnd = count == 0 && message.msg_controllen == 0;
    return count;
}

}  // namespace

vexa_device::vexa_device(std::shared_ptr<const Vexa::Library::Backend> backend) noexcept
    : backend_(std::move(backend)) {}

// Nobody else has a reference, and the loop gets none any more.
vexa_device::~vexa_device() {
    static_cast<void>(close(0));
    const MutexLock lock(mutex_);
    leaveLoop();
}

bool vexa_device::tryRetain() noexcept {
    std::uint32_t count = references_.load(std::memory_order_relaxed);
    while (count != 0) {
        if (references_.compare_exchange_weak(count, count + 1, std::memory_order_relaxed)) {
            return true;
        }
    }
    return false;
}

void vexa_device::release() noexcept {
    if (references_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
}

vexa_status vexa_device::open(std::uint32_t options) noexcept {
    {
        const MutexLock lock(mutex_);
        if (!present_) return VEXA_STATUS_GONE;
        if (state_ != State::Closed) return VEXA_STATUS_ALREADY_OPEN;
        state_ = State::Opening;
    }
    FileDescriptor opened;
    vexa_status status = openBackend(options, opened);
    {
        const MutexLock lock(mutex_);
        if (status != VEXA_STATUS_SUCCESS) {
            state_ = State::Closed;
            return status;
        }
        isPacketSocket_ = isPacketSocket(opened.number());
        descriptor_ = std::move(opened);
        if (watch()) {
            state_ = State::Open;
            return VEXA_STATUS_SUCCESS;
        }
        state_ = State::Closing;
        opened = std::exchange(descriptor_, FileDescriptor());
    }
    closeBackend(options, std::move(opened));
    return VEXA_STATUS_NO_RESOURCES;
}

// With the state Opening, hence alone.
vexa_status vexa_device::openBackend(std::uint32_t options, FileDescriptor& descriptor) noexcept {
    int number = -1;
    const vexa_status status = backend_->open(options, number);
    if (status != VEXA_STATUS_SUCCESS) return status;
    descriptor = FileDescriptor(number);
    if (descriptor && setNonBlocking(descriptor.number())) return VEXA_STATUS_SUCCESS;
    descriptor = FileDescriptor();
    backend_->close(options);
    return VEXA_STATUS_IO_ERROR;
}

vexa_status vexa_device::close(std::uint32_t options) noexcept {
    FileDescriptor open;
    {
        const MutexLock lock(mutex_);
        if (state_ != State::Open) return VEXA_STATUS_NOT_OPEN;
        state_ = State::Closing;
        unwatch();
        open = std::exchange(descriptor_, FileDescriptor());
    }
    closeBackend(options, std::move(open));
    return VEXA_STATUS_SUCCESS;
}

// With the state Closing, hence alone.
void vexa_device::closeBackend(std::uint32_t options, FileDescriptor descriptor) noexcept {
    descriptor = FileDescriptor();
    backend_->close(options);
    const MutexLock lock(mutex_);
    state_ = State::Closed;
}

vexa_status vexa_device::getReport(vexa_report_type type, std::uint32_t reportId,
                                   std::uint8_t* buffer, std::size_t* length) noexcept {
    if (!length || (!buffer && *length > 0)) return VEXA_STATUS_BAD_ARGUMENT;
    const std::size_t room = std::exchange(*length, 0);
    if (!present_) return VEXA_STATUS_GONE;
    std::size_t written = room;
    const vexa_status status = backend_->getReport(type, reportId, buffer, written);
    if (status == VEXA_STATUS_SUCCESS) *length = std::min(written, room);
    return status;
}

vexa_value* vexa_device::copyProperty(const vexa_value* key) noexcept {
    return key && present_ ? backend_->copyProperty(key) : nullptr;
}

bool vexa_device::setProperty(const vexa_value* key, const vexa_value* value) noexcept {
    return key && present_ && backend_->setProperty(key, value);
}

void vexa_device::setInputReportCallback(std::uint8_t* buffer, std::size_t length,
                                         vexa_input_report_callback callback,
                                         void* context) noexcept {
    const MutexLock lock(mutex_);
    target_ = {
        .buffer = buffer, .length = buffer ? length : 0, .callback = callback, .context = context};
    if (!callback) {
        unwatch();
    } else {
        // Without memory the reports wait until the next occasion.
        static_cast<void>(watch());
    }
}

vexa_status vexa_device::schedule(vexa_run_loop* loop, const char* mode) noexcept {
    if (!loop || !mode) return VEXA_STATUS_BAD_ARGUMENT;
    const MutexLock lock(mutex_);
    if (loop->hasEnded() || (loop_ && !loop_->hasEnded())) return VEXA_STATUS_BAD_ARGUMENT;
    leaveLoop();
    mode_ = loop->mode(mode);
    if (!mode_) return VEXA_STATUS_NO_RESOURCES;
    loop->retain();
    loop_ = loop;
    if (watch()) return VEXA_STATUS_SUCCESS;
    leaveLoop();
    return VEXA_STATUS_NO_RESOURCES;
}

void vexa_device::unschedule(vexa_run_loop* loop, const char* mode) noexcept {
    const MutexLock lock(mutex_);
    if (loop_ && loop_ == loop && mode_ == loop->mode(mode)) leaveLoop();
}

// Reports are watched for while there is somewhere to take them from, to serve them, to put them,
// and somebody to tell. True when nothing is missing that should be there.
bool vexa_device::watch() noexcept {
    if (watch_ != 0 || !descriptor_ || !loop_ || !target_.callback || !present_) return true;
    watch_ = loop_->watch(*mode_, *this, descriptor_.number());
    return watch_ != 0;
}

void vexa_device::unwatch() noexcept {
    if (watch_ == 0) return;
    loop_->unwatch(*mode_, std::exchange(watch_, 0), descriptor_.number());
}

void vexa_device::leaveLoop() noexcept {
    if (!loop_) return;
    unwatch();
    mode_ = nullptr;
    std::exchange(loop_, nullptr)->release();
}

bool vexa_device::serve(std::uint64_t watch, std::uint32_t events) noexcept {
    Target target;
    std::size_t length = 0;
    std::uint64_t timestamp = 0;
    {
        const MutexLock lock(mutex_);
        // Closed or unscheduled since the loop looked; it may even be watched anew.
        if (watch != watch_) return false;
        const std::optional<std::size_t> report = read(events);
        if (!report) return false;
        timestamp = vexa_clock_now();
        length = *report;
        target = target_;
    }
    backend_->reportArrived(target.buffer, length);
    target.callback(target.context, VEXA_STATUS_SUCCESS, this, VEXA_REPORT_INPUT,
                    length > 0 ? target.buffer[0] : 0U, target.buffer, length, timestamp);
    backend_->reportHandled();
    return true;
}

std::optional<std::size_t> vexa_device::read(std::uint32_t events) noexcept {
    // A read with no room at all would not even take the report out.
    std::uint8_t noRoom = 0;
    std::uint8_t* const buffer = target_.length > 0 ? target_.buffer : &noRoom;
    const std::size_t room = std::max<std::size_t>(target_.length, 1);

    const bool hungUp = (events & (EPOLLHUP | EPOLLRDHUP | EPOLLERR)) != 0;
    bool isEnd = false;
    const ssize_t count = hungUp && isPacketSocket_
                              ? readAfterHangUp(descriptor_.number(), buffer, room, isEnd)
                              : readOnce(descriptor_.number(), buffer, room);
    const bool nothingYet = count < 0 && (errno == EAGAIN || errno == EWOULDBLOCK);
    if (nothingYet && !hungUp) return std::nullopt;
    if (count < 0 || isEnd || (count == 0 && hungUp && !isPacketSocket_)) {
        present_ = false;
        unwatch();
        return std::nullopt;
    }
    return std::min(static_cast<std::size_t>(count), target_.length);
}

extern "C" {

vexa_device* vexa_device_create(uint32_t service) noexcept {
    auto backend = Vexa::Library::registeredBackend(service);
    return backend ? new (std::nothrow) vexa_device(std::move(backend)) : nullptr;
}

vexa_device* vexa_device_retain(vexa_device* device) noexcept {
    if (device) device->retain();
    return device;
}

void vexa_device_release(vexa_device* device) noexcept {
    if (device) device->release();
}

vexa_status vexa_device_open(vexa_device* device, uint32_t options) noexcept {
    return device->open(options);
}

vexa_status vexa_device_close(vexa_device* device, uint32_t options) noexcept {
    return device->close(options);
}

vexa_status vexa_device_get_report(vexa_device* device, vexa_report_type type, uint32_t report_id,
                                   uint8_t* buffer, size_t* length) noexcept {
    return device->getReport(type, report_id, buffer, length);
}

vexa_value* vexa_device_copy_property(vexa_device* device, const vexa_value* key) noexcept {
    return device->copyProperty(key);
}

bool vexa_device_set_property(vexa_device* device, const vexa_value* key,
                              const vexa_value* value) noexcept {
    return device->setProperty(key, value);
}

void vexa_device_set_input_report_callback(vexa_device* device, uint8_t* buffer, size_t length,
                                           vexa_input_report_callback callback,
                                           void* context) noexcept {
    device->setInputReportCallback(buffer, length, callback, context);
}

vexa_status vexa_device_schedule(vexa_device* device, vexa_run_loop* loop,
                                 const char* mode) noexcept {
    return device->schedule(loop, mode);
}

void vexa_device_unschedule(vexa_device* device, vexa_run_loop* loop, const char* mode) noexcept {
    device->unschedule(loop, mode);
}

bool vexa_device_is_present(const vexa_device* device) noexcept {
    return device->isPresent();
}

}  // extern "C"
