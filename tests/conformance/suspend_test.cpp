#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::queue;
using namespace plr::test;

TEST(Suspend, HoldsWorkAndSyncCallersBackUntilEveryResumeCame) {
    const auto target = queue::create("target");
    const auto child = queue::create("child", target);
    std::atomic<int> ran{0};
    target.suspend();
    target.suspend();
    for (const queue& each : {child, target})
        each.async([&] { ++ran; });
    std::thread caller([&] { child.sync([&] { ++ran; }); });
    target.resume();
    // A queue beside it that went through the same pool has run.
    drain(queue::create("beside"));
    EXPECT_EQ(ran, 0);
    target.resume();
    caller.join();
    drain(target);
    EXPECT_EQ(ran, 3);
}

TEST(Suspend, FromItsOwnWorkTakesEffectBeforeTheNextPiece) {
    const auto target = queue::create("target");
    const auto child = queue::create("child", target);
    for (const queue& held : {child, target}) {
        Event ran;
        std::atomic<bool> resumed{false};
        child.suspend();  // until both are there
        child.async([&] {
            held.suspend();
            ran.signal();
        });
        child.async([&] { EXPECT_TRUE(resumed); });
        child.resume();
        queue::create("beside").async([&] { ran.signal(); });
        EXPECT_TRUE(ran.wait() && ran.wait());
        resumed = true;
        held.resume();
        drain(child);
    }
}

}  // namespace
