// A highest block of a PriorityQueue behind 100,000 normal ones that wait, each of
// which takes 10 us. Submitted by another thread at any moment of a normal block's run:
//   p50_us, p99_us  from before the submission to the block's start
// and what that is made of:
//   block_us        a normal block's run, median
//   hop_us          from the end of a normal block, which submits the highest one
//                   as its last act, to that one's start; median

#include <algorithm>
#include <cstdint>
#include <random>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/event.h"
#include "bench/support/process.h"
#include "plr/concurrency/priority_queue.h"

namespace {

using Block = dispatch::block<void()>;
using Queue = plr::concurrency::PriorityQueue;
using enum Queue::Priority;

constexpr std::uint64_t kWaiting = 100'000;
constexpr std::uint64_t kSubmitted = 2 * kWaiting;  // those that run meanwhile, too
constexpr std::int64_t kBlockNs = 10'000;
constexpr std::size_t kSamples = 2'000;

void spinFor(std::int64_t ns) {
    const std::int64_t end = bench::nowNs() + ns;
    while (bench::nowNs() < end) {
    }
}

struct Load {
    void normalBlock() {
        if (over)
            return;
        const std::int64_t start = bench::nowNs();
        spinFor(kBlockNs);
        ++ran;
        const std::int64_t end = bench::nowNs();
        blocks.add(end - start);
        if (ran % 8 == 0)
            queue.addHighestPriorityBlock(Block([this, end] { hops.add(bench::nowNs() - end); }));
    }

    // Highest blocks after pauses that fall anywhere in a normal block's run.
    void sample() {
        std::minstd_rand random(1);
        for (std::size_t i = 0; i < kSamples; ++i) {
            spinFor(static_cast<std::int64_t>(20'000 + random() % 20'000));
            const std::int64_t start = bench::nowNs();
            queue.addHighestPriorityBlock(Block([this, start] {
                latencies.add(bench::nowNs() - start);
                sampled.signal();
            }));
            sampled.wait();
        }
    }

    struct Times {
        void add(std::int64_t ns) { all.push_back(ns); }
        [[nodiscard]] double us(unsigned percent) {
            std::sort(all.begin(), all.end());
            return static_cast<double>(all[all.size() * percent / 100]) / 1e3;
        }
        std::vector<std::int64_t> all;
    };

    Queue queue{"bench"};
    bench::Event sampled;
    // On the queue.
    bool over = false;
    std::uint64_t ran = 0;
    Times blocks;
    Times hops;
    Times latencies;
};

}  // namespace

int main() {
    Load load;
    load.queue.suspend();
    for (std::uint64_t i = 0; i < kSubmitted; ++i)
        load.queue.addBlock(Block([&load] { load.normalBlock(); }), Normal);
    load.queue.resume();
    load.sample();
    load.queue.addHighestPriorityBlockSync(Block([&load] { load.over = true; }));
    load.queue.addBlockSync(Block([] {}), Normal);
    if (kSubmitted - load.ran < kWaiting)
        bench::fail("too few normal blocks were left waiting");
    bench::result("p50_us", load.latencies.us(50));
    bench::result("p99_us", load.latencies.us(99));
    bench::result("block_us", load.blocks.us(50));
    bench::result("hop_us", load.hops.us(50));
}
