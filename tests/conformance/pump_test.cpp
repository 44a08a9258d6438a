#include <gtest/gtest.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <memory>
#include <string>
#include <thread>

#include "dispatch/dispatch.h"
#include "support/descriptors.h"
#include "support/waiting.h"

namespace {

using dispatch::pump;
using dispatch::queue;
using namespace plr::test;

// Whether there is something to process, waited for unless `bound` says otherwise.
bool isReadable(const pump& served, std::chrono::milliseconds bound = kBound) {
    pollfd waiting{served.descriptor(), POLLIN, 0};
    return ::poll(&waiting, 1, static_cast<int>(bound.count())) == 1;
}
bool isIdle(const pump& served) {
    return !isReadable(served, std::chrono::milliseconds::zero());
}
// As an event loop does, until `over`.
template <class Condition>
void serve(const pump& served, Condition over) {
    while (!over() && isReadable(served))
        served.process();
}

TEST(Pump, RunsWhatManyThreadsPostOnTheThreadThatPollsIt) {
    constexpr unsigned kThreads = 4;
    constexpr unsigned kEach = 5'000;
    const pump served("served");
    const auto nested = queue::create("nested", served.queue());
    const auto here = std::this_thread::get_id();
    std::array<unsigned, kThreads> seen{};
    unsigned total = 0;
    unsigned faults = 0;
    Threads threads(kThreads, [&](unsigned t) {
        for (unsigned i = 0; i < kEach; ++i)
            (t % 2 ? nested : served.queue()).async([&, t, i] {
                faults += seen[t]++ != i || std::this_thread::get_id() != here;
                ++total;
            });
    });
    serve(served, [&] { return total == kThreads * kEach; });
    threads.join();
    EXPECT_EQ(total, kThreads * kEach);
    EXPECT_EQ(faults, 0u);
    served.process();  // for a wake-up that came too late
    EXPECT_TRUE(isIdle(served));
}

TEST(Pump, IsWokenOnceForABurstAndServedInBatches) {
    const pump served("served");
    EXPECT_TRUE(isIdle(served));
    unsigned ran = 0;
    for (unsigned i = 0; i < 10'000; ++i)
        served.queue().async([&] { ++ran; });
    std::uint64_t wakes = 0;
    ASSERT_EQ(::read(served.descriptor(), &wakes, sizeof wakes), 8);
    EXPECT_EQ(wakes, 1u);
    EXPECT_TRUE(served.process());
    EXPECT_LT(ran, 1'000u);
    EXPECT_FALSE(isIdle(served));
    while (served.process()) {
    }
    EXPECT_EQ(ran, 10'000u);
    EXPECT_TRUE(isIdle(served));
}

TEST(Pump, SyncRunsOnTheServingThreadAsPartOfTheCallersWork) {
    const pump served("served");
    const auto nested = queue::create("nested", served.queue());
    const auto caller = queue::create("caller");
    const auto here = std::this_thread::get_id();
    bool done = false;
    served.process();
    caller.async([&] {
        const auto result = nested.sync([&] {
            EXPECT_EQ(std::this_thread::get_id(), here);
            served.queue().assert_current();
            nested.assert_current();
            caller.assert_current();
            return std::make_unique<int>(5);
        });
        served.queue().async([&done, value = *result] { done = value == 5; });
    });
    serve(served, [&] { return done; });
    EXPECT_TRUE(done);
    served.queue().assert_not_current();
}

TEST(Pump, SyncByTheServingThreadTakesItsTurn) {
    const pump served("served");
    const auto nested = queue::create("nested", served.queue());
    std::string order;
    nested.async([&] { order += 'a'; });
    served.process();
    nested.async([&] { order += 'b'; });
    nested.suspend();
    std::thread resumer([&] { nested.resume(); });
    nested.sync([&] { order += 'c'; });
    EXPECT_EQ(order, "abc");
    resumer.join();
}

TEST(Pump, ServesWhateverTargetsIt) {
    const pump served("served");
    const auto nested = queue::create("nested", served.queue());
    std::string ran;
    const auto timer = dispatch::source::timer(nested);
    timer.set_event_handler(dispatch::block<void()>([&] { ran += 't'; }));
    timer.set_timer(dispatch::time::now(), dispatch::kOnce);
    timer.resume();
    serve(served, [&] { return ran == "t"; });
    const Ends pipe;
    const auto readable = dispatch::source::readable(pipe.out(), served.queue());
    bool closed = false;
    readable.set_event_handler(dispatch::block<void()>([&] {
        ran += 'r';
        readable.cancel();
    }));
    readable.set_cancel_handler(dispatch::block<void()>([&] { closed = true; }));
    readable.resume();
    pipe.put("x");
    serve(served, [&] { return closed; });
    const dispatch::group group;
    group.async(queue::create("elsewhere"), [] {});
    group.notify(nested, dispatch::block<void()>([&] { ran += 'g'; }));
    serve(served, [&] { return ran == "trg"; });
    EXPECT_EQ(ran, "trg");
}

TEST(Pump, KeepsSuspendedWorkWithoutBeingReadable) {
    const pump served("served");
    const auto nested = queue::create("nested", served.queue());
    for (const queue& suspended : {served.queue(), nested}) {
        bool ran = false;
        suspended.suspend();
        suspended.async([&] { ran = true; });
        served.process();
        EXPECT_FALSE(ran);
        EXPECT_TRUE(isIdle(served));
        suspended.resume();
        EXPECT_TRUE(isReadable(served));
        served.process();
        EXPECT_TRUE(ran);
    }
}

TEST(Pump, RunsNothingInsideOfItsOwnWork) {
    const pump served("served");
    std::string order;
    served.queue().async([&] {
        served.queue().async([&] { order += 'b'; });
        EXPECT_FALSE(served.process());
        order += 'a';
    });
    served.process();
    EXPECT_EQ(order, "ab");
}

TEST(Pump, LeavesItsQueueToThePoolWhenItGoes) {
    auto served = std::make_unique<pump>("served");
    const queue kept = served->queue();
    const auto here = std::this_thread::get_id();
    std::thread::id first;
    std::thread::id second;
    kept.async([&] {
        first = std::this_thread::get_id();
        kept.suspend();
        kept.async([&] { second = std::this_thread::get_id(); });
    });
    served.reset();
    EXPECT_EQ(first, here);
    kept.resume();
    drain(kept);
    EXPECT_NE(second, std::thread::id());
    EXPECT_NE(second, here);
}

TEST(Pump, OfTheProcessRunsUntilStopped) {
    bool inside = false;
    std::thread other([&] {
        dispatch::main_queue().sync([&] { inside = dispatch::main_queue().is_current(); });
        dispatch::stop_main_queue();
    });
    dispatch::run_main_queue();
    EXPECT_TRUE(inside);
    other.join();
}

TEST(PumpDeathTest, MisuseStopsTheProcess) {
    testing::FLAGS_gtest_death_test_style = "threadsafe";
    const struct {
        const char* message;
        void (*misuse)(const pump&);
    } rows[] = {
        {"queue 'served': served by a second thread",
         [](const pump& served) {
             served.process();
             std::thread([&] { served.process(); }).join();
         }},
        {"queue 'served': run\\(\\) from its own work",
         [](const pump& served) {
             served.queue().async([&] { served.run(); });
             served.process();
         }},
        {"queue 'nested': sync\\(\\) from its own work would wait for ever",
         [](const pump& served) {
             const auto nested = queue::create("nested", served.queue());
             served.queue().async([&] { nested.sync([] {}); });
             served.process();
         }},
    };
    for (const auto& row : rows) {
        const pump served("served");
        EXPECT_DEATH(row.misuse(served), row.message);
    }
}

}  // namespace
