#include "platform/linux/dispatch/pool.h"

#include <pthread.h>
#include <sched.h>

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "platform/linux/dispatch/deputy.h"
#include "platform/linux/dispatch/detached_thread.h"
#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/queue_cells.h"
#include "platform/linux/dispatch/queue_core.h"
#include "plr/base/assert.h"
#include "plr/base/report.h"

namespace dispatch::detail {
namespace {

[[gnu::tls_model("initial-exec")]] thread_local worker* current_worker = nullptr;

constexpr unsigned kBatch = 256;
constexpr auto kRetireAfter = std::chrono::seconds(10);
constexpr auto kRetireSparesAfter = std::chrono::seconds(1);
constexpr unsigned kSpare = 4;           // sleepers for each processor
constexpr unsigned kTakenPerStamp = 64;  // so often a worker that never rests reads the clock

unsigned usable_processors() noexcept {
    cpu_set_t set;
    if (::sched_getaffinity(0, sizeof set, &set) != 0)
        return 1;
    return static_cast<unsigned>(std::max(1, CPU_COUNT(&set)));
}

}  // namespace

std::atomic<pool*> pool::shared_{nullptr};

pool& pool::make() noexcept {
    static pool* const made = [] {  // never destroyed: workers outlive main()
        forks::expect();
        return new pool;
    }();
    shared_.store(made, std::memory_order_release);
    return *made;
}

pool::pool() noexcept : processors_(usable_processors()) {
    sleepers_.reserve(kMaximumWorkers);
    all_.reserve(kMaximumWorkers);
}

// ---- Submitting -------------------------------------------------------------------------

void pool::submit(item* work, priority level) noexcept {
    const bool was_empty = lists_[static_cast<unsigned>(level)].push(work);
    if (current_worker && was_empty && !frame::more_to_do())
        deputy::watch();  // this worker comes for it, unless its present work takes long
    else
        notify();
}

void pool::notify() noexcept {
    if (searching_.load(std::memory_order_seq_cst) > 0)
        return;
    if (sleeping_.load(std::memory_order_seq_cst) > 0 && wake_one())
        return;
    const unsigned busy = workers_.load(std::memory_order_relaxed);
    if (busy - blocked_.load(std::memory_order_relaxed) < processors_ && add_worker())
        return;
    deputy::watch();
}

bool pool::wake_one(bool any) noexcept {
    worker* chosen = nullptr;
    bool polling = false;
    {
        scoped_lock guard(idle_lock_);
        // The poller stays where it is as long as somebody else can come.
        for (auto each = sleepers_.rbegin(); each != sleepers_.rend(); ++each) {
            if (!any && (*each)->reserved.load(std::memory_order_relaxed))
                continue;
            if (!chosen || chosen->polling)
                chosen = *each;
            if (!chosen->polling)
                break;
        }
        if (!chosen)
            return false;
        polling = chosen->polling;
        remove_sleeper(*chosen);
        searching_.fetch_add(1, std::memory_order_seq_cst);
        chosen->wake.store(1, std::memory_order_release);
    }
    // `chosen` lives: workers retire only while they stand among the sleepers.
    if (polling)
        poller::shared().interrupt();
    else
        futex_wake(chosen->wake, 1);
    return true;
}

void pool::remove_sleeper(worker& self) noexcept {
    const auto found = std::find(sleepers_.rbegin(), sleepers_.rend(), &self);
    if (found == sleepers_.rend())
        return;
    sleepers_.erase(std::prev(found.base()));
    sleeping_.fetch_sub(1, std::memory_order_seq_cst);
}

bool pool::add_worker() noexcept {
    unsigned count = workers_.load(std::memory_order_relaxed);
    do {
        if (count >= kMaximumWorkers)
            return false;
    } while (!workers_.compare_exchange_weak(count, count + 1, std::memory_order_acq_rel));
    searching_.fetch_add(1, std::memory_order_seq_cst);

    auto* made = new worker;
    const int error = start_detached(&pool::main, made);
    if (error == 0)
        return true;
    delete made;
    searching_.fetch_sub(1, std::memory_order_seq_cst);
    workers_.fetch_sub(1, std::memory_order_acq_rel);
    static std::atomic<bool> reported{false};
    if (!reported.exchange(true))
        plr::report("dispatch: no further worker thread (%s); going on with %u",
                    ::strerrordesc_np(error), workers_.load());
    return false;
}

// ---- Working -----------------------------------------------------------------------------

void* pool::main(void* context) noexcept {
    auto* self = static_cast<worker*>(context);
    self->thread = ::gettid();
    self->doing = &activity::of_this_thread();
    ::pthread_setname_np(::pthread_self(), "plr-worker");
    pool& owner = shared();
    {
        scoped_lock guard(owner.all_lock_);
        owner.all_.push_back(self);
    }
    current_worker = self;
    owner.run(*self);
    current_worker = nullptr;
    {
        scoped_lock guard(owner.all_lock_);
        std::erase(owner.all_, self);
    }
    owner.workers_.fetch_sub(1, std::memory_order_acq_rel);
    delete self;
    return nullptr;
}

// Begins as a searcher.
void pool::run(worker& self) noexcept {
    bool searching = true;
    activity::of_this_thread().stamp();
    for (unsigned taken = 1;; ++taken) {
        priority level;
        if (item* work = take(self, level)) {
            if (searching) {
                searching = false;
                // The last searcher that found work sends the next one.
                if (searching_.fetch_sub(1, std::memory_order_seq_cst) == 1 && has_waiting_work())
                    notify();
            }
            if (taken % kTakenPerStamp == 0)
                activity::of_this_thread().stamp();
            execute(work, level);
            continue;
        }
        if (searching) {
            searching = false;
            searching_.fetch_sub(1, std::memory_order_seq_cst);
            if (has_waiting_work())  // pushed while the pusher saw a searcher
                continue;
        }
        if (!sleep(self))
            return;
        searching = self.wake.exchange(0, std::memory_order_acq_rel) != 0;
        activity::of_this_thread().stamp();
    }
}

item* pool::take(worker& self, priority& level) noexcept {
    if (!has_waiting_work() && !is_distressed())
        return nullptr;
    scoped_lock guard(take_lock_);
    item* work = nullptr;
    if (!is_distressed()) [[likely]] {
        work = take_first(lists_, level);
    } else {
        if (!self.reserved.load(std::memory_order_relaxed) && reserved_ < processors_) {
            self.reserved.store(true, std::memory_order_relaxed);
            ++reserved_;
        }
        work = take_quick(level);
        if (!work && !self.reserved.load(std::memory_order_relaxed))
            work = take_first(deferred_, level);
    }
    if (work)
        taken_.store(taken_.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
    return work;
}

item* pool::take_first(std::array<run_list, 3>& from, priority& level) noexcept {
    for (unsigned i = 0; i < from.size(); ++i) {
        if (item* work = from[i].take()) {
            level = static_cast<priority>(i);
            return work;
        }
    }
    return nullptr;
}

// What is not quick is put off.
item* pool::take_quick(priority& level) noexcept {
    while (item* work = take_first(lists_, level)) {
        const queue_core* queue =
            work->run == &queue_tag ? queue_core::of(work) : queue_core::global(level);
        if (queue->is_quick())
            return work;
        deferred_[static_cast<unsigned>(level)].push(work);
    }
    return nullptr;
}

void pool::execute(item* work, priority level) noexcept {
    if (work->run == &queue_tag) {
        unsigned budget = kBatch;
        queue_core::of(work)->run_owned(budget);
        return;
    }
    const frame here(queue_core::global(level));
    const working_on seen(here.queue);
    seen.here.step();
    if (work->run == &embedded_tag) {
        auto* embedded = static_cast<embedded_item*>(work);
        embedded->function(embedded);
    } else {
        work->run(work);
        recycle_item(static_cast<closure_item*>(work));
    }
    queue_core::global(level)->was_drained();
}

// Idle until there may be work. Returns false when the worker shall retire; else
// the worker stands no longer among the sleepers, and `wake` tells whether it was
// woken as a searcher.
bool pool::sleep(worker& self) noexcept {
    bool polling = false;
    {
        scoped_lock guard(idle_lock_);
        sleepers_.push_back(&self);
        sleeping_.fetch_add(1, std::memory_order_seq_cst);
        if (!poller_) {
            poller_ = polling = self.polling = true;
            polled_.fetch_add(1, std::memory_order_relaxed);
        }
    }
    if (has_waiting_work()) {
        leave_idle(self);
        return true;
    }
    if (polling) {
        poller::shared().wait(self);
        return true;
    }
    while (!self.wake.load(std::memory_order_acquire)) {
        if (futex_wait(self.wake, 0, time::after(patience())))
            continue;
        scoped_lock guard(idle_lock_);
        if (self.wake.load(std::memory_order_acquire))
            break;
        remove_sleeper(self);
        return false;
    }
    return true;
}

// More than there are processors for are needed only after much has blocked.
std::chrono::nanoseconds pool::patience() const noexcept {
    return sleeping_.load(std::memory_order_relaxed) > kSpare * processors_ ? kRetireSparesAfter
                                                                            : kRetireAfter;
}

void pool::leave_idle(worker& self) noexcept {
    scoped_lock guard(idle_lock_);
    remove_sleeper(self);
    // Not before: an interruption must reach the worker it was meant for, so
    // nobody else may wait in the poller yet.
    if (self.polling)
        self.polling = poller_ = false;
}

// ---- Forks ---------------------------------------------------------------------------------

void pool::at_fork(forks::moment when) noexcept {
    forks::hold(all_lock_, when);
    forks::hold(idle_lock_, when);
}

void pool::forked() noexcept {
    for (run_list& each : lists_)
        each.clear();
    take_lock_.assert_held();  // by nobody who is here
    scoped_lock guard(all_lock_);
    scoped_lock idle(idle_lock_);
    all_.clear();
    sleepers_.clear();
    poller_ = false;
    for (run_list& each : deferred_)
        each.clear();
    distressed_.store(false);
    reserved_ = 0;
    if (current_worker) {
        current_worker->reserved = false;
        current_worker->thread = ::gettid();
        all_.push_back(current_worker);
    }
    keep_only_this_server();
    sleeping_.store(0);
    searching_.store(0);
    blocked_.store(0);
    resting_.store(0);
    workers_.store(static_cast<unsigned>(all_.size()));
    take_lock_.unlock();
}

// ---- Blocking -----------------------------------------------------------------------------

bool pool::is_worker() noexcept {
    return current_worker;
}

void pool::will_block() noexcept {
    if (!current_worker)
        return;
    const unsigned blocked = blocked_.fetch_add(1, std::memory_order_seq_cst) + 1;
    if (searching_.load(std::memory_order_seq_cst) == 0) {
        const progress now = look();
        const unsigned asleep = now.sleeping + blocked;
        const unsigned workers = workers_.load(std::memory_order_seq_cst);
        const unsigned active = workers > asleep ? workers - asleep : 0;
        // Somebody must be left to run what frees us, and to poll.
        if (now.waiting ? active < processors_ : active == 0 && !now.poller)
            reinforce();
    }
    deputy::watch();
}

void pool::did_block() noexcept {
    if (current_worker)
        blocked_.fetch_sub(1, std::memory_order_seq_cst);
}

}  // namespace dispatch::detail
