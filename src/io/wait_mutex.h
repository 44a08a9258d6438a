#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>

#include "plr/base/thread_annotations.h"

// std::mutex with waits, under clang's thread-safety analysis.
namespace plr::io {

class PLR_CAPABILITY("mutex") WaitMutex {
  public:
    using Clock = std::chrono::steady_clock;

    void lock() PLR_ACQUIRE() { held_.lock(); }
    void unlock() noexcept PLR_RELEASE() { held_.unlock(); }

    void wait(std::condition_variable& changed) PLR_REQUIRES(this) {
        std::unique_lock held(held_, std::adopt_lock);
        changed.wait(held);
        held.release();
    }
    // False when `end` came first.
    bool waitUntil(std::condition_variable& changed, Clock::time_point end) PLR_REQUIRES(this) {
        std::unique_lock held(held_, std::adopt_lock);
        const bool inTime = changed.wait_until(held, end) == std::cv_status::no_timeout;
        held.release();
        return inTime;
    }

  private:
    std::mutex held_;
};

class PLR_SCOPED_CAPABILITY WaitLock {
  public:
    explicit WaitLock(WaitMutex& mutex) PLR_ACQUIRE(mutex) : mutex_(mutex) { mutex_.lock(); }
    ~WaitLock() PLR_RELEASE() { mutex_.unlock(); }
    WaitLock(const WaitLock&) = delete;
    WaitLock& operator=(const WaitLock&) = delete;

  private:
    WaitMutex& mutex_;
};

// The other way: the mutex is free for the scope. (To the analysis its end is the
// release of a release.)
class PLR_SCOPED_CAPABILITY WaitUnlock {
  public:
    explicit WaitUnlock(WaitMutex& mutex) PLR_RELEASE(mutex) : mutex_(mutex) { mutex_.unlock(); }
    ~WaitUnlock() PLR_RELEASE() { mutex_.lock(); }
    WaitUnlock(const WaitUnlock&) = delete;
    WaitUnlock& operator=(const WaitUnlock&) = delete;

  private:
    WaitMutex& mutex_;
};

}  // namespace plr::io
