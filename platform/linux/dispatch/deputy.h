#pragma once

#include <atomic>
#include <cstdint>

// A thread that looks after the pool while there is something to look after:
// it wakes a sleeping worker when work waits behind one that takes long or when
// nobody polls, and adds workers when all of them block where the library cannot
// see it. It sleeps without a tick when the pool is quiet, and is made on first use.
namespace dispatch::detail {

class deputy {
  public:
    // Something was left undone that the deputy shall check. Any thread; one
    // load while it is awake already.
    static void watch() noexcept {
        if (!watching_.load(std::memory_order_relaxed))
            start();
    }

    // In the child of a fork: the thread is the parent's.
    static void forked() noexcept {
        made_.store(false, std::memory_order_relaxed);
        watching_.store(0, std::memory_order_relaxed);
    }

  private:
    static void start() noexcept;
    static void* main(void*) noexcept;
    static void observe() noexcept;

    static std::atomic<std::uint32_t> watching_;  // futex: 0 asleep, 1 awake
    static std::atomic<bool> made_;
};

}  // namespace dispatch::detail
