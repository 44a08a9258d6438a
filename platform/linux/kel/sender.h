#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>

#include "dispatch/queue.h"
#include "dispatch/source.h"
#include "kel/kel.h"
#include "platform/linux/kel/backlog.h"
#include "platform/linux/kel/destination.h"
#include "platform/linux/kel/lock.h"
#include "platform/linux/kel/record.h"

// What stands behind a client: the backlog and the one thread at a time that
// empties it.
//
// Owner:   the client, and whatever it waits with: source and delayed work.
// Threads: any. The lock covers the backlog and the counts and no system call:
//          the thread that set sending_ sends without it, and others leave
//          their messages to that thread.
namespace kel {

class sender : public std::enable_shared_from_this<sender> {
  public:
    sender(identity who, places where);
    // In a forked child, in place of the parent's, which nobody uses here.
    // Without a backlog.
    struct forked {};
    sender(forked, sender& parents);
    sender& operator=(const sender&) = delete;
    ~sender() = default;

    void send(const kel_message& message) noexcept;
    // See kel_send_now() and kel_flush_now().
    [[nodiscard]] bool send_now(int priority, const char* domain,
                                std::string_view text) const noexcept;
    [[nodiscard]] bool flush_now() noexcept PLR_NO_THREAD_SAFETY_ANALYSIS;  // keeps the lock

    int set_filter(int mask) noexcept { return filter_.exchange(mask & 0xff); }
    void set_limits(const kel_limits& limits) noexcept;
    [[nodiscard]] kel_statistics statistics() noexcept;
    [[nodiscard]] bool flush(std::chrono::milliseconds bound) noexcept;
    // Ends all waiting. Returns the number of messages given up.
    std::size_t close() noexcept;

  private:
    enum class waiting { no, for_room, for_time };

    [[nodiscard]] bool send_line_now(int priority, std::string_view domain,
                                     std::string_view text) const noexcept;
    [[nodiscard]] bool send_record_now(const record& message) const noexcept;
    void send_waiting(unsigned most) noexcept PLR_REQUIRES(lock_);
    bool send_first() noexcept PLR_REQUIRES(lock_);
    bool tell_gap() noexcept PLR_REQUIRES(lock_);
    outcome attempt(const record& message) noexcept PLR_REQUIRES(lock_);
    void wait_after(outcome why) noexcept PLR_REQUIRES(lock_);
    void drop_waiting() noexcept PLR_REQUIRES(lock_);
    void watch() PLR_REQUIRES(lock_);
    void unwatch() noexcept PLR_REQUIRES(lock_);
    void go_on_after(std::chrono::milliseconds delay) PLR_REQUIRES(lock_);
    void go_on() noexcept;
    [[nodiscard]] bool send_all(waiting& waits) noexcept;

    const identity who_;
    const bool keeps_backlog_;
    std::atomic<int> filter_{0xff};
    std::atomic<unsigned> patience_{KEL_DEFAULT_PATIENCE_MS};  // ms
    destination destination_;                                  // deliver(): who set sending_
    const dispatch::queue queue_;                              // sends what waited

    mutex lock_;
    backlog backlog_ PLR_GUARDED_BY(lock_);
    bool sending_ PLR_GUARDED_BY(lock_) = false;
    bool closed_ PLR_GUARDED_BY(lock_) = false;
    waiting waits_ PLR_GUARDED_BY(lock_) = waiting::no;
    dispatch::source room_ PLR_GUARDED_BY(lock_);         // while waiting for_room
    std::uint64_t unreported_ PLR_GUARDED_BY(lock_) = 0;  // lost before what is sent next
    std::uint64_t sent_ PLR_GUARDED_BY(lock_) = 0;
    std::uint64_t dropped_ PLR_GUARDED_BY(lock_) = 0;
};

}  // namespace kel
