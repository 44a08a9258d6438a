#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <memory>
#include <string_view>
#include <thread>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/event.h"
#include "bench/support/process.h"

// What is measured of serial queues, written once for every peer.
//
// A peer is a class made once a process from a number of workers (as many as
// processors are used; for peers that let their user choose) and a member class
// Queue: constructed from the peer, with post(callable). A queue may go while its
// work waits. Every closure posted here captures one pointer, so that no peer
// allocates for its size.
//
//   post_drain_1, _2  1 or 2 producer threads post to one queue as fast as they
//                     can; until all ran; ns a closure
//   hop               work of queue A posts to B, that to A, …; ns a hop
//   round_robin       one producer posts to 1,000 queues in turn; until all
//                     ran; ns a closure
//   many_queues       the same with 10,000 queues and 1,000 closures each, of which
//                     each checks that it comes in its order
//   create            create and destroy a queue without work; ns
//   outside           post, the closure signals, the poster waits; all threads
//                     on one processor; us
namespace bench::dispatch_cases {

inline constexpr std::uint64_t kPosts = 2'000'000;
inline constexpr std::uint64_t kHops = 1'000'000;
inline constexpr std::uint64_t kCreations = 1'000'000;
inline constexpr std::uint64_t kWaits = 100'000;
inline constexpr std::size_t kQueues = 1'000;
inline constexpr std::size_t kManyQueues = 10'000;
inline constexpr std::uint32_t kEach = 1'000;

// Signals once it was counted down to 0.
class Countdown {
  public:
    explicit Countdown(unsigned from) : left_(from) {}
    void operator()() noexcept {
        if (left_.fetch_sub(1, std::memory_order_acq_rel) == 1)
            reached_.signal();
    }
    void wait() noexcept { reached_.wait(); }

  private:
    std::atomic<unsigned> left_;
    Event reached_;
};

// Nanoseconds for `posts` in all.
template <class Peer>
std::int64_t postDrain(Peer& peer, unsigned producers, std::uint64_t posts) {
    typename Peer::Queue queue(peer);
    std::uint64_t ran = 0;  // touched by the queue's work only
    Countdown done(producers);
    std::atomic<unsigned> ready{0};
    std::atomic<bool> go{false};
    std::vector<std::thread> threads;
    for (unsigned i = 0; i < producers; ++i)
        threads.emplace_back([&] {
            ready.fetch_add(1);
            while (!go.load(std::memory_order_acquire))
                std::this_thread::yield();
            for (std::uint64_t n = 0; n < posts / producers; ++n)
                queue.post([&ran] { ++ran; });
            queue.post([&done] { done(); });
        });
    while (ready.load() < producers)
        std::this_thread::yield();
    const std::int64_t start = nowNs();
    go.store(true, std::memory_order_release);
    done.wait();
    const std::int64_t taken = nowNs() - start;
    for (std::thread& thread : threads)
        thread.join();
    if (ran != posts / producers * producers)
        fail("work was lost");
    return taken;
}

template <class Peer>
struct Hops {
    explicit Hops(Peer& peer, std::uint64_t count)
        : first(peer), second(peer), queues{&first, &second}, left(count) {}

    void next() {
        if (left == 0)
            done.signal();
        else
            queues[--left & 1]->post([this] { next(); });
    }

    typename Peer::Queue first;
    typename Peer::Queue second;
    std::array<typename Peer::Queue*, 2> queues;
    std::uint64_t left;  // handed on with the hop
    Event done;
};

template <class Peer>
std::int64_t hop(Peer& peer, std::uint64_t hops) {
    Hops<Peer> state(peer, hops);
    const std::int64_t start = nowNs();
    state.next();
    state.done.wait();
    return nowNs() - start;
}

template <class Peer>
std::int64_t roundRobin(Peer& peer, std::uint64_t posts) {
    struct alignas(64) Counter {
        std::uint64_t ran = 0;
    };
    std::deque<typename Peer::Queue> queues;
    for (std::size_t i = 0; i < kQueues; ++i)
        queues.emplace_back(peer);
    std::vector<Counter> counters(kQueues);
    Countdown done(kQueues);
    const std::int64_t start = nowNs();
    for (std::uint64_t n = 0; n < posts / kQueues; ++n)
        for (std::size_t i = 0; i < kQueues; ++i)
            queues[i].post([counter = &counters[i]] { ++counter->ran; });
    for (auto& queue : queues)
        queue.post([&done] { done(); });
    done.wait();
    const std::int64_t taken = nowNs() - start;
    for (const Counter& counter : counters)
        if (counter.ran != posts / kQueues)
            fail("work was lost");
    return taken;
}

template <class Peer>
int manyQueues(Peer& peer) {
    struct Line {
        explicit Line(Peer& on) : queue(on) {}
        typename Peer::Queue queue;
        std::uint32_t next = 0;
        std::uint32_t faults = 0;
    };
    std::deque<Line> lines;
    for (std::size_t i = 0; i < kManyQueues; ++i)
        lines.emplace_back(peer);
    Countdown done(kManyQueues);
    const std::int64_t start = nowNs();
    for (std::uint32_t n = 0; n < kEach; ++n)
        for (Line& line : lines)
            line.queue.post([&line, n] { line.faults += line.next++ != n; });
    for (Line& line : lines)
        line.queue.post([&done] { done(); });
    done.wait();
    const std::int64_t taken = nowNs() - start;
    for (const Line& line : lines)
        if (line.next != kEach || line.faults != 0)
            fail("work was lost or came out of its order");
    result("ns", static_cast<double>(taken) / static_cast<double>(kManyQueues * kEach));
    return 0;
}

template <class Peer>
std::int64_t create(Peer& peer, std::uint64_t count) {
    const std::int64_t start = nowNs();
    for (std::uint64_t n = 0; n < count; ++n) {
        typename Peer::Queue queue(peer);
        asm volatile("" : : "r"(&queue) : "memory");
    }
    return nowNs() - start;
}

template <class Peer>
std::int64_t outside(Peer& peer, std::uint64_t waits) {
    typename Peer::Queue queue(peer);
    Event ran;
    const std::int64_t start = nowNs();
    for (std::uint64_t n = 0; n < waits; ++n) {
        queue.post([&ran] { ran.signal(); });
        ran.wait();
    }
    return nowNs() - start;
}

// Warms up with a tenth of the work, measures the rest, prints ns an operation.
template <class Measure>
int report(std::uint64_t operations, Measure measure) {
    measure(operations / 10);
    const std::int64_t taken = measure(operations);
    result("ns", static_cast<double>(taken) / static_cast<double>(operations));
    return 0;
}

// Runs the case that the command line names; a second argument is the number of
// operations, in place of the usual one.
template <class Peer>
int run(int argc, char** argv) {
    const std::string_view name = argc >= 2 ? argv[1] : "";
    const auto usual = [&](std::uint64_t operations) {
        return argc == 3 ? std::strtoull(argv[2], nullptr, 10) : operations;
    };
    const bool pinned = name == "outside";
    if (pinned)
        pinTo(1);
    Peer peer(pinned ? 1 : 2);
    if (name == "post_drain_1")
        return report(usual(kPosts), [&](std::uint64_t n) { return postDrain(peer, 1, n); });
    if (name == "post_drain_2")
        return report(usual(kPosts), [&](std::uint64_t n) { return postDrain(peer, 2, n); });
    if (name == "hop")
        return report(usual(kHops), [&](std::uint64_t n) { return hop(peer, n); });
    if (name == "round_robin")
        return report(usual(kPosts), [&](std::uint64_t n) { return roundRobin(peer, n); });
    if (name == "many_queues")
        return manyQueues(peer);
    if (name == "create")
        return report(usual(kCreations), [&](std::uint64_t n) { return create(peer, n); });
    if (name == "outside")
        return report(kWaits, [&](std::uint64_t n) { return outside(peer, n); });
    std::fprintf(stderr, "unknown case\n");
    return 2;
}

}  // namespace bench::dispatch_cases
