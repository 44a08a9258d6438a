#pragma once

#include <chrono>
#include <compare>
#include <cstdint>

#include "plr/base/export.h"

// A deadline: 64 bits that carry nanoseconds and the clock they are read on.
//
// The two highest bits name the clock, the other 62 count nanoseconds since
// that clock's start (POSIX clock_gettime). Deadlines past the range become
// `forever`. Plain data: any thread.
namespace dispatch {

enum class clock : std::uint8_t {
    monotonic = 0,  // CLOCK_MONOTONIC: stands still while the system sleeps
    boot = 1,       // CLOCK_BOOTTIME: counts the time asleep
    wall = 2,       // the calendar (calendar.h): follows changes of the system time at once
};

class time {
  public:
    // The start of the monotonic clock: always past.
    constexpr time() noexcept = default;
    constexpr explicit time(std::uint64_t bits) noexcept : bits_(bits) {}
    // `nanoseconds` since the start of `on`; negative becomes 0.
    static constexpr time at(clock on, std::int64_t nanoseconds) noexcept {
        if (nanoseconds > kMaximum)
            return time(~std::uint64_t{0});
        const auto count = static_cast<std::uint64_t>(nanoseconds < 0 ? 0 : nanoseconds);
        return time((static_cast<std::uint64_t>(on) << 62) | count);
    }
    // Now plus `delay`; a negative delay is a deadline already past.
    PLR_EXPORT static time after(std::chrono::nanoseconds delay,
                                 clock on = clock::monotonic) noexcept;
    // A wall clock that cannot be read gives its start.
    PLR_EXPORT static time now(clock on = clock::monotonic) noexcept;

    // All 64 bits, for storage and comparison with `forever`.
    [[nodiscard]] constexpr std::uint64_t bits() const noexcept { return bits_; }
    [[nodiscard]] constexpr bool is_forever() const noexcept { return bits_ == ~std::uint64_t{0}; }
    // Meaningless for `forever`.
    [[nodiscard]] constexpr clock on() const noexcept { return static_cast<clock>(bits_ >> 62); }
    [[nodiscard]] constexpr std::int64_t nanoseconds() const noexcept {
        return static_cast<std::int64_t>(bits_ & static_cast<std::uint64_t>(kMaximum));
    }
    // The same clock, `delay` later; forever stays forever.
    [[nodiscard]] constexpr time plus(std::chrono::nanoseconds delay) const noexcept {
        if (is_forever() || delay.count() > kMaximum - nanoseconds())
            return time(~std::uint64_t{0});
        return at(on(), nanoseconds() + delay.count());
    }

    friend constexpr bool operator==(time, time) noexcept = default;

  private:
    static constexpr std::int64_t kMaximum = (std::int64_t{1} << 62) - 1;
    std::uint64_t bits_ = 0;
};

// Never: all 64 bits set.
inline constexpr time forever{~std::uint64_t{0}};
// Deadlines that have passed already: "do not wait".
inline constexpr time immediately{};

}  // namespace dispatch
