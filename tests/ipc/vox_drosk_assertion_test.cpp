#include "plr/ipc/vox_drosk_assertion.h"

#include "support/failing_allocations.h"
#include "support/waiting.h"
#include "vox/service.h"

namespace {

class DroskAssertion : public ::testing::Test {
  protected:
    ~DroskAssertion() override { EXPECT_EQ(vox_transaction_count(), 0u); }

    std::shared_ptr<plr::VoxDroskAssertion> assertion =
        plr::VoxDroskAssertion::create_default_global();
};

TEST_F(DroskAssertion, NamesWhatIsUnderWay) {
    EXPECT_EQ(assertion->dumpState(), "No Assertions");
    EXPECT_EQ(assertion->getAssertionCount(), 0u);
    auto a = assertion->createActivity("a");
    const auto b = assertion->createActivity("b");
    const auto again = b;
    EXPECT_EQ(*a, "a");
    EXPECT_EQ(vox_transaction_count(), 2u);
    EXPECT_EQ(assertion->dumpState(), "Assertions remaining: a,b");
    a.reset();
    EXPECT_EQ(vox_transaction_count(), 1u);
    EXPECT_EQ(assertion->dumpState(), "Assertions remaining: b");
    EXPECT_EQ(assertion->getAssertionCount(), 1u);
}

// What ended is in the list until it is tidied up: here it ends without the
// object's knowledge.
TEST_F(DroskAssertion, ShowsAndCountsWhatEndedUntilItIsTidiedUp) {
    auto a = std::make_shared<std::string>("a");
    assertion->addActivity(a);
    auto b = assertion->createActivity("b");
    a.reset();
    EXPECT_EQ(assertion->dumpState(), "Assertions remaining: <expired>,b");
    EXPECT_EQ(assertion->getAssertionCount(), 2u);
    assertion->tidyUp();
    EXPECT_EQ(assertion->getAssertionCount(), 1u);
    b.reset();
    assertion->addActivity(std::make_shared<std::string>("gone"));
    EXPECT_EQ(assertion->dumpState(), "No Assertions");
    EXPECT_EQ(assertion->getAssertionCount(), 1u);
}

TEST_F(DroskAssertion, IsOutlivedByItsActivities) {
    auto activity = assertion->createActivity("a");
    assertion.reset();
    EXPECT_EQ(vox_transaction_count(), 1u);
    activity.reset();
}

TEST_F(DroskAssertion, LeavesNoTransactionOpenWhenAnActivityCannotBegin) {
    plr::VoxDroskAssertion unowned;
    EXPECT_THROW(static_cast<void>(unowned.createActivity("a")), std::bad_weak_ptr);
    EXPECT_EQ(vox_transaction_count(), 0u);
    int failures = 0;
    for (;; ++failures) {
        std::string name = "a name that is too long to stand inside the string";
        plr::test::succeedingAllocations = failures;
        std::shared_ptr<std::string> activity;
        try {
            activity = assertion->createActivity(std::move(name));
        } catch (const std::bad_alloc&) {
        }
        const bool failed = std::exchange(plr::test::succeedingAllocations, -1) < 0;
        EXPECT_EQ(vox_transaction_count(), activity ? 1u : 0u) << "allocation " << failures;
        EXPECT_EQ(activity == nullptr, failed);
        if (activity)
            break;
    }
    EXPECT_GE(failures, 2);  // the name's string and the handle
}

TEST_F(DroskAssertion, IsUsedByManyThreads) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i)
        threads.emplace_back([this] {
            std::shared_ptr<std::string> last;
            for (int n = 0; n < 2000; ++n)
                last = assertion->createActivity(std::to_string(n));
        });
    for (std::thread& each : threads)
        each.join();
    EXPECT_EQ(vox_transaction_count(), 0u);
    EXPECT_EQ(assertion->getAssertionCount(), 0u);
}

}  // namespace
