#pragma once

#include <sys/types.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "dispatch/queue.h"
#include "platform/linux/dispatch/activity.h"
#include "platform/linux/dispatch/fork.h"
#include "platform/linux/dispatch/run_list.h"
#include "platform/linux/dispatch/spin_lock.h"

// The process-wide pool of workers.
//
// A worker takes work from the run lists, high priority first. Without work one
// idle worker is the poller (it waits in epoll_wait, poller.h) and the others
// sleep on a futex, the one that slept last being woken first.
//
// Waking: a push from outside wakes one sleeper, unless a worker is searching
// already. A push by a worker that has nothing else to do, to an empty list, wakes
// nobody, because that worker comes for it next. The deputy (deputy.h) mends what that leaves open:
// it wakes or adds workers when work waits and none is taken.
//
// Distress: when work waits and workers block where the library cannot see it, the
// deputy adds workers, and work of queues that were quick so far goes first; as many
// workers as there are processors are reserved for it. So queues that block do not
// hold up others, also when there are more of them than there may be workers. A
// queue is quick that was once drained without the deputy finding its worker stuck.
//
// No wake-up is lost: who pushes publishes the work and then looks for sleepers;
// who goes to sleep publishes itself and then looks for work (all seq_cst).
namespace dispatch::detail {

struct worker {
    std::atomic<std::uint32_t> wake{0};
    bool polling = false;  // under pool::idle_lock_
    pid_t thread = 0;
    const activity* doing = nullptr;    // its thread's
    std::atomic<bool> reserved{false};  // changes under pool::take_lock_
    // The deputy's: at this piece of work it was seen waiting for something.
    std::uint64_t blocked_at = ~std::uint64_t{0};
    std::uint64_t slow_at = ~std::uint64_t{0};  // and its queue was told
};

class pool {
  public:
    static pool& shared() noexcept {
        pool* made = shared_.load(std::memory_order_acquire);
        return made ? *made : make();
    }

    // Any thread; `work` is a closure for a global queue, an embedded item or a
    // queue's place.
    void submit(item* work, priority level) noexcept;

    [[nodiscard]] bool has_waiting_work() const noexcept {
        return !lists_[0].empty() || !lists_[1].empty() || !lists_[2].empty();
    }
    // Processors this process may use.
    [[nodiscard]] unsigned processors() const noexcept { return processors_; }

    // The calling worker is about to wait for other work of the pool; it does so
    // no more. Nothing on other threads.
    void will_block() noexcept;
    void did_block() noexcept;
    // Workers sleep in such a section and have not been woken: counted by whoever wakes
    // them, so that nobody who is about to go on counts as one at rest.
    void rest(int more) noexcept {
        resting_.fetch_add(static_cast<unsigned>(more), std::memory_order_seq_cst);
    }
    [[nodiscard]] static bool is_worker() noexcept;

    // There is something to poll for: somebody must exist to do it.
    void ensure_poller() noexcept {
        if (workers_.load(std::memory_order_acquire) == 0)
            add_worker();
    }

    // For the poller, when it has events in hand and is no poller any more.
    void leave_idle(worker& self) noexcept;

    // For forks. In the child, the calling thread is the only worker that is left, if
    // it is one.
    void at_fork(forks::moment when) noexcept;
    void forked() noexcept;

    // For the deputy.
    struct progress {
        std::uint64_t taken;   // work taken since the start
        std::uint64_t polled;  // times a worker became the poller
        unsigned sleeping;
        bool poller;
        bool waiting;
        friend bool operator==(const progress&, const progress&) = default;
    };
    [[nodiscard]] progress look() noexcept;
    // Wakes a sleeper or, without one, adds a worker. False at the limit.
    bool reinforce() noexcept;
    // Workers that the system has on a processor or in its run queue.
    [[nodiscard]] unsigned runnable_workers() noexcept;
    // The same, but for those that were seen waiting in their present piece of work:
    // these cost nothing again. The deputy only.
    [[nodiscard]] unsigned unstuck_workers() noexcept;
    // Distress begins or goes on; is over if nothing waits.
    void distress() noexcept;
    void relax() noexcept;
    [[nodiscard]] bool is_distressed() const noexcept {
        return distressed_.load(std::memory_order_relaxed);
    }

    // The calling thread serves a pump: those who look on look at it as well. Of very
    // many such threads the first kMaximumServers are looked at.
    void add_server() noexcept;
    void remove_server() noexcept;

    // For those who look on: a picture of each thread, into `seen`, which has room for
    // kMostSeen.
    struct view {
        enum class role : std::uint8_t { worker, poller, server };
        pid_t thread;
        role as;
        const queue_core* queue;  // to look up; null when it runs nothing
        std::uint64_t steps;
        std::int64_t since;  // see activity
    };
    static constexpr std::size_t kMaximumServers = 64;
    static constexpr std::size_t kMostSeen = kMaximumWorkers + kMaximumServers;
    void look_at_threads(std::vector<view>& seen) noexcept;
    // Nothing waits, and no worker is at anything but waiting. For threads that are no
    // workers.
    [[nodiscard]] bool is_quiet() noexcept;

  private:
    pool() noexcept;
    static pool& make() noexcept;
    static void* main(void* context) noexcept;

    void run(worker& self) noexcept;
    static void execute(item* work, priority level) noexcept;
    [[nodiscard]] item* take(worker& self, priority& level) noexcept;
    [[nodiscard]] item* take_quick(priority& level) noexcept PLR_REQUIRES(take_lock_);
    [[nodiscard]] item* take_first(std::array<run_list, 3>& from, priority& level) noexcept
        PLR_REQUIRES(take_lock_);
    [[nodiscard]] bool has_deferred_work() const noexcept {
        return !deferred_[0].empty() || !deferred_[1].empty() || !deferred_[2].empty();
    }
    [[nodiscard]] bool sleep(worker& self) noexcept;
    void notify() noexcept;
    // A reserved one only if `any`.
    bool wake_one(bool any = true) noexcept;
    [[nodiscard]] static bool is_runnable(const worker& one) noexcept;
    [[nodiscard]] std::chrono::nanoseconds patience() const noexcept;
    bool add_worker() noexcept;
    void remove_sleeper(worker& self) noexcept PLR_REQUIRES(idle_lock_);

    static std::atomic<pool*> shared_;

    std::array<run_list, 3> lists_;
    std::array<run_list, 3> deferred_;  // in distress: of queues not known to be quick
    alignas(64) spin_lock take_lock_;
    std::atomic<std::uint64_t> taken_{0};
    std::atomic<bool> distressed_{false};
    unsigned reserved_ PLR_GUARDED_BY(take_lock_) = 0;  // workers

    alignas(64) std::atomic<unsigned> sleeping_{0};  // entries of sleepers_
    std::atomic<unsigned> searching_{0};             // awake, without work
    std::atomic<unsigned> workers_{0};
    std::atomic<unsigned> blocked_{0};  // in will_block()
    std::atomic<unsigned> resting_{0};  // these, while they sleep
    std::atomic<std::uint64_t> polled_{0};
    spin_lock idle_lock_;
    std::vector<worker*> sleepers_ PLR_GUARDED_BY(idle_lock_);  // last slept, first woken
    bool poller_ PLR_GUARDED_BY(idle_lock_) = false;
    spin_lock all_lock_;
    std::vector<worker*> all_ PLR_GUARDED_BY(all_lock_);
    struct server {
        pid_t thread;
        const activity* doing;
    };
    [[nodiscard]] std::span<server> servers() noexcept PLR_REQUIRES(all_lock_) {
        return {servers_.data(), server_count_};
    }
    template <class Predicate>
    void drop_servers(Predicate which) noexcept PLR_REQUIRES(all_lock_);
    void keep_only_this_server() noexcept PLR_REQUIRES(all_lock_);
    std::array<server, kMaximumServers> servers_ PLR_GUARDED_BY(all_lock_){};
    std::size_t server_count_ PLR_GUARDED_BY(all_lock_) = 0;
    unsigned processors_;
};

// A worker waits for other work of the pool while one of these lives.
struct blocking_section {
    blocking_section() noexcept { pool::shared().will_block(); }
    ~blocking_section() { pool::shared().did_block(); }
    blocking_section(const blocking_section&) = delete;
    blocking_section& operator=(const blocking_section&) = delete;
};

}  // namespace dispatch::detail
