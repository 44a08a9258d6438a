#include <gtest/gtest.h>
#include <signal.h>

#include "dispatch/dispatch.h"
#include "support/child.h"
#include "support/descriptors.h"
#include "support/sanitized.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::queue;
using namespace plr::test;
using namespace std::chrono_literals;

bool ran(const queue& on) {
    Event event;
    on.async([&] { event.signal(); });
    return event.wait();
}

bool fired(const queue& on) {
    Event event;
    on.after(dispatch::time::after(100us), block<void()>([&] { event.signal(); }));
    return event.wait();
}

// Work, timers and queues that come and go, on several threads, while it lives.
struct Load {
    ~Load() { stop = true; }
    void work() {
        const auto own = queue::create("own", busy);
        const auto timer = dispatch::source::timer(own);
        timer.set_timer(dispatch::immediately, 50us);
        timer.resume();
        for (int n = 0; n < 50; ++n)
            own.async([this] { busy.async([] {}); });
        busy.sync([] {});
        own.sync([] {});
    }

    const queue busy = queue::create("busy");
    std::atomic<bool> stop{false};
    const Threads threads{3, [this](unsigned) {
                              while (!stop)
                                  work();
                          }};
};

// Other threads allocate at the fork, and sanitizers' heaps stay locked then;
// ThreadSanitizer has no threads in the child either.
#define SKIP_UNDER_SANITIZERS() \
    if (kSanitized)             \
    GTEST_SKIP() << "sanitizers do not survive a fork with threads"

TEST(Fork, TheChildsQueuesWorkWhateverTheParentsThreadsWereAt) {
    SKIP_UNDER_SANITIZERS();
    const int rounds = 1'000;
    const Load load;
    for (int i = 0; i < rounds; ++i)
        ASSERT_TRUE(holdsInChild([&] {
            return ran(load.busy) && ran(queue::create("new", load.busy)) && ran(queue::global()) &&
                   load.busy.sync([] { return true; }) &&
                   (i % 10 != 0 || (fired(load.busy) && !dispatch::dump().empty()));
        })) << i;
}

TEST(Fork, WorkTimersAndSourcesStayWithTheParent) {
    SKIP_UNDER_SANITIZERS();
    const auto serial = queue::create("serial");
    const Ends pipe;
    std::atomic<int> runs{0};
    const auto timer = dispatch::source::timer(serial);
    timer.set_event_handler(block<void()>([&] { ++runs; }));
    timer.set_timer(dispatch::time::after(50ms), dispatch::kOnce);
    timer.resume();
    const auto readable = dispatch::source::readable(pipe.out(), serial);
    readable.set_event_handler(block<void()>([&] {
        ++runs;
        readable.cancel();
    }));
    readable.resume();
    serial.suspend();
    for (int i = 0; i < 10; ++i)
        serial.async([&] { ++runs; });
    EXPECT_TRUE(holdsInChild([&] {
        serial.resume();
        pipe.put("x");
        timer.cancel();
        readable.cancel();
        return ran(serial) && fired(queue::create("later")) && runs == 0;
    }));
    serial.resume();
    EXPECT_TRUE(eventually([&] { return runs == 12; }));
}

TEST(Fork, AWorkersChildGoesOnWithItsPresentWorkOnly) {
    SKIP_UNDER_SANITIZERS();
    const auto serial = queue::create("serial");
    const auto nested = queue::create("nested", serial);
    for (const queue& on : {serial, nested, queue::global()}) {
        Event done;
        bool held = false;
        on.async([&] {
            on.async([] {});  // the parent's
            held = holdsInChild([&] {
                on.async([] {});
                return on.is_current() && ran(queue::create("other")) && ran(queue::global());
            });
            done.signal();
        });
        ASSERT_TRUE(done.wait());
        drain(on);
        EXPECT_TRUE(held) << on.label();
    }
}

}  // namespace
