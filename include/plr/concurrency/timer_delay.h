#pragma once

#include <chrono>
#include <cmath>
#include <cstdint>
#include <limits>
#include <ratio>
#include <tuple>
#include <type_traits>

namespace plr {

// The clock that a delay is measured on.
enum class TimeType : std::uint8_t {
    Monotonic = 0,  // dispatch::clock::monotonic
    WallClock = 1,  // dispatch::clock::wall: the deadline is a time of day
};

// A delay or a period as timers take it, made from any std::chrono duration:
// microseconds, rounded up so that no timer is early, and clamped to what 64 bits
// hold, which never comes. A floating-point duration that is not a number is zero.
class TimerDelay {
  public:
    using Time = std::tuple<TimeType, std::chrono::microseconds>;

    template <class Rep, class Period>
    constexpr TimerDelay(std::chrono::duration<Rep, Period> delay)
        : time_(TimeType::Monotonic, roundedUp(delay)) {}

    // The same delay, measured on the wall clock.
    [[nodiscard]] constexpr TimerDelay onWallClock() const {
        TimerDelay result = *this;
        std::get<TimeType>(result.time_) = TimeType::WallClock;
        return result;
    }

    [[nodiscard]] constexpr const Time& time() const noexcept { return time_; }

  private:
    using Microseconds = std::chrono::microseconds;

    template <class Rep, class Period>
    static constexpr Microseconds roundedUp(std::chrono::duration<Rep, Period> delay) {
        if constexpr (std::is_floating_point_v<Rep>)
            return roundedUpFloating(std::chrono::duration<Rep, std::micro>(delay).count());
        else
            return roundedUpWhole<std::ratio_divide<Period, std::micro>>(delay.count());
    }

    template <class Rep>
    static constexpr Microseconds roundedUpFloating(Rep microseconds) {
        constexpr Rep kTooMuch = 0x1p63;  // the first that does not fit
        if (microseconds != microseconds)
            return Microseconds::zero();
        if (microseconds >= kTooMuch)
            return Microseconds::max();
        if (microseconds <= -kTooMuch)
            return Microseconds::min();
        return Microseconds(static_cast<std::int64_t>(std::ceil(microseconds)));
    }

    // `count` times Unit microseconds.
    template <class Unit, class Rep>
    static constexpr Microseconds roundedUpWhole(Rep count) {
        constexpr std::int64_t kMaximum = std::numeric_limits<std::int64_t>::max();
        if constexpr (std::is_unsigned_v<Rep>)
            if (count > static_cast<std::uint64_t>(kMaximum))
                return Microseconds::max();
        const auto signedCount = static_cast<std::int64_t>(count);
        const std::int64_t units = signedCount / Unit::den;
        const std::int64_t rest = signedCount % Unit::den * Unit::num;
        if (units >= kMaximum / Unit::num)
            return Microseconds::max();
        if (units <= -(kMaximum / Unit::num))
            return Microseconds::min();
        return Microseconds(units * Unit::num + rest / Unit::den + (rest % Unit::den > 0));
    }

    Time time_;
};

}  // namespace plr
