#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::queue;
using plr::test::drain;
using plr::test::Event;

TEST(Sync, RunsInPlaceOnAnIdleQueueAndReturnsTheResult) {
    const auto serial = queue::create("serial");
    const auto here = std::this_thread::get_id();
    EXPECT_EQ(serial.sync([] { return std::this_thread::get_id(); }), here);
    const std::unique_ptr<int> moved = serial.sync([] { return std::make_unique<int>(5); });
    EXPECT_EQ(*moved, 5);
    int value = 1;
    int& reference = serial.sync([&]() -> int& { return value; });
    EXPECT_EQ(&reference, &value);
}

TEST(Sync, WaitsItsTurnOnABusyQueueAndThenRunsOnTheCallersThread) {
    const auto serial = queue::create("serial");
    Event running;
    Event release;
    int order = 0;
    serial.async([&] {
        running.signal();
        EXPECT_TRUE(release.wait());
        EXPECT_EQ(order++, 0);
    });
    EXPECT_TRUE(running.wait());
    serial.async([&] { EXPECT_EQ(order++, 1); });
    std::thread releaser([&] { release.signal(); });
    const auto here = std::this_thread::get_id();
    serial.sync([&] {
        EXPECT_EQ(std::this_thread::get_id(), here);
        EXPECT_EQ(order++, 2);
        serial.async([&] { EXPECT_EQ(order++, 3); });
    });
    releaser.join();
    drain(serial);
    EXPECT_EQ(order, 4);
}

TEST(Sync, FromManyThreadsAtOnceMixedWithAsyncLosesNothing) {
    constexpr int kThreads = 6;
    constexpr int kEach = 4'000;
    const auto target = queue::create("target");
    const std::vector<queue> levels = {target, queue::create("one", target),
                                       queue::create("two", queue::create("mid", target))};
    int counted = 0;
    int inside = 0;
    int faults = 0;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < kEach; ++i) {
                const queue& on = levels[static_cast<unsigned>(t + i) % levels.size()];
                const auto work = [&] {
                    faults += inside++ != 0;
                    ++counted;
                    --inside;
                };
                if (i % 3 == 0)
                    on.async(work);
                else
                    on.sync(work);
            }
        });
    }
    for (auto& each : threads)
        each.join();
    for (const queue& each : levels)
        drain(each);
    EXPECT_EQ(counted, kThreads * kEach);
    EXPECT_EQ(faults, 0);
}

TEST(Sync, OntoTheQueueOneIsOnStopsTheProcess) {
    const auto target = queue::create("upper");
    const auto child = queue::create("lower", target);
    const auto other = queue::create("other");
    EXPECT_DEATH(child.sync([&] { child.sync([] {}); }), "'lower'");
    EXPECT_DEATH(child.sync([&] { target.sync([] {}); }), "'upper'");
    EXPECT_DEATH(target.sync([&] { child.sync([] {}); }), "'upper'");
    EXPECT_DEATH(child.sync([&] { other.sync([&] { child.sync([] {}); }); }), "'lower'");
}

// Many more workers than processors wait in sync() for work that is queued
// behind them.
TEST(Sync, BlockedWorkersAreReplaced) {
    constexpr int kWaiters = 40;
    const auto busy = queue::create("busy");
    Event release;
    busy.async([&] { EXPECT_TRUE(release.wait()); });
    dispatch::group all;
    std::atomic<int> started{0};
    std::atomic<int> finished{0};
    Event everybody;
    for (int i = 0; i < kWaiters; ++i) {
        all.async(queue::global(), [&] {
            if (++started == kWaiters)
                everybody.signal();
            busy.sync([&] { ++finished; });
        });
    }
    EXPECT_TRUE(everybody.wait());
    queue::global().async([&] { release.signal(); });
    EXPECT_EQ(all.wait(dispatch::time::after(plr::test::kBound)), 0);
    EXPECT_EQ(finished, kWaiters);
}

// The pool cannot see these block.
TEST(Sync, WorkersThatBlockElsewhereDoNotStopTheRest) {
    constexpr int kBlocked = 24;
    Event release;
    dispatch::group all;
    for (int i = 0; i < kBlocked; ++i)
        all.async(queue::create("blocked"), [&] { EXPECT_TRUE(release.wait()); });
    Event ran;
    queue::create("free").async([&] { ran.signal(); });
    EXPECT_TRUE(ran.wait());
    Event timer;
    queue::create("timed").after(dispatch::time::after(std::chrono::milliseconds(1)),
                                 dispatch::block<void()>([&] { timer.signal(); }));
    EXPECT_TRUE(timer.wait());
    for (int i = 0; i < kBlocked; ++i)
        release.signal();
    EXPECT_EQ(all.wait(dispatch::time::after(plr::test::kBound)), 0);
}

}  // namespace
