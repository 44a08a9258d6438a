#pragma once

#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <ctime>

#include "dispatch/time.h"

// futex(2), process-private.
namespace dispatch::detail {

// Sleeps while `word` holds `expected`, at most until `until`. Returns false on
// time-out; true otherwise, also without a reason.
inline bool futex_wait(std::atomic<std::uint32_t>& word, std::uint32_t expected,
                       time until = forever) noexcept {
    timespec deadline{};
    timespec* limit = nullptr;
    int operation = FUTEX_WAIT_BITSET | FUTEX_PRIVATE_FLAG;
    if (!until.is_forever()) {
        if (until.on() == clock::wall)
            operation |= FUTEX_CLOCK_REALTIME;
        else if (until.on() == clock::boot)  // the kernel offers no futex on this clock
            until = time::after(std::chrono::nanoseconds(until.nanoseconds() -
                                                         time::now(clock::boot).nanoseconds()));
        deadline.tv_sec = until.nanoseconds() / 1'000'000'000;
        deadline.tv_nsec = until.nanoseconds() % 1'000'000'000;
        limit = &deadline;
    }
    const long result =
        ::syscall(SYS_futex, &word, operation, expected, limit, nullptr, FUTEX_BITSET_MATCH_ANY);
    return result == 0 || errno != ETIMEDOUT;
}

// The word may be gone already when this is called: a wake-up of an address
// that nobody waits on does nothing.
inline void futex_wake(std::atomic<std::uint32_t>& word, int count) noexcept {
    ::syscall(SYS_futex, &word, FUTEX_WAKE | FUTEX_PRIVATE_FLAG, count, nullptr, nullptr, 0);
}
inline void futex_wake_all(std::atomic<std::uint32_t>& word) noexcept {
    futex_wake(word, INT_MAX);
}

inline void cpu_relax() noexcept {
#if defined(__x86_64__) || defined(__i386__)
    __builtin_ia32_pause();
#elif defined(__aarch64__)
    asm volatile("yield");
#endif
}

}  // namespace dispatch::detail
