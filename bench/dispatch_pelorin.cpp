// Our serial queues. Also
//   sync        sync() on an idle queue
//   idle_queue  the heap's growth over 100,000 queues without work; bytes each
//   blocked     1,000 queues whose work blocks in read(), until the pool has all
//               workers that it may have and for a second more: the longest wait of
//               another queue's work, which comes each millisecond; ms
//   measured    post_drain_1 onto a queue that keeps statistics

#include <malloc.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <utility>
#include <vector>

#include "bench/dispatch_cases.h"
#include "dispatch/dispatch.h"

namespace {

struct PelorinPeer {
    explicit PelorinPeer(unsigned) {}  // the pool chooses by the processors it may use

    class Queue {
      public:
        explicit Queue(PelorinPeer&) : queue_(dispatch::queue::create("bench")) {}
        template <class Callable>
        void post(Callable&& work) {
            queue_.async(std::forward<Callable>(work));
        }

        [[nodiscard]] const dispatch::queue& get() const { return queue_; }

      private:
        dispatch::queue queue_;
    };
};

struct MeasuredPeer {
    struct Queue : PelorinPeer::Queue {
        explicit Queue(MeasuredPeer& peer) : PelorinPeer::Queue(peer.plain) {
            dispatch::enable_statistics(get());
        }
    };
    PelorinPeer plain{2};
};

unsigned workers() {
    unsigned count = 0;
    std::sscanf(dispatch::dump().c_str(), "dispatch: %u", &count);
    return count;
}

int idleSync(std::uint64_t operations) {
    const dispatch::queue queue = dispatch::queue::create("bench");
    std::uint64_t counter = 0;
    // Worker threads exist, as they do beside the mutex.
    bench::Event ran;
    queue.async([&ran] { ran.signal(); });
    ran.wait();
    return bench::dispatch_cases::report(operations, [&](std::uint64_t count) {
        const std::int64_t start = bench::nowNs();
        for (std::uint64_t n = 0; n < count; ++n)
            queue.sync([&counter] {
                ++counter;
                asm volatile("" : : "r"(&counter) : "memory");
            });
        return bench::nowNs() - start;
    });
}

int idleQueues() {
    constexpr std::size_t kCount = 100'000;
    std::vector<dispatch::queue> queues;
    queues.reserve(kCount);
    const auto before = ::mallinfo2();
    for (std::size_t i = 0; i < kCount; ++i)
        queues.push_back(dispatch::queue::create("com.example.telephony.sms.outbox"));
    const auto after = ::mallinfo2();
    const std::size_t grown = after.uordblks + after.hblkhd - before.uordblks - before.hblkhd;
    bench::result("bytes", static_cast<double>(grown) / kCount);
    return 0;
}

// Of work that `queue` gets each millisecond, until `enough`.
template <class Enough>
std::int64_t longestWait(const dispatch::queue& queue, Enough enough) {
    std::int64_t longest = 0;
    bench::Event ran;
    do {
        const std::int64_t posted = bench::nowNs();
        std::int64_t begun = 0;
        queue.async([&] {
            begun = bench::nowNs();
            ran.signal();
        });
        ran.wait();
        longest = std::max(longest, begun - posted);
        ::usleep(1'000);
    } while (!enough());
    return longest;
}

int blockedWorkers() {
    constexpr std::size_t kBlocks = 1'000;
    int pipes[2];
    bench::check(::pipe(pipes), "pipe");
    const auto other = dispatch::queue::create("other");
    other.sync([] {});
    longestWait(other, [] { return true; });
    bench::dispatch_cases::Countdown done(kBlocks);
    std::vector<dispatch::queue> queues;
    for (std::size_t i = 0; i < kBlocks; ++i)
        queues.emplace_back(dispatch::queue::create("blocked")).async([&] {
            char one;
            bench::check(static_cast<int>(::read(pipes[0], &one, 1)), "read");
            done();
        });
    std::int64_t full = 0;
    const auto start = bench::nowNs();
    const std::int64_t longest = longestWait(other, [&] {
        const std::int64_t now = bench::nowNs();
        if (full == 0 && workers() == dispatch::kMaximumWorkers)
            full = now;
        if (now - start > 60'000'000'000)
            bench::fail("the pool did not grow");
        return full != 0 && now - full > 1'000'000'000;
    });
    const std::vector<char> bytes(kBlocks);
    bench::check(static_cast<int>(::write(pipes[1], bytes.data(), bytes.size())), "write");
    done.wait();
    bench::result("ms", static_cast<double>(longest) / 1e6);
    bench::result("full_ms", static_cast<double>(full - start) / 1e6);
    return 0;
}

int measured() {
    return bench::dispatch_cases::report(bench::dispatch_cases::kPosts, [](std::uint64_t count) {
        MeasuredPeer peer;
        return bench::dispatch_cases::postDrain(peer, 1, count);
    });
}

}  // namespace

int main(int argc, char** argv) {
    if (argc >= 2 && std::string_view(argv[1]) == "sync")
        return idleSync(argc == 3 ? std::strtoull(argv[2], nullptr, 10) : 10'000'000);
    if (argc == 2 && std::string_view(argv[1]) == "idle_queue")
        return idleQueues();
    if (argc == 2 && std::string_view(argv[1]) == "blocked")
        return blockedWorkers();
    if (argc == 2 && std::string_view(argv[1]) == "measured")
        return measured();
    return bench::dispatch_cases::run<PelorinPeer>(argc, argv);
}
