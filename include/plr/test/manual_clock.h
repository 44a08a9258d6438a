#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>

#include "dispatch/uptime.h"

namespace plr::test {

// The monotonic clock and the boot clock moved by hand while one of these lives (one
// at a time). They start where the kernel's are, and stand still; timers on them see
// the steps only. Any thread. VirtualTime has it all in one.
class ManualClock {
  public:
    ManualClock() {
        for (const dispatch::clock on : {dispatch::clock::monotonic, dispatch::clock::boot})
            start(on) = dispatch::time::now(on).nanoseconds();
        elapsed_ = 0;
        before_ = dispatch::uptime::replace(&read);
    }
    ManualClock(const ManualClock&) = delete;
    ManualClock& operator=(const ManualClock&) = delete;
    // Timers that are still set go by the kernel's clocks from now on.
    ~ManualClock() { dispatch::uptime::replace(before_); }

    // Since it was made.
    [[nodiscard]] std::chrono::nanoseconds elapsed() const {
        return std::chrono::nanoseconds(elapsed_.load());
    }
    // Forwards; timers that are due are submitted when it returns, a periodic one once
    // however many periods have passed.
    void step(std::chrono::nanoseconds by) {
        elapsed_ += by.count();
        dispatch::uptime::has_moved();
    }

  private:
    // Threads may still be reading by the clock of the test before.
    static std::atomic<std::int64_t>& start(dispatch::clock on) noexcept {
        static std::atomic<std::int64_t> starts[2];
        return starts[on == dispatch::clock::boot ? 1 : 0];
    }
    static std::int64_t read(dispatch::clock on) noexcept { return start(on) + elapsed_; }

    inline static std::atomic<std::int64_t> elapsed_{0};
    dispatch::uptime::reader before_;
};

}  // namespace plr::test
