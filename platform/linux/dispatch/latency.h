#pragma once

#include <array>
#include <atomic>
#include <cstdint>

#include "dispatch/diagnostics.h"
#include "dispatch/queue.h"

// The statistics of a queue that keeps them.
//
// Work is stamped when it is submitted, by a second node around it: nodes have no
// room for a time, and work of queues without statistics needs none.
namespace dispatch::detail {

class queue_core;
struct embedded_item;

class counted_durations {
  public:
    // Any thread.
    void add(std::int64_t nanoseconds) noexcept;
    std::uint64_t read(std::size_t bucket, bool take) noexcept {
        return take ? counts_[bucket].exchange(0, std::memory_order_relaxed)
                    : counts_[bucket].load(std::memory_order_relaxed);
    }
    std::int64_t read_longest(bool take) noexcept {
        return take ? longest_.exchange(0, std::memory_order_relaxed)
                    : longest_.load(std::memory_order_relaxed);
    }

  private:
    std::array<std::atomic<std::uint64_t>, histogram::kBuckets> counts_{};
    std::atomic<std::int64_t> longest_{0};  // nanoseconds
};

struct latencies {
    counted_durations wait;
    counted_durations run;
};

// A node around `work` that has it run and counted; `work` itself when there is no
// memory.
[[nodiscard]] item* stamped(latencies& into, closure_item* work) noexcept;
[[nodiscard]] item* stamped(latencies& into, embedded_item* work) noexcept;
// When `work` was submitted, monotonic nanoseconds; 0 when it is not stamped. The
// caller sees to it that it stays.
[[nodiscard]] std::int64_t submission_of(const item* work) noexcept;

[[nodiscard]] queue_statistics read(latencies* from, bool take) noexcept;

// One sync().
struct measured_sync {
    latencies& into;
    void (*function)(void*) noexcept;
    void* context;
    std::int64_t called = time::now().nanoseconds();

    static void run(void* opaque) noexcept;
};

}  // namespace dispatch::detail
