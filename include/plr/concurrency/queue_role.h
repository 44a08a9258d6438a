#pragma once

#include <utility>

#include "dispatch/queue.h"
#include "plr/base/assert.h"
#include "plr/base/thread_annotations.h"

// A QueueRole is "running on this queue" as something that clang's
// thread-safety analysis understands: state that only the queue may touch is
// PLR_CONFINED_TO(role), members that run there are PLR_ON(role). A block that
// was queued starts with role.assertCurrent(), which tells the analysis and,
// in debug builds, checks.
//
// Owner:   the object whose queue it is; holds one reference of the queue.
// Threads: any.
namespace plr {

class PLR_CAPABILITY("queue") QueueRole {
  public:
    explicit QueueRole(dispatch::queue queue) noexcept : queue_(std::move(queue)) {}
    QueueRole(const QueueRole&) = delete;
    QueueRole& operator=(const QueueRole&) = delete;

    [[nodiscard]] const dispatch::queue& queue() const noexcept { return queue_; }

    // The caller runs on the queue: debug builds stop the process if not.
    void assertCurrent() const noexcept PLR_ASSERT_CAPABILITY(this) {
#ifdef PLR_DEBUG
        queue_.assert_current();
#endif
    }

  private:
    const dispatch::queue queue_;
};

}  // namespace plr
