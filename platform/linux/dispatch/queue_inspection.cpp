// Looking into a queue: its statistics, and what waits on it.
#include <linux/membarrier.h>
#include <sched.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <memory>

#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch::detail {
namespace {

// A barrier on every thread of this process. False where the kernel has none.
bool barrier_everywhere() noexcept {
    const auto command = [](int what) { return ::syscall(SYS_membarrier, what, 0, 0) == 0; };
    if (command(MEMBARRIER_CMD_REGISTER_PRIVATE_EXPEDITED) &&
        command(MEMBARRIER_CMD_PRIVATE_EXPEDITED))
        return true;
    return command(MEMBARRIER_CMD_GLOBAL);
}

}  // namespace

// ---- Statistics -----------------------------------------------------------------------

void queue_core::enable_statistics(bool on) {
    if (!on) {
        kind_.fetch_and(static_cast<std::uint8_t>(~kMeasured), std::memory_order_relaxed);
        return;
    }
    if (!statistics()) {
        auto made = std::make_unique<latencies>();
        latencies* expected = nullptr;
        if (statistics_.compare_exchange_strong(expected, made.get(), std::memory_order_acq_rel))
            static_cast<void>(made.release());
    }
    kind_.fetch_or(kMeasured, std::memory_order_release);
}

template <class Item>
void queue_core::submit_stamped(Item* work) noexcept {
    latencies* const into = has(kMeasured) ? statistics() : nullptr;
    item* const submitted = into ? stamped(*into, work) : work;
    if (is_global())
        pool::shared().submit(submitted, level());
    else
        push(submitted);
}

void queue_core::submit_specially(closure_item* work) noexcept {
    submit_stamped(work);
}
void queue_core::submit_specially(embedded_item* work) noexcept {
    submit_stamped(work);
}

// ---- What waits --------------------------------------------------------------------------

void queue_core::wait_for_walk() noexcept {
    while (walked_.load(std::memory_order_acquire))
        ::sched_yield();
}

queue_core::waiting queue_core::count_waiting() noexcept {
    waiting found;
    if (!is_busy())
        return found;
    walked_.store(true, std::memory_order_seq_cst);
    if (barrier_everywhere())
        found = walk();
    else
        found.is_known = false;
    walked_.store(false, std::memory_order_release);
    return found;
}

// The first item that waits: null when none does, or when the list is just being
// changed, for which `settled` is false.
item* queue_core::first_waiting(bool& settled) const noexcept {
    settled = true;
    const item* const last = tail_.load(std::memory_order_acquire);
    const item* const running = running_.load(std::memory_order_acquire);
    if (!last || last == running)
        return nullptr;
    const bool runs_closure = running && running != &stub_;
    item* first = runs_closure ? nullptr : head_.load(std::memory_order_acquire);
    if (!first)
        first = (runs_closure ? running : &stub_)->next.load(std::memory_order_acquire);
    settled = first != nullptr;
    return first;
}

queue_core::waiting queue_core::walk() const noexcept {
    bool settled = false;
    const item* each = first_waiting(settled);
    while (!settled) {
        ::sched_yield();
        each = first_waiting(settled);
    }
    waiting found;
    found.oldest = each ? submission_of(each) : 0;
    // What comes meanwhile is counted as far as it is linked by then.
    const item* const last = tail_.load(std::memory_order_acquire);
    while (each) {
        ++found.count;
        each = each == last ? nullptr : each->next.load(std::memory_order_acquire);
    }
    return found;
}

}  // namespace dispatch::detail
