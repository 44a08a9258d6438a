#pragma once

#include <atomic>
#include <cstdint>

#include "dispatch/time.h"

// What a thread runs, for whoever looks on: dump() and the watchdog. Written by
// its thread with plain stores, once for each piece of work.
namespace dispatch::detail {

class queue_core;

struct activity {
    // Whose work the thread runs, null for none. To look up only: the queue may be
    // gone when it is read.
    std::atomic<const queue_core*> queue{nullptr};
    std::atomic<std::uint64_t> steps{0};  // pieces of work begun
    // Monotonic nanoseconds: the present piece of work has begun after it. Read from
    // the clock where that costs nothing beside what else is done there.
    std::atomic<std::int64_t> since{0};

    static activity& of_this_thread() noexcept;

    void step() noexcept {
        steps.store(steps.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
    }
    void stamp() noexcept { since.store(time::now().nanoseconds(), std::memory_order_relaxed); }
};

namespace activities {
[[gnu::tls_model("initial-exec")]] inline constinit thread_local activity local{};
}

inline activity& activity::of_this_thread() noexcept {
    return activities::local;
}

// The thread runs work of `entered` while one of these lives.
class working_on {
  public:
    explicit working_on(const queue_core* entered) noexcept
        : here(activity::of_this_thread()), outer_(here.queue.load(std::memory_order_relaxed)) {
        here.queue.store(entered, std::memory_order_relaxed);
    }
    ~working_on() { here.queue.store(outer_, std::memory_order_relaxed); }
    working_on(const working_on&) = delete;
    working_on& operator=(const working_on&) = delete;

    activity& here;

  private:
    const queue_core* outer_;
};

}  // namespace dispatch::detail
