#pragma once

#include <mutex>

#include "plr/base/thread_annotations.h"

// std::mutex and its guard under clang's thread-safety analysis.
namespace vox_link {

class PLR_CAPABILITY("mutex") mutex {
  public:
    void lock() noexcept PLR_ACQUIRE() { held_.lock(); }
    void unlock() noexcept PLR_RELEASE() { held_.unlock(); }

  private:
    std::mutex held_;
};

class PLR_SCOPED_CAPABILITY lock_guard {
  public:
    explicit lock_guard(mutex& guarded) noexcept PLR_ACQUIRE(guarded) : guarded_(guarded) {
        guarded_.lock();
    }
    ~lock_guard() PLR_RELEASE() { guarded_.unlock(); }
    lock_guard(const lock_guard&) = delete;
    lock_guard& operator=(const lock_guard&) = delete;

  private:
    mutex& guarded_;
};

// Marks state and members that belong to a connection's target queue.
class PLR_CAPABILITY("queue") queue_role {
  public:
    // States that the calling thread is on the queue: the entry points that
    // the queue itself calls.
    void entered() const noexcept PLR_ASSERT_CAPABILITY(this) {}
};

}  // namespace vox_link
