#pragma once

#include <sys/types.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"

// Looking inside: what the queues of this process do, which piece of work takes
// too long, and how long work waits and runs.
//
// Threads: every function on any thread at any time, work of queues included.
// Cost:    nothing where it is not asked for: dump() pays for itself; a watchdog
//          costs its own thread; a queue's statistics cost that queue's work
//          (bench/dispatch_cases.h).
namespace dispatch {

// Text for people, some lines: the workers, and the threads that serve pumps (pump.h),
// with what each of them runs, live queues with what waits on them, pending timers,
// watched descriptors.
//
//   dispatch: 3 workers, 2 processors
//     worker 4711: runs "modem" for up to 12.3 s
//     worker 4712: polls
//     pump's thread 4700: is elsewhere
//   queues: 17, of which 15 are idle
//     "modem": running, 3 wait, oldest 12.2 s, suspended 1, for "radio"
//   timers: 12 monotonic, first in 3.2 s
//   descriptors: 1
//     fd 7: for "net.rx"
//
// "for up to" counts from when the worker last looked at the clock, which is at
// most some hundred pieces of work ago; with a watchdog it is as exact as that
// one. "oldest", the time since the submission of what waits longest, is known of
// queues that keep statistics. What runs while it looks makes the picture a little
// uneven; a queue is held up while what waits on it is counted. Throws std::bad_alloc.
[[nodiscard]] PLR_EXPORT std::string dump();

// ---- Watchdog ---------------------------------------------------------------------

// A piece of work that runs longer than the limit.
struct overrun {
    std::string_view label;             // its queue's; a loan for the call
    pid_t thread;                       // that runs it, gettid(2)
    std::chrono::nanoseconds at_least;  // it has run for so long, at the least
};

// From now on, `handler` is called once for each piece of work that runs on a
// worker, or on a thread that serves a pump, for longer than `limit` (at least
// 1 ms), between `limit` and a quarter more after its begin: on the watchdog's own
// thread, one call at a time, while the work still runs. Without a handler it is
// reported through the report hook (plr/base/report.h). A later call replaces both;
// a limit of zero ends it, and no call of the former handler is under way when this
// returns, unless it was the handler that called. Work counts as running while it
// waits in sync() or blocks; what sync() runs in place on other threads is not
// watched.
PLR_EXPORT void set_watchdog(std::chrono::nanoseconds limit,
                             block<void(const overrun&)> handler = nullptr);

// ---- Statistics of a queue --------------------------------------------------------

// How often durations occurred, in buckets of 1/16 of a power of two: what is read
// from it is at most 7 % above the truth.
class histogram {
  public:
    [[nodiscard]] std::uint64_t count() const noexcept { return count_; }
    // The duration that `percent` of all did not exceed; 100 for the longest, which
    // is exact. Zero without any.
    [[nodiscard]] PLR_EXPORT std::chrono::nanoseconds percentile(double percent) const noexcept;
    [[nodiscard]] std::chrono::nanoseconds longest() const noexcept {
        return std::chrono::nanoseconds(longest_);
    }

    // Of bucket(duration) in nanoseconds, the last one being open to the top.
    static constexpr std::size_t kBuckets = 672;
    static constexpr std::size_t bucket(std::uint64_t nanoseconds) noexcept;
    // The longest duration in it.
    static constexpr std::uint64_t limit(std::size_t bucket) noexcept;

  private:
    friend class statistics_reader;
    std::array<std::uint64_t, kBuckets> counts_{};
    std::uint64_t count_ = 0;
    std::int64_t longest_ = 0;  // nanoseconds
};

struct queue_statistics {
    histogram wait;  // from the submission to the begin
    histogram run;   // from the begin to the end
};

// Switches statistics of `of` on or off; they are off for a new queue, and kept
// when switched off. They cover work that is submitted from now on, by async(),
// sync() and the queue's timers and sources; work of a queue that targets this
// one is counted there. On, a piece of work costs two nodes and three readings of
// the clock; the first time allocates 11 KiB. Throws std::bad_alloc.
PLR_EXPORT void enable_statistics(const queue& of, bool on = true);
// What was counted since they were switched on, or taken.
[[nodiscard]] PLR_EXPORT queue_statistics statistics(const queue& of);
// The same, and counting begins anew: nothing is lost in between.
PLR_EXPORT queue_statistics take_statistics(const queue& of);

constexpr std::size_t histogram::bucket(std::uint64_t nanoseconds) noexcept {
    if (nanoseconds < 16)
        return static_cast<std::size_t>(nanoseconds);
    const int octave = 63 - __builtin_clzll(nanoseconds);
    const std::size_t place =
        static_cast<std::size_t>(octave - 3) * 16 + ((nanoseconds >> (octave - 4)) & 15);
    return place < kBuckets ? place : kBuckets - 1;
}

constexpr std::uint64_t histogram::limit(std::size_t bucket) noexcept {
    if (bucket < 16)
        return bucket;
    const std::size_t octave = bucket / 16 + 3;
    return ((16 + bucket % 16 + 1) << (octave - 4)) - 1;
}

}  // namespace dispatch
