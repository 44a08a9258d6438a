#include "platform/linux/dispatch/source_core.h"

#include <algorithm>
#include <utility>

namespace dispatch::detail {
namespace {

constexpr std::uint64_t kMostEvents = std::uint64_t{1} << 55;

}  // namespace

std::uint64_t source_core::change(std::uint64_t set, std::uint64_t clear) noexcept {
    std::uint64_t seen = state_.load(std::memory_order_acquire);
    if (!(seen & kSubmitted)) {
        state_.store((seen | set) & ~clear, std::memory_order_release);
        return seen;
    }
    while (!state_.compare_exchange_weak(seen, (seen | set) & ~clear, std::memory_order_acq_rel)) {
    }
    return seen;
}

bool source_core::look(std::uint64_t set) noexcept {
    std::uint64_t seen = state_.load(std::memory_order_acquire);
    for (;;) {
        if (!(seen & kSubmitted)) {
            state_.store(seen | set | kSubmitted, std::memory_order_release);
            return true;
        }
        if (state_.compare_exchange_weak(seen, seen | set | kAgain, std::memory_order_acq_rel))
            return false;
    }
}

// Events that wait already have somebody who sees to them: the item, or the
// resume() that is to come.
void source_core::add_events(std::uint64_t count) noexcept {
    std::uint64_t seen = state_.load(std::memory_order_acquire);
    for (;;) {
        const std::uint64_t waiting = seen / kEvent;
        const std::uint64_t added = std::min(count, kMostEvents - waiting) * kEvent;
        const bool idle = waiting == 0 && !(seen & kSubmitted);
        const std::uint64_t wanted = (seen + added) | (idle ? kSubmitted : 0);
        if (!(seen & kSubmitted)) {
            state_.store(wanted, std::memory_order_release);
            if (idle)
                submit_work();
            return;
        }
        if (state_.compare_exchange_weak(seen, wanted, std::memory_order_acq_rel))
            return;
    }
}

void source_core::suspend() noexcept {
    scoped_lock guard(lock_);
    ++suspensions_;
    change(kSuspended, 0);
}

void source_core::resume() {
    bool submits = false;
    {
        scoped_lock guard(lock_);
        PLR_ASSERT(suspensions_ != 0, "more resumes than suspends");
        if (--suspensions_ != 0)
            return;
        if (is(kArmed | kCancelled)) {
            if (change(0, kSuspended) / kEvent != 0)
                submits = look(0);
        } else {
            change(kArmed, kSuspended);
            arm();
        }
    }
    if (submits)
        submit_work();
}

void source_core::cancel() noexcept {
    bool submits = false;
    {
        scoped_lock guard(lock_);
        if (is(kCancelled))
            return;
        submits = look(kCancelled);
        if (is(kArmed))
            disarm();
    }
    if (submits)
        submit_work();
}

void source_core::release() noexcept {
    // The only handle has no rival.
    if (handles_.load(std::memory_order_acquire) != 1 &&
        handles_.fetch_sub(1, std::memory_order_acq_rel) != 1)
        return;
    bool submits = false;
    bool over = false;
    {
        scoped_lock guard(lock_);
        const std::uint64_t seen = state_.load(std::memory_order_acquire);
        if (seen & kFinished) {
            over = !(change(kReleased, 0) & (kSubmitted | kHeld));
        } else {
            if ((seen & kArmed) && !(seen & kCancelled))
                disarm();
            submits = look(kReleased | kCancelled);
        }
    }
    if (submits)
        submit_work();
    if (over)
        delete this;
}

void source_core::let_go() noexcept {
    bool over = false;
    {
        scoped_lock guard(lock_);
        const std::uint64_t before = change(0, kHeld);
        over = (before & kReleased) && (before & kFinished) && !(before & kSubmitted);
    }
    if (over)
        delete this;
}

// ---- On the queue ---------------------------------------------------------------------

void source_core::run() noexcept {
    if (!is(kCancelled | kSuspended))
        handle();
    bool finished = is(kFinished);
    if (is(kCancelled) && !finished) {
        finish();
        finished = true;
    }
    leave(finished);
}

void source_core::handle() noexcept {
    data_ = state_.fetch_and(kEvent - 1, std::memory_order_acq_rel) / kEvent;
    if (data_ == 0)
        return;
    if (on_event_)
        on_event_();
    if (!is_cancelled())
        handled();
}

void source_core::finish() noexcept {
    if (is(kArmed))
        ended();
    const block<void()> last = std::move(on_cancel_);
    if (last)
        last();
    on_event_ = nullptr;
}

// Clears kSubmitted, or submits again for what came meanwhile.
void source_core::leave(bool finished) noexcept {
    std::uint64_t seen = state_.load(std::memory_order_acquire);
    for (;;) {
        if (finished && (seen & (kReleased | kHeld)) == kReleased) {
            delete this;
            return;
        }
        const bool events = seen / kEvent != 0 && !(seen & kSuspended);
        const bool more = !finished && ((seen & kAgain) || events);
        const std::uint64_t wanted =
            (seen | (finished ? kFinished : 0)) & ~(more ? kAgain : kAgain | kSubmitted);
        if (!state_.compare_exchange_weak(seen, wanted, std::memory_order_acq_rel))
            continue;
        if (more)
            submit_work();
        return;
    }
}

}  // namespace dispatch::detail
