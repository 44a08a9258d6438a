#include <gtest/gtest.h>

#include <optional>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::group;
using dispatch::group_session;
using dispatch::queue;
using namespace plr::test;

TEST(Group, WaitTellsDoneFromTimeOut) {
    const group work;
    EXPECT_EQ(work.wait(dispatch::immediately), 0);
    work.enter();
    EXPECT_NE(work.wait(dispatch::immediately), 0);
    EXPECT_NE(work.wait(dispatch::time::after(std::chrono::milliseconds(1))), 0);
    EXPECT_NE(work.wait(dispatch::time::after(std::chrono::milliseconds(1), dispatch::clock::wall)),
              0);
    queue::global().async([&] { work.leave(); });
    EXPECT_EQ(work.wait(dispatch::time::after(kBound)), 0);
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
    Threads(5, [&](unsigned t) {
        for (unsigned i = 0; i < kRounds; ++i) {
            if (t == 0) {
                work.notify(serial, block<void()>([&, i] { ++notified[i]; }));
            } else if (t == 1 && i % 10 == 0) {
                EXPECT_EQ(work.wait(dispatch::time::after(kBound)), 0);
            } else {
                work.enter();
                work.leave();
            }
        }
    });
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

TEST(Group, LeaveWithoutEnterStopsTheProcess) {
    EXPECT_DEATH(group().leave(), "leave\\(\\) without enter\\(\\)");
}

}  // namespace
