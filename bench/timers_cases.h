#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string_view>
#include <utility>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/process.h"

// What is measured of timers, written once for every peer.
//
// A peer is a class made once a process, with
//   inTurns(turns, work)  calls `work` so many times from within the peer's loop
//                         (or queue) and lets it do what was put off in between
//   run(), stop()         runs the loop until a handler says stop
//   class Timer           made from the peer and a handler (a callable that
//                         captures one pointer): arm(deadline, now) for once,
//                         repeat(first, period), disarm(), destructor; in the
//                         handler, periods() that this call stands for
//
// Deadlines are nanoseconds of CLOCK_MONOTONIC. `now` is a reading of the clock
// that a turn takes once, as loops do themselves; a peer whose interface wants a
// delay gets deadline - now, one that takes deadlines reads no clock.
//
//   arm_disarm N  arm and disarm one timer object, N others waiting; ns a pair
//   life N        make a timer with its handler, arm, cancel and destroy it, N
//                 others waiting; until everything is released; ns each
//   fire          100,000 timers become due within a millisecond; from the
//                 first deadline until the last handler ran; ns each
//   drift         a timer of 10 ms for 60 s: by how much the last call is later
//                 against its time than the first calls were; us
namespace bench::timers_cases {

inline constexpr std::uint64_t kPerTurn = 1'000;
inline constexpr std::uint64_t kOperations = 2'000'000;
inline constexpr std::size_t kFirings = 100'000;
inline constexpr std::int64_t kSecond = 1'000'000'000;
inline constexpr std::int64_t kMillisecond = 1'000'000;

// Delays of 10 to 120 seconds, the usual time-outs: nothing fires.
class Delays {
  public:
    std::int64_t next() noexcept {
        state_ = state_ * 6364136223846793005u + 1442695040888963407u;
        return 10 * kSecond + static_cast<std::int64_t>((state_ >> 33) % 110'000) * kMillisecond +
               static_cast<std::int64_t>((state_ >> 40) & 0xFFFFF);
    }

  private:
    std::uint64_t state_ = 42;
};

inline constexpr auto kNothing = [] {};

// Processor time of all threads of the process.
inline std::int64_t cpuNs() noexcept {
    timespec used{};
    ::clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &used);
    return std::int64_t{used.tv_sec} * kSecond + used.tv_nsec;
}

template <class Peer>
std::vector<std::unique_ptr<typename Peer::Timer>> waiting(Peer& peer, std::size_t count) {
    std::vector<std::unique_ptr<typename Peer::Timer>> made;
    Delays delays;
    peer.inTurns(1, [&] {
        const std::int64_t now = nowNs();
        for (std::size_t i = 0; i < count; ++i) {
            made.push_back(std::make_unique<typename Peer::Timer>(peer, kNothing));
            made.back()->arm(now + delays.next(), now);
        }
    });
    return made;
}

template <class Peer>
std::int64_t armDisarm(Peer& peer, std::uint64_t operations) {
    typename Peer::Timer timer(peer, kNothing);
    Delays delays;
    const std::int64_t start = nowNs();
    peer.inTurns(operations / kPerTurn, [&] {
        const std::int64_t now = nowNs();
        for (std::uint64_t i = 0; i < kPerTurn; ++i) {
            timer.arm(now + delays.next(), now);
            timer.disarm();
        }
    });
    return nowNs() - start;
}

template <class Peer>
std::int64_t life(Peer& peer, std::uint64_t operations) {
    Delays delays;
    std::uint64_t fired = 0;
    const std::int64_t start = nowNs();
    peer.inTurns(operations / kPerTurn, [&] {
        const std::int64_t now = nowNs();
        for (std::uint64_t i = 0; i < kPerTurn; ++i) {
            typename Peer::Timer timer(peer, [&fired] { ++fired; });
            timer.arm(now + delays.next(), now);
        }
    });
    const std::int64_t taken = nowNs() - start;
    if (fired != 0)
        fail("a cancelled timer fired");
    return taken;
}

template <class Peer>
struct Firing {
    void operator()() {
        if (++fired == kFirings)
            peer.stop();
    }
    Peer& peer;
    std::size_t fired = 0;
};

template <class Peer>
int fire(Peer& peer) {
    Firing<Peer> firing{peer};
    std::vector<std::unique_ptr<typename Peer::Timer>> timers;
    // Whole milliseconds, because one of the peers knows no others.
    const std::int64_t first = (nowNs() / kMillisecond + 1'000) * kMillisecond;
    for (std::size_t i = 0; i < kFirings; ++i)
        timers.push_back(std::make_unique<typename Peer::Timer>(peer, [&firing] { firing(); }));
    peer.inTurns(1, [&] {
        for (std::size_t i = 0; i < kFirings; ++i) {
            const auto offset = static_cast<std::int64_t>(i * 7919 % kFirings) * 10;
            timers[i]->arm(first + offset, nowNs());
        }
    });
    if (nowNs() >= first)
        fail("armed too late");
    const std::int64_t usedBefore = cpuNs();
    peer.run();
    const std::int64_t taken = nowNs() - first;
    const std::int64_t used = cpuNs() - usedBefore;
    result("ns", static_cast<double>(taken) / static_cast<double>(kFirings));
    result("cpu_ns", static_cast<double>(used) / static_cast<double>(kFirings));
    return 0;
}

// The least late of the first and of the last hundred calls.
template <class Peer>
struct Drift {
    static constexpr std::int64_t kPeriod = 10 * kMillisecond;
    static constexpr std::int64_t kCalls = 6'000;
    static constexpr std::int64_t kAtBothEnds = 100;

    void operator()() {
        // What came late together is one call.
        calls += timer->periods();
        const std::int64_t by = nowNs() - (first + (calls - 1) * kPeriod);
        if (calls <= kAtBothEnds)
            early = std::min(early, by);
        if (calls > kCalls - kAtBothEnds)
            late = std::min(late, by);
        if (calls >= kCalls && !std::exchange(over, true))
            peer.stop();
    }

    Peer& peer;
    typename Peer::Timer* timer = nullptr;
    bool over = false;
    std::int64_t first = (nowNs() / kMillisecond + 20) * kMillisecond;
    std::int64_t calls = 0;
    std::int64_t early = kSecond;
    std::int64_t late = kSecond;
};

template <class Peer>
int drift(Peer& peer) {
    Drift<Peer> state{peer};
    typename Peer::Timer timer(peer, [&state] { state(); });
    state.timer = &timer;
    peer.inTurns(1, [&] { timer.repeat(state.first, state.kPeriod); });
    peer.run();
    peer.inTurns(1, [&] { timer.disarm(); });
    result("us", static_cast<double>(std::abs(state.late - state.early)) / 1e3);
    return 0;
}

// Warms up with a tenth of the work, measures the rest, prints ns an operation.
template <class Measure>
int report(std::uint64_t operations, Measure measure) {
    measure(operations / 10);
    const std::int64_t taken = measure(operations);
    result("ns", static_cast<double>(taken) / static_cast<double>(operations));
    return 0;
}

// Runs the case that the command line names.
template <class Peer>
int run(int argc, char** argv) {
    const std::string_view name = argc > 1 ? argv[1] : "";
    Peer peer;
    if (name == "fire")
        return fire(peer);
    if (name == "drift")
        return drift(peer);
    const auto others = waiting(peer, argc > 2 ? std::strtoul(argv[2], nullptr, 10) : 0);
    if (name == "arm_disarm")
        return report(kOperations, [&](std::uint64_t n) { return armDisarm(peer, n); });
    if (name == "life")
        return report(kOperations, [&](std::uint64_t n) { return life(peer, n); });
    std::fprintf(stderr, "unknown case\n");
    return 2;
}

}  // namespace bench::timers_cases
