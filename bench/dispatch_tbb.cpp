// oneTBB has no serial queue; its documentation's idiom is a concurrent_queue
// and a count of what waits: the post that raises it from 0 enqueues a task that
// empties the queue. Faster here than a flow graph's serial function_node, which
// makes a task a message; an arena of concurrency 1 a queue keeps no order.

#include <tbb/concurrent_queue.h>
#include <tbb/global_control.h>
#include <tbb/task_arena.h>

#include <cstddef>
#include <functional>
#include <memory>
#include <utility>

#include "bench/dispatch_cases.h"

namespace {

struct TbbPeer {
    // The limit counts the main thread too.
    explicit TbbPeer(unsigned workers)
        : limit(tbb::global_control::max_allowed_parallelism, workers + 1),
          arena(static_cast<int>(workers), 0) {}

    struct State {
        explicit State(tbb::task_arena& runner) : arena(runner) {}

        // Empties the queue; `self` keeps the state alive meanwhile.
        static void drain(const std::shared_ptr<State>& self) {
            std::size_t left = self->waiting.load(std::memory_order_acquire);
            while (left > 0) {
                for (std::size_t n = 0; n < left; ++n) {
                    std::function<void()> work;
                    while (!self->work.try_pop(work)) {
                    }
                    work();
                }
                left = self->waiting.fetch_sub(left, std::memory_order_acq_rel) - left;
            }
        }

        tbb::task_arena& arena;
        tbb::concurrent_queue<std::function<void()>> work;
        std::atomic<std::size_t> waiting{0};
    };

    class Queue {
      public:
        explicit Queue(TbbPeer& peer) : state_(std::make_shared<State>(peer.arena)) {}
        template <class Callable>
        void post(Callable&& work) {
            state_->work.push(std::forward<Callable>(work));
            if (state_->waiting.fetch_add(1, std::memory_order_acq_rel) == 0)
                state_->arena.enqueue([state = state_] { State::drain(state); });
        }

      private:
        std::shared_ptr<State> state_;
    };

    tbb::global_control limit;
    tbb::task_arena arena;
};

}  // namespace

int main(int argc, char** argv) {
    return bench::dispatch_cases::run<TbbPeer>(argc, argv);
}
