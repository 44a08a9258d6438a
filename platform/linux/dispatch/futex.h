#pragma once

#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <ctime>

#include "dispatch/time.h"
#include "dispatch/uptime.h"

// futex(2), process-private.
namespace dispatch::detail {

// When `until` will have come, on a clock that the kernel has futexes for.
inline timespec futex_deadline(time until) noexcept {
    std::int64_t nanoseconds = until.nanoseconds();
    if (until.on() == clock::boot || (until.on() == clock::monotonic && uptime::stand_in())) {
        timespec now{};
        ::clock_gettime(CLOCK_MONOTONIC, &now);
        nanoseconds += now.tv_sec * std::int64_t{1'000'000'000} + now.tv_nsec -
                       time::now(until.on()).nanoseconds();
    }
    nanoseconds = std::max<std::int64_t>(nanoseconds, 0);
    return {nanoseconds / 1'000'000'000, nanoseconds % 1'000'000'000};
}

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
        deadline = futex_deadline(until);
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
