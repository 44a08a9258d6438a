#pragma once

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/event.h"
#include "bench/support/process.h"

// What is measured of one update that goes to N watchers, the same for every
// peer. Three processes, placed by the scheduler: the setter (which measures),
// the service, and one that holds all N watcher connections.
//
//   latency N  one SET at a time; from before the SET until the last watcher has
//              it; us
//   rate N     SETs follow each other, at most kWindow of them not yet everywhere;
//              million deliveries/s
namespace bench::fanout_cases {

inline constexpr std::string_view kPath = "/radio/signal";
inline constexpr std::string_view kValue = "a value of thirty-two characters";
inline constexpr std::uint64_t kWindow = 64;

// What the watchers tell the setter, in shared memory.
class Board {
  public:
    // Watchers: one is registered. Setter: waits until all are.
    void attach(std::uint64_t watchers) noexcept {
        if (attached_.fetch_add(1) + 1 == watchers)
            ready_.signal();
    }
    void waitForWatchers() noexcept { ready_.wait(); }

    // Watchers: `count` more deliveries. One thread at a time.
    void deliver(std::uint64_t count = 1) noexcept {
        const std::uint64_t before = delivered_.load(std::memory_order_relaxed);
        const std::uint64_t now = before + count;
        const std::uint64_t target = target_.load();
        if (before < target && now >= target)
            reachedNs_.store(nowNs());
        delivered_.store(now);
        // Read again: the setter may have aimed, and gone to sleep, meanwhile.
        if (now >= target_.load() && waiting_.load() != 0 && waiting_.exchange(0) != 0)
            detail::futexWake(waiting_);
    }

    // Setter: waits for deliveries up to `target`. reachedNs() is exact when the
    // target was set before the message that completes it.
    void aim(std::uint64_t target) noexcept { target_.store(target); }
    void waitForTarget() noexcept {
        const std::uint64_t target = target_.load();
        while (delivered_.load() < target) {
            waiting_.store(1);
            if (delivered_.load() < target)
                detail::futexWait(waiting_, 1);
        }
        waiting_.store(0);
    }
    // When the target was reached, on nowNs()'s clock.
    [[nodiscard]] std::int64_t reachedNs() const noexcept { return reachedNs_.load(); }
    [[nodiscard]] std::uint64_t delivered() const noexcept { return delivered_.load(); }

  private:
    std::atomic<std::uint64_t> attached_{0};
    Event ready_;
    alignas(64) std::atomic<std::uint64_t> delivered_{0};
    std::atomic<std::uint64_t> target_{~std::uint64_t{0}};
    std::atomic<std::int64_t> reachedNs_{0};
    alignas(64) std::atomic<std::uint32_t> waiting_{0};
};

struct Case {
    bool latency = true;
    std::uint64_t watchers = 1;
    std::string variant;      // a third argument, for peers that have some
    std::uint64_t share = 1;  // of the SETs of a rate, one in so many: for slow peers

    // SETs that are measured; a tenth more come before them.
    [[nodiscard]] std::uint64_t sets() const {
        if (latency)
            return watchers == 1 ? 5'000 : watchers == 100 ? 2'000 : 300;
        return (watchers == 1 ? 200'000 : 1'000'000 / watchers) / share;
    }
};

inline Case parse(int argc, char** argv) {
    if (argc < 3)
        fail("usage: latency|rate WATCHERS [VARIANT]");
    allowOpenFiles(8'192);
    return {std::string_view(argv[1]) == "latency", std::stoull(argv[2]), argc > 3 ? argv[3] : "",
            1};
}

template <class Set>
void measureLatency(const Case& measured, Board& board, Set set) {
    std::vector<std::int64_t> taken;
    const std::uint64_t warmUp = measured.sets() / 10;
    for (std::uint64_t n = 0; n < warmUp + measured.sets(); ++n) {
        board.aim((n + 1) * measured.watchers);
        const std::int64_t start = nowNs();
        set();
        board.waitForTarget();
        if (n >= warmUp)
            taken.push_back(board.reachedNs() - start);
    }
    std::sort(taken.begin(), taken.end());
    result("p50_us", static_cast<double>(taken[taken.size() / 2]) * 1e-3);
    result("p99_us", static_cast<double>(taken[taken.size() * 99 / 100]) * 1e-3);
}

template <class Set>
void setInWindow(const Case& measured, Board& board, std::uint64_t first, std::uint64_t count,
                 Set set) {
    for (std::uint64_t n = first; n < first + count; ++n) {
        if (n % (kWindow / 2) == 0 && n >= first + kWindow) {
            board.aim((n - kWindow / 2) * measured.watchers);
            board.waitForTarget();
        }
        set();
    }
    board.aim((first + count) * measured.watchers);
    board.waitForTarget();
}

template <class Set>
void measureRate(const Case& measured, Board& board, Set set) {
    const std::uint64_t warmUp = measured.sets() / 10;
    setInWindow(measured, board, 0, warmUp, set);
    const std::int64_t start = nowNs();
    setInWindow(measured, board, warmUp, measured.sets(), set);
    const auto taken = static_cast<double>(nowNs() - start);
    result("million_per_s", static_cast<double>(measured.sets() * measured.watchers) / taken * 1e3);
}

// `set` makes one SET. All watchers are registered. Fails when a delivery came
// twice.
template <class Set>
void measure(const Case& measured, Board& board, Set set) {
    if (measured.latency)
        measureLatency(measured, board, set);
    else
        measureRate(measured, board, set);
    if (board.delivered() != (measured.sets() / 10 + measured.sets()) * measured.watchers)
        fail("more was delivered than set");
}

}  // namespace bench::fanout_cases
