#pragma once

#include <cstdint>
#include <string>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"

// A PriorityQueue runs blocks one at a time, like a serial queue, with two
// priorities: a block of the highest one holds back every normal block that has
// not started yet, until it has run.
//
// Owner:   handles: copies share the queues, work that waits keeps them alive.
//          A moved-from one is a copy: it stays usable.
// Queues:  "<name>.normal" and "<name>.highest" only order what waits; both
//          target "<name>.work", on which everything runs.
// Order:   normal blocks run in the order of their submission, and so do the
//          highest ones. A highest block starts before every normal one that
//          had not started when it was submitted; a normal block that was about
//          to start on another thread just then may still come first. Highest
//          blocks submitted by blocks stack: normal ones wait for all of them.
// Cost:    a normal block is an async(); a highest one is that and a counted
//          suspension: whatever the number of normal blocks that wait, it starts
//          after the one that runs (bench/dispatch_pelorin.cpp).
// Threads: any. The operations that wait must not be called by a block of the
//          same queue: that stops the process.
//
// Blocks are not null. Those that are submitted are released on the work queue,
// after their run.
// Submitting throws std::bad_alloc, and has changed nothing then.
namespace plr::concurrency {

class PLR_EXPORT PriorityQueue {
  public:
    // Every other value is a normal priority, too.
    enum class Priority : std::int32_t { Normal = 0, Highest = 1 };

    // Three queues, labelled with `name` and the suffixes above. Without memory
    // for the normal or the highest one the process stops with the reason
    // "fNormalQueue" or "fHighestQueue"; without memory for the work queue alone
    // this throws std::bad_alloc.
    explicit PriorityQueue(const std::string& name);
    PriorityQueue(const PriorityQueue&) = default;
    PriorityQueue& operator=(const PriorityQueue&) = default;
    ~PriorityQueue() = default;

    // Submits `block` and returns.
    void addBlock(dispatch::block<void()> block, Priority priority) const;
    void addHighestPriorityBlock(dispatch::block<void()> block) const;

    // The same; `group` counts the block until it has run.
    void addBlock(const dispatch::group& group, dispatch::block<void()> block,
                  Priority priority) const;
    void addHighestPriorityBlock(const dispatch::group& group, dispatch::block<void()> block) const;

    // Returns when `block` has run, which it does on the calling thread.
    void addBlockSync(const dispatch::block<void()>& block, Priority priority) const;
    void addHighestPriorityBlockSync(const dispatch::block<void()>& block) const;

    // Submits `block` once, when `group` has completed; a highest block holds
    // normal ones back from then on only.
    void notifyOn(const dispatch::group& group, dispatch::block<void()> block,
                  Priority priority) const;

    // Counted: no block of either priority starts before every suspend() has had
    // its resume(). The last copy must not go while suspended.
    void suspend();
    void resume();

    // Stops the process, naming the work queue, unless the calling thread runs a
    // block of this queue.
    void assertSynchronized() const;

  private:
    // The order of the fields is that of release, from last to first.
    dispatch::queue normal_;
    dispatch::queue highest_;
    dispatch::queue work_;
};

}  // namespace plr::concurrency
