#include <vector>

#include "dispatch/dispatch.h"
#include "plr/test/manual_calendar.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::queue;
using dispatch::source;
using namespace plr::test;
using namespace std::chrono_literals;

struct WallTimer {
    explicit WallTimer(std::chrono::nanoseconds delay,
                       std::chrono::nanoseconds interval = dispatch::kOnce) {
        timer.set_event_handler(block<void()>([this] {
            periods += timer.data();
            fired.signal();
        }));
        timer.set_timer(dispatch::time::after(delay, dispatch::clock::wall), interval);
        timer.resume();
    }
    ~WallTimer() {
        timer.cancel();
        drain(serial);
    }
    // How often it has fired, all that was due being delivered.
    std::uint64_t count() {
        return serial.sync([this] { return periods; });
    }

    queue serial = queue::create("serial");
    source timer = source::timer(serial);
    std::uint64_t periods = 0;
    Event fired;
};

TEST(WallClock, ATimerFollowsStepsForwardsAndBackwards) {
    ManualCalendar calendar;
    WallTimer hour(1h);
    WallTimer minute(1min);
    calendar.step(1h - 1ns);
    EXPECT_EQ(hour.count(), 0u);
    EXPECT_EQ(minute.count(), 1u);
    calendar.step(-30min);
    WallTimer later(10min);  // before what was due already
    calendar.step(10min - 1ns);
    EXPECT_EQ(later.count(), 0u);
    calendar.step(1ns);
    EXPECT_EQ(later.count(), 1u);
    EXPECT_EQ(hour.count(), 0u);
    calendar.step(20min + 1ns);
    EXPECT_EQ(hour.count(), 1u);
    EXPECT_EQ(minute.count(), 1u);
}

TEST(WallClock, APeriodicTimerCountsThePeriodsOfAStep) {
    ManualCalendar calendar;
    WallTimer timer(1s, 1s);
    calendar.step(999ms);
    EXPECT_EQ(timer.count(), 0u);
    calendar.step(1h);
    EXPECT_EQ(timer.count(), 3600u);
    // Back by two hours, nothing for as long; and periods add up without drift, however
    // late a call was.
    calendar.step(-2h);
    EXPECT_EQ(timer.count(), 3600u);
    calendar.step(2h + 1ms);
    EXPECT_EQ(timer.count(), 3601u);
}

TEST(WallClock, ManyFireInTheOrderOfTheirDeadlinesAndWithdrawnOnesNever) {
    constexpr int kTimers = 2'000;
    ManualCalendar calendar;
    const auto serial = queue::create("serial");
    std::vector<int> fired;  // touched on the queue only
    std::vector<int> expected;
    std::vector<source> timers;
    for (int i = 0; i < kTimers; ++i) {
        const int due = i * 7919 % kTimers;
        const source& timer = timers.emplace_back(source::timer(serial));
        timer.set_event_handler(block<void()>([&fired, due] { fired.push_back(due); }));
        timer.set_timer(dispatch::time::after(1s + due * 1us, dispatch::clock::wall),
                        dispatch::kOnce);
        timer.resume();
        if (due % 2 == 1)
            timer.cancel();
        if (i % 2 == 0)
            expected.push_back(i);
    }
    calendar.step(2s);
    drain(serial);
    EXPECT_EQ(fired, expected);
}

TEST(WallClock, TimersGoBackToTheKernelsClock) {
    std::unique_ptr<WallTimer> timer;
    {
        ManualCalendar calendar(std::chrono::system_clock::now().time_since_epoch() - 1h);
        timer = std::make_unique<WallTimer>(1h);
    }
    EXPECT_TRUE(timer->fired.wait());
}

TEST(TimerSource, AnIntervalThatIsNotPositiveOrEndlessMeansOnce) {
    for (const auto interval : {0ns, -1'000'000ns, std::chrono::nanoseconds::max()}) {
        ManualCalendar calendar;
        WallTimer timer(1s, interval);
        calendar.step(1h);
        calendar.step(1h);
        EXPECT_EQ(timer.count(), 1u) << interval.count();
    }
}

// Also for a concurrent queue; what comes meanwhile makes one more call.
TEST(TimerSource, HandlersNeverRunTwoAtOnce) {
    ManualCalendar calendar;
    const auto timer = source::timer(queue::global());
    std::atomic<int> inside{0};
    std::uint64_t periods = 0;
    Event entered;
    Event proceed;
    timer.set_event_handler(block<void()>([&] {
        EXPECT_EQ(++inside, 1);
        periods += timer.data();
        entered.signal();
        EXPECT_TRUE(proceed.wait());
        --inside;
    }));
    Event cancelled;
    timer.set_cancel_handler(block<void()>([&] { cancelled.signal(); }));
    timer.set_timer(dispatch::time::after(1s, dispatch::clock::wall), 1s);
    timer.resume();
    calendar.step(1s);
    ASSERT_TRUE(entered.wait());
    calendar.step(1s);
    calendar.step(3s);
    proceed.signal();
    ASSERT_TRUE(entered.wait());
    EXPECT_EQ(periods, 5u);
    timer.cancel();
    proceed.signal();
    EXPECT_TRUE(cancelled.wait());
}

TEST(Source, SetAnewWhileSuspendedItsFiringsAreDeliveredOnResumeAsOne) {
    ManualCalendar calendar;
    WallTimer timer(1h);
    timer.timer.suspend();
    timer.timer.set_timer(dispatch::time::after(1s, dispatch::clock::wall), 1s);
    calendar.step(1s);
    calendar.step(1s);
    EXPECT_EQ(timer.count(), 0u);
    timer.timer.resume();
    EXPECT_TRUE(timer.fired.wait());
    EXPECT_EQ(timer.count(), 2u);
}

// Handles, arming and cancelling on several threads, firing meanwhile: the
// cancel handler runs once each and everything is freed.
TEST(Source, ManyThreadsMakeArmAndCancel) {
    constexpr unsigned kThreads = 4;
    constexpr int kRounds = 2'000;
    std::atomic<int> cancelled{0};
    const auto serial = queue::create("serial");
    const dispatch::group all;
    Threads(kThreads, [&](unsigned i) {
        for (int round = 0; round < kRounds; ++round) {
            const auto timer = source::timer(i % 2 == 0 ? serial : queue::global());
            all.enter();
            timer.set_event_handler(block<void()>([timer] { timer.cancel(); }));
            timer.set_cancel_handler(block<void()>([&] {
                ++cancelled;
                all.leave();
            }));
            timer.set_timer(dispatch::time::after(round % 64 * 1us), 1us);
            timer.resume();
            if (round % 3 == 0)
                timer.suspend();
            if (round % 3 != 1)
                timer.cancel();
        }
    });
    EXPECT_EQ(all.wait(dispatch::time::after(kBound)), 0);
    EXPECT_EQ(cancelled, int{kThreads} * kRounds);
}

}  // namespace
