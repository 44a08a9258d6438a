#pragma once

#include <atomic>
#include <ctime>

#include "plr/base/export.h"

// The kernel's calendar clock: the wall-clock time, which the operator or the
// network may set, also backwards.
//
// One service a process, which every reader of the date goes through:
// dispatch::time's wall clock, the timers on it and plr::Clock.
//
// Owner:   the process; never destroyed. Fetch the handle once and keep it.
// Threads: any.
// Cost:    read() is the system's clock call, which enters no kernel.
namespace dispatch {

class calendar {
  public:
    PLR_EXPORT static const calendar& shared() noexcept;

    // The time since 1970-01-01T00:00:00Z without leap seconds (POSIX
    // clock_gettime, CLOCK_REALTIME). Returns 0, or an error number (errno.h)
    // with `now` unspecified.
    [[nodiscard]] int read(std::timespec& now) const noexcept {
        return reader_.load(std::memory_order_relaxed)(now);
    }

    // ---- The seam for tests, and for a calendar that is not the kernel's ----
    //
    // `reader` stands in for the kernel from now on, null gives it its place
    // back; returns 0 or an error number as read() does, on any thread. While a
    // stand-in is there, timers on the wall clock are looked at when one is set
    // or was_set() is called, and at no other time: a calendar that is moved by
    // hand. Returns the stand-in that was there before, or null. Waits that end at a time
    // (group::wait()) keep to the kernel's clock.
    using reader = int (*)(std::timespec& now) noexcept;
    PLR_EXPORT static reader replace(reader replacement) noexcept;
    // The clock was set, forwards or backwards: when this returns, the timers
    // that are due by it have been submitted to their queues. The kernel's clock
    // needs no such call.
    PLR_EXPORT static void was_set() noexcept;
    // Whether the kernel's clock is the one that is read.
    [[nodiscard]] PLR_EXPORT bool is_kernels() const noexcept;

  private:
    constexpr calendar() noexcept;

    static calendar shared_;

    std::atomic<reader> reader_;
};

}  // namespace dispatch
