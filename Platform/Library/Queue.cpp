#include "Platform/Library/EventBase.h"
#include "Platform/Library/FileDescriptor.h"
#include "Platform/Library/LiveObjects.h"
#include "Platform/SignalsBlocked.h"

#include <vexa/queue.h>

#include <event2/event.h>
#include <pthread.h>
#include <semaphore.h>
#include <sys/eventfd.h>
#include <unistd.h>
#include <array>
#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

namespace {

using Vexa::Library::Counted;
using Vexa::Library::Event;
using Vexa::Library::EventBase;
using Vexa::Library::FileDescriptor;

// The queue whose thread this is.
constinit thread_local const vexa_queue* current = nullptr;

}  // namespace

/// The queue's thread waits in libevent for a wake. Whoever submits pushes its task on a stack,
/// without a lock that a slower thread could hold; the thread takes the whole stack and turns it
/// over. Each push wakes it; the wake is an edge, so nothing has to be read to be woken again.
struct vexa_queue final : private Counted<VEXA_OBJECT_QUEUE> {
public:
    static vexa_queue* create(const char* label) noexcept {
        std::unique_ptr<vexa_queue> queue(new (std::nothrow) vexa_queue);
        if (!queue || !queue->start(label)) return nullptr;
        return queue.release();
    }

    void retain() noexcept { references_.fetch_add(1, std::memory_order_relaxed); }

    void release() noexcept {
        if (references_.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
        if (isCurrent()) {
            // Seen once the task that we are in has returned.
            orphaned_ = true;
            static_cast<void>(pthread_detach(thread_));
            return;
        }
        push(end_);
        static_cast<void>(pthread_join(thread_, nullptr));
        delete this;
    }

    bool submit(vexa_task task, void* context) noexcept {
        auto* const node = new (std::nothrow) Node{.task = task, .context = context, .owned = true};
        if (!node) return false;
        push(*node);
        return true;
    }

    void drain() noexcept {
        if (isCurrent()) return;
        sem_t done;
        static_cast<void>(::sem_init(&done, 0, 0));
        Node node{.task = [](void* context) { ::sem_post(static_cast<sem_t*>(context)); },
                  .context = &done};
        push(node);
        while (::sem_wait(&done) != 0 && errno == EINTR) {
        }
        static_cast<void>(::sem_destroy(&done));
    }

    [[nodiscard]] bool isCurrent() const noexcept { return current == this; }

private:
    struct Node {
        vexa_task task = nullptr;
        void* context = nullptr;
        bool owned = false;
        Node* next = nullptr;
    };

    friend std::default_delete<vexa_queue>;

    vexa_queue() = default;
    ~vexa_queue() = default;

    // False: no memory, no descriptors, no thread.
    bool start(const char* label) noexcept {
        wake_ = FileDescriptor(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
        if (!wake_ || !base_) return false;
        woken_.reset(event_new(
            base_.get(), wake_.number(), EV_READ | EV_ET | EV_PERSIST,
            [](evutil_socket_t, short, void* queue) { static_cast<vexa_queue*>(queue)->serve(); },
            this));
        if (!woken_ || event_add(woken_.get(), nullptr) != 0) return false;

        if (label) std::strncpy(name_.data(), label, name_.size() - 1);
        const Vexa::SignalsBlocked blocked;
        const auto body = [](void* queue) -> void* {
            static_cast<vexa_queue*>(queue)->work();
            return nullptr;
        };
        return pthread_create(&thread_, nullptr, body, this) == 0;
    }

    void push(Node& node) noexcept {
        Node* older = newest_.load(std::memory_order_relaxed);
        do {
            node.next = older;
        } while (!newest_.compare_exchange_weak(older, &node, std::memory_order_release,
                                                std::memory_order_relaxed));
        // The node may have run and be gone by now; the queue is not: whoever pushes holds it. Not
        // only who found the stack empty wakes the thread: that one may be slow to come here.
        const std::uint64_t one = 1;
        static_cast<void>(::write(wake_.number(), &one, sizeof one) == sizeof one);
    }

    void work() noexcept {
        current = this;
        if (name_[0] != '\0') {
            static_cast<void>(pthread_setname_np(pthread_self(), name_.data()));
        }
        static_cast<void>(event_base_loop(base_.get(), 0));
        if (orphaned_) delete this;
    }

    // From within `work`, at each wake.
    void serve() noexcept {
        bool isOver = false;
        do {
            Node* task = takeInOrder();
            // Only an orphan takes again and finds nothing: nobody is left who could submit.
            isOver = orphaned_ && !task;
            while (task && !isOver) {
                isOver = task == &end_;
                Node* const next = task->next;
                if (!isOver) runOnce(*task);
                task = next;
            }
        } while (orphaned_ && !isOver);
        if (isOver) static_cast<void>(event_base_loopbreak(base_.get()));
    }

    Node* takeInOrder() noexcept {
        Node* newest = newest_.exchange(nullptr, std::memory_order_acquire);
        Node* oldest = nullptr;
        while (newest) {
            Node* const older = newest->next;
            newest->next = oldest;
            oldest = newest;
            newest = older;
        }
        return oldest;
    }

    // A node that is not owned lies on the stack of a thread that goes on when it has run.
    static void runOnce(Node& node) noexcept {
        const Node task = node;
        if (task.owned) delete &node;
        task.task(task.context);
    }

    std::atomic<std::uint32_t> references_{1};
    std::atomic<Node*> newest_{nullptr};
    FileDescriptor wake_;
    EventBase base_{Vexa::Library::makeEventBase()};
    Event woken_;
    pthread_t thread_{};
    std::array<char, 16> name_{};
    Node end_;
    bool orphaned_ = false;  // the queue's own thread only
};

extern "C" {

vexa_queue* vexa_queue_create(const char* label) noexcept {
    return vexa_queue::create(label);
}

vexa_queue* vexa_queue_retain(vexa_queue* queue) noexcept {
    if (queue) queue->retain();
    return queue;
}

void vexa_queue_release(vexa_queue* queue) noexcept {
    if (queue) queue->release();
}

bool vexa_queue_submit(vexa_queue* queue, vexa_task task, void* context) noexcept {
    return queue->submit(task, context);
}

void vexa_queue_drain(vexa_queue* queue) noexcept {
    queue->drain();
}

bool vexa_queue_is_current(const vexa_queue* queue) noexcept {
    return queue && queue->isCurrent();
}

}  // extern "C"
