#include "platform/linux/dispatch/deputy.h"

#include <pthread.h>

#include <algorithm>
#include <chrono>

#include "platform/linux/dispatch/detached_thread.h"
#include "platform/linux/dispatch/futex.h"
#include "platform/linux/dispatch/pool.h"

namespace dispatch::detail {
namespace {

// Longest time that work waits behind a block that takes long, about two ticks.
constexpr auto kTick = std::chrono::milliseconds(4);
constexpr unsigned kMostAtOnce = 16;

}  // namespace

std::atomic<std::uint32_t> deputy::watching_{0};
std::atomic<bool> deputy::made_{false};

void deputy::start() noexcept {
    if (watching_.exchange(1, std::memory_order_acq_rel))
        return;
    if (made_.exchange(true)) {
        futex_wake(watching_, 1);
        return;
    }
    if (start_detached(&deputy::main, nullptr) != 0) {
        made_.store(false);
        watching_.store(0, std::memory_order_release);  // the next call tries again
    }
}

void* deputy::main(void*) noexcept {
    ::pthread_setname_np(::pthread_self(), "plr-deputy");
    for (;;) {
        observe();
        watching_.store(0, std::memory_order_seq_cst);
        // Who called watch() before the store has published his reason before.
        const pool::progress seen = pool::shared().look();
        if (seen.waiting || !seen.poller)
            watching_.store(1, std::memory_order_relaxed);
        while (!watching_.load(std::memory_order_acquire))
            futex_wait(watching_, 0);
    }
    return nullptr;
}

// Returns when the pool has been quiet for a tick.
void deputy::observe() noexcept {
    std::atomic<std::uint32_t> never{0};
    pool& watched = pool::shared();
    pool::progress last = watched.look();
    for (unsigned reinforcements = 1;;) {
        futex_wait(never, 0, time::after(kTick));
        const pool::progress seen = watched.look();
        const bool moved = seen.taken != last.taken || seen.polled != last.polled;
        last = seen;
        if (!seen.waiting)
            watched.relax();
        if (moved && !watched.is_distressed()) {
            reinforcements = 1;
            continue;
        }
        if (!seen.waiting && seen.poller)
            return;
        if (!seen.waiting || (seen.sleeping > 0 && !watched.is_distressed())) {
            watched.reinforce();  // takes the work, or becomes the poller
            continue;
        }
        // All workers are at it. When they compute, more of them would not help.
        if (watched.unstuck_workers() >= watched.processors())
            continue;
        watched.distress();
        for (unsigned i = 0; i < reinforcements && watched.reinforce(); ++i) {
        }
        reinforcements = std::min(2 * reinforcements, kMostAtOnce);
    }
}

}  // namespace dispatch::detail
