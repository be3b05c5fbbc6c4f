#include "Host/HostSession.h"

#include "Host/HostFailure.h"
#include "Host/StatusText.h"

#include <pthread.h>
#include <sched.h>
#include <vexa/log.h>

#include <new>
#include <stdexcept>
#include <string>
#include <utility>

namespace VexaTouch::Host {
namespace {

constexpr const char* kQueueLabel = "vexa-events";
/// Just below the input thread's 63: taking reports comes before delivering their events.
constexpr int kQueuePriority = 62;

/// Otherwise an event waits for whatever keeps the processors busy, however soon it was made.
void askForRealTime() noexcept {
    sched_param parameter{};
    parameter.sched_priority = kQueuePriority;
    // Without the permission it stays as it is.
    static_cast<void>(pthread_setschedparam(pthread_self(), SCHED_RR, &parameter));
}

Vexa::SerialQueue eventsQueue(const std::string& file) {
    try {
        return Vexa::SerialQueue(kQueueLabel);
    } catch (const std::bad_alloc&) {
        throw HostFailure(file +
                          ": no thread or no descriptors (it takes four) for the events' queue");
    }
}

}  // namespace

HostSession::HostSession(const PluginLibrary& library, std::uint32_t service, EventSink sink,
                         const Vexa::PropertyValue& properties)
    : file_(library.file()),
      sink_(std::move(sink)),
      queue_(eventsQueue(file_)),
      plugin_(library),
      service_(plugin_.service()) {
    queue_.submit([] {
        askForRealTime();
        // Nor shall an event wait for who reads the log slowly, as long as the thread lives.
        vexa_log_set_thread_must_not_block(true);
    });
    if (const vexa_status status = plugin_.probe(properties, service, score_);
        status != VEXA_STATUS_SUCCESS) {
        fail("Probe", status);
    }
    if (const vexa_status status = plugin_.start(properties, service);
        status != VEXA_STATUS_SUCCESS) {
        fail("Start", status);
    }
    started_ = true;
    service_.setEventCallback(&deliver, this, nullptr);
}

HostSession::~HostSession() {
    release();
}

void HostSession::begin(std::uint32_t options) {
    if (scheduled_) {
        // A service that is scheduled twice runs two threads, of which only one can be ended.
        throw std::logic_error(file_ + ": begins again without having been halted");
    }
    service_.schedule(queue_.get());
    scheduled_ = true;
    options_ = options;
    open_ = service_.open(options);
    if (!open_) {
        halt();
        throw HostFailure(file_ + ": open failed: the service could not open its device");
    }
}

void HostSession::end() {
    if (const vexa_status status = release(); status != VEXA_STATUS_SUCCESS) {
        fail("Stop", status);
    }
}

void HostSession::deliver(void* target, void* /*refcon*/, void* /*sender*/, vexa_event* event,
                          std::uint32_t /*options*/) {
    static_cast<HostSession*>(target)->sink_(Vexa::HidEvent::share(event));
}

void HostSession::fail(std::string_view step, vexa_status status) const {
    throw HostFailure(file_ + ": " + std::string(step) + " failed: status " + statusText(status));
}

void HostSession::halt() {
    if (std::exchange(open_, false)) {
        service_.close(options_);
    }
    if (std::exchange(scheduled_, false)) {
        service_.unschedule(queue_.get());
        // What the service had handed over is delivered while there is somebody to take it.
        queue_.drain();
    }
}

vexa_status HostSession::release() noexcept {
    halt();
    const vexa_status status =
        std::exchange(started_, false) ? plugin_.stop() : VEXA_STATUS_SUCCESS;
    service_.reset();
    plugin_.reset();
    return status;
}

}  // namespace VexaTouch::Host
