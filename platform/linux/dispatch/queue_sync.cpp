#include <utility>

#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch::detail {

void waiter::wait() noexcept {
    for (unsigned spins = 0; spins < 100 && pool::shared().processors() > 1; ++spins) {
        if (is_granted())
            return;
        cpu_relax();
    }
    blocking_section blocked;
    const std::uint32_t asleep = pool::is_worker() ? kWorkerAsleep : kAsleep;
    std::uint32_t seen = kAwake;
    if (!state.compare_exchange_strong(seen, asleep, std::memory_order_acq_rel))
        return;
    if (asleep == kWorkerAsleep)
        pool::shared().rest(1);
    while (!is_granted())
        futex_wait(state, asleep);
}

void waiter::grant() noexcept {
    const std::uint32_t before = state.exchange(kGranted, std::memory_order_acq_rel);
    if (before == kAwake)
        return;
    if (before == kWorkerAsleep)
        pool::shared().rest(-1);
    futex_wake(state, 1);
}

// Takes an idle queue, suspended or not.
bool queue_core::try_lock() noexcept {
    item* expected = nullptr;
    if (!tail_.compare_exchange_strong(expected, &stub_, std::memory_order_acq_rel))
        return false;
    counted_ = false;
    begin_list_at(&stub_, nullptr);
    return true;
}

// Hot path when idle: one compare-exchange to enter and one to leave;
// bench/dispatch_cases.h.
void queue_core::run_sync(void (*function)(void*) noexcept, void* context) {
    if (has(kGlobal | kMeasured | kPumped)) [[unlikely]]
        run_sync_specially(function, context);
    else
        run_sync_here(function, context);
}

void queue_core::run_sync_specially(void (*function)(void*) noexcept, void* context) {
    if (has(kMeasured)) {
        measured_sync measured{*statistics(), function, context};
        run_sync_unmeasured(&measured_sync::run, &measured);
    } else {
        run_sync_unmeasured(function, context);
    }
}

void queue_core::run_sync_unmeasured(void (*function)(void*) noexcept, void* context) {
    if (pump_) {
        hand_over(function, context);
    } else if (is_global()) {
        const frame here(this);
        function(context);
    } else {
        run_sync_here(function, context);
    }
}

void queue_core::run_sync_here(void (*function)(void*) noexcept, void* context) {
    const frame here(this);
    lock_from_here();
    function(context);
    unlock_chain();
}

// Owns this queue and all its targets, none of them suspended, when it returns.
void queue_core::lock_from_here() noexcept {
    queue_core* level = this;
    while (level && level->try_lock())
        level = level->target_;
    if (level) [[unlikely]]
        level->wait_for_ownership();
    // `level` and its targets were looked at when they were handed over, the others
    // not since they are ours.
    for (queue_core* below = this; below != level;) {
        if (!below->is_suspended()) [[likely]] {
            below = below->target_;
            continue;
        }
        below->wait_for_resume();
        level = std::exchange(below, this);
    }
}

// Comes with the ownership of the targets.
void queue_core::wait_for_ownership() noexcept {
    // The innermost frame is the sync() that waits here. What one of our targets
    // runs keeps us from running.
    for (const queue_core* level = this; level; level = level->target_)
        for (const frame* held = frame::top()->up; held; held = held->up)
            if (level->is_target_of(held->queue))
                stop("sync() from its own work would wait for ever");
    waiter self;
    push(&self);
    self.wait();
}

// For the owner of a suspended queue and its targets: lets others have the
// targets, and is the first to run when the queue goes on.
void queue_core::wait_for_resume() noexcept {
    waiter self;
    attach(&self);
    count_ownership();
    if (target_)
        target_->unlock_chain();
    activate();
    self.wait();
}

void queue_core::unlock_chain() noexcept {
    for (queue_core* level = this; level;) {
        queue_core* above = level->target_;
        level->unlock();
        level = above;
    }
}

void queue_core::unlock() noexcept {
    const bool counted = counted_;  // not ours to read once the list is empty
    item* next = head_.load(std::memory_order_relaxed);
    if (!next)
        next = take_after_stub();
    if (!next) {
        if (counted)
            release_reference();
        return;
    }
    begin_list_at(&stub_, next);
    count_ownership();
    if (next->run == &waiter_tag && !target_ && !is_suspended()) {
        grant(next);
        return;
    }
    activate();
}

}  // namespace dispatch::detail
