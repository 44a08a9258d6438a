#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "dispatch/time.h"
#include "platform/linux/dispatch/spin_lock.h"

// All pending timers: per clock a 4-ary heap over one timerfd, which is armed for
// the earliest deadline only. The wall clock's descriptor is told of clock steps
// by the kernel (TFD_TIMER_CANCEL_ON_SET), so that its timers follow at once.
namespace dispatch::detail {

class timer_queue;

// A timer, part of the object that owns it. Periodic timers are counted from
// their first deadline, so that no delay adds up.
class timer_entry {
  public:
    // `fire` runs on the poller's thread, under the lock of the timer queue, so
    // that disarm() can be sure: it only submits. A timer that fires once may be
    // deleted there. `firings` counts the periods since the last call.
    using fire_type = void (*)(timer_entry* self, std::uint64_t firings) noexcept;
    explicit timer_entry(fire_type fire) noexcept : fire_(fire) {}
    timer_entry(const timer_entry&) = delete;
    timer_entry& operator=(const timer_entry&) = delete;

  private:
    friend class timer_queue;
    static constexpr std::size_t kNowhere = ~std::size_t{0};

    fire_type fire_;
    std::int64_t deadline_ = 0;  // nanoseconds on clock_
    std::int64_t interval_ = 0;  // nanoseconds; 0 for once
    std::size_t position_ = kNowhere;
    clock clock_ = clock::monotonic;
};

class timer_queue {
  public:
    // Adds the timerfds to the poller's descriptor, `first_tag` + clock being
    // their epoll data.
    timer_queue(int epoll, std::uint64_t first_tag) noexcept;

    // Arms, or arms anew. `interval` in nanoseconds, 0 for once. Throws
    // std::bad_alloc with the timer not armed.
    void arm(timer_entry& entry, time deadline, std::int64_t interval);
    // Once it returned, the timer does not fire any more. Returns whether it was
    // armed.
    bool disarm(timer_entry& entry) noexcept;

    // Fires what is due; the poller calls this when the clock's descriptor is
    // readable.
    void expire(clock on) noexcept;

  private:
    struct slot {
        std::int64_t deadline;
        timer_entry* entry;
    };
    struct per_clock {
        int descriptor = -1;
        std::int64_t armed = 0;  // deadline the descriptor is set to; 0 for none
        std::vector<slot> heap;
    };

    void place(per_clock& clock, std::size_t position, slot moved) noexcept;
    void sift_up(per_clock& clock, std::size_t position) noexcept;
    void sift_down(per_clock& clock, std::size_t position) noexcept;
    void remove(per_clock& clock, std::size_t position) noexcept;
    void set_descriptor(per_clock& clock, dispatch::clock which) noexcept;

    spin_lock lock_;
    std::array<per_clock, 3> clocks_;  // under lock_; the descriptors never change
};

}  // namespace dispatch::detail
