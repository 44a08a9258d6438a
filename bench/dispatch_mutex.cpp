// The plain reference: a mutex and a deque a queue, swapped whole by the worker
// that empties it, on a pool that is a mutex, a condition variable and a deque.
// Also `bound`: a closure is allocated, linked, called and freed on one thread,
// which post and drain is held against; and `mutex`: lock and unlock of an uncontended std::mutex,
// which idle sync() is held against.

#include <condition_variable>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

#include "bench/dispatch_cases.h"

namespace {

class Pool {
  public:
    explicit Pool(unsigned workers) {
        for (unsigned i = 0; i < workers; ++i)
            workers_.emplace_back([this] { work(); });
    }
    ~Pool() {
        {
            const std::lock_guard lock(mutex_);
            ending_ = true;
        }
        wake_.notify_all();
        for (std::thread& worker : workers_)
            worker.join();
    }
    void submit(std::function<void()> task) {
        {
            const std::lock_guard lock(mutex_);
            tasks_.push_back(std::move(task));
        }
        wake_.notify_one();
    }

  private:
    void work() {
        for (;;) {
            std::unique_lock lock(mutex_);
            wake_.wait(lock, [this] { return ending_ || !tasks_.empty(); });
            if (tasks_.empty())
                return;
            const std::function<void()> task = std::move(tasks_.front());
            tasks_.pop_front();
            lock.unlock();
            task();
        }
    }

    std::mutex mutex_;
    std::condition_variable wake_;
    std::deque<std::function<void()>> tasks_;
    bool ending_ = false;
    std::vector<std::thread> workers_;
};

struct MutexPeer {
    explicit MutexPeer(unsigned workers) : pool(workers) {}

    struct State {
        static void drain(const std::shared_ptr<State>& self) {
            std::deque<std::function<void()>> batch;
            for (;;) {
                {
                    const std::lock_guard lock(self->mutex);
                    batch.clear();
                    batch.swap(self->work);
                    self->running = !batch.empty();
                    if (!self->running)
                        return;
                }
                for (const auto& work : batch)
                    work();
            }
        }

        std::mutex mutex;
        std::deque<std::function<void()>> work;
        bool running = false;
    };

    class Queue {
      public:
        explicit Queue(MutexPeer& peer) : pool_(peer.pool), state_(std::make_shared<State>()) {}
        template <class Callable>
        void post(Callable&& work) {
            bool wake = false;
            {
                const std::lock_guard lock(state_->mutex);
                state_->work.emplace_back(std::forward<Callable>(work));
                wake = !std::exchange(state_->running, true);
            }
            if (wake)
                pool_.submit([state = state_] { State::drain(state); });
        }

      private:
        Pool& pool_;
        std::shared_ptr<State> state_;
    };

    Pool pool;
};

struct Node {
    virtual ~Node() = default;
    virtual void call() = 0;
    Node* next = nullptr;
};
template <class Callable>
struct Made final : Node {
    explicit Made(Callable given) : work(given) {}
    void call() override { work(); }
    Callable work;
};

// In batches, as many as a queue has waiting when its worker keeps up.
int onOneThread() {
    constexpr std::uint64_t kBatch = 256;
    std::uint64_t ran = 0;
    return bench::dispatch_cases::report(10'000'000, [&](std::uint64_t count) {
        const std::int64_t start = bench::nowNs();
        for (std::uint64_t n = 0; n < count; n += kBatch) {
            Node* first = nullptr;
            Node** last = &first;
            for (std::uint64_t i = 0; i < kBatch; ++i) {
                auto work = [&ran] { ++ran; };
                *last = new Made<decltype(work)>(work);
                last = &(*last)->next;
            }
            while (first) {
                const std::unique_ptr<Node> done(std::exchange(first, first->next));
                done->call();
            }
        }
        return bench::nowNs() - start;
    });
}

int lockAndUnlock() {
    // A second thread exists, so that the C library does not leave the lock's
    // atomic operations out.
    const Pool pool(1);
    std::mutex mutex;
    std::uint64_t counter = 0;
    return bench::dispatch_cases::report(10'000'000, [&](std::uint64_t count) {
        const std::int64_t start = bench::nowNs();
        for (std::uint64_t n = 0; n < count; ++n) {
            const std::lock_guard lock(mutex);
            ++counter;
            asm volatile("" : : "r"(&counter) : "memory");
        }
        return bench::nowNs() - start;
    });
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 2 && std::string_view(argv[1]) == "mutex")
        return lockAndUnlock();
    if (argc == 2 && std::string_view(argv[1]) == "bound")
        return onOneThread();
    return bench::dispatch_cases::run<MutexPeer>(argc, argv);
}
