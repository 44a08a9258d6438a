// Who else works when workers block, and what all of them are at.
#include <unistd.h>

#include <algorithm>
#include <cstdio>

#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_cells.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch::detail {

bool pool::reinforce() noexcept {
    const bool any = has_waiting_work() || !is_distressed();
    return (sleeping_.load(std::memory_order_seq_cst) > 0 && wake_one(any)) || add_worker();
}

pool::progress pool::look() noexcept {
    progress seen{};
    seen.taken = taken_.load(std::memory_order_relaxed);
    seen.polled = polled_.load(std::memory_order_relaxed);
    seen.waiting = has_waiting_work() || has_deferred_work();
    scoped_lock guard(idle_lock_);
    seen.sleeping = static_cast<unsigned>(sleepers_.size());
    seen.poller = poller_;
    return seen;
}

void pool::look_at_threads(std::vector<view>& seen) noexcept {
    scoped_lock guard(all_lock_);
    scoped_lock idle(idle_lock_);
    const auto look = [&](pid_t thread, const activity& doing, view::role as) {
        const std::uint64_t steps = doing.steps.load(std::memory_order_relaxed);
        seen.push_back({thread, as, doing.queue.load(std::memory_order_relaxed), steps,
                        doing.since.load(std::memory_order_relaxed)});
    };
    for (const worker* each : all_)
        look(each->thread, *each->doing, each->polling ? view::role::poller : view::role::worker);
    for (const server& each : servers())
        look(each.thread, *each.doing, view::role::server);
}

// ---- Threads that serve pumps ----------------------------------------------------------------

void pool::add_server() noexcept {
    scoped_lock guard(all_lock_);
    if (server_count_ < servers_.size())
        servers_[server_count_++] = {::gettid(), &activity::of_this_thread()};
}

template <class Predicate>
void pool::drop_servers(Predicate which) noexcept {
    const auto all = servers();
    server_count_ =
        static_cast<std::size_t>(std::remove_if(all.begin(), all.end(), which) - all.begin());
}

void pool::remove_server() noexcept {
    scoped_lock guard(all_lock_);
    drop_servers([](const server& each) { return each.doing == &activity::of_this_thread(); });
}

void pool::keep_only_this_server() noexcept {
    drop_servers([](const server& each) { return each.doing != &activity::of_this_thread(); });
    for (server& each : servers())
        each.thread = ::gettid();
}

// ---- What workers are at ---------------------------------------------------------------------

bool pool::is_runnable(const worker& one) noexcept {
    char path[64];
    std::snprintf(path, sizeof path, "/proc/self/task/%d/stat", one.thread);
    char state = '?';
    if (std::FILE* file = std::fopen(path, "re")) {
        if (std::fscanf(file, "%*d (%*[^)]) %c", &state) != 1)
            state = '?';
        std::fclose(file);
    }
    return state == 'R';
}

unsigned pool::runnable_workers() noexcept {
    scoped_lock guard(all_lock_);
    return static_cast<unsigned>(std::count_if(
        all_.begin(), all_.end(), [](const worker* each) { return is_runnable(*each); }));
}

unsigned pool::unstuck_workers() noexcept {
    scoped_lock guard(all_lock_);
    return static_cast<unsigned>(std::count_if(all_.begin(), all_.end(), [](worker* each) {
        const std::uint64_t step = each->doing->steps.load(std::memory_order_relaxed);
        const bool idle = !each->doing->queue.load(std::memory_order_relaxed);
        if (idle || each->blocked_at == step)
            return false;
        if (is_runnable(*each))
            return true;
        each->blocked_at = step;
        return false;
    }));
}

// The queues of workers that are stuck are not quick; a reserved worker that is stuck
// makes place for another.
void pool::distress() noexcept {
    std::vector<const queue_core*> slow;
    {
        scoped_lock guard(all_lock_);
        scoped_lock taking(take_lock_);
        distressed_.store(true, std::memory_order_relaxed);
        slow.reserve(all_.size());
        for (worker* each : all_) {
            const std::uint64_t step = each->doing->steps.load(std::memory_order_relaxed);
            if (each->blocked_at != step || each->slow_at == step)
                continue;
            each->slow_at = step;
            slow.push_back(each->doing->queue.load(std::memory_order_relaxed));
            if (each->reserved.exchange(false, std::memory_order_relaxed))
                --reserved_;
        }
    }
    for (const queue_core* each : slow)
        queue_cells::if_live(each, [](queue_core& found) { found.was_slow(); });
}

void pool::relax() noexcept {
    if (!is_distressed())
        return;
    scoped_lock guard(all_lock_);
    scoped_lock taking(take_lock_);
    if (has_waiting_work() || has_deferred_work())
        return;
    distressed_.store(false, std::memory_order_relaxed);
    reserved_ = 0;
    for (worker* each : all_)
        each->reserved.store(false, std::memory_order_relaxed);
}

// A worker that was woken is runnable from then on, though it may still be listed as
// asleep; one that did something in between the two looks has changed their counts.
bool pool::is_quiet() noexcept {
    const progress before = look();
    const unsigned resting = resting_.load(std::memory_order_seq_cst);
    if (before.waiting || searching_.load(std::memory_order_seq_cst) > 0 ||
        before.sleeping + resting != workers_.load(std::memory_order_seq_cst))
        return false;
    return runnable_workers() == 0 && look() == before;
}

}  // namespace dispatch::detail
