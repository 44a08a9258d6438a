#include "dispatch/time.h"

#include <ctime>

#include "dispatch/calendar.h"
#include "dispatch/uptime.h"

namespace dispatch {

time time::now(clock on) noexcept {
    std::timespec reading{};
    if (const uptime::reader stand_in = uptime::stand_in(); stand_in && on != clock::wall)
        return at(on, stand_in(on));
    if (on != clock::wall)
        ::clock_gettime(on == clock::boot ? CLOCK_BOOTTIME : CLOCK_MONOTONIC, &reading);
    else if (calendar::shared().read(reading) != 0)
        return at(on, 0);
    return at(on, reading.tv_sec * std::int64_t{1'000'000'000} + reading.tv_nsec);
}

time time::after(std::chrono::nanoseconds delay, clock on) noexcept {
    return now(on).plus(delay);
}

}  // namespace dispatch
