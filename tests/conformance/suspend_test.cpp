#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::queue;
using plr::test::drain;
using plr::test::Event;

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
        child.async([&] {
            held.suspend();
            ran.signal();
        });
        child.async([&] { EXPECT_TRUE(resumed); });
        queue::create("beside").async([&] { ran.signal(); });
        EXPECT_TRUE(ran.wait() && ran.wait());
        resumed = true;
        held.resume();
        drain(child);
    }
}

// Suspensions come and go on several threads while work is pushed: nothing is
// lost, nothing runs twice, nothing stays parked.
TEST(Suspend, RacingWithWorkLosesNothing) {
    constexpr int kRounds = 3'000;
    const auto target = queue::create("target");
    const auto child = queue::create("child", target);
    int ran = 0;
    std::vector<std::thread> threads;
    for (int t = 0; t < 2; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < kRounds; ++i) {
                const queue& victim = (i + t) % 2 == 0 ? child : target;
                victim.suspend();
                child.async([&] { ++ran; });
                victim.resume();
            }
        });
    }
    threads.emplace_back([&] {
        for (int i = 0; i < kRounds; ++i) {
            if (i % 2 == 0)
                child.async([&] { ++ran; });
            else
                child.sync([&] { ++ran; });
        }
    });
    for (auto& each : threads)
        each.join();
    child.sync([&] { EXPECT_EQ(ran, 3 * kRounds); });
}

}  // namespace
