#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <functional>
#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/sanitized.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::queue;
using plr::test::Event;
using namespace std::chrono_literals;

// The status of a child that ran `body`, -1 when it did not end in time.
int in_child(const std::function<bool()>& body) {
    const pid_t child = ::fork();
    if (child == 0) {
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        ::alarm(static_cast<unsigned>(plr::test::kBound.count()));
        ::_exit(body() ? 0 : 1);
    }
    int status = -1;
    ::waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

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
    Load() {
        for (int i = 0; i < 3; ++i)
            threads.emplace_back([this] {
                while (!stop) {
                    const auto own = queue::create("own", busy);
                    const auto timer = dispatch::source::timer(own);
                    timer.set_timer(dispatch::immediately, 50us);
                    timer.resume();
                    for (int n = 0; n < 50; ++n)
                        own.async([this] { busy.async([] {}); });
                    busy.sync([] {});
                    own.sync([] {});
                }
            });
    }
    ~Load() { stop = true; }

    const queue busy = queue::create("busy");
    std::atomic<bool> stop{false};
    std::vector<std::jthread> threads;
};

// Other threads allocate at the fork, and sanitizers' heaps stay locked then;
// ThreadSanitizer has no threads in the child either.
#define SKIP_UNDER_SANITIZERS() \
    if (plr::test::kSanitized)  \
    GTEST_SKIP() << "sanitizers do not survive a fork with threads"

TEST(Fork, TheChildsQueuesWorkWhateverTheParentsThreadsWereAt) {
    SKIP_UNDER_SANITIZERS();
    const int rounds = 1'000;
    const Load load;
    for (int i = 0; i < rounds; ++i)
        ASSERT_EQ(in_child([&] {
                      return ran(load.busy) && ran(queue::create("new", load.busy)) &&
                             ran(queue::global()) && load.busy.sync([] { return true; }) &&
                             (i % 10 != 0 || (fired(load.busy) && !dispatch::dump().empty()));
                  }),
                  0)
            << i;
}

TEST(Fork, WorkTimersAndSourcesStayWithTheParent) {
    SKIP_UNDER_SANITIZERS();
    const auto serial = queue::create("serial");
    int pipes[2];
    ASSERT_EQ(::pipe2(pipes, O_CLOEXEC), 0);
    std::atomic<int> runs{0};
    const auto timer = dispatch::source::timer(serial);
    timer.set_event_handler(block<void()>([&] { ++runs; }));
    timer.set_timer(dispatch::time::after(50ms), dispatch::kOnce);
    timer.resume();
    const auto readable = dispatch::source::readable(pipes[0], serial);
    readable.set_event_handler(block<void()>([&] {
        ++runs;
        readable.cancel();
    }));
    readable.resume();
    serial.suspend();
    for (int i = 0; i < 10; ++i)
        serial.async([&] { ++runs; });
    EXPECT_EQ(in_child([&] {
                  serial.resume();
                  static_cast<void>(!::write(pipes[1], "x", 1));
                  timer.cancel();
                  readable.cancel();
                  return ran(serial) && fired(queue::create("later")) && runs == 0;
              }),
              0);
    serial.resume();
    EXPECT_TRUE(plr::test::eventually([&] { return runs == 12; }));
    ::close(pipes[0]);
    ::close(pipes[1]);
}

TEST(Fork, AWorkersChildGoesOnWithItsPresentWorkOnly) {
    SKIP_UNDER_SANITIZERS();
    const auto serial = queue::create("serial");
    const auto nested = queue::create("nested", serial);
    for (const queue& on : {serial, nested, queue::global()}) {
        Event done;
        int status = -1;
        on.async([&] {
            on.async([] {});  // the parent's
            status = in_child([&] {
                on.async([] {});
                return on.is_current() && ran(queue::create("other")) && ran(queue::global());
            });
            done.signal();
        });
        ASSERT_TRUE(done.wait());
        plr::test::drain(on);
        EXPECT_EQ(status, 0) << on.label();
    }
}

}  // namespace
