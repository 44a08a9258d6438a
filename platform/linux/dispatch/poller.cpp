#include "platform/linux/dispatch/poller.h"

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <new>

#include "platform/linux/dispatch/deputy.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_core.h"
#include "plr/base/assert.h"

namespace dispatch::detail {
namespace {

// Tags of descriptors that are not in the table; places count from 0.
constexpr std::uint64_t kInterruptionTag = ~std::uint64_t{0};
constexpr std::uint64_t kFirstTimerTag = ~std::uint64_t{0} - 3;
constexpr std::uint32_t kMostPlaces = 0xFFFFFF00;
constexpr int kEventsAtOnce = 64;

int make_epoll() noexcept {
    const int made = ::epoll_create1(EPOLL_CLOEXEC);
    PLR_ASSERT(made >= 0, "epoll_create1");
    return made;
}

}  // namespace

poller& poller::shared() noexcept {
    static poller& made = *new poller;
    return made;
}

poller::poller() noexcept {
    open();
}

void poller::open() noexcept {
    epoll_ = make_epoll();
    interruption_ = ::eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
    epoll_event interest{};
    interest.events = EPOLLIN | EPOLLET;
    interest.data.u64 = kInterruptionTag;
    PLR_ASSERT(::epoll_ctl(epoll_, EPOLL_CTL_ADD, interruption_, &interest) == 0, "eventfd");
    timers_.open(epoll_, kFirstTimerTag);
}

void poller::at_fork(forks::moment when) noexcept {
    forks::hold(timers_.lock(), when);
    forks::hold(lock_, when);
}

// What the parent waits for is not to be touched: the descriptors are closed, which
// are the parent's as well.
void poller::forked() noexcept {
    ::close(epoll_);
    ::close(interruption_);
    timers_.forked();
    scoped_lock guard(lock_);
    places_.clear();
    free_.clear();
    open();
}

void poller::interrupt() noexcept {
    const std::uint64_t one = 1;
    static_cast<void>(!::write(interruption_, &one, sizeof one));
}

void poller::wait(worker& self) noexcept {
    epoll_event events[kEventsAtOnce];
    const int count = ::epoll_wait(epoll_, events, kEventsAtOnce, -1);
    pool::shared().leave_idle(self);
    if (count <= 0)
        return;
    if (count > 1 || events[0].data.u64 != kInterruptionTag)
        deputy::watch();  // nobody polls until this worker comes back
    for (int i = 0; i < count; ++i) {
        const std::uint64_t tag = events[i].data.u64;
        if (tag == kInterruptionTag)
            continue;
        if (tag >= kFirstTimerTag)
            timers_.expire(static_cast<clock>(tag - kFirstTimerTag));
        else
            deliver(tag, events[i].events);
    }
}

// Under the lock, so that remove() knows whether a call still comes.
void poller::deliver(std::uint64_t tag, std::uint32_t events) noexcept {
    const auto index = static_cast<std::uint32_t>(tag);
    const auto generation = static_cast<std::uint32_t>(tag >> 32);
    scoped_lock guard(lock_);
    const place& found = places_[index];
    if (!found.watch || found.generation != generation)
        return;
    if (found.watch->events_.fetch_or(events, std::memory_order_acq_rel) == 0)
        submit(found.watch->on_, &found.watch->work_);
}

std::uint64_t poller::tag_of(const io_watch& watch) noexcept {
    return (std::uint64_t{watch.generation_} << 32) | watch.slot_;
}

int poller::add(io_watch& watch, std::uint32_t interest) noexcept {
    scoped_lock guard(lock_);
    if (free_.empty()) {
        if (places_.size() >= kMostPlaces)
            return ENOSPC;
        try {
            free_.reserve(places_.size() + 1);
            places_.emplace_back();
        } catch (const std::bad_alloc&) {
            return ENOMEM;
        }
        free_.push_back(static_cast<std::uint32_t>(places_.size() - 1));
    }
    place& taken = places_[free_.back()];
    watch.slot_ = free_.back();
    // The highest generations would look like the tags above.
    taken.generation = (taken.generation + 1) & 0x7FFFFFFF;
    watch.generation_ = taken.generation;
    epoll_event wanted{};
    wanted.events = interest | EPOLLET;
    wanted.data.u64 = tag_of(watch);
    if (::epoll_ctl(epoll_, EPOLL_CTL_ADD, watch.fd_, &wanted) != 0)
        return errno;
    taken.watch = &watch;
    free_.pop_back();
    pool::shared().ensure_poller();
    return 0;
}

int poller::change(io_watch& watch, std::uint32_t interest) noexcept {
    epoll_event wanted{};
    wanted.events = interest | EPOLLET;
    wanted.data.u64 = tag_of(watch);
    return ::epoll_ctl(epoll_, EPOLL_CTL_MOD, watch.fd_, &wanted) == 0 ? 0 : errno;
}

bool poller::remove(io_watch& watch) noexcept {
    scoped_lock guard(lock_);
    if (watch.slot_ >= places_.size() || places_[watch.slot_].watch != &watch)
        return true;  // from before a fork
    ::epoll_ctl(epoll_, EPOLL_CTL_DEL, watch.fd_, nullptr);
    places_[watch.slot_].watch = nullptr;
    free_.push_back(watch.slot_);  // never grows past places_.size(), which add() reserved
    return watch.events_.load(std::memory_order_acquire) == 0;
}

std::vector<poller::view> poller::look() {
    std::vector<view> seen;
    scoped_lock guard(lock_);
    for (const place& each : places_)
        if (each.watch)
            seen.push_back({each.watch->fd_, each.watch->on_->label()});
    return seen;
}

// ---- io_watch and embedded items -----------------------------------------------------------

embedded_item::embedded_item(function_type called) noexcept : function(called) {
    run = &embedded_tag;
}

void submit(queue_core* core, embedded_item* work) noexcept {
    if (core->is_special())
        core->submit_specially(work);
    else
        core->push(work);
}

io_watch::io_watch(function_type called) noexcept : work_(&io_watch::run), function_(called) {}

void io_watch::run(embedded_item* work) noexcept {
    // work_ is the first member.
    auto* self = reinterpret_cast<io_watch*>(work);
    self->function_(self);
}

int io_watch::start(int fd, std::uint32_t interest, queue_core* on) noexcept {
    fd_ = fd;
    on_ = on;
    return poller::shared().add(*this, interest);
}

int io_watch::modify(std::uint32_t interest) noexcept {
    return poller::shared().change(*this, interest);
}

bool io_watch::stop() noexcept {
    return poller::shared().remove(*this);
}

}  // namespace dispatch::detail
