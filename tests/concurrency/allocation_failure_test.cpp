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
    const std::string name(100, 'q');  // a label that needs memory of its own
    const auto makeAfter = [&name](int succeeding) {
        plr::test::succeedingAllocations = succeeding;
        const plr::concurrency::PriorityQueue made(name);
    };
    makeAfter(-1);
    const std::size_t before = plr::test::allocations;
    makeAfter(-1);
    const int each = static_cast<int>(plr::test::allocations - before) / 3;
    EXPECT_THROW(makeAfter(0), std::bad_alloc);
    EXPECT_DEATH(makeAfter(each), ": fNormalQueue");
    EXPECT_DEATH(makeAfter(2 * each), ": fHighestQueue");
}

}  // namespace
