#pragma once

#include <memory>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"

// A VoxDroskAssertion keeps an idle service process alive for as long as named
// activities are under way, and tells which these are.
//
// An activity is a handle: a shared string that is the activity's name. From its
// creation until its last copy is dropped it holds one Vox transaction
// (vox/service.h), whether or not the assertion object still exists.
//
// Owner:   the std::shared_ptr of create_default_global(); a process keeps one.
//          Activities are their holders'; the object knows them weakly.
// Queue:   "VoxDroskAssertion" owns the list of activities.
// Threads: any; getAssertionCount() and dumpState() wait for the queue and must
//          not be called on it.
// Cost:    an activity is three allocations and two queued nodes.
namespace plr {

class PLR_EXPORT VoxDroskAssertion final : public SharedSynchronizable<VoxDroskAssertion> {
  public:
    VoxDroskAssertion();
    ~VoxDroskAssertion();
    [[nodiscard]] static std::shared_ptr<VoxDroskAssertion> create_default_global();

    // Begins an activity, which ends with the last copy of the handle, on the
    // thread that drops it. Throws std::bad_weak_ptr when the object has no owner,
    // and std::bad_alloc; then no transaction is left open.
    [[nodiscard]] std::shared_ptr<std::string> createActivity(std::string name);

    // Adds an activity behind those in the list.
    void addActivity(std::weak_ptr<std::string> activity);
    // Removes from the list what has ended.
    void tidyUp();

    // Deliberate: activities that ended are counted until a tidyUp() has run.
    [[nodiscard]] unsigned long getAssertionCount() const;

    // "Assertions remaining: " and the names in order of creation, with commas between,
    // "<expired>" for those that ended; "No Assertions" when no activity is left.
    [[nodiscard]] std::string dumpState() const;
    [[nodiscard]] std::string dumpState_sync() const PLR_ON(ownQueue_);

  private:
    std::vector<std::weak_ptr<std::string>> activities_ PLR_CONFINED_TO(ownQueue_);
};

}  // namespace plr
