#include <poll.h>
#include <sys/socket.h>

#include <atomic>
#include <cstdlib>
#include <memory>
#include <system_error>

#include "dispatch/dispatch.h"
#include "support/descriptors.h"
#include "support/waiting.h"

namespace {

using dispatch::block;
using dispatch::queue;
using dispatch::source;
using namespace plr::test;
using namespace std::chrono_literals;

constexpr int kSockets = SOCK_STREAM | SOCK_NONBLOCK;

TEST(TimerSource, RepeatsOnEveryClockUntilCancelled) {
    const auto serial = queue::create("serial");
    for (const auto on :
         {dispatch::clock::monotonic, dispatch::clock::boot, dispatch::clock::wall}) {
        const auto timer = source::timer(serial);
        Event third;
        Event cancelled;
        int calls = 0;
        timer.set_event_handler(block<void()>([&] {
            if (++calls == 3) {
                timer.cancel();
                third.signal();
            }
        }));
        timer.set_cancel_handler(block<void()>([&] { cancelled.signal(); }));
        timer.set_timer(dispatch::time::after(1ms, on), 1ms);
        timer.resume();
        EXPECT_TRUE(third.wait()) << static_cast<int>(on);
        EXPECT_TRUE(cancelled.wait());
        EXPECT_EQ(calls, 3);
    }
}

TEST(Source, CancelRunsItsHandlerOnceAfterTheLastEventAndFreesBoth) {
    const auto serial = queue::create("serial");
    auto token = std::make_shared<int>();
    int cancelled = 0;
    int after = 0;
    Event end;
    {
        const auto timer = source::timer(serial);
        timer.set_event_handler(block<void()>([token, &cancelled, &after, timer] {
            after += cancelled;
            timer.cancel();
        }));
        timer.set_cancel_handler(block<void()>([token, &cancelled, &end] {
            ++cancelled;
            end.signal();
        }));
        timer.set_timer(dispatch::immediately, 1ms);
        timer.resume();
    }
    // The handler's own reference keeps the source until it cancels itself.
    EXPECT_TRUE(end.wait());
    drain(serial);
    EXPECT_EQ(token.use_count(), 1);
    EXPECT_EQ(cancelled, 1);
    EXPECT_EQ(after, 0);
}

TEST(Source, DroppingTheLastHandleCancels) {
    const auto serial = queue::create("serial");
    Ends pair(kSockets);
    Event cancelled;
    {
        const auto reader = source::readable(pair.out(), serial);
        reader.set_cancel_handler(block<void()>([&] { cancelled.signal(); }));
        reader.resume();
    }
    EXPECT_TRUE(cancelled.wait());
    {
        const auto never_resumed = source::timer(serial);
        never_resumed.set_cancel_handler(block<void()>([&] { cancelled.signal(); }));
    }
    EXPECT_TRUE(cancelled.wait());
}

TEST(DescriptorSource, CallsWhileReadableHoweverLittleTheHandlerTakes) {
    const auto serial = queue::create("serial");
    Ends pair(kSockets);
    std::string got;
    Event end;
    const auto reader = source::readable(pair.out(), serial);
    reader.set_event_handler(block<void()>([&] {
        char one = 0;
        const auto count = ::read(pair.out(), &one, 1);
        if (count == 1)
            got += one;
        if (count == 0) {
            reader.cancel();
            end.signal();
        }
    }));
    reader.resume();
    pair.put("hello").put(" world");
    pair.closeIn();
    EXPECT_TRUE(end.wait());
    EXPECT_EQ(got, "hello world");
    drain(serial);
}

TEST(DescriptorSource, WritableComesBackWhenThereIsRoom) {
    const auto serial = queue::create("serial");
    Ends pair(kSockets);
    const std::string chunk(64 * 1024, 'x');
    std::atomic<std::size_t> written{0};
    const auto writer = source::writable(pair.in(), serial);
    writer.set_event_handler(block<void()>([&] {
        const auto count = ::write(pair.in(), chunk.data(), chunk.size());
        if (count > 0)
            written += static_cast<std::size_t>(count);
    }));
    writer.resume();
    // Many times what the socket holds.
    std::size_t read = 0;
    std::string buffer(256 * 1024, '\0');
    while (read < 200 * chunk.size()) {
        pollfd state{pair.out(), POLLIN, 0};
        ASSERT_GT(::poll(&state, 1, 60'000), 0);
        const auto count = ::read(pair.out(), buffer.data(), buffer.size());
        if (count > 0)
            read += static_cast<std::size_t>(count);
    }
    writer.cancel();
    drain(serial);
    EXPECT_GE(written, read);
}

TEST(DescriptorSource, ARegularFileIsAlwaysReadyAndABadOneIsRefused) {
    const auto serial = queue::create("serial");
    char path[] = "/tmp/pelorin-test-XXXXXX";
    const int file = ::mkstemp(path);
    ASSERT_GE(file, 0);
    ::unlink(path);
    ASSERT_EQ(::pwrite(file, "abc", 3, 0), 3);
    std::string got;
    Event end;
    const auto reader = source::readable(file, serial);
    reader.set_event_handler(block<void()>([&] {
        char one = 0;
        if (::read(file, &one, 1) == 1) {
            got += one;
            return;
        }
        reader.cancel();
        end.signal();
    }));
    reader.resume();
    EXPECT_TRUE(end.wait());
    EXPECT_EQ(got, "abc");
    drain(serial);
    ::close(file);
    EXPECT_THROW(static_cast<void>(source::readable(file, serial)), std::system_error);
}

}  // namespace
