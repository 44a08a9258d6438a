#include <gtest/gtest.h>

#include <atomic>
#include <optional>
#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::group;
using dispatch::group_session;
using dispatch::queue;
using plr::test::drain;
using plr::test::Event;

TEST(Group, WaitTellsDoneFromTimeOut) {
    const group work;
    EXPECT_EQ(work.wait(dispatch::immediately), 0);
    work.enter();
    EXPECT_NE(work.wait(dispatch::immediately), 0);
    EXPECT_NE(work.wait(dispatch::time::after(std::chrono::milliseconds(1))), 0);
    EXPECT_NE(work.wait(dispatch::time::after(std::chrono::milliseconds(1), dispatch::clock::wall)),
              0);
    queue::global().async([&] { work.leave(); });
    EXPECT_EQ(work.wait(dispatch::time::after(plr::test::kBound)), 0);
}

TEST(Group, NotifiesExactlyOnceWhenTheCountIsZero) {
    const auto serial = queue::create("serial");
    const group work;
    int notified = 0;
    work.notify(serial, block<void()>([&] { ++notified; }));  // at once: nobody entered
    drain(serial);
    EXPECT_EQ(notified, 1);
    work.enter();
    work.notify(serial, block<void()>([&] { notified += 10; }));
    work.notify(serial, block<void()>([&] { notified += 100; }));
    drain(serial);
    EXPECT_EQ(notified, 1);
    work.leave();
    drain(serial);
    EXPECT_EQ(notified, 111);
    work.enter();
    work.leave();
    drain(serial);
    EXPECT_EQ(notified, 111);
}

// Enters, leaves, notifications and waits race; every notification comes once
// and every wait returns.
TEST(Group, RacingNotificationsComeExactlyOnce) {
    constexpr int kRounds = 5'000;
    const auto serial = queue::create("serial");
    const group work;
    std::vector<int> notified(kRounds, 0);
    std::vector<std::thread> threads;
    for (int t = 0; t < 3; ++t) {
        threads.emplace_back([&] {
            for (int i = 0; i < kRounds; ++i) {
                work.enter();
                work.leave();
            }
        });
    }
    threads.emplace_back([&] {
        for (unsigned i = 0; i < kRounds; ++i)
            work.notify(serial, block<void()>([&, i] { ++notified[i]; }));
    });
    threads.emplace_back([&] {
        for (int i = 0; i < kRounds / 10; ++i)
            EXPECT_EQ(work.wait(dispatch::time::after(plr::test::kBound)), 0);
    });
    for (auto& each : threads)
        each.join();
    drain(serial);
    EXPECT_EQ(notified, std::vector<int>(kRounds, 1));
}

TEST(Group, SessionsLeaveWithTheirLastCopy) {
    const group work;
    std::optional<group_session> first(work);
    std::optional<group_session> copy(first);
    first.reset();
    EXPECT_NE(work.wait(dispatch::immediately), 0);
    copy.reset();
    EXPECT_EQ(work.wait(dispatch::immediately), 0);
}

TEST(Group, WorkersMayWaitForWorkThatIsQueued) {
    constexpr int kWaiters = 30;
    group done;
    for (int i = 0; i < kWaiters; ++i) {
        done.async(queue::global(), [] {
            const group inner;
            inner.async(queue::global(), [] {});
            EXPECT_EQ(inner.wait(dispatch::time::after(plr::test::kBound)), 0);
        });
    }
    EXPECT_EQ(done.wait(dispatch::time::after(plr::test::kBound)), 0);
}

TEST(Group, LeaveWithoutEnterStopsTheProcess) {
    EXPECT_DEATH(group().leave(), "leave\\(\\) without enter\\(\\)");
}

}  // namespace
