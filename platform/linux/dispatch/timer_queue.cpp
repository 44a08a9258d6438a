#include "platform/linux/dispatch/timer_queue.h"

#include <sys/epoll.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "dispatch/calendar.h"
#include "dispatch/uptime.h"
#include "plr/base/assert.h"
#include "plr/base/report.h"

namespace dispatch::detail {
namespace {

constexpr clockid_t kClocks[] = {CLOCK_MONOTONIC, CLOCK_BOOTTIME, CLOCK_REALTIME};

// Fired before others get the lock.
constexpr unsigned kBatch = 64;
// Fired before their handlers get their turn.
constexpr unsigned kTurn = 1024;

// Of deadlines; what a period takes past it never comes.
constexpr std::int64_t kLatest = (std::int64_t{1} << 62) - 1;

bool is_kernels(clock which) noexcept {
    return which == clock::wall ? calendar::shared().is_kernels() : !uptime::stand_in();
}

}  // namespace

void timer_queue::open(int epoll, std::uint64_t first_tag) noexcept {
    static_assert(std::size(kClocks) == std::tuple_size_v<decltype(clocks_)>);
    std::size_t i = 0;
    for (const clockid_t clock : kClocks) {
        const int made = ::timerfd_create(clock, TFD_NONBLOCK | TFD_CLOEXEC);
        epoll_event interest{};
        interest.events = EPOLLIN;
        interest.data.u64 = first_tag + i;
        if (made < 0 || ::epoll_ctl(epoll, EPOLL_CTL_ADD, made, &interest) != 0)
            plr::report("dispatch: no timer descriptor (%s)", ::strerrordesc_np(errno));
        PLR_ASSERT(made >= 0, "timerfd_create");
        clocks_[i++].descriptor = made;
    }
}

void timer_queue::forked() noexcept {
    scoped_lock guard(lock_);
    for (per_clock& each : clocks_) {
        ::close(each.descriptor);
        each.armed = timer_wheel::kNever;
        each.pending = 0;
        each.wheel.clear();
    }
}

// Only an earlier deadline costs a system call: a later one is found out when
// the descriptor fires.
void timer_queue::set_descriptor(per_clock& clock, dispatch::clock which) noexcept {
    std::int64_t wanted = std::max<std::int64_t>(clock.wheel.earliest(), 1);
    if (clock.armed <= wanted)
        return;
    int flags = TFD_TIMER_ABSTIME;
    if (which == dispatch::clock::wall)
        flags |= TFD_TIMER_CANCEL_ON_SET;
    // A stand-in moves by hand only; what it says is due must wake the poller.
    if (!is_kernels(which)) {
        if (wanted > time::now(which).nanoseconds())
            return;
        wanted = 1;
    }
    itimerspec setting{};
    setting.it_value.tv_sec = wanted / 1'000'000'000;
    setting.it_value.tv_nsec = wanted % 1'000'000'000;
    ::timerfd_settime(clock.descriptor, flags, &setting, nullptr);
    clock.armed = wanted;
}

// Hot path: bench/timers_cases.h.
void timer_queue::arm(timer_entry& entry, time deadline, std::int64_t interval) noexcept {
    disarm(entry);
    if (deadline.is_forever())
        return;
    per_clock& clock = of(deadline.on());
    entry.clock_ = deadline.on();
    entry.interval_ = interval;
    ++clock.pending;
    clock.wheel.insert(entry, deadline.nanoseconds());
    if (clock.armed > deadline.nanoseconds()) [[unlikely]]
        set_descriptor(clock, deadline.on());
}

void timer_queue::disarm(timer_entry& entry) noexcept {
    if (!entry.is_pending())
        return;
    per_clock& clock = of(entry.clock_);
    --clock.pending;
    clock.wheel.remove(entry);
}

time timer_queue::earliest(clock on) noexcept {
    scoped_lock guard(lock_);
    const std::int64_t deadline = of(on).wheel.earliest();
    return deadline == timer_wheel::kNever ? forever : time::at(on, deadline);
}

// At most kTurn at a time: their handlers then run while they are in the caches,
// and the first of very many do not wait for the last.
bool timer_queue::expire(clock on) noexcept {
    per_clock& clock = of(on);
    std::int64_t now;
    {
        scoped_lock guard(lock_);
        std::uint64_t expirations;
        // ECANCELED says that the wall clock was set; either way the wheel decides.
        static_cast<void>(!::read(clock.descriptor, &expirations, sizeof expirations));
        clock.armed = timer_wheel::kNever;
        now = time::now(on).nanoseconds();
        clock.wheel.set_back(now);
    }
    bool more = true;
    for (unsigned fired = 0; more && fired < kTurn; fired += kBatch)
        more = fire_some(clock, now);
    scoped_lock guard(lock_);
    set_descriptor(clock, on);
    return more;
}

// Returns whether more may be due.
bool timer_queue::fire_some(per_clock& clock, std::int64_t now) noexcept {
    scoped_lock guard(lock_);
    for (unsigned fired = 0; fired < kBatch; ++fired) {
        wheel_entry* due = clock.wheel.take_due(now);
        if (!due)
            return false;
        fire(clock, *static_cast<timer_entry*>(due), now);
    }
    return true;
}

// The entry may be gone when its function returns.
void timer_queue::fire(per_clock& clock, timer_entry& due, std::int64_t now) noexcept {
    std::uint64_t firings = 1;
    --clock.pending;
    if (due.interval_ > 0) {
        const std::int64_t missed = (now - due.deadline()) / due.interval_;
        const std::int64_t last = due.deadline() + missed * due.interval_;
        firings += static_cast<std::uint64_t>(missed);
        if (due.interval_ <= kLatest - last) {
            ++clock.pending;
            clock.wheel.insert(due, last + due.interval_);
        }
    }
    due.fire_(&due, firings);
}

}  // namespace dispatch::detail
