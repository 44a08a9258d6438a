#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "dispatch/dispatch.h"
#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/vox/lock.h"
#include "platform/linux/vox/value_layout.h"
#include "vox/connection.h"

// What peer connections and listeners have in common: the object that users
// hold, its setting up, suspension, and the one way in which it ends.
//
// Owner:   two counts. References are the users'; when they are gone, the
//          connection is cancelled. Holds are the implementation's: one for all
//          references together and one for everything that will call back (a
//          watch, a scheduled turn, a timer). The object is freed with the last hold.
// Threads: public members on any thread; those PLR_ON(queue_role_) on the
//          target queue. lock_ guards what is shared and is never held while
//          foreign code runs.
// Ending:  fail() notes why, once, and cuts the connection off; a turn on the
//          target queue then tells its handlers. A turn is the one kind of work
//          that a connection submits there.
namespace vox_link {

using event_block = dispatch::block<void(vox_object_t)>;

class connection : public vox_custom_object {
  public:
    // The connection that `object` is; null for other values and a null pointer.
    [[nodiscard]] static connection* from(vox_object_t object) noexcept;

    void set_event_handler(event_block handler);
    void set_target_queue(dispatch::queue queue);
    void resume();
    void suspend() noexcept;
    void cancel();

    [[nodiscard]] const std::string& name() const noexcept { return name_; }
    [[nodiscard]] virtual bool is_listener() const noexcept = 0;

    void hold(std::uint32_t times = 1) noexcept {
        holds_.fetch_add(times, std::memory_order_relaxed);
    }
    void unhold() noexcept;

  protected:
    // The peer broke the protocol, or went over a limit.
    enum class blame : std::uint8_t { nobody, protocol, limit };

    explicit connection(std::string name);
    virtual ~connection() = default;

    // At the first resume, on its thread.
    virtual void start() = 0;
    // Whatever is due, on the target queue; not while suspended.
    virtual void turn() PLR_ON(queue_role_)
    = 0;
    // Stops traffic at once. Any thread.
    virtual void cut_off() PLR_REQUIRES(lock_) = 0;
    // Gives up what is left, before the event handler hears of `error`.
    virtual void wind_up(vox_object_t error) PLR_ON(queue_role_)
    = 0;
    virtual void count_blame(blame) PLR_ON(queue_role_)
    {}
    // A message that came on this connection, or a reply that would go to it, is
    // being freed; a descriptor that came was closed. Any thread.
    virtual void message_gone(vox_dictionary_object&) noexcept {}
    virtual void descriptor_gone() noexcept {}
    // For report lines: "connection from pid 12 (uid 0) to 'net.example.radio'".
    [[nodiscard]] virtual std::string title() = 0;

    // Ends the connection, unless it is ending already.
    void fail(std::int64_t code, std::string reason, blame blamed = blame::nobody)
        PLR_EXCLUDES(lock_);
    void fail_locked(std::int64_t code, std::string reason, blame blamed = blame::nobody)
        PLR_REQUIRES(lock_);
    // Makes a turn happen. Any thread.
    void schedule();
    void deliver(vox_object_t event) PLR_ON(queue_role_);
    [[nodiscard]] bool is_suspended() const noexcept {
        return suspensions_.load(std::memory_order_acquire) > 0;
    }
    // From the first resume on what was set up is fixed.
    [[nodiscard]] bool is_started() const noexcept { return started_.load(); }
    [[nodiscard]] bool is_ending() const noexcept {
        return ending_.load(std::memory_order_acquire);
    }
    [[nodiscard]] const dispatch::queue& queue() const noexcept { return queue_; }

    mutable mutex lock_;
    queue_role queue_role_;

  private:
    struct ending {
        std::int64_t code;
        std::string reason;
        blame blamed;
    };
    struct turn_item : dispatch::detail::embedded_item {
        explicit turn_item(connection* of) noexcept;
        connection* owner;
    };
    static const vox_custom_vtable kVtable;

    void references_gone() noexcept;
    void settle_queue();
    [[nodiscard]] std::string_view label() const noexcept {
        return name_.empty() ? std::string_view("vox") : name_;
    }
    void run_turn();
    void end() PLR_ON(queue_role_);

    const std::string name_;
    dispatch::queue queue_;  // fixed from the first resume or the end on
    event_block handler_;    // fixed likewise; released after the last event
    std::atomic<std::uint32_t> holds_{1};
    std::atomic<int> suspensions_{1};
    std::atomic<bool> started_{false};
    std::atomic<bool> cancelled_{false};
    std::atomic<bool> ending_{false};
    std::atomic<bool> scheduled_{false};
    std::unique_ptr<ending> why_ PLR_GUARDED_BY(lock_);
    bool ended_ PLR_GUARDED_BY(queue_role_) = false;
    turn_item turn_;
};

// A user's reference for the time of a turn; null when all are gone.
class borrowed_reference {
  public:
    explicit borrowed_reference(connection* of) noexcept;
    ~borrowed_reference();
    borrowed_reference(const borrowed_reference&) = delete;
    borrowed_reference& operator=(const borrowed_reference&) = delete;
    explicit operator bool() const noexcept { return taken_ != nullptr; }

  private:
    connection* taken_;
};

}  // namespace vox_link
