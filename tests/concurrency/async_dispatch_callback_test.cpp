#include "plr/concurrency/async_dispatch_callback.h"

#include "support/waiting.h"

namespace {

TEST(AsyncDispatchCallback, DeliversInOrderOnItsQueue) {
    const auto queue = dispatch::queue::create("callback");
    std::vector<bool> values;  // touched on the queue only
    const dispatch::block<void(bool)> block([&](bool value) {
        EXPECT_TRUE(queue.is_current());
        values.push_back(value);
    });
    const std::unique_ptr<PelorinAsyncCallback<bool>> callback =
        std::make_unique<PelorinAsyncDispatchCallback>(queue, block);
    callback->invoke(true);
    callback->invoke(false);
    EXPECT_EQ(queue.sync([&] { return values; }), (std::vector<bool>{true, false}));
}

TEST(AsyncDispatchCallback, HoldsNeitherTheBlockNorACopyOfIt) {
    const auto queue = dispatch::queue::create("callback");
    const dispatch::block<void(bool)> block([](bool) {});
    PelorinAsyncDispatchCallback callback(queue, block);
    queue.suspend();
    callback.invoke(true);
    EXPECT_EQ(block.get()->references.load(), 1U);
    queue.resume();
    plr::test::drain(queue);
}

}  // namespace
