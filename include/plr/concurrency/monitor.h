#pragma once

#include <string>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/time.h"
#include "plr/base/export.h"
#include "plr/concurrency/priority_queue.h"

// A Monitor is a PriorityQueue and a group of what was submitted to it, so that
// one can wait for all of it.
//
// Owner:   whoever made it; blocks that wait do not need it. A child shares its
//          parent's queue and group, and may outlive it.
// Threads: any; what waits must not be called by a block of the same queue.
//
// Order, cost and failures are those of PriorityQueue.
namespace plr::concurrency {

class PLR_EXPORT Monitor {
  public:
    using Priority = PriorityQueue::Priority;

    // A queue of its own, and a group. Throws std::bad_alloc.
    explicit Monitor(const std::string& name);
    // Shares what `parent` (not null) has: each waits for the other's work, too.
    // The name is not used.
    Monitor(Monitor* parent, const std::string& name);
    Monitor(const Monitor&) = delete;
    Monitor& operator=(const Monitor&) = delete;
    virtual ~Monitor();

    // Submits `block` as a member of the monitor's group, or of `group` instead.
    void executeBlock(dispatch::block<void()> block, Priority priority);
    void executeBlock(dispatch::block<void()> block, Priority priority) const;
    void executeBlock(const dispatch::group& group, dispatch::block<void()> block,
                      Priority priority);
    void executeBlock(const dispatch::group& group, dispatch::block<void()> block,
                      Priority priority) const;

    // Submits `block`, outside of every group, and waits until it has run or
    // `timeout` has passed; which of them is not told. After a time-out the block
    // still runs when its turn comes. dispatch::forever runs it on the calling
    // thread.
    void executeBlockAndWait(dispatch::block<void()> block, Priority priority,
                             dispatch::time timeout);
    void executeBlockAndWait(dispatch::block<void()> block, Priority priority,
                             dispatch::time timeout) const;

    // Waits until nothing of the monitor's group is left or `timeout` has passed.
    // Returns 0 when nothing is left, non-zero on time-out.
    [[nodiscard]] long waitForCompletion(dispatch::time timeout);
    [[nodiscard]] long waitForCompletion(dispatch::time timeout) const;

    // Submits `block` once `group` has completed.
    void notifyOnCompletion(const dispatch::group& group, dispatch::block<void()> block,
                            Priority priority);
    void notifyOnCompletion(const dispatch::group& group, dispatch::block<void()> block,
                            Priority priority) const;

    // Counted; of the queue, so of all that share it.
    void suspend();
    void resume();
    // Runs `block` at once on the calling thread while the queue is suspended.
    // What runs on the queue already may still be running beside it.
    void suspendAndExecute(const dispatch::block<void()>& block);

  private:
    PriorityQueue queue_;
    dispatch::group group_;
};

}  // namespace plr::concurrency
