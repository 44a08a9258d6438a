#include <gtest/gtest.h>

#include <memory>
#include <new>

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

}  // namespace
