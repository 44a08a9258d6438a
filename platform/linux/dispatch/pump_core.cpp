#include "platform/linux/dispatch/pump_core.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "platform/linux/dispatch/activity.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch::detail {
namespace {

constexpr unsigned kBatch = 256;  // pieces of work until the event loop gets its turn

thread_local const char this_thread = 0;

struct announced_server {
    announced_server() noexcept { pool::shared().add_server(); }
    ~announced_server() { pool::shared().remove_server(); }
    announced_server(const announced_server&) = delete;
    announced_server& operator=(const announced_server&) = delete;
};

int make_descriptor() {
    const int made = ::eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
    if (made < 0)
        throw std::system_error(errno, std::generic_category(), "eventfd");
    return made;
}

// A sync() whose work runs on a pump's thread, as if it ran on the caller's.
struct handed final : embedded_item {
    handed(queue_core* entered, frame* callers_frames, void (*called)(void*) noexcept,
           void* argument) noexcept
        : embedded_item(&handed::call),
          queue(entered),
          callers(callers_frames),
          work(called),
          context(argument) {}

    static void call(embedded_item* item) noexcept {
        auto* self = static_cast<handed*>(item);
        {
            frame here(self->queue);
            frame* const outer = std::exchange(here.up, self->callers);
            self->work(self->context);
            here.up = outer;
        }
        self->done.grant();
    }

    queue_core* const queue;
    frame* const callers;
    void (*const work)(void*) noexcept;
    void* const context;
    waiter done;
};

}  // namespace

pump_core::pump_core() : descriptor_(make_descriptor()) {}
pump_core::~pump_core() {
    ::close(descriptor_);
}

bool pump_core::announce() noexcept {
    state expected = state::idle;
    if (!state_.compare_exchange_strong(expected, state::ready, std::memory_order_acq_rel))
        return false;
    wake();
    return true;
}

// Cleared before the state is looked at: what is announced in between makes the
// descriptor readable again.
bool pump_core::process(queue_core& served) noexcept {
    claim(served);
    std::uint64_t wakes;
    static_cast<void>(!::read(descriptor_, &wakes, sizeof wakes));
    state expected = state::ready;
    if (!state_.compare_exchange_strong(expected, state::idle, std::memory_order_acq_rel))
        return false;
    unsigned budget = kBatch;
    activity::of_this_thread().stamp();
    served.run_owned(budget);
    return has(state::ready);
}

void pump_core::run(queue_core& served) noexcept {
    claim(served);
    if (served.is_current())
        served.stop("run() from its own work");
    while (!stopped_.exchange(false, std::memory_order_acq_rel))
        if (!process(served))
            wait();
}

void pump_core::forked() noexcept {
    state expected = state::ready;
    state_.compare_exchange_strong(expected, state::idle, std::memory_order_relaxed);
    server_.store(nullptr, std::memory_order_relaxed);
    // The same number, but the child's own.
    const int own = ::eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
    if (own >= 0) {
        ::dup3(own, descriptor_, O_CLOEXEC);
        ::close(own);
    }
}

void pump_core::stop() noexcept {
    stopped_.store(true, std::memory_order_release);
    wake();
}

void pump_core::close(queue_core& served) noexcept {
    if (served.is_current())
        served.stop("the pump went in its own work");
    while (process(served)) {
    }
    if (state_.exchange(state::closed, std::memory_order_acq_rel) == state::ready)
        served.activate();
}

void pump_core::await(queue_core& served, waiter& done) noexcept {
    while (is_server() && !has(state::closed) && !done.is_granted())
        if (!process(served) && !done.is_granted())
            wait();
    done.wait();
}

void pump_core::claim(const queue_core& served) noexcept {
    const void* seen = nullptr;
    if (server_.compare_exchange_strong(seen, &this_thread, std::memory_order_acq_rel)) {
        static thread_local const announced_server here;
        static_cast<void>(&here);
    } else if (seen != &this_thread) {
        served.stop("served by a second thread");
    }
}

bool pump_core::is_server() const noexcept {
    return server_.load(std::memory_order_acquire) == &this_thread;
}

void pump_core::wake() const noexcept {
    const std::uint64_t one = 1;
    static_cast<void>(!::write(descriptor_, &one, sizeof one));
}

void pump_core::wait() const noexcept {
    pollfd readable{descriptor_, POLLIN, 0};
    ::poll(&readable, 1, -1);
}

// ---- sync() onto the pump ------------------------------------------------------------

void queue_core::hand_over(void (*function)(void*) noexcept, void* context) noexcept {
    queue_core* served = this;
    while (served->target_)
        served = served->target_;
    if (served->is_current())
        stop("sync() from its own work would wait for ever");
    handed work(this, frame::top(), function, context);
    push(&work);
    pump_->await(*served, work.done);
}

}  // namespace dispatch::detail
