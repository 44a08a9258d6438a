#include <gtest/gtest.h>

#include <functional>
#include <memory>

#include "dispatch/block.h"

namespace {

using dispatch::block;

TEST(Block, CopiesShareOneCallableAndTheLastOneDestroysIt) {
    auto token = std::make_shared<int>(0);
    block<int()> first([token, calls = 0]() mutable { return ++calls; });
    block<int()> second = first;
    EXPECT_EQ(first(), 1);
    EXPECT_EQ(second(), 2);
    first = nullptr;
    EXPECT_EQ(token.use_count(), 2);
    EXPECT_EQ(second(), 3);
    second = block<int()>();
    EXPECT_EQ(token.use_count(), 1);
}

TEST(Block, NullIsFalseAndMovedFromIsNull) {
    block<void()> made([] {});
    block<void()> moved = std::move(made);
    EXPECT_FALSE(made);  // NOLINT(bugprone-use-after-move)
    EXPECT_TRUE(moved);
    EXPECT_FALSE(block<void()>(nullptr));
    EXPECT_DEATH(made(), "a null block was called");  // NOLINT(bugprone-use-after-move)
}

TEST(Block, ALoanBecomesAHolderAgain) {
    auto token = std::make_shared<int>(7);
    auto made = std::make_unique<block<int()>>([token] { return *token; });
    const auto again = block<int()>::from_raw(made->get());
    made.reset();
    EXPECT_EQ(again(), 7);
}

int whichOverload(const std::function<void()>&) {
    return 1;
}
int whichOverload(const block<void()>&) {
    return 2;
}

TEST(Block, OverloadsWithStdFunctionDoNotCollideOnALambda) {
    EXPECT_EQ(whichOverload([] {}), 1);
    EXPECT_EQ(whichOverload(block<void()>([] {})), 2);
    static_assert(!std::is_convertible_v<void (*)(), block<void()>>);
}

}  // namespace
