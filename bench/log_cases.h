#pragma once

#include <malloc.h>

#include <algorithm>
#include <atomic>
#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/event.h"
#include "bench/support/process.h"

// What is measured of logging, written once for every peer.
//
// A peer is a class made from a file's name and a Gate, or null, that its
// backend is to pass before each message. It hands the messages of logger
// kLogger to that file on a thread of its own: time, level, logger, text; Info
// and above; callers wait while kQueued messages do. It has
//   finish()      everything logged before is in the file
//   class Caller  made from the peer by each thread that logs:
//     message(a, b)   logs kText, a, a space, b at level Info
//     disabled(a, b)  the same at level Debug, which is off
//
// Every case reads its file afterwards: a message that is missing, twice or out
// of its thread's order ends the run without a figure.
//
//   paced N     N threads, each with a message every 10 to 20 us, at random,
//               busy in between: a backend that waits for messages falls asleep,
//               and the call that wakes it pays for that; ns a call
//   brisk N     the same every 0.5 to 1 us: a backend that keeps up sleeps now
//               and then
//   flooded N   N threads that do nothing else. Percentiles from one half of the
//               run; mean and messages per second (from the first call until
//               everything is in the file) from the other, without clock readings
//   disabled    ns a message whose level is off
//   empty       the loop of `disabled` without a message
//   memory      bytes of heap for a message that waits: growth since before the
//               peer was made, with a held backend and kHeld messages waiting
//
// The clock's own cost is measured, as the median of readings that follow each
// other, and taken off every call that was read.
namespace bench::log_cases {

inline constexpr char kLogger[] = "radio.modem";
inline constexpr char kText[] = "The modem has registered on a new cell: ";
static_assert(sizeof kText - 1 == 40);
inline constexpr std::size_t kQueued = 8'192;
inline constexpr std::size_t kHeld = 8'000;
inline constexpr std::size_t kPaced = 50'000;          // calls of all threads
inline constexpr std::size_t kFlooded = 600'000;       // the same
inline constexpr std::uint64_t kDisabled = 1'000'000;  // calls a lap
inline constexpr int kFirstNumber = 1'000'000;

// Closed first; open for good after open().
class Gate {
  public:
    void pass() {
        if (!open_) {
            event_.wait();
            open_ = true;
        }
    }
    void open() { event_.signal(); }

  private:
    bool open_ = false;  // the backend's
    Event event_;
};

// Numbers of the messages that each thread is to have in the file.
class Reader {
  public:
    explicit Reader(unsigned threads) : next_(threads, kFirstNumber) {}

    void read(const std::string& file, std::size_t eachThread) {
        std::ifstream stream(file);
        for (std::string line; std::getline(stream, line);)
            take(line);
        for (const int next : next_)
            if (next != kFirstNumber + static_cast<int>(eachThread))
                fail("messages are missing");
    }

  private:
    void take(std::string_view line) {
        const std::size_t text = line.find(kText);
        if (text == line.npos || line.find(kLogger) > text)
            fail("not a message: " + std::string(line));
        unsigned thread = 0;
        int number = 0;
        const char* const end = line.data() + line.size();
        const auto first = std::from_chars(line.data() + text + sizeof kText - 1, end, thread);
        if (first.ptr == end || thread >= next_.size() ||
            std::from_chars(first.ptr + 1, end, number).ptr != end || number != next_[thread]++)
            fail("a message out of order: " + std::string(line));
    }

    std::vector<int> next_;  // of each thread
};

// One peer with a file of its own.
template <class Peer>
class Run {
  public:
    explicit Run(unsigned threads, Gate* gate = nullptr)
        : threads_(threads), file_(folder_.path() + "/log"), peer_(file_, gate) {}

    // `work` in each thread, with its caller and its number; they start together.
    // Nanoseconds until everything is in the file.
    template <class Work>
    std::int64_t log(Work work) {
        std::atomic<unsigned> ready{0};
        std::atomic<bool> go{false};
        std::vector<std::thread> threads;
        for (unsigned number = 0; number < threads_; ++number)
            threads.emplace_back([&, number] {
                typename Peer::Caller caller(peer_);
                ready.fetch_add(1);
                while (!go.load(std::memory_order_acquire)) {
                }
                work(caller, number);
            });
        while (ready.load() < threads_)
            std::this_thread::yield();
        const std::int64_t start = nowNs();
        go.store(true, std::memory_order_release);
        for (std::thread& thread : threads)
            thread.join();
        peer_.finish();
        return nowNs() - start;
    }

    void check(std::size_t eachThread) { Reader(threads_).read(file_, eachThread); }

  private:
    const unsigned threads_;
    TemporaryFolder folder_;
    const std::string file_;
    Peer peer_;
};

inline std::int64_t percentile(std::vector<std::int64_t>& sorted, unsigned percent) {
    return sorted[std::min(sorted.size() - 1, sorted.size() * percent / 100)];
}

inline std::int64_t clockCost() {
    LapRecorder laps(1'000, 100'000);
    laps.start();
    while (laps.lap()) {
    }
    return laps.percentile(50);
}

// How long each call took, the clock's cost taken off.
class Samples {
  public:
    explicit Samples(std::size_t calls) { calls_.reserve(calls); }

    template <class Caller>
    std::int64_t call(Caller& caller, unsigned thread, int number) {
        const std::int64_t before = nowNs();
        caller.message(static_cast<int>(thread), number);
        const std::int64_t after = nowNs();
        calls_.push_back(after - before - cost_);
        return after;
    }
    void add(const Samples& other) {
        calls_.insert(calls_.end(), other.calls_.begin(), other.calls_.end());
    }
    void tellPercentiles() {
        std::sort(calls_.begin(), calls_.end());
        result("p50_ns", static_cast<double>(percentile(calls_, 50)));
        result("p99_ns", static_cast<double>(percentile(calls_, 99)));
    }
    void tellMean() const {
        double sum = 0;
        for (const std::int64_t taken : calls_)
            sum += static_cast<double>(taken);
        result("mean_ns", sum / static_cast<double>(calls_.size()));
    }

  private:
    const std::int64_t cost_ = clockCost();
    std::vector<std::int64_t> calls_;  // nanoseconds
};

// Calls `pause(end of the last call)` after each call; a tenth is to warm up.
template <class Peer, class Pause>
Samples sampled(unsigned threads, std::size_t calls, Pause pause) {
    const std::size_t each = calls / threads;
    std::vector<Samples> samples(threads, Samples(0));
    Run<Peer> run(threads);
    run.log([&](auto& caller, unsigned thread) {
        Samples warmUp(each / 10);
        Samples kept(each);
        for (std::size_t i = 0; i < each + each / 10; ++i)
            pause((i < each / 10 ? warmUp : kept)
                      .call(caller, thread, kFirstNumber + static_cast<int>(i)));
        samples[thread].add(kept);
    });
    run.check(each + each / 10);
    for (unsigned thread = 1; thread < threads; ++thread)
        samples[0].add(samples[thread]);
    return samples[0];
}

inline void busyUntil(std::int64_t then) {
    while (nowNs() < then) {
    }
}

// A call every `pause` to twice `pause` nanoseconds.
template <class Peer>
int paced(unsigned threads, std::uint64_t pause) {
    Samples samples = sampled<Peer>(threads, kPaced, [pause](std::int64_t end) {
        thread_local std::uint64_t state = 42;
        state = state * 6364136223846793005u + 1442695040888963407u;
        busyUntil(end + static_cast<std::int64_t>(pause + (state >> 33) % pause));
    });
    samples.tellPercentiles();
    samples.tellMean();
    return 0;
}

// Tells how long the calls took, and how long it took until all were in the file.
template <class Peer>
void flood(unsigned threads, std::size_t calls) {
    const std::size_t each = calls / threads;
    std::atomic<std::int64_t> inCalls{0};
    Run<Peer> run(threads);
    const std::int64_t taken = run.log([&](auto& caller, unsigned thread) {
        const std::int64_t start = nowNs();
        for (std::size_t i = 0; i < each; ++i)
            caller.message(static_cast<int>(thread), kFirstNumber + static_cast<int>(i));
        inCalls.fetch_add(nowNs() - start);
    });
    run.check(each);
    const auto logged = static_cast<double>(each * threads);
    result("mean_ns", static_cast<double>(inCalls.load()) / logged);
    result("million_per_s", logged / static_cast<double>(taken) * 1e3);
}

template <class Peer>
int flooded(unsigned threads) {
    sampled<Peer>(threads, kFlooded, [](std::int64_t) {}).tellPercentiles();
    flood<Peer>(threads, kFlooded);
    return 0;
}

// The barrier stands for the work between two messages: whatever decides about
// a level may have changed, so that it has to be read for each one.
template <class Work>
int loop(Work work) {
    LapRecorder laps(4, 20);
    laps.start();
    do {
        for (std::uint64_t i = 0; i < kDisabled; ++i) {
            asm volatile("" : : : "memory");
            work();
        }
    } while (laps.lap());
    result("ns", static_cast<double>(laps.percentile(50)) / static_cast<double>(kDisabled));
    return 0;
}

template <class Peer>
int disabled() {
    Run<Peer> run(1);
    run.log([](auto& caller, unsigned) {
        // The barrier sees memory only that somebody else may see.
        asm volatile("" : : "r"(&caller) : "memory");
        loop([&caller] { caller.disabled(1, 2); });
    });
    run.check(0);
    return 0;
}

inline std::size_t heapBytes() {
    const struct mallinfo2 info = ::mallinfo2();
    return info.uordblks + info.hblkhd;
}

template <class Peer>
int memory() {
    const std::size_t before = heapBytes();
    Gate gate;
    std::size_t grown = 0;
    Run<Peer> run(1, &gate);
    run.log([&](auto& caller, unsigned) {
        for (std::size_t i = 0; i < kHeld; ++i)
            caller.message(0, kFirstNumber + static_cast<int>(i));
        grown = heapBytes() - before;
        gate.open();
    });
    run.check(kHeld);
    result("bytes", static_cast<double>(grown) / static_cast<double>(kHeld));
    return 0;
}

// Runs the case that the command line names.
template <class Peer>
int run(int argc, char** argv) {
    const std::string_view name = argc > 1 ? argv[1] : "";
    const auto threads = static_cast<unsigned>(argc > 2 ? std::strtoul(argv[2], nullptr, 10) : 1);
    if (name == "paced")
        return paced<Peer>(threads, 10'000);
    if (name == "brisk")
        return paced<Peer>(threads, 500);
    if (name == "flooded")
        return flooded<Peer>(threads);
    if (name == "disabled")
        return disabled<Peer>();
    if (name == "empty")
        return loop([] {});
    if (name == "memory")
        return memory<Peer>();
    std::fprintf(stderr, "unknown case\n");
    return 2;
}

}  // namespace bench::log_cases
