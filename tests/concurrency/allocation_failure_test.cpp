#include <gtest/gtest.h>

#include <memory>
#include <new>
#include <string>
#include <thread>

#include "plr/concurrency/priority_queue.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "support/failing_allocations.h"
#include "support/waiting.h"

namespace {

class Thing : public plr::SharedSynchronizable<Thing> {
  public:
    explicit Thing(plr::test::Event& end) : SharedSynchronizable("thing"), end_(end) {}
    ~Thing() {
        EXPECT_TRUE(ownQueue_.queue().is_current());
        end_.signal();
    }

  private:
    plr::test::Event& end_;
};

TEST(SharedSynchronizable, IsDestroyedOnItsQueueWhenItCannotBeOwned) {
    plr::test::Event end;
    auto* thing = new Thing(end);
    const auto own = [thing] { return Thing::make_shared_ptr(thing); };
    plr::test::succeedingAllocations = 0;
    EXPECT_THROW(static_cast<void>(own()), std::bad_alloc);
    EXPECT_TRUE(end.wait());
}

TEST(PriorityQueue, SaysWhichQueueCouldNotBeMade) {
    const auto makeAfter = [](int succeeding) {
        const std::string name = "q";  // labels need no memory of their own
        plr::test::succeedingAllocations = succeeding;
        const plr::concurrency::PriorityQueue made(name);
    };
    EXPECT_THROW(makeAfter(0), std::bad_alloc);
    EXPECT_DEATH(makeAfter(1), ": fNormalQueue");
    EXPECT_DEATH(makeAfter(2), ": fHighestQueue");
    makeAfter(3);
    plr::test::succeedingAllocations = -1;
}

TEST(PriorityQueue, GoesOnAfterASubmissionThatFoundNoMemory) {
    using enum plr::concurrency::PriorityQueue::Priority;
    const plr::concurrency::PriorityQueue queue("lanes");
    const dispatch::block<void()> nothing([] {});
    // A thread of its own: nodes are recycled by thread.
    std::thread([&] {
        plr::test::succeedingAllocations = 0;
        EXPECT_THROW(queue.addBlock(nothing, Highest), std::bad_alloc);
    }).join();
    queue.addBlockSync(nothing, Normal);
}

}  // namespace
