// Our serial queues. Also `sync`: sync() on an idle queue.

#include <utility>

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

      private:
        dispatch::queue queue_;
    };
};

int idleSync() {
    const dispatch::queue queue = dispatch::queue::create("bench");
    std::uint64_t counter = 0;
    // Worker threads exist, as they do beside the mutex.
    bench::Event ran;
    queue.async([&ran] { ran.signal(); });
    ran.wait();
    return bench::dispatch_cases::report(10'000'000, [&](std::uint64_t count) {
        const std::int64_t start = bench::nowNs();
        for (std::uint64_t n = 0; n < count; ++n)
            queue.sync([&counter] {
                ++counter;
                asm volatile("" : : "r"(&counter) : "memory");
            });
        return bench::nowNs() - start;
    });
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 2 && std::string_view(argv[1]) == "sync")
        return idleSync();
    return bench::dispatch_cases::run<PelorinPeer>(argc, argv);
}
