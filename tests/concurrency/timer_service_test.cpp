#include "plr/concurrency/timer_service.h"

#include <cmath>
#include <limits>

#include "plr/concurrency/dispatch_timer_service.h"
#include "plr/test/manual_calendar.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;
using dispatch::block;
using dispatch::queue;
using std::chrono::microseconds;
using namespace std::chrono_literals;

constexpr auto kMaximum = std::numeric_limits<std::int64_t>::max();
constexpr auto kMinimum = std::numeric_limits<std::int64_t>::min();

// Time is moved by hand: all timers here are on the wall clock.
struct Timers : testing::Test {
    static TimerService::Time wall(microseconds delay) { return {TimeType::WallClock, delay}; }
    block<void()> counting() {
        return block<void()>([this] {
            EXPECT_TRUE(serial.is_current());
            ++calls;
        });
    }
    int count() {
        return serial.sync([this] { return calls; });
    }

    ManualCalendar calendar;
    std::shared_ptr<DispatchTimerService> service = DispatchTimerService::create(nullptr);
    queue serial = queue::create("serial");
    int calls = 0;
};

TEST_F(Timers, AOneShotTimerFiresOnceAndIsExpiredThen) {
    const auto timer = service->createOneShotTimerImpl("once", wall(1s), serial, counting());
    calendar.step(1s - 1ns);
    EXPECT_EQ(count(), 0);
    EXPECT_FALSE(timer->isExpired());
    calendar.step(1ns);
    EXPECT_EQ(count(), 1);
    EXPECT_TRUE(timer->isExpired());
    calendar.step(1h);
    EXPECT_EQ(count(), 1);
}

TEST_F(Timers, APeriodicTimerFiresEachPeriodUntilItIsCancelledOrGone) {
    auto timer = service->createPeriodicTimerImpl("often", wall(1s), serial, counting());
    calendar.step(1s - 1ns);
    EXPECT_EQ(count(), 0);
    for (int i = 1; i < 4; ++i) {
        calendar.step(1s);
        EXPECT_EQ(count(), i);
    }
    timer->cancel();
    EXPECT_TRUE(timer->isExpired());
    calendar.step(1s);
    EXPECT_EQ(count(), 3);

    timer = service->createPeriodicTimerImpl("often", wall(1s), serial, counting());
    timer.reset();
    calendar.step(1s);
    EXPECT_EQ(count(), 3);
}

TEST_F(Timers, OnlyTheCheckRefusesAPeriodOfZero) {
    try {
        service->throwIfPeriodIsZero(wall(0us));
        ADD_FAILURE() << "not refused";
    } catch (const IllegalTimerParamsException& refused) {
        EXPECT_STREQ(refused.what(), "Cannot set up a period of 0 time; that would be insane!");
    }
    EXPECT_NO_THROW(service->throwIfPeriodIsZero(wall(-1us)));
    Event fired;
    for (const auto type : {TimeType::Monotonic, TimeType::WallClock})
        for (const auto period : {0us, -1us}) {
            const auto timer = service->createPeriodicTimerImpl(
                "", {type, period}, serial, block<void()>([&] { fired.signal(); }));
            EXPECT_TRUE(fired.wait());
            EXPECT_FALSE(timer->isExpired());
            drain(serial);
        }
}

TEST_F(Timers, ScheduledDeadlinesCountFromTheServicesTurn) {
    Event proceed;
    service->execute_wrapped([&] { EXPECT_TRUE(proceed.wait()); });
    service->scheduleAfterImpl("", wall(1s), serial, counting());
    calendar.step(10s);
    EXPECT_EQ(count(), 0);
    proceed.signal();
    service->flush();
    calendar.step(1s - 1ns);
    EXPECT_EQ(count(), 0);
    calendar.step(1ns);
    EXPECT_EQ(count(), 1);
}

TEST_F(Timers, RequestsKeepTheServiceAliveAndTimersDoNot) {
    const auto timer = service->createOneShotTimerImpl("", wall(1s), serial, counting());
    Event proceed;
    Event scheduled;
    service->execute_wrapped([&] { EXPECT_TRUE(proceed.wait()); });
    service->scheduleAfterImpl("", wall(-1s), serial, block<void()>([&] { scheduled.signal(); }));
    service.reset();
    proceed.signal();
    EXPECT_TRUE(scheduled.wait());
    calendar.step(1s);
    EXPECT_EQ(count(), 1);
}

TEST_F(Timers, WithoutAQueueWorkRunsOnTheGlobalOne) {
    Event ran;
    const auto check = [&ran] {
        EXPECT_TRUE(queue::global().is_current());
        ran.signal();
    };
    const auto now = wall(0us);
    service->scheduleAfterImpl("", now, block<void()>(check));
    const auto one = service->createOneShotTimerImpl("", now, std::function<void()>(check));
    const auto two = service->createPeriodicTimerImpl("", now, block<void()>(check));
    service->runAfter(0s, check);
    const auto three = service->startTimer(0s, check);
    for (int i = 0; i < 5; ++i)
        EXPECT_TRUE(ran.wait()) << i;
}

TEST_F(Timers, FriendlyEntryPointsTakeAnyDurationAndCallable) {
    const auto soon = TimerDelay(0.5s).onWallClock();
    service->runAfter(soon, serial, [this] { ++calls; });
    const auto once = service->startTimer(soon, serial, counting(), "once");
    const std::function<void()> function([this] { ++calls; });
    const auto often = service->startPeriodicTimer(soon, serial, function, "often");
    service->flush();
    calendar.step(500ms - 1ns);
    EXPECT_EQ(count(), 0);
    calendar.step(1ns);
    EXPECT_EQ(count(), 3);
    calendar.step(500ms);
    EXPECT_EQ(count(), 4);
    for (const TimerDelay& period : {TimerDelay(0s), TimerDelay(-1us)})
        EXPECT_THROW(static_cast<void>(service->startPeriodicTimer(period, serial, counting())),
                     IllegalTimerParamsException);
}

TEST_F(Timers, DispatchTimesCountFromNowOnTheirClock) {
    const std::int64_t now = dispatch::time::now(dispatch::clock::wall).nanoseconds();
    const auto at = service->makeDispatchTime(wall(5us));
    EXPECT_EQ(at, dispatch::time::at(dispatch::clock::wall, now + 5'000));
    const auto monotonic = service->makeDispatchTime({TimeType::Monotonic, 1h});
    EXPECT_EQ(monotonic.on(), dispatch::clock::monotonic);
    EXPECT_TRUE(service->makeDispatchTime(wall(microseconds::max())).is_forever());
    EXPECT_EQ(service->makeDispatchTime(wall(microseconds::min())).nanoseconds(), 0);
}

TEST(TimerDelay, IsWholeMicrosecondsRoundedUpAndClamped) {
    using Frames = std::chrono::duration<int, std::ratio<1, 30>>;
    using Big = std::chrono::duration<std::uint64_t, std::nano>;
    const struct {
        const char* name;
        TimerDelay delay;
        std::int64_t expected;
    } rows[] = {
        {"part of one", 1ns, 1},
        {"negative rounds up", -1500ns, -1},
        {"odd units", Frames(1), 33'334},
        {"floating rounds up", std::chrono::duration<float, std::micro>(1.5F), 2},
        {"not a number", std::chrono::duration<double>(std::nan("")), 0},
        {"too long", std::chrono::hours::max(), kMaximum},
        {"too long floating", std::chrono::duration<double>(1e300), kMaximum},
        {"too long floating negative", std::chrono::duration<double>(-1e300), kMinimum},
        {"nanoseconds", std::chrono::nanoseconds::max(), kMaximum / 1000 + 1},
        {"unsigned", Big(std::numeric_limits<std::uint64_t>::max()), kMaximum},
    };
    for (const auto& row : rows)
        EXPECT_EQ(std::get<microseconds>(row.delay.time()).count(), row.expected) << row.name;
}

}  // namespace
