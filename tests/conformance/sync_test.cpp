#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <thread>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::queue;
using dispatch::time;
using namespace plr::test;

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

TEST(Sync, OntoTheQueueOneIsOnStopsTheProcess) {
    const auto target = queue::create("upper");
    const auto child = queue::create("lower", target);
    const auto other = queue::create("other");
    EXPECT_DEATH(child.sync([&] { child.sync([] {}); }), "'lower'");
    EXPECT_DEATH(child.sync([&] { target.sync([] {}); }), "'upper'");
    EXPECT_DEATH(target.sync([&] { child.sync([] {}); }), "'upper'");
    EXPECT_DEATH(child.sync([&] { other.sync([&] { child.sync([] {}); }); }), "'lower'");
}

// Many more workers than processors wait for what is queued behind them: in sync(), for a
// group, and where the pool cannot see it. Others are served meanwhile.
TEST(Sync, WorkersThatWaitAreReplaced) {
    constexpr int kWaiters = 40;
    struct Held {
        const queue busy = queue::create("busy");
        const dispatch::group awaited;
        Event event;
    };
    const std::pair<const char*, void (*)(Held&)> rows[] = {
        {"sync", [](Held& held) { held.busy.sync([] {}); }},
        {"group", [](Held& held) { EXPECT_EQ(held.awaited.wait(time::after(kBound)), 0); }},
        {"elsewhere", [](Held& held) { EXPECT_TRUE(held.event.wait()); }},
    };
    for (const auto& [name, wait] : rows) {
        SCOPED_TRACE(name);
        Held held;
        held.busy.suspend();
        held.awaited.enter();
        const dispatch::group all;
        std::atomic<int> started{0};
        Event everybody;
        for (int i = 0; i < kWaiters; ++i)
            all.async(queue::global(), [&, wait = wait] {
                if (++started == kWaiters)
                    everybody.signal();
                wait(held);
            });
        EXPECT_TRUE(everybody.wait());
        const auto timed = queue::create("timed");
        timed.after(time::after(std::chrono::milliseconds(1)), dispatch::block<void()>([&] {
                        held.busy.resume();
                        held.awaited.leave();
                        for (int i = 0; i < kWaiters; ++i)
                            held.event.signal();
                    }));
        EXPECT_EQ(all.wait(time::after(kBound)), 0);
        drain(timed);
    }
}

}  // namespace
