#pragma once

#include <atomic>
#include <cstdint>

#include "dispatch/queue.h"

// What the other services of this port use of the queues beyond the public
// interface: work without allocation, and descriptor events delivered straight
// to a queue.
namespace dispatch::detail {

// Work that is part of a longer-lived object instead of a node. It may be
// submitted again as soon as `function` has been entered, not before.
struct embedded_item : item {
    using function_type = void (*)(embedded_item*) noexcept;
    explicit embedded_item(function_type called) noexcept;
    function_type function;
};

void submit(queue_core* core, embedded_item* work) noexcept;

// Edge-triggered events of one descriptor (epoll(7)), delivered as calls of
// one function on a queue: on the very thread that woke up for them when the
// queue is idle.
//
// Owner:   the object it is part of, which lives until stop() returned true or
//          the one outstanding call came.
// Threads: start(), modify() and stop() on any thread, one at a time.
class io_watch {
  public:
    using function_type = void (*)(io_watch*) noexcept;
    explicit io_watch(function_type called) noexcept;
    io_watch(const io_watch&) = delete;
    io_watch& operator=(const io_watch&) = delete;

    // Watches `fd` for `interest` (EPOLLIN, EPOLLOUT; hang-up and errors always
    // come). `on` is lent and outlives the watch. Returns 0 or an error number.
    [[nodiscard]] int start(int fd, std::uint32_t interest, queue_core* on) noexcept;
    // Replaces the interest; what is ready already is delivered again.
    [[nodiscard]] int modify(std::uint32_t interest) noexcept;
    // Ends the watch; the descriptor may be closed afterwards. Returns true when
    // no call will come any more, false when one is queued and still comes.
    [[nodiscard]] bool stop() noexcept;

    // In the function: the events (EPOLL*) since it was last asked. A call comes
    // only when some are there; after this one, new events make a new call.
    [[nodiscard]] std::uint32_t take_events() noexcept {
        return events_.exchange(0, std::memory_order_acq_rel);
    }

  private:
    friend class poller;
    static void run(embedded_item* work) noexcept;

    embedded_item work_;
    function_type function_;
    queue_core* on_ = nullptr;
    std::atomic<std::uint32_t> events_{0};
    int fd_ = -1;
    std::uint32_t slot_ = 0;  // place in the poller's table, with its generation
    std::uint32_t generation_ = 0;
};

}  // namespace dispatch::detail
