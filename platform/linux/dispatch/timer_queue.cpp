#include "platform/linux/dispatch/timer_queue.h"

#include <sys/epoll.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "plr/base/assert.h"
#include "plr/base/report.h"

namespace dispatch::detail {
namespace {

constexpr std::size_t kArity = 4;

constexpr clockid_t kClocks[] = {CLOCK_MONOTONIC, CLOCK_BOOTTIME, CLOCK_REALTIME};

}  // namespace

timer_queue::timer_queue(int epoll, std::uint64_t first_tag) noexcept {
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

void timer_queue::place(per_clock& clock, std::size_t position, slot moved) noexcept {
    clock.heap[position] = moved;
    moved.entry->position_ = position;
}

void timer_queue::sift_up(per_clock& clock, std::size_t position) noexcept {
    const slot moved = clock.heap[position];
    while (position > 0) {
        const std::size_t parent = (position - 1) / kArity;
        if (clock.heap[parent].deadline <= moved.deadline)
            break;
        place(clock, position, clock.heap[parent]);
        position = parent;
    }
    place(clock, position, moved);
}

void timer_queue::sift_down(per_clock& clock, std::size_t position) noexcept {
    const slot moved = clock.heap[position];
    for (;;) {
        const std::size_t first = position * kArity + 1;
        if (first >= clock.heap.size())
            break;
        const std::size_t end = std::min(first + kArity, clock.heap.size());
        std::size_t least = first;
        for (std::size_t child = first + 1; child < end; ++child)
            if (clock.heap[child].deadline < clock.heap[least].deadline)
                least = child;
        if (moved.deadline <= clock.heap[least].deadline)
            break;
        place(clock, position, clock.heap[least]);
        position = least;
    }
    place(clock, position, moved);
}

void timer_queue::remove(per_clock& clock, std::size_t position) noexcept {
    clock.heap[position].entry->position_ = timer_entry::kNowhere;
    const slot last = clock.heap.back();
    clock.heap.pop_back();
    if (position == clock.heap.size())
        return;
    place(clock, position, last);
    sift_up(clock, position);
    sift_down(clock, last.entry->position_);
}

// Only an earlier deadline costs a system call: a later one is found out when
// the descriptor fires.
void timer_queue::set_descriptor(per_clock& clock, dispatch::clock which) noexcept {
    if (clock.heap.empty())
        return;
    const std::int64_t earliest = std::max<std::int64_t>(clock.heap.front().deadline, 1);
    if (clock.armed != 0 && clock.armed <= earliest)
        return;
    itimerspec setting{};
    setting.it_value.tv_sec = earliest / 1'000'000'000;
    setting.it_value.tv_nsec = earliest % 1'000'000'000;
    int flags = TFD_TIMER_ABSTIME;
    if (which == dispatch::clock::wall)
        flags |= TFD_TIMER_CANCEL_ON_SET;
    ::timerfd_settime(clock.descriptor, flags, &setting, nullptr);
    clock.armed = earliest;
}

void timer_queue::arm(timer_entry& entry, time deadline, std::int64_t interval) {
    scoped_lock guard(lock_);
    if (entry.position_ != timer_entry::kNowhere)
        remove(clocks_[static_cast<unsigned>(entry.clock_)], entry.position_);
    if (deadline.is_forever())
        return;
    per_clock& clock = clocks_[static_cast<unsigned>(deadline.on())];
    clock.heap.push_back({deadline.nanoseconds(), &entry});
    entry.deadline_ = deadline.nanoseconds();
    entry.interval_ = interval;
    entry.clock_ = deadline.on();
    sift_up(clock, clock.heap.size() - 1);
    set_descriptor(clock, deadline.on());
}

bool timer_queue::disarm(timer_entry& entry) noexcept {
    scoped_lock guard(lock_);
    if (entry.position_ == timer_entry::kNowhere)
        return false;
    remove(clocks_[static_cast<unsigned>(entry.clock_)], entry.position_);
    return true;
}

void timer_queue::expire(clock on) noexcept {
    scoped_lock guard(lock_);
    per_clock& clock = clocks_[static_cast<unsigned>(on)];
    std::uint64_t expirations;
    // ECANCELED says that the wall clock was set; either way the heap decides.
    static_cast<void>(!::read(clock.descriptor, &expirations, sizeof expirations));
    clock.armed = 0;
    const std::int64_t now = time::now(on).nanoseconds();
    while (!clock.heap.empty() && clock.heap.front().deadline <= now) {
        timer_entry& due = *clock.heap.front().entry;
        std::uint64_t firings = 1;
        if (due.interval_ > 0) {
            firings += static_cast<std::uint64_t>((now - due.deadline_) / due.interval_);
            due.deadline_ += static_cast<std::int64_t>(firings) * due.interval_;
            clock.heap.front().deadline = due.deadline_;
            sift_down(clock, 0);
        } else {
            remove(clock, 0);
        }
        due.fire_(&due, firings);
    }
    set_descriptor(clock, on);
}

}  // namespace dispatch::detail
