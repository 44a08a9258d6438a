#pragma once

#include <atomic>
#include <chrono>

#include "dispatch/calendar.h"

namespace plr::test {

// The wall clock moved by hand while one of these lives (one at a time). Starts
// at a time of its own; timers on the wall clock see its steps only.
class ManualCalendar {
  public:
    explicit ManualCalendar(std::chrono::nanoseconds start = std::chrono::seconds(1'000'000'000)) {
        now_ = start.count();
        error_ = 0;
        before_ = dispatch::calendar::replace(&read);
    }
    ManualCalendar(const ManualCalendar&) = delete;
    ManualCalendar& operator=(const ManualCalendar&) = delete;
    ~ManualCalendar() { dispatch::calendar::replace(before_); }

    // Forwards or backwards; timers that are due are submitted when it returns.
    void step(std::chrono::nanoseconds by) {
        now_ += by.count();
        dispatch::calendar::was_set();
    }
    // Readings fail with this error number; 0 mends the clock.
    void fail(int error) { error_ = error; }

  private:
    static int read(std::timespec& now) noexcept {
        now.tv_sec = now_ / 1'000'000'000;
        now.tv_nsec = now_ % 1'000'000'000;
        return error_;
    }
    inline static std::atomic<std::int64_t> now_{0};
    inline static std::atomic<int> error_{0};
    dispatch::calendar::reader before_;
};

}  // namespace plr::test
