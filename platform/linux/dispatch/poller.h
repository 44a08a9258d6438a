#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/linux/dispatch/fork.h"
#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/dispatch/spin_lock.h"
#include "platform/linux/dispatch/timer_queue.h"

// The one epoll instance: descriptor events, timers and the interruption of the
// idle worker that waits here. Never destroyed.
namespace dispatch::detail {

struct worker;

class poller {
  public:
    static poller& shared() noexcept;

    // Waits for events, takes the worker from among the sleepers, and submits
    // what the events are for. One worker at a time.
    void wait(worker& self) noexcept;
    // Makes wait() return, now or the next time. Any thread.
    void interrupt() noexcept;

    [[nodiscard]] timer_queue& timers() noexcept { return timers_; }

    // For forks. The child has descriptors of its own, and nothing is waited for.
    void at_fork(forks::moment when) noexcept;
    void forked() noexcept;

    // For io_watch.
    [[nodiscard]] int add(io_watch& watch, std::uint32_t interest) noexcept;
    [[nodiscard]] int change(io_watch& watch, std::uint32_t interest) noexcept;
    [[nodiscard]] bool remove(io_watch& watch) noexcept;

    // A watched descriptor and the queue that its events are for.
    struct view {
        int fd;
        std::string label;
    };
    [[nodiscard]] std::vector<view> look();

  private:
    // A watch may end while its event is on the way from the kernel: events
    // carry the place in the table and its generation, not a pointer.
    struct place {
        io_watch* watch = nullptr;
        std::uint32_t generation = 0;
    };

    poller() noexcept;
    void open() noexcept;
    void deliver(std::uint64_t tag, std::uint32_t events) noexcept;
    static std::uint64_t tag_of(const io_watch& watch) noexcept;

    int epoll_ = -1;
    int interruption_ = -1;  // eventfd, edge-triggered, so that nobody has to read it
    timer_queue timers_;
    spin_lock lock_;
    std::vector<place> places_ PLR_GUARDED_BY(lock_);
    std::vector<std::uint32_t> free_ PLR_GUARDED_BY(lock_);
};

}  // namespace dispatch::detail
