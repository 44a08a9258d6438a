#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "dispatch/dispatch.h"
#include "platform/linux/dispatch/spin_lock.h"
#include "platform/linux/qf/preferences_file.h"
#include "platform/linux/qf/preferences_watch.h"
#include "plr/base/thread_annotations.h"

namespace qf::preferences {

class PLR_CAPABILITY("mutex") mutex {
  public:
    void lock() noexcept PLR_ACQUIRE() { held_.lock(); }
    void unlock() noexcept PLR_RELEASE() { held_.unlock(); }

  private:
    std::mutex held_;
};
using lock_guard = dispatch::detail::scoped_lock<mutex>;

// What is asked for.
struct selection {
    std::string application;
    std::string user;
    std::string host;
    friend bool operator<(const selection& left, const selection& right) noexcept {
        return std::tie(left.application, left.user, left.host) <
               std::tie(right.application, right.user, right.host);
    }
};

// What the files of a selection say together.
struct snapshot {
    owned_dictionary values;
    owned_array errors;
};

// An observer's handler and where it runs.
class observation {
  public:
    observation(dispatch::queue queue, dispatch::block<void()> handler) noexcept
        : queue_(std::move(queue)), handler_(std::move(handler)) {}

    // Has the handler called, once for all calls of this before that.
    static void tell(const std::shared_ptr<observation>& self);
    void cancel() noexcept { cancelled_.store(true, std::memory_order_release); }

  private:
    const dispatch::queue queue_;
    const dispatch::block<void()> handler_;
    std::atomic<bool> told_{false};
    std::atomic<bool> cancelled_{false};
};

// All that was read, by selection; keeps it up to date.
//
// Owner:   the process; never destroyed.
// Threads: any. One lock; it is held while files are read, but never while
//          somebody else's code runs. Readers take it only to read something for the
//          first time, or after a change: see preferences_cache.h.
// Queue:   "qf.preferences" reads the news about files.
// fork():  the child keeps what was read and reads what is new, but does not
//          notice changes: it has no threads that could.
class store {
  public:
    static store& instance();
    // Moves on with every change of any snapshot.
    [[nodiscard]] static std::uint64_t version() noexcept {
        return version_.load(std::memory_order_acquire);
    }

    // Reads the files when nobody has before.
    [[nodiscard]] snapshot get(QfStringRef application, QfStringRef user, QfStringRef host);
    // This process has changed the file.
    void reread(const std::string& path);

    void add(const selection& what, const std::shared_ptr<observation>& observer);
    void remove(const selection& what, const observation* observer) noexcept;

    // Drops what was read and nobody observes. For tests.
    void forget();

  private:
    struct domain {
        std::vector<layer_file> files;  // the weakest first
        owned_error error;              // of the selection itself
        snapshot now;                   // null values: not read yet
        std::vector<std::shared_ptr<observation>> observers;
    };

    store();
    static void before_fork();
    static void in_parent();
    static void in_child();

    domain& find(const selection& what) PLR_REQUIRES(lock_);
    template <class Condition>
    void reload(const Condition& is_changed) PLR_REQUIRES(lock_);
    void publish(domain& of) PLR_REQUIRES(lock_);
    [[nodiscard]] snapshot combine(const domain& of) const PLR_REQUIRES(lock_);

    void watch_all() PLR_REQUIRES(lock_);
    int listen() PLR_REQUIRES(lock_);
    void set_watch_error(int error) PLR_REQUIRES(lock_);
    void read_news();
    void poll();

    static std::atomic<std::uint64_t> version_;

    mutex lock_;
    std::map<selection, domain> domains_ PLR_GUARDED_BY(lock_);
    folder_watch watch_ PLR_GUARDED_BY(lock_);
    owned_error watch_error_ PLR_GUARDED_BY(lock_);  // changes are polled for
    const dispatch::queue queue_;
    dispatch::source events_ PLR_GUARDED_BY(lock_);
    dispatch::source timer_ PLR_GUARDED_BY(lock_);
    bool is_child_ PLR_GUARDED_BY(lock_) = false;
};

}  // namespace qf::preferences
