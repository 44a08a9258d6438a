#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/waiting.h"

namespace {

using dispatch::queue;
using namespace plr::test;

// Queues of several levels, which some of the threads suspend meanwhile and some wait for.
TEST(Queue, KeepsTheOrderOfEachThreadExcludesItselfAndLosesNothing) {
    constexpr int kEach = 12'000;
    constexpr unsigned kThreads = 6;
    const auto target = queue::create("target");
    const std::array levels = {target, queue::create("one", target),
                               queue::create("two", queue::create("mid", target))};
    std::array<std::array<int, levels.size()>, kThreads> seen{};  // touched on the target only
    int inside = 0;
    int faults = 0;
    Threads(kThreads, [&](unsigned t) {
        std::array<int, levels.size()> sent{};
        for (unsigned i = 0; i < kEach; ++i) {
            const std::size_t level = (t + i) % levels.size();
            const queue& on = levels[level];
            const auto work = [&, t, level, number = sent[level]++] {
                faults += inside++ != 0;
                faults += seen[t][level]++ != number;
                --inside;
            };
            if (t % 3 == 0)
                on.suspend();
            if (t % 3 == 1 && i % 4 == 0)
                on.sync(work);
            else
                on.async(work);
            if (t % 3 == 0)
                on.resume();
        }
    });
    for (const queue& each : levels)
        drain(each);
    EXPECT_EQ(faults, 0);
    for (const auto& each : seen)
        EXPECT_EQ(each, (std::array{kEach / 3, kEach / 3, kEach / 3}));
}

TEST(Queue, RunsClosuresOfEverySizeAndDestroysThemOnTheQueue) {
    const auto serial = queue::create("serial");
    std::atomic<std::size_t> sum{0};
    std::atomic<int> destroyed{0};
    const auto submit = [&]<std::size_t Size>(std::array<char, Size> payload) {
        std::shared_ptr<void> held(nullptr, [&](void*) { destroyed += serial.is_current(); });
        serial.async([payload, held = std::move(held), &sum] { sum += payload.size(); });
    };
    submit(std::array<char, 1>{});
    submit(std::array<char, 24>{});
    submit(std::array<char, 500>{});
    drain(serial);
    drain(serial);
    EXPECT_EQ(sum, 525U);
    EXPECT_EQ(destroyed, 3);
}

TEST(Queue, ABusyQueueDoesNotStarveOthers) {
    const auto other = queue::create("other");
    std::atomic<bool> stop{false};
    struct Again {
        const queue& on;
        std::atomic<bool>& stop;
        void operator()() const {
            if (!stop)
                on.async(Again{on, stop});
        }
    };
    // As many endless queues as there may be workers, and one more.
    std::vector<queue> all;
    for (unsigned i = 0; i <= std::thread::hardware_concurrency(); ++i)
        all.push_back(queue::create("endless"));
    for (const queue& each : all)
        each.async(Again{each, stop});
    Event ran;
    other.async([&] { ran.signal(); });
    EXPECT_TRUE(ran.wait());
    stop = true;
    for (const queue& each : all) {
        drain(each);
        drain(each);  // one more may have been submitted just before
    }
}

TEST(Queue, LivesUntilItsWorkHasRunWithoutHandles) {
    Event done;
    auto destroyed = std::make_shared<int>();
    {
        const auto held = queue::create("gate");
        held.suspend();
        auto passing = queue::create("passing", held);
        for (int i = 0; i < 100; ++i)
            passing.async([destroyed] {});
        passing.async([&done] { done.signal(); });
        passing = queue();
        held.resume();
    }
    EXPECT_TRUE(done.wait());
    Event after;  // the closures' destruction follows their run
    queue::global().async([&] { after.signal(); });
    EXPECT_TRUE(after.wait());
}

TEST(Queue, ATargetRunsChildrenInTheOrderOfTheirFirstWork) {
    const auto target = queue::create("target");
    const auto first = queue::create("first", target);
    const auto second = queue::create("second", target);
    std::string order;
    target.suspend();
    first.async([&] { order += "1"; });
    target.async([&] { order += "t"; });
    second.async([&] { order += "2"; });
    target.resume();
    drain(target);
    EXPECT_EQ(order, "1t2");
}

TEST(Queue, GlobalQueuesRunAtOnceAndByPriority) {
    using dispatch::priority;
    Event started;
    Event release;
    const dispatch::group waiting;
    for (const priority each : {priority::low, priority::normal, priority::high})
        waiting.async(queue::global(each), [&, each] {
            EXPECT_TRUE(queue::global(each).is_current());
            EXPECT_EQ(queue::global().is_current(), each == priority::normal);
            started.signal();
            EXPECT_TRUE(release.wait());
        });
    for (int i = 0; i < 3; ++i)
        EXPECT_TRUE(started.wait());
    for (int i = 0; i < 3; ++i)
        release.signal();
    EXPECT_EQ(waiting.wait(dispatch::time::after(kBound)), 0);
    EXPECT_EQ(queue::global().sync([] { return 3; }), 3);
}

TEST(Queue, AfterRunsOnceTheDeadlineHasPassedOnEitherClock) {
    const auto serial = queue::create("serial");
    for (const auto on :
         {dispatch::clock::monotonic, dispatch::clock::boot, dispatch::clock::wall}) {
        Event ran;
        const auto deadline = dispatch::time::after(std::chrono::milliseconds(3), on);
        serial.after(deadline, dispatch::block<void()>([&] {
                         EXPECT_TRUE(serial.is_current());
                         EXPECT_GE(dispatch::time::now(on).nanoseconds(), deadline.nanoseconds());
                         ran.signal();
                     }));
        EXPECT_TRUE(ran.wait()) << static_cast<int>(on);
    }
    Event past;
    serial.after(dispatch::immediately, dispatch::block<void()>([&] { past.signal(); }));
    EXPECT_TRUE(past.wait());
    auto token = std::make_shared<int>();
    serial.after(dispatch::forever, dispatch::block<void()>([token] {}));
    EXPECT_EQ(token.use_count(), 1);
}

TEST(Queue, SpecificsAreFoundThroughTargetsAndReleased) {
    static const char outerKey = 0;
    static const char innerKey = 0;
    static std::vector<int> destroyed;
    destroyed.clear();
    const auto record = [](void* value) { destroyed.push_back(*static_cast<int*>(value)); };
    int outer = 1;
    int inner = 2;
    int replacement = 3;
    {
        const auto target = queue::create("target");
        const auto child = queue::create("child", target);
        target.set_specific(&outerKey, &outer, record);
        child.set_specific(&innerKey, &inner, record);
        EXPECT_EQ(child.get_specific(&outerKey), &outer);
        EXPECT_EQ(target.get_specific(&innerKey), nullptr);
        EXPECT_EQ(dispatch::current_specific(&outerKey), nullptr);
        child.sync([&] { EXPECT_EQ(dispatch::current_specific(&outerKey), &outer); });
        child.set_specific(&outerKey, &replacement, record);
        EXPECT_EQ(child.get_specific(&outerKey), &replacement);
        child.set_specific(&innerKey, nullptr);
        EXPECT_EQ(child.get_specific(&innerKey), nullptr);
        EXPECT_EQ(destroyed, std::vector{2});
        child.set_specific(&outerKey, nullptr);
        EXPECT_EQ(child.get_specific(&outerKey), &outer);
    }
    EXPECT_EQ(destroyed, (std::vector{2, 3, 1}));
}

TEST(Queue, KnowsWhetherItIsCurrent) {
    const auto target = queue::create("target");
    const auto child = queue::create("child", target);
    const auto other = queue::create("other");
    EXPECT_FALSE(child.is_current());
    child.assert_not_current();
    child.sync([&] {
        EXPECT_TRUE(child.is_current());
        EXPECT_TRUE(target.is_current());
        EXPECT_FALSE(other.is_current());
        // Still held further up the stack.
        other.sync([&] { EXPECT_TRUE(child.is_current()); });
        child.assert_current();
    });
    EXPECT_DEATH(child.assert_current(), "child");
    EXPECT_STREQ(child.label(), "child");
}

TEST(Queue, MisuseStopsTheProcessAndNamesTheQueue) {
    const auto serial = queue::create("the queue");
    EXPECT_DEATH(serial.resume(), "'the queue': more resumes than suspends");
    EXPECT_DEATH(
        {
            auto doomed = queue::create("doomed");
            doomed.suspend();
            doomed = queue();
        },
        "'doomed': the last handle of a suspended queue went");
    EXPECT_DEATH(queue::global().suspend(), "global");
    EXPECT_DEATH(serial.sync([] { throw 1; }), "");
}

}  // namespace
