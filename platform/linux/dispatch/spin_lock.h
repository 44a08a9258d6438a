#pragma once

#include <sched.h>

#include <atomic>

#include "platform/linux/dispatch/futex.h"
#include "plr/base/thread_annotations.h"

namespace dispatch::detail {

// For a handful of instructions at a time; gives the processor away when the
// holder seems to have lost it.
class PLR_CAPABILITY("mutex") spin_lock {
  public:
    void lock() noexcept PLR_ACQUIRE() {
        unsigned spins = 0;
        while (held_.exchange(true, std::memory_order_acquire)) {
            while (held_.load(std::memory_order_relaxed)) {
                if (++spins % 64 == 0)
                    ::sched_yield();
                else
                    cpu_relax();
            }
        }
    }
    void unlock() noexcept PLR_RELEASE() { held_.store(false, std::memory_order_release); }
    // Tells the analysis what it cannot see: the caller's caller holds it.
    void assert_held() const noexcept PLR_ASSERT_CAPABILITY(this) {}

  private:
    std::atomic<bool> held_{false};
};

// std::lock_guard with thread-safety annotations.
template <class Mutex>
class PLR_SCOPED_CAPABILITY scoped_lock {
  public:
    explicit scoped_lock(Mutex& mutex) noexcept PLR_ACQUIRE(mutex) : mutex_(mutex) {
        mutex_.lock();
    }
    ~scoped_lock() PLR_RELEASE() { mutex_.unlock(); }
    scoped_lock(const scoped_lock&) = delete;
    scoped_lock& operator=(const scoped_lock&) = delete;

  private:
    Mutex& mutex_;
};

}  // namespace dispatch::detail
