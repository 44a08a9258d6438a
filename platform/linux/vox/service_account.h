#pragma once

#include <sys/types.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>

#include "dispatch/queue.h"
#include "platform/linux/vox/lock.h"
#include "vox/limits.h"
#include "vox/listener.h"

// What a listener's clients cost it, in all and by user, and how often that went
// too far.
//
// Owner:   the listener, its clients and every user's account share it.
// Threads: any. Clients charge what they cost with relaxed atomics; the locks are for
//          clients that come and go, and for those who look. A client's own lock comes
//          behind the one on the clients and before the other.
namespace vox_link {

// What is limited for all clients of one user together.
enum class cost : std::uint8_t {
    queued_bytes,
    queued_messages,
    pending_replies,
    open_requests,
    held_descriptors,
    partial_bytes,
};
inline constexpr std::size_t kCosts = 6;

// A limit that something would go over; false for none.
struct limit_hit {
    const char* name = nullptr;  // of the field of vox_limits_t
    std::uint64_t most = 0;
    explicit operator bool() const noexcept { return name != nullptr; }
    // "max_queued_bytes (65536)"
    [[nodiscard]] std::string text() const {
        return std::string(name) + " (" + std::to_string(most) + ")";
    }
};

class service_account;
class user_turns;

// One user of one listener. Lives as long as a client's place or anything that
// is charged to it: whoever charges holds a pointer.
class user_account {
  public:
    user_account(std::shared_ptr<service_account> of, uid_t user) noexcept;
    ~user_account();
    user_account(const user_account&) = delete;
    user_account& operator=(const user_account&) = delete;

    // Charges `amount` unless that exceeds `times` the limit; returns whether it did.
    [[nodiscard]] bool take(cost of, std::uint64_t amount, unsigned times = 1) noexcept;
    void give_back(cost of, std::uint64_t amount) noexcept;
    // Makes what one client is `charged` for equal `now`; giving back always succeeds.
    [[nodiscard]] bool adjust(cost of, std::uint64_t& charged, std::uint64_t now,
                              unsigned times = 1) noexcept;
    [[nodiscard]] std::uint64_t used(cost of) const noexcept {
        return used_[static_cast<std::size_t>(of)].load(std::memory_order_relaxed);
    }
    [[nodiscard]] limit_hit limit(cost of) const noexcept;
    [[nodiscard]] service_account& service() const noexcept { return *service_; }
    // Where the user's clients take turns. One a queue, as long as clients do not
    // alternate between queues.
    [[nodiscard]] std::shared_ptr<user_turns> turns_on(const dispatch::queue& queue);

  private:
    friend class service_account;
    const std::shared_ptr<service_account> service_;
    const uid_t user_;
    std::array<std::atomic<std::uint64_t>, kCosts> used_{};
    std::uint32_t connections_ = 0;    // under the service's lock
    std::weak_ptr<user_turns> turns_;  // under the service's lock; those made last
};

// A client that is asked for its counts when somebody looks.
class counted_client {
  public:
    // Adds messages_sent, …_received, …_dropped and requests_refused.
    virtual void add_counts(vox_listener_statistics_t& sums) const = 0;

  protected:
    ~counted_client() = default;
};

class service_account : public std::enable_shared_from_this<service_account> {
  public:
    // One client's place, given back when it is destroyed.
    class ticket {
      public:
        ticket() noexcept = default;
        ticket(ticket&& other) noexcept = default;
        ticket& operator=(ticket&& other) noexcept {
            ticket(std::move(other)).user_.swap(user_);
            return *this;
        }
        ~ticket();
        explicit operator bool() const noexcept { return user_ != nullptr; }
        [[nodiscard]] const std::shared_ptr<user_account>& user() const noexcept { return user_; }

      private:
        friend class service_account;
        explicit ticket(std::shared_ptr<user_account> user) noexcept : user_(std::move(user)) {}
        std::shared_ptr<user_account> user_;
    };
    enum class event : std::uint8_t {
        accepted,  // the client was handed to the handler
        refused_by_policy,
        refused_by_limit,  // take() counts it itself
        refused_without_descriptors,
        ended_for_limit,
        ended_for_protocol,
    };

    explicit service_account(const vox_limits_t& limits) noexcept : limits_(limits) {}

    // A place for a client of `user`; a false ticket, and `hit` says why, when
    // there is none left.
    [[nodiscard]] ticket take(uid_t user, limit_hit& hit);
    void count(event happened) noexcept {
        events_[static_cast<std::size_t>(happened)].fetch_add(1, std::memory_order_relaxed);
    }

    // From its construction to its destruction; a client that leaves is counted
    // once more.
    void enter(const counted_client& client);
    void leave(const counted_client& client);

    [[nodiscard]] const vox_limits_t& limits() const noexcept { return limits_; }
    [[nodiscard]] vox_listener_statistics_t statistics() const;
    [[nodiscard]] vox_user_statistics_t user_statistics(uid_t user) const;

  private:
    friend class user_account;
    void give_back(user_account& user) noexcept;
    void forget(uid_t user) noexcept;

    const vox_limits_t limits_;
    std::array<std::atomic<std::uint64_t>, 6> events_{};
    mutable mutex lock_;
    std::uint32_t connections_ PLR_GUARDED_BY(lock_) = 0;
    std::unordered_map<uid_t, std::weak_ptr<user_account>> users_ PLR_GUARDED_BY(lock_);
    mutable mutex clients_lock_;
    std::unordered_set<const counted_client*> clients_ PLR_GUARDED_BY(clients_lock_);
    vox_listener_statistics_t past_ PLR_GUARDED_BY(clients_lock_) = {};  // of those that left
};

}  // namespace vox_link
