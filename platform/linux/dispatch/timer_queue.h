#pragma once

#include <array>
#include <cstdint>

#include "dispatch/time.h"
#include "platform/linux/dispatch/spin_lock.h"
#include "platform/linux/dispatch/timer_wheel.h"

// All pending timers: per clock a wheel and one timerfd, which is set for the
// earliest deadline. It stays set when that timer is withdrawn: waking once for
// nothing is cheaper than a system call for each. The kernel tells the wall
// clock's descriptor of steps (TFD_TIMER_CANCEL_ON_SET).
namespace dispatch::detail {

// A timer, part of the object that owns it.
class timer_entry : public wheel_entry {
  public:
    // `fire` runs on the poller's thread, under the lock of the timer queue, so
    // that disarm() can be sure: it only submits. A timer that fires once may be
    // deleted there. `firings` counts the periods since the last call.
    using fire_type = void (*)(timer_entry* self, std::uint64_t firings) noexcept;
    explicit timer_entry(fire_type fire) noexcept : fire_(fire) {}

  private:
    friend class timer_queue;

    clock clock_ = clock::monotonic;  // where it is pending
    fire_type fire_;
    std::int64_t interval_ = 0;  // nanoseconds; 0 for once
};

class timer_queue {
  public:
    // Makes the timerfds and adds them to the poller's descriptor, `first_tag` + clock being
    // their epoll data.
    void open(int epoll, std::uint64_t first_tag) noexcept;
    // In the child of a fork, before it is opened again: nothing is pending.
    void forked() noexcept PLR_EXCLUDES(lock_);

    // Owners may keep state of their own under it. Not to be held over expire().
    [[nodiscard]] spin_lock& lock() noexcept PLR_RETURN_CAPABILITY(lock_) { return lock_; }

    // Arms, or arms anew. `interval` in nanoseconds, 0 for once. No system call
    // unless it is the earliest of all.
    void arm(timer_entry& entry, time deadline, std::int64_t interval) noexcept PLR_REQUIRES(lock_);
    // The timer does not fire any more. Never a system call.
    void disarm(timer_entry& entry) noexcept PLR_REQUIRES(lock_);

    // No deadline on `on` is before this.
    [[nodiscard]] time earliest(clock on) noexcept PLR_EXCLUDES(lock_);

    // Fires what is due: when the clock's descriptor is readable, or the clock
    // was set. Returns whether more may be due, for which the descriptor stays
    // readable. Any thread.
    bool expire(clock on) noexcept PLR_EXCLUDES(lock_);

    // How many are pending, and the earliest deadline, which a withdrawn timer may
    // have left.
    struct view {
        std::size_t pending;
        std::int64_t earliest;  // nanoseconds
    };
    [[nodiscard]] view look(clock on) noexcept PLR_EXCLUDES(lock_) {
        scoped_lock guard(lock_);
        return {of(on).pending, of(on).wheel.earliest()};
    }

  private:
    struct per_clock {
        int descriptor = -1;
        std::int64_t armed = timer_wheel::kNever;  // what the descriptor is set to
        std::size_t pending = 0;
        timer_wheel wheel;
    };

    [[nodiscard]] per_clock& of(clock which) noexcept {
        return clocks_[static_cast<unsigned>(which)];
    }
    void set_descriptor(per_clock& clock, dispatch::clock which) noexcept PLR_REQUIRES(lock_);
    [[nodiscard]] bool fire_some(per_clock& clock, std::int64_t now) noexcept PLR_EXCLUDES(lock_);
    void fire(per_clock& clock, timer_entry& due, std::int64_t now) noexcept PLR_REQUIRES(lock_);

    spin_lock lock_;
    std::array<per_clock, 3> clocks_;  // under lock_; the descriptors never change
};

}  // namespace dispatch::detail
