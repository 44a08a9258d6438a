#include "platform/linux/dispatch/queue_core.h"

#include <sched.h>

#include <cstddef>
#include <utility>

#include "platform/linux/dispatch/activity.h"
#include "platform/linux/dispatch/pool.h"
#include "plr/base/assert.h"

namespace dispatch::detail {
namespace {

constexpr unsigned kBatch = 256;       // items a queue runs before others get their turn
constexpr unsigned kLingerAfter = 64;  // a drain that ran that many waits a moment for more
constexpr unsigned kLingerSpins = 16;
constexpr unsigned kLingerLooks = 4;
// Nodes are handed out in the order of their addresses: what was submitted soon after
// an item stands there, on this queue or on one that is drained soon.
constexpr std::ptrdiff_t kAhead = 8 * sizeof(closure_item);

// The producer of the successor is between its two stores.
item* wait_for_next(item* last) noexcept {
    for (unsigned spins = 1;; ++spins) {
        if (item* next = last->next.load(std::memory_order_acquire))
            return next;
        if (spins % 64 == 0)
            ::sched_yield();
        else
            cpu_relax();
    }
}

// A producer that keeps the queue busy is about to push again: going idle now
// would make it pay for waking us.
item* linger(item* last, unsigned ran) noexcept {
    if (ran < kLingerAfter || pool::shared().processors() == 1)
        return nullptr;
    // Seldom: each look takes the line from the producer.
    for (unsigned look = 0; look < kLingerLooks; ++look) {
        for (unsigned spins = 0; spins < kLingerSpins; ++spins)
            cpu_relax();
        if (item* next = last->next.load(std::memory_order_acquire))
            return next;
    }
    return nullptr;
}

}  // namespace

void queue_tag(item*) noexcept {}
void waiter_tag(item*) noexcept {}
void embedded_tag(item*) noexcept {}

bool frame::more_to_do() noexcept {
    for (const frame* each = top(); each; each = each->up)
        if (each->drains && each->queue->has_more())
            return true;
    return false;
}

bool queue_core::is_target_of(const queue_core* level) const noexcept {
    while (level && level != this)
        level = level->target_;
    return level != nullptr;
}

bool queue_core::is_current() const noexcept {
    for (const frame* held = frame::top(); held; held = held->up)
        if (is_target_of(held->queue))
            return true;
    return false;
}

void queue_core::was_slow() noexcept {
    for (queue_core* level = this; level; level = level->target_)
        level->reputation_.store(reputation::slow, std::memory_order_relaxed);
}

// ---- The list -----------------------------------------------------------------------

// Hot path: one exchange; bench/dispatch_cases.h.
void queue_core::push(item* work) noexcept {
    work->next.store(nullptr, std::memory_order_relaxed);
    item* previous = tail_.exchange(work, std::memory_order_acq_rel);
    if (previous) [[likely]] {
        previous->next.store(work, std::memory_order_release);
        return;
    }
    begin_list_at(nullptr, work);
    counted_ = true;
    references_.fetch_add(1, std::memory_order_relaxed);
    activate();
}

void queue_core::activate() noexcept {
    if (is_suspended() && park())
        return;
    if (target_)
        target_->push(&place_);
    else if (!pump_ || !pump_->announce())
        pool::shared().submit(&place_, priority_);
}

// Takes `first`, the next to run, off the list. Returns its successor, or null
// with the stub in its place.
item* queue_core::detach(item* first) noexcept {
    if (item* next = first->next.load(std::memory_order_acquire))
        return next;
    item* expected = first;
    if (tail_.compare_exchange_strong(expected, &stub_, std::memory_order_acq_rel))
        return nullptr;
    return wait_for_next(first);
}

// The reverse: `first` runs before everything that waits.
void queue_core::attach(item* first) noexcept {
    item* next = head_.load(std::memory_order_relaxed);
    if (!next) {
        item* expected = &stub_;
        if (tail_.compare_exchange_strong(expected, first, std::memory_order_acq_rel)) {
            begin_list_at(&stub_, first);
            return;
        }
        next = wait_for_next(&stub_);
        stub_.next.store(nullptr, std::memory_order_relaxed);
    }
    first->next.store(next, std::memory_order_relaxed);
    begin_list_at(&stub_, first);
}

// The item behind the stub; null after ownership was given up because there is
// none.
item* queue_core::take_after_stub() noexcept {
    item* next = stub_.next.load(std::memory_order_acquire);
    if (!next) {
        item* expected = &stub_;
        if (tail_.compare_exchange_strong(expected, nullptr, std::memory_order_acq_rel))
            return nullptr;
        next = wait_for_next(&stub_);
    }
    stub_.next.store(nullptr, std::memory_order_relaxed);
    return next;
}

void queue_core::count_ownership() noexcept {
    if (std::exchange(counted_, true))
        return;
    references_.fetch_add(1, std::memory_order_relaxed);
}

queue_core::outcome queue_core::drain(unsigned& budget) noexcept {
    const frame here(this, true);
    const working_on seen(this);
    const queue_core* const above = target_;  // beside tail_, which is the producers'
    item* work = head_.load(std::memory_order_relaxed);
    running_.store(work, std::memory_order_release);
    for (unsigned ran = 0;; ++ran) {
        if (is_suspended()) [[unlikely]] {
            put_back(work);
            if (park())
                return outcome::parked;
            running_.store(work, std::memory_order_release);
        }
        if (above && above->is_held_back()) [[unlikely]] {
            put_back(work);
            return outcome::more;
        }
        if (budget == 0) [[unlikely]] {
            if (pump_ || pool::shared().has_waiting_work()) {
                put_back(work);
                return outcome::more;
            }
            budget = kBatch;
            seen.here.stamp();
        }
        --budget;
        if (work->run == &waiter_tag) [[unlikely]] {
            grant(work);
            return outcome::handed;
        }
        seen.here.step();
        if (work->run == &queue_tag || work->run == &embedded_tag) {
            begin_list_at(&stub_, detach(work));
            let_walk();
            if (!run_nested(work, budget))
                return outcome::handed;
            item* const next = head_.load(std::memory_order_relaxed);
            work = next ? next : take_after_stub();
            if (!work)
                return outcome::idle;
            running_.store(work, std::memory_order_release);
            continue;
        }
        __builtin_prefetch(reinterpret_cast<const std::byte*>(work) + kAhead);
        work->run(work);
        item* next = work->next.load(std::memory_order_acquire);
        if (!next)
            next = linger(work, ran);
        if (!next) {
            next = leave(work);
            if (!next)
                return outcome::idle;
        }
        running_.store(next, std::memory_order_release);
        let_walk();
        recycle_item(static_cast<closure_item*>(work));
        work = next;
    }
}

// `last` has run and nothing follows it. Gives up the ownership and returns null,
// or returns what follows by now.
item* queue_core::leave(item* last) noexcept {
    for (;;) {
        begin_list_at(&stub_, nullptr);
        std::atomic_signal_fence(std::memory_order_seq_cst);
        if (!walked_.load(std::memory_order_acquire)) [[likely]]
            break;
        begin_list_at(last, nullptr);  // who counts must not wait for us
        wait_for_walk();
    }
    item* expected = last;
    if (!tail_.compare_exchange_strong(expected, nullptr, std::memory_order_acq_rel))
        return wait_for_next(last);
    recycle_item(static_cast<closure_item*>(last));
    return nullptr;
}

// Hands ownership to the waiter that is first in the list.
void queue_core::grant(item* first) noexcept {
    begin_list_at(&stub_, detach(first));
    let_walk();
    static_cast<waiter*>(first)->grant();
}

// Runs a detached item that is a queue or embedded. Returns false when a waiter
// inside took over the ownership.
bool queue_core::run_nested(item* work, unsigned& budget) noexcept {
    if (work->run == &embedded_tag) {
        auto* embedded = static_cast<embedded_item*>(work);
        embedded->function(embedded);
        return true;
    }
    return of(work)->run_owned(budget);
}

bool queue_core::run_owned(unsigned& budget) noexcept {
    switch (drain(budget)) {
        case outcome::idle:
            was_drained();
            release_reference();
            return true;
        case outcome::parked:
            return true;
        case outcome::more:
            activate();
            return true;
        case outcome::handed:
            return false;
    }
    __builtin_unreachable();
}

// ---- Suspension ------------------------------------------------------------------------

bool queue_core::is_held_back() const noexcept {
    for (const queue_core* level = this; level; level = level->target_)
        if (level->is_suspended())
            return true;
    return false;
}

bool queue_core::park() noexcept {
    std::uint32_t seen = suspension_.load(std::memory_order_acquire);
    while (seen >= kSuspension)
        if (suspension_.compare_exchange_weak(seen, seen | kParked, std::memory_order_acq_rel))
            return true;
    return false;
}

void queue_core::suspend() noexcept {
    PLR_ASSERT(!is_global(), "a global queue cannot be suspended");
    suspension_.fetch_add(kSuspension, std::memory_order_acq_rel);
}

void queue_core::resume() noexcept {
    const std::uint32_t before = suspension_.fetch_sub(kSuspension, std::memory_order_acq_rel);
    if (before < kSuspension)
        stop("more resumes than suspends");
    if (before != (kSuspension | kParked))
        return;
    // Nobody owns the queue while it is parked; another suspend() may have come.
    std::uint32_t expected = kParked;
    if (suspension_.compare_exchange_strong(expected, 0, std::memory_order_acq_rel))
        activate();
}

}  // namespace dispatch::detail
