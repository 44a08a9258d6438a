#pragma once

#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <climits>
#include <cstdint>

// Waiting for another thread or process, the same way for every peer.
// Both classes may stand in memory shared between processes.
namespace bench {

namespace detail {

inline void futexWait(std::atomic<std::uint32_t>& word, std::uint32_t seen) noexcept {
    ::syscall(SYS_futex, &word, FUTEX_WAIT, seen, nullptr, nullptr, 0);
}

inline void futexWake(std::atomic<std::uint32_t>& word) noexcept {
    ::syscall(SYS_futex, &word, FUTEX_WAKE, INT_MAX, nullptr, nullptr, 0);
}

}  // namespace detail

// One signal, one waiter; ready for reuse after wait(). Does not spin; a signal
// makes a system call only when the waiter sleeps.
class Event {
  public:
    void signal() noexcept {
        if (state_.exchange(kSignalled, std::memory_order_acq_rel) == kWaiting)
            detail::futexWake(state_);
    }

    void wait() noexcept {
        std::uint32_t expected = kIdle;
        state_.compare_exchange_strong(expected, kWaiting, std::memory_order_acq_rel);
        while (state_.load(std::memory_order_acquire) != kSignalled)
            detail::futexWait(state_, kWaiting);
        state_.store(kIdle, std::memory_order_release);
    }

  private:
    static constexpr std::uint32_t kIdle = 0;
    static constexpr std::uint32_t kSignalled = 1;
    static constexpr std::uint32_t kWaiting = 2;
    std::atomic<std::uint32_t> state_{kIdle};
};

}  // namespace bench
