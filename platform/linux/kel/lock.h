#pragma once

#include <mutex>

#include "platform/linux/dispatch/spin_lock.h"
#include "plr/base/thread_annotations.h"

// std::mutex and its guard under clang's thread-safety analysis.
namespace kel {

class PLR_CAPABILITY("mutex") mutex {
  public:
    void lock() noexcept PLR_ACQUIRE() { held_.lock(); }
    [[nodiscard]] bool try_lock() noexcept PLR_TRY_ACQUIRE(true) { return held_.try_lock(); }
    void unlock() noexcept PLR_RELEASE() { held_.unlock(); }

  private:
    std::mutex held_;
};

using lock_guard = dispatch::detail::scoped_lock<mutex>;

}  // namespace kel
