#pragma once

#include <atomic>
#include <cstdint>

#include "plr/base/thread_annotations.h"

// A mutex for a handful of instructions: it spins for about as long as those
// take before it sleeps, and its tryLock() may be called in a signal handler.
// Four bytes. Not recursive.
namespace plr::detail {

class PLR_CAPABILITY("mutex") BriefMutex {
  public:
    void lock() noexcept PLR_ACQUIRE() {
        if (!tryLock()) [[unlikely]]
            lockSlowly();
    }
    [[nodiscard]] bool tryLock() noexcept PLR_TRY_ACQUIRE(true) {
        std::uint32_t expected = kFree;
        return state_.compare_exchange_strong(expected, kHeld, std::memory_order_acquire,
                                              std::memory_order_relaxed);
    }
    void unlock() noexcept PLR_RELEASE() {
        if (state_.exchange(kFree, std::memory_order_release) == kAwaited) [[unlikely]]
            state_.notify_one();
    }

  private:
    static constexpr std::uint32_t kFree = 0;
    static constexpr std::uint32_t kHeld = 1;
    static constexpr std::uint32_t kAwaited = 2;  // held, and somebody may sleep
    static constexpr unsigned kSpins = 100;

    [[gnu::noinline]] void lockSlowly() noexcept {
        for (unsigned i = 0; i < kSpins; ++i) {
            pause();
            std::uint32_t expected = kFree;
            if (state_.load(std::memory_order_relaxed) == kFree &&
                state_.compare_exchange_weak(expected, kHeld, std::memory_order_acquire,
                                             std::memory_order_relaxed))
                return;
        }
        while (state_.exchange(kAwaited, std::memory_order_acquire) != kFree)
            state_.wait(kAwaited, std::memory_order_relaxed);
    }
    static void pause() noexcept {
#if defined(__x86_64__) || defined(__i386__)
        __builtin_ia32_pause();
#elif defined(__aarch64__)
        asm volatile("yield");
#endif
    }

    std::atomic<std::uint32_t> state_{kFree};
};

class PLR_SCOPED_CAPABILITY BriefLock {
  public:
    explicit BriefLock(BriefMutex& mutex) noexcept PLR_ACQUIRE(mutex) : mutex_(mutex) {
        mutex_.lock();
    }
    ~BriefLock() PLR_RELEASE() { mutex_.unlock(); }
    BriefLock(const BriefLock&) = delete;
    BriefLock& operator=(const BriefLock&) = delete;

  private:
    BriefMutex& mutex_;
};

}  // namespace plr::detail
