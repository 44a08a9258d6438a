#include "dispatch/diagnostics.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "dispatch/dispatch.h"
#include "dispatch/pump.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::overrun;
using dispatch::queue;
using namespace plr::test;
using testing::ContainsRegex;
using testing::HasSubstr;
using testing::Not;
using namespace std::chrono_literals;

// Keeps a queue busy while it lives.
struct Occupied {
    explicit Occupied(const queue& on) : occupied(on) {
        on.async([this] {
            began.signal();
            EXPECT_TRUE(proceed.wait());
        });
        EXPECT_TRUE(began.wait());
    }
    ~Occupied() {
        proceed.signal();
        drain(occupied);
    }
    const queue occupied;
    Event began;
    Event proceed;
};

TEST(Dump, ShowsWhatRunsWaitsAndIsSuspended) {
    const auto target = queue::create("the target");
    const auto running = queue::create("running one", target);
    const auto suspended = queue::create("suspended one");
    const auto idle = queue::create("idle one");
    const auto timer = dispatch::source::timer(idle);
    timer.set_timer(dispatch::time::after(1h, dispatch::clock::boot), dispatch::kOnce);
    timer.resume();
    suspended.suspend();
    suspended.suspend();
    suspended.async([] {});
    dispatch::enable_statistics(running);
    {
        const Occupied occupied(running);
        for (int i = 0; i < 1'000; ++i)
            running.async([] {});
        target.async([] {});
        const std::string text = dispatch::dump();
        EXPECT_THAT(text, ContainsRegex("worker [0-9]+: runs \"running one\" for up to [0-9]"));
        EXPECT_THAT(text, ContainsRegex("\"running one\": running, 1000 wait, oldest [0-9.]+ "
                                        "[a-z]+, for \"the target\", waited"));
        EXPECT_THAT(text, ContainsRegex("\"the target\": .*1 waits\n"));
        EXPECT_THAT(text, HasSubstr("\"suspended one\": not running, 1 waits, suspended 2\n"));
        EXPECT_THAT(text, Not(HasSubstr("idle one")));
        EXPECT_THAT(text, ContainsRegex("[1-9] boot, first in 3[56][0-9]+[.][0-9] s"));
    }
    suspended.resume();
    suspended.resume();
    drain(suspended);
    EXPECT_THAT(dispatch::dump(), Not(HasSubstr("\"suspended one\": ")));
}

// On queues that come and go, are filled, drained, handed over and nested at the time.
TEST(Dump, MayLookAtAnyTime) {
    std::atomic<bool> stop{false};
    const auto shared = queue::create("shared");
    const Threads threads(3, [&](unsigned) {
        while (!stop) {
            const auto own = queue::create(std::string(100, 'x'), shared);
            dispatch::enable_statistics(own);
            const auto single = queue::create("single");
            for (int n = 0; n < 20; ++n) {
                own.async([&] { shared.async([] {}); });
                single.async([] {});
            }
            const auto timer = dispatch::source::timer(own);
            timer.set_timer(dispatch::immediately, 1ms);
            timer.resume();
            shared.async([] {});
            own.sync([] {});
            shared.sync([] {});
        }
    });
    for (int i = 0; i < 300; ++i)
        EXPECT_THAT(dispatch::dump(), HasSubstr("queues: "));
    EXPECT_THAT(shared.sync([] { return dispatch::dump(); }), HasSubstr("\"shared\""));
    stop = true;
}

// Overruns by label; on a busy machine that of any work may be among them.
class Overruns {
  public:
    explicit Overruns(std::chrono::nanoseconds limit) {
        dispatch::set_watchdog(limit, block<void(const overrun&)>([this, limit](const overrun& o) {
                                   EXPECT_GE(o.at_least, limit);
                                   const std::lock_guard guard(lock_);
                                   labels_.emplace_back(o.label);
                                   reported.signal();
                               }));
    }
    ~Overruns() { dispatch::set_watchdog(0ns); }
    std::ptrdiff_t count(std::string_view label) {
        const std::lock_guard guard(lock_);
        return std::ranges::count(labels_, label);
    }
    bool reach(std::string_view label, std::ptrdiff_t times) {
        while (count(label) < times)
            if (!reported.wait())
                return false;
        return true;
    }

    Event reported;

  private:
    std::mutex lock_;
    std::vector<std::string> labels_;
};

TEST(Watchdog, NamesTheQueueOfWorkThatTakesTooLongOnce) {
    const auto slow = queue::create("slow one");
    const auto longer = queue::create("longer one");
    slow.sync([] {});  // work before it does not count
    Overruns overruns(5ms);
    for (int times = 1; times <= 2; ++times) {
        const Occupied occupied(slow);
        ASSERT_TRUE(overruns.reach("slow one", times));
        const Occupied other(longer);  // its report shows that no second one of the first comes
        ASSERT_TRUE(overruns.reach("longer one", times));
        EXPECT_EQ(overruns.count("slow one"), times);
    }
}

TEST(Watchdog, CoversTheThreadThatServesAPump) {
    Overruns overruns(5ms);
    const dispatch::pump pump("served");
    std::string text;
    pump.queue().async([&] {
        EXPECT_TRUE(overruns.reach("served", 1));
        text = dispatch::dump();
    });
    pump.process();
    const std::string thread = "pump's thread " + std::to_string(::gettid());
    EXPECT_THAT(text, HasSubstr(thread + ": runs \"served\""));
    EXPECT_THAT(dispatch::dump(), HasSubstr(thread + ": is elsewhere"));
}

TEST(Watchdog, IsSilentOnceEndedAlsoByItsOwnHandler) {
    Event reported;
    dispatch::set_watchdog(1ms, block<void(const overrun&)>([&](const overrun&) {
                               dispatch::set_watchdog(0ns);
                               reported.signal();
                           }));
    const auto first = queue::create("first");
    const auto second = queue::create("second");
    const Occupied occupied(first);
    const Occupied other(second);
    EXPECT_TRUE(reported.wait());
    // A later watchdog sees them both; the ended one had seen one.
    Overruns overruns(1ms);
    EXPECT_TRUE(overruns.reported.wait());
    EXPECT_TRUE(overruns.reported.wait());
}

TEST(Statistics, CountEachKindOfWorkFromSubmissionToEnd) {
    const auto measured = queue::create("measured");
    const auto nested = queue::create("nested", measured);
    measured.async([] {});  // before they are switched on
    drain(measured);
    dispatch::enable_statistics(measured);
    {
        const Occupied occupied(measured);
        measured.async([] { ::usleep(2'000); });
    }  // drains by a sync()
    Event fired;
    measured.after(dispatch::time::after(1ms), block<void()>([&] { fired.signal(); }));
    EXPECT_TRUE(fired.wait());
    nested.sync([] {});
    dispatch::enable_statistics(measured, false);
    drain(measured);
    const auto counted = dispatch::take_statistics(measured);
    EXPECT_EQ(counted.wait.count(), 4u);
    EXPECT_EQ(counted.run.count(), 4u);
    EXPECT_GE(counted.run.longest(), 2ms);
    EXPECT_GE(counted.wait.longest(), 0ns);
    EXPECT_EQ(dispatch::statistics(measured).wait.count(), 0u);
    EXPECT_EQ(dispatch::statistics(nested).run.count(), 0u);
}

TEST(Statistics, CountWorkOfAConcurrentQueueOnAllWorkers) {
    const auto global = queue::global(dispatch::priority::low);
    dispatch::enable_statistics(global);
    static_cast<void>(dispatch::take_statistics(global));
    const dispatch::group all;
    for (int i = 0; i < 10'000; ++i)
        all.async(global, [] {});
    EXPECT_EQ(all.wait(dispatch::time::after(kBound)), 0);
    dispatch::enable_statistics(global, false);
    EXPECT_TRUE(eventually([&] { return dispatch::statistics(global).run.count() == 10'000; }));
}

TEST(Statistics, BucketsAreASixteenthOfAPowerOfTwo) {
    using dispatch::histogram;
    std::size_t last = 0;
    for (std::uint64_t value = 0; value < std::uint64_t{1} << 44; value += 1 + value / 40) {
        const std::size_t bucket = histogram::bucket(value);
        ASSERT_TRUE(bucket == last || bucket == last + 1) << value;
        ASSERT_LE(value, histogram::limit(bucket));
        ASSERT_LE(static_cast<double>(histogram::limit(bucket)),
                  static_cast<double>(value) * 1.07 + 1);
        ASSERT_TRUE(bucket == 0 || histogram::limit(bucket - 1) < value) << value;
        last = bucket;
    }
    EXPECT_EQ(histogram::bucket(~std::uint64_t{0}), histogram::kBuckets - 1);
}

}  // namespace
