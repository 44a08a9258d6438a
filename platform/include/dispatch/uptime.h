#pragma once

#include <chrono>
#include <cstdint>

#include "dispatch/time.h"
#include "plr/base/export.h"

// The kernel's clocks that nobody sets: monotonic and boot time, which every reader
// of them goes through, as those of the date go through calendar.h; and the seams
// that tests need to let time pass by hand. plr/test/virtual_time.h makes use of them.
//
// Threads: any, unless it says otherwise.
namespace dispatch {

class uptime {
  public:
    // Nanoseconds since the start of `on`, monotonic or boot; on any thread.
    using reader = std::int64_t (*)(clock on) noexcept;

    // `replacement` stands in for the kernel from now on, null gives it its place
    // back. While a stand-in is there, timers on the two clocks are looked at when one
    // is set or has_moved() is called, and at no other time; waits that end at a time
    // (group::wait()) take as long as is left by the stand-in when they begin. Returns
    // the stand-in that was there before, or null.
    PLR_EXPORT static reader replace(reader replacement) noexcept;
    // The stand-in's time has changed: when this returns, the timers that are due by
    // it have been submitted to their queues.
    PLR_EXPORT static void has_moved() noexcept;
    // Null while the kernel's clocks are read.
    [[nodiscard]] PLR_EXPORT static reader stand_in() noexcept;
};

// No timer on `on` is due before this; forever when none is pending. It is exact,
// unless the timer was withdrawn.
[[nodiscard]] PLR_EXPORT time next_timer(clock on) noexcept;

// Waits until the pool has nothing to do: no work waits there, no worker runs any or
// has an event in hand. Workers that wait in sync() or group::wait() count as idle; so
// does work that is suspended, waits at a pump or is not due. Returns false when that
// takes longer than `bound` by the kernel's clock. Not for work of the pool.
[[nodiscard]] PLR_EXPORT bool wait_until_quiet(std::chrono::nanoseconds bound) noexcept;

}  // namespace dispatch
