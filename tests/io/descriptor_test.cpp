#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <future>
#include <string>
#include <thread>

#include "Pelorin"
#include "support/descriptors.h"
#include "support/waiting.h"

namespace {
thread_local timespec waitedFor;  // by the last ppoll(); -1 s: for ever
}  // namespace

extern "C" __attribute__((visibility("default"))) int ppoll(pollfd* descriptors, nfds_t count,
                                                            const timespec* timeout,
                                                            const sigset_t* mask) {
    static auto* const next = reinterpret_cast<decltype(&ppoll)>(::dlsym(RTLD_NEXT, "ppoll"));
    waitedFor = timeout ? *timeout : timespec{-1, 0};
    return next(descriptors, count, timeout, mask);
}

namespace {

using plr::test::Ends;
constexpr std::uint32_t kLongest = 0xFFFFFFFE;  // of those that end: 49 days

// A read of up to four bytes.
struct Read {
    Read(int fd, int unblockFd, std::uint32_t timeoutMs) {
        errno = 0;
        result = PelorinUnblockableReadWithTimeout(fd, unblockFd, bytes.data(), 4, timeoutMs);
        error = errno;
    }
    std::array<char, 5> bytes{};
    std::int32_t result;
    int error;
};

TEST(Descriptor, AReadEndsForOneOfTheseReasons) {
    Ends empty;
    Ends full;
    full.put("abcdef");
    Ends unblock;
    unblock.put("u");
    Ends ended;
    ended.closeIn();
    Ends hungUp(SOCK_SEQPACKET);
    hungUp.closeIn();
    constexpr int kNotOpen = 987;
    struct {
        const char* name;
        int fd, unblockFd;
        std::uint32_t timeoutMs;
        std::int32_t result;
        int error;
    } const rows[] = {
        {"unblock", full.out(), unblock.out(), 0, 0, ECANCELED},
        {"unblock, closed", full.out(), ended.out(), 0, 0, ECANCELED},
        {"data", full.out(), empty.out(), kLongest, 4, 0},
        {"the rest", full.out(), -1, PELORIN_FOREVER, 2, 0},
        {"time-out 0", empty.out(), -1, 0, 0, ETIMEDOUT},
        {"time-out", empty.out(), empty.out(), 1, 0, ETIMEDOUT},
        {"end of input", ended.out(), -1, PELORIN_FOREVER, 0, ENODATA},
        {"hang-up", hungUp.out(), -1, PELORIN_FOREVER, 0, ENODATA},
        {"negative", -2, full.out(), 0, -9, EBADF},
        {"not open", kNotOpen, -1, 0, -1, EBADF},
        {"unblock not open", full.out(), kNotOpen, 0, -1, EBADF},
        {"not to be read", empty.in(), -1, 0, 0, ETIMEDOUT},
    };
    for (const auto& row : rows) {
        const Read read(row.fd, row.unblockFd, row.timeoutMs);
        EXPECT_EQ(read.result, row.result) << row.name;
        EXPECT_EQ(read.error, row.error) << row.name;
    }
}

TEST(Descriptor, NumbersFrom1024OnWork) {
    const plr::test::DescriptorLimit limit(4096);
    const Ends data;
    const Ends unblock;
    ASSERT_EQ(::dup2(data.out(), 1024), 1024);
    ASSERT_EQ(::dup2(unblock.out(), 2047), 2047);
    data.put("abcd");
    EXPECT_EQ(Read(1024, 2047, 0).result, 4);
    EXPECT_EQ(Read(1024, 2047, 0).error, ETIMEDOUT);
    unblock.put("x");
    EXPECT_EQ(Read(1024, 2047, PELORIN_FOREVER).error, ECANCELED);
    ::close(1024);
    ::close(2047);
}

TEST(Descriptor, TimeOutsAreMilliseconds) {
    const Ends data;
    data.put("ready at once, whatever the time-out is");
    struct {
        std::uint32_t timeoutMs;
        time_t seconds;
        long nanoseconds;
    } const rows[] = {
        {0, 0, 0}, {1, 0, 1'000'000}, {2999, 2, 999'000'000}, {kLongest, 4'294'967, 294'000'000}};
    for (const auto& row : rows) {
        EXPECT_EQ(Read(data.out(), -1, row.timeoutMs).result, 4);
        EXPECT_EQ(waitedFor.tv_sec, row.seconds) << row.timeoutMs;
        EXPECT_EQ(waitedFor.tv_nsec, row.nanoseconds) << row.timeoutMs;
    }
    EXPECT_EQ(Read(data.out(), -1, PELORIN_FOREVER).result, 4);
    EXPECT_EQ(waitedFor.tv_sec, -1);
}

TEST(Descriptor, ALongWaitEndsWhenDataComesOrTheUnblock) {
    for (const std::uint32_t timeoutMs : {kLongest, PELORIN_FOREVER}) {
        const Ends data;
        const Ends unblock;
        const auto readLater = [&] { return Read(data.out(), unblock.out(), timeoutMs).result; };
        auto first = std::async(std::launch::async, readLater);
        data.put("abc");
        EXPECT_EQ(first.get(), 3);
        auto second = std::async(std::launch::async, readLater);
        unblock.put("x");
        EXPECT_EQ(second.get(), 0);
    }
}

TEST(Descriptor, ToCompletionGoesOnUntilTheLength) {
    Ends ends(SOCK_SEQPACKET);
    std::string text(5, '.');
    ends.put("ab").put("cde").put("x");
    EXPECT_TRUE(
        PelorinUnblockableReadToCompletionWithTimeout(ends.out(), -1, text.data(), 5, 1000));
    EXPECT_EQ(text, "abcde");
    EXPECT_TRUE(PelorinUnblockableReadToCompletionWithTimeout(-1, -1, text.data(), 0, 0));
    EXPECT_FALSE(PelorinUnblockableReadToCompletionWithTimeout(ends.out(), -1, text.data(), 5, 0));
    EXPECT_EQ(errno, ETIMEDOUT);
    ends.put("x");
    ends.closeIn();
    EXPECT_FALSE(PelorinUnblockableReadToCompletionWithTimeout(ends.out(), -1, text.data(), 5,
                                                               PELORIN_FOREVER));
    EXPECT_EQ(errno, ENODATA);
}

// Runs `call` on a thread that gets signals until it returns.
template <class Call>
void interrupt(Call call) {
    struct sigaction action {};
    action.sa_handler = [](int) {};
    ::sigaction(SIGUSR1, &action, nullptr);
    std::atomic<bool> done = false;
    std::thread thread([&] {
        call();
        done = true;
    });
    EXPECT_TRUE(plr::test::eventually([&] {
        ::pthread_kill(thread.native_handle(), SIGUSR1);
        return done.load();
    }));
    thread.join();
}

TEST(Descriptor, ASignalEndsTheWait) {
    const Ends empty;
    interrupt([&] {
        const Read read(empty.out(), -1, PELORIN_FOREVER);
        EXPECT_EQ(read.result, -1);
        EXPECT_EQ(read.error, EINTR);
    });
}

TEST(Descriptor, AWriteGoesOnUntilAnErrorAndCountsUpToIt) {
    const Ends ends;
    std::uint32_t written = 77;
    EXPECT_EQ(PelorinWriteToCompletion(-1, "", 0, &written), 0);
    EXPECT_EQ(written, 0u);
    EXPECT_EQ(PelorinWriteToCompletion(-1, "abc", 3, &written), EBADF);
    EXPECT_EQ(written, 0u);

    // A signal cuts the write at what found room; the next one finds nothing written.
    const auto room = static_cast<std::uint32_t>(::fcntl(ends.in(), F_SETPIPE_SZ, 65536));
    const std::string more(room + 1000, 'm');
    interrupt([&] {
        EXPECT_EQ(PelorinWriteToCompletion(ends.in(), more.data(), room + 1000, &written), EINTR);
    });
    EXPECT_EQ(written, room);
}

TEST(Descriptor, AWriteToCompletionIsWhole) {
    const Ends ends;
    const std::string text(300'000, 't');
    std::uint32_t written = 0;
    auto error = std::async(std::launch::async, [&] {
        return PelorinWriteToCompletion(ends.in(), text.data(), 300'000, &written);
    });
    std::string got(text.size(), '.');
    EXPECT_TRUE(PelorinUnblockableReadToCompletionWithTimeout(ends.out(), -1, got.data(), 300'000,
                                                              PELORIN_FOREVER));
    EXPECT_EQ(error.get(), 0);
    EXPECT_EQ(written, 300'000u);
    EXPECT_EQ(got, text);
}

}  // namespace
