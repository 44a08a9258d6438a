#include "dispatch/queue.h"

#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"
#include "plr/base/assert.h"
#include "plr/base/report.h"

namespace dispatch {
namespace detail {
namespace {

// One pending queue::after(): first a timer, then work on the queue.
struct delayed final : timer_entry, embedded_item {
    delayed(queue_core* on, block<void()> what) noexcept
        : timer_entry(&delayed::fire),
          embedded_item(&delayed::call),
          target(queue::from_raw(on)),
          work(std::move(what)) {}

    static void fire(timer_entry* entry, std::uint64_t) noexcept {
        auto* self = static_cast<delayed*>(entry);
        submit(self->target.get(), self);
    }
    static void call(embedded_item* item) noexcept {
        const std::unique_ptr<delayed> self(static_cast<delayed*>(item));
        self->work();
    }

    const queue target;
    const block<void()> work;
};

}  // namespace

void retain(queue_core* core) noexcept {
    core->retain();
}
void release(queue_core* core) noexcept {
    core->release();
}

void submit(queue_core* core, closure_item* work) noexcept {
    if (core->is_special()) [[unlikely]]
        core->submit_specially(work);
    else
        core->push(work);
}

void submit_and_wait(queue_core* core, void (*function)(void*) noexcept, void* context) {
    core->run_sync(function, context);
}

}  // namespace detail

using detail::queue_core;

queue queue::create(std::string_view label, const queue& target) {
    return adopt(queue_core::create(label, target.get()));
}

queue queue::global(priority level) noexcept {
    return from_raw(queue_core::global(level));
}

void queue::after(time when, block<void()> work) const {
    if (when.is_forever())
        return;
    if (when.nanoseconds() <= time::now(when.on()).nanoseconds()) {
        async(std::move(work));
        return;
    }
    auto* pending = new detail::delayed(core_, std::move(work));
    detail::timer_queue& timers = detail::poller::shared().timers();
    {
        detail::scoped_lock guard(timers.lock());
        timers.arm(*pending, when, 0);
    }
    detail::pool::shared().ensure_poller();
}

void queue::suspend() const noexcept {
    core_->suspend();
}
void queue::resume() const noexcept {
    core_->resume();
}
const char* queue::label() const noexcept {
    return core_->label();
}

void queue::set_specific(const void* key, void* value, void (*destructor)(void*)) const {
    core_->set_specific(key, value, destructor);
}
void* queue::get_specific(const void* key) const noexcept {
    return core_->get_specific(key);
}

bool queue::is_current() const noexcept {
    return core_->is_current();
}

void queue::assert_current() const noexcept {
    if (is_current())
        return;
    plr::report("dispatch: not on queue '%s'", label());
    PLR_ASSERT(false, "called on the wrong queue");
}

void queue::assert_not_current() const noexcept {
    if (!is_current())
        return;
    plr::report("dispatch: on queue '%s'", label());
    PLR_ASSERT(false, "called on the wrong queue");
}

void* current_specific(const void* key) noexcept {
    const detail::frame* innermost = detail::frame::top();
    return innermost ? innermost->queue->get_specific(key) : nullptr;
}

}  // namespace dispatch
