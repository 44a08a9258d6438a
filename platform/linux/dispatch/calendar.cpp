#include "dispatch/calendar.h"

#include <cerrno>

#include "platform/linux/dispatch/poller.h"

namespace dispatch {
namespace {

int read_kernels_clock(std::timespec& now) noexcept {
    return ::clock_gettime(CLOCK_REALTIME, &now) == 0 ? 0 : errno;
}

}  // namespace

constexpr calendar::calendar() noexcept : reader_(&read_kernels_clock) {}

constinit calendar calendar::shared_;

const calendar& calendar::shared() noexcept {
    return shared_;
}

bool calendar::is_kernels() const noexcept {
    return reader_.load(std::memory_order_relaxed) == &read_kernels_clock;
}

calendar::reader calendar::replace(reader replacement) noexcept {
    const reader before = shared_.reader_.exchange(replacement ? replacement : &read_kernels_clock);
    was_set();
    return before == &read_kernels_clock ? nullptr : before;
}

void calendar::was_set() noexcept {
    while (detail::poller::shared().timers().expire(clock::wall)) {
    }
}

}  // namespace dispatch
