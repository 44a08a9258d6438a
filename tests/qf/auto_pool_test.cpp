#include "plr/ob/auto_pool.h"

#include <gtest/gtest.h>

#include <utility>

#include "ob/ob.h"

namespace {

using plr::ob::AutoPool;

class AutoPoolTest : public testing::Test {
  protected:
    ~AutoPoolTest() override { ob_release(number_); }
    void autorelease() { ob_autorelease(ob_retain(number_)); }
    // References that pools hold.
    [[nodiscard]] long pooled() const { return ob_get_reference_count(number_) - 1; }

    ObNumber* number_ = ob_number_create_bool(true);
};

TEST_F(AutoPoolTest, ReleasesWhenItsLastOwnerEnds) {
    {
        AutoPool pool;
        {
            const AutoPool moved(std::move(pool));
            EXPECT_TRUE(moved);
            EXPECT_FALSE(pool);  // NOLINT(bugprone-use-after-move): owns none then
            autorelease();
        }
        EXPECT_EQ(pooled(), 0);
    }
    EXPECT_EQ(pooled(), 0);
}

TEST_F(AutoPoolTest, AssignmentEndsThePoolHeldBeforeAndGoesOn) {
    const AutoPool outermost;
    {
        AutoPool pool;
        for (int round = 0; round < 3; ++round) {
            autorelease();
            pool = AutoPool();
            EXPECT_EQ(pooled(), 0);
        }
        autorelease();
        AutoPool& same = pool;
        pool = std::move(same);
        EXPECT_EQ(pooled(), 1);
    }
    EXPECT_EQ(pooled(), 0);
    {
        AutoPool outer;
        autorelease();
        AutoPool inner;
        autorelease();
        inner = std::move(outer);
        EXPECT_EQ(pooled(), 1);
    }
    EXPECT_EQ(pooled(), 0);
}

TEST_F(AutoPoolTest, SwapExchangesPools) {
    AutoPool first;
    autorelease();
    {
        AutoPool second;
        autorelease();
        swap(first, second);
        EXPECT_EQ(pooled(), 2);
    }
    EXPECT_EQ(pooled(), 0) << "the end of the older pool is that of the younger, too";
}

}  // namespace
