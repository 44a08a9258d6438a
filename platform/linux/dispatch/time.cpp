#include "dispatch/time.h"

#include <ctime>

namespace dispatch {

time time::now(clock on) noexcept {
    static constexpr clockid_t kClocks[] = {CLOCK_MONOTONIC, CLOCK_BOOTTIME, CLOCK_REALTIME};
    timespec reading{};
    ::clock_gettime(kClocks[static_cast<unsigned>(on)], &reading);
    return at(on, reading.tv_sec * std::int64_t{1'000'000'000} + reading.tv_nsec);
}

time time::after(std::chrono::nanoseconds delay, clock on) noexcept {
    return now(on).plus(delay);
}

}  // namespace dispatch
