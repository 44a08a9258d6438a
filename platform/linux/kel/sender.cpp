#include "platform/linux/kel/sender.h"

#include <poll.h>
#include <sched.h>

#include <algorithm>
#include <exception>
#include <limits>
#include <utility>

namespace kel {
namespace {

using std::chrono::milliseconds;

// A thread that logs sends so many in a row for others at most.
constexpr unsigned kMostForOthers = 16;
constexpr unsigned kMostOnQueue = 256;
// Nobody tells when a kernel has memory, a terminal room, or a log comes back.
constexpr milliseconds kShortageDelay(10);
constexpr milliseconds kAbsenceDelay(50);

}  // namespace

sender::sender(identity who, places where)
    : who_(std::move(who)),
      keeps_backlog_(true),
      destination_(std::move(where), who_),
      queue_(dispatch::queue::create("kel")) {}

sender::sender(forked, sender& parents)
    : who_(parents.who_),
      keeps_backlog_(false),
      filter_(parents.filter_.load()),
      destination_(parents.destination_.where(), who_) {
    parents.destination_.close();
}

void sender::send(const kel_message& message) noexcept {
    if ((filter_.load(std::memory_order_relaxed) >> priority_of(message) & 1) == 0)
        return;
    try {
        record made = encode(message, who_);
        const lock_guard guard(lock_);
        if (!backlog_.push(std::move(made)))
            dropped_++;
        send_waiting(kMostForOthers);
    } catch (const std::exception&) {  // no memory
        const lock_guard guard(lock_);
        dropped_++;
        backlog_.lose_newest();
    }
}

void sender::send_waiting(unsigned most) noexcept {
    if (sending_ || waits_ != waiting::no)
        return;
    if (!keeps_backlog_)
        most = std::numeric_limits<unsigned>::max();
    sending_ = true;
    bool goes_on = true;
    for (unsigned count = 0; goes_on && !closed_ && count < most; count++)
        goes_on = tell_gap() && send_first();
    sending_ = false;
    if (goes_on && !closed_)
        wait_after(outcome::sent);
}

// Whether the next message may follow.
bool sender::tell_gap() noexcept {
    unreported_ += backlog_.take_loss();
    if (unreported_ == 0) [[likely]]
        return true;
    const std::uint64_t count = unreported_;
    try {
        const outcome result = attempt(encode_gap(count, who_));
        if (result == outcome::sent)
            unreported_ -= count;
        if (result == outcome::sent || result == outcome::refused)
            return true;
        wait_after(result);
    } catch (const std::exception&) {
        wait_after(outcome::shortage);
    }
    return false;
}

// Whether there was one and the next one may follow.
bool sender::send_first() noexcept {
    if (backlog_.empty())
        return false;
    const outcome result = attempt(backlog_.first());
    if (result == outcome::sent) {
        sent_++;
    } else if (result == outcome::refused) {
        dropped_++;
        unreported_++;
    } else {
        wait_after(result);
        return false;
    }
    backlog_.pop();
    return true;
}

// The lock is free meanwhile: others push and do not send.
outcome sender::attempt(const record& message) noexcept {
    lock_.unlock();
    outcome result = outcome::shortage;
    try {
        result = destination_.deliver(message, milliseconds(patience_.load()));
    } catch (const std::exception&) {  // no memory for a line
    }
    lock_.lock();
    return result;
}

// Arranges that go_on() is called when it may make sense.
void sender::wait_after(outcome why) noexcept {
    if (closed_)
        return;
    if (!keeps_backlog_) {
        drop_waiting();
        return;
    }
    try {
        if (why == outcome::full)
            watch();
        else
            go_on_after(why == outcome::sent     ? milliseconds(0)
                        : why == outcome::absent ? kAbsenceDelay
                                                 : kShortageDelay);
    } catch (const std::exception&) {
        waits_ = waiting::no;  // the next message tries
    }
}

void sender::drop_waiting() noexcept {
    for (; !backlog_.empty(); backlog_.pop()) {
        unreported_ += backlog_.take_loss() + 1;
        dropped_++;
    }
}

void sender::watch() {
    waits_ = waiting::for_room;
    if (room_)
        return;
    room_ = dispatch::source::writable(destination_.fd(), queue_);
    room_.set_event_handler(
        dispatch::block<void()>([self = shared_from_this()] { self->go_on(); }));
    room_.resume();
}

void sender::unwatch() noexcept {
    if (!room_)
        return;
    room_.cancel();
    room_ = {};
}

void sender::go_on_after(milliseconds delay) {
    waits_ = waiting::for_time;
    queue_.after(dispatch::time::after(delay),
                 dispatch::block<void()>([self = shared_from_this()] { self->go_on(); }));
}

// On the queue.
void sender::go_on() noexcept {
    const lock_guard guard(lock_);
    waits_ = waiting::no;
    send_waiting(kMostOnQueue);
    if (waits_ != waiting::for_room)
        unwatch();
}

void sender::set_limits(const kel_limits& limits) noexcept {
    patience_.store(limits.patience_ms);
    const lock_guard guard(lock_);
    backlog_.set_limits(limits.messages, limits.bytes);
}

kel_statistics sender::statistics() noexcept {
    const lock_guard guard(lock_);
    return {sent_, dropped_, backlog_.size()};
}

// Whether nothing is left; `waits` tells for what otherwise.
bool sender::send_all(waiting& waits) noexcept {
    const lock_guard guard(lock_);
    waits_ = waiting::no;
    send_waiting(kMostOnQueue);
    waits = waits_;
    return backlog_.empty() && !sending_ && waits_ == waiting::no;
}

bool sender::flush(milliseconds bound) noexcept {
    const auto end = std::chrono::steady_clock::now() + bound;
    waiting waits;
    while (!send_all(waits)) {
        const auto left = std::chrono::ceil<milliseconds>(end - std::chrono::steady_clock::now());
        if (left.count() <= 0)
            return false;
        pollfd socket{destination_.fd(), POLLOUT, 0};
        if (waits == waiting::for_room)
            ::poll(&socket, 1, static_cast<int>(left.count()));
        else
            ::poll(nullptr, 0, static_cast<int>(std::min(left, kShortageDelay).count()));
    }
    return true;
}

std::size_t sender::close() noexcept {
    const lock_guard guard(lock_);
    closed_ = true;
    while (sending_) {
        lock_.unlock();
        ::sched_yield();
        lock_.lock();
    }
    unwatch();
    return backlog_.size();
}

}  // namespace kel
