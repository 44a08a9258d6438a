#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <mutex>
#include <unordered_map>
#include <vector>

#include "dispatch/diagnostics.h"
#include "platform/linux/dispatch/detached_thread.h"
#include "platform/linux/dispatch/fork.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_cells.h"
#include "platform/linux/dispatch/queue_core.h"
#include "plr/base/report.h"

namespace dispatch {
namespace {

using detail::pool;
using std::chrono::nanoseconds;

// A thread that looks at what every worker and server runs, four times within the
// limit: one that is at the same piece of work as before has been so for the time
// between. It is made when first wanted, and sleeps without a tick when not.
class watchdog {
  public:
    // Never destroyed.
    static watchdog& shared() {
        watchdog* seen = made.load(std::memory_order_acquire);
        if (seen)
            return *seen;
        auto* const fresh = new watchdog;
        if (made.compare_exchange_strong(seen, fresh, std::memory_order_acq_rel))
            return *fresh;
        delete fresh;
        return *seen;
    }
    static void forget() noexcept { made.store(nullptr, std::memory_order_relaxed); }

    void set(nanoseconds limit, block<void(const overrun&)>&& handler) {
        std::unique_lock guard(lock_);
        limit_ = limit.count() <= 0 ? nanoseconds(0) : std::max<nanoseconds>(limit, kLeast);
        handler_ = std::move(handler);
        seen_.clear();
        ++settings_;
        if (limit_.count() > 0 && !running_)
            running_ = detail::start_detached(&watchdog::main, this) == 0;
        if (limit_.count() > 0 && !running_)
            plr::report("dispatch: no thread for the watchdog");
        changed_.notify_all();
        if (!::pthread_equal(::pthread_self(), thread_))
            changed_.wait(guard, [this] { return !calling_; });
    }

  private:
    static constexpr std::chrono::milliseconds kLeast{1};
    static constexpr int kLooks = 4;

    struct sight {
        std::uint64_t steps;
        std::int64_t first;  // when it was first seen at this piece of work
        bool reported;
    };

    static void* main(void* self) noexcept {
        ::pthread_setname_np(::pthread_self(), "plr-watchdog");
        static_cast<watchdog*>(self)->watch();
        return nullptr;
    }

    [[noreturn]] void watch() noexcept {
        std::vector<pool::view> threads;
        threads.reserve(pool::kMostSeen);
        std::unique_lock guard(lock_);
        thread_ = ::pthread_self();
        for (;;) {
            if (limit_.count() == 0) {
                changed_.wait(guard);
                continue;
            }
            threads.clear();
            pool::shared().look_at_threads(threads);
            look_at(threads, guard);
            changed_.wait_for(guard, limit_ / kLooks);
        }
    }

    void look_at(const std::vector<pool::view>& threads, std::unique_lock<std::mutex>& guard) {
        const std::int64_t now = time::now().nanoseconds();
        const std::uint64_t settings = settings_;
        std::unordered_map<pid_t, sight> before;
        before.swap(seen_);
        for (const pool::view& each : threads) {
            if (!each.queue)
                continue;
            const auto found = before.find(each.thread);
            const bool same = found != before.end() && found->second.steps == each.steps;
            sight& seen = seen_[each.thread] = same ? found->second : sight{each.steps, now, false};
            if (seen.reported || nanoseconds(now - seen.first) < limit_)
                continue;
            seen.reported = true;
            report(each, nanoseconds(now - seen.first), guard);
            if (settings != settings_)
                return;
        }
    }

    // Unlocked meanwhile, so that the handler may change the setting.
    void report(const pool::view& runner, nanoseconds taken, std::unique_lock<std::mutex>& guard) {
        std::string label;
        detail::queue_cells::if_live(
            runner.queue, [&](const detail::queue_core& queue) { label = queue.label(); });
        const auto handler = handler_;
        calling_ = true;
        guard.unlock();
        if (handler)
            handler(overrun{label, runner.thread, taken});
        else
            plr::report("dispatch: work of queue '%s' runs for %.3f s already (thread %d)",
                        label.c_str(), std::chrono::duration<double>(taken).count(), runner.thread);
        guard.lock();
        calling_ = false;
        changed_.notify_all();
    }

    static inline std::atomic<watchdog*> made{nullptr};

    std::mutex lock_;
    std::condition_variable changed_;
    nanoseconds limit_{0};
    block<void(const overrun&)> handler_;
    std::unordered_map<pid_t, sight> seen_;
    std::uint64_t settings_ = 0;
    pthread_t thread_{};
    bool running_ = false;
    bool calling_ = false;
};

}  // namespace

// Its thread is the parent's.
void detail::forks::forget_watchdog() noexcept {
    watchdog::forget();
}

void set_watchdog(nanoseconds limit, block<void(const overrun&)> handler) {
    watchdog::shared().set(limit, std::move(handler));
}

}  // namespace dispatch
