#pragma once

#include <time.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

// Time for benchmarks: CLOCK_MONOTONIC in nanoseconds, which processes of one
// machine share, and a recorder of laps. Any thread; a recorder has one user at
// a time.
namespace bench {

inline std::int64_t nowNs() noexcept {
    timespec now{};
    ::clock_gettime(CLOCK_MONOTONIC, &now);
    return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

// Laps of round trips that follow each other without a pause: the end of one is
// the start of the next, so that one clock reading serves both.
class LapRecorder {
  public:
    // The first `warmUp` laps are not kept, the `laps` after them are.
    LapRecorder(std::size_t warmUp, std::size_t laps) : unkept_(warmUp), wanted_(laps) {
        laps_.reserve(laps);
    }

    void start() noexcept { last_ = nowNs(); }
    // Ends a lap. Returns whether another one is wanted.
    bool lap() {
        const std::int64_t now = nowNs();
        if (unkept_ > 0)
            --unkept_;
        else
            laps_.push_back(now - last_);
        last_ = now;
        return laps_.size() < wanted_;
    }

    // The lap that `percent` of them do not exceed, in nanoseconds. Sorts;
    // needs at least one lap.
    [[nodiscard]] std::int64_t percentile(unsigned percent) {
        std::sort(laps_.begin(), laps_.end());
        return laps_[std::min(laps_.size() - 1, laps_.size() * percent / 100)];
    }

  private:
    std::size_t unkept_;
    std::size_t wanted_;
    std::int64_t last_ = 0;
    std::vector<std::int64_t> laps_;  // nanoseconds each
};

}  // namespace bench
