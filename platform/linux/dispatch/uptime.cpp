#include "dispatch/uptime.h"

#include <unistd.h>

#include <atomic>

#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/pool.h"

namespace dispatch {
namespace {

constexpr useconds_t kLook = 50;  // microseconds between two looks at the pool

std::atomic<uptime::reader> stand_in_reader{nullptr};

}  // namespace

uptime::reader uptime::stand_in() noexcept {
    return stand_in_reader.load(std::memory_order_relaxed);
}

uptime::reader uptime::replace(reader replacement) noexcept {
    const reader before = stand_in_reader.exchange(replacement);
    has_moved();
    return before;
}

void uptime::has_moved() noexcept {
    for (const clock moved : {clock::monotonic, clock::boot}) {
        while (detail::poller::shared().timers().expire(moved)) {
        }
    }
}

time next_timer(clock on) noexcept {
    return detail::poller::shared().timers().earliest(on);
}

bool wait_until_quiet(std::chrono::nanoseconds bound) noexcept {
    const auto end = std::chrono::steady_clock::now() + bound;
    while (!detail::pool::shared().is_quiet()) {
        if (std::chrono::steady_clock::now() > end)
            return false;
        ::usleep(kLook);
    }
    return true;
}

}  // namespace dispatch
