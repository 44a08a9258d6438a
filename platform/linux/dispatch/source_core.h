#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "dispatch/time.h"
#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/dispatch/spin_lock.h"
#include "plr/base/assert.h"

// The state of one source.
//
// A source submits one embedded item to its queue whenever there may be
// something to do there; what is to be done is decided on the queue. Whoever
// sets kSubmitted submits; until the item has run and cleared it again, nobody
// else does, so that also on a concurrent queue one thread runs the source.
//
// state_ changes under lock_, except that the thread which runs the source
// changes it without; so a plain store does while kSubmitted is clear.
// lock_ is shared by all sources of a kind: it outlives each of them.
//
// The source is destroyed when it is released by its handles, finished on its
// queue, and neither submitted nor held.
namespace dispatch::detail {

class source_core {
  public:
    source_core(const queue& on, spin_lock& lock) noexcept
        : lock_(lock), queue_(on), work_(*this) {}
    virtual ~source_core() = default;
    source_core(const source_core&) = delete;
    source_core& operator=(const source_core&) = delete;

    void retain() noexcept { handles_.fetch_add(1, std::memory_order_relaxed); }
    void release() noexcept;

    void set_event_handler(block<void()>&& handler) noexcept {
        PLR_ASSERT(!is(kArmed), "handlers are set before the first resume()");
        on_event_ = std::move(handler);
    }
    void set_cancel_handler(block<void()>&& handler) noexcept {
        PLR_ASSERT(!is(kArmed), "handlers are set before the first resume()");
        on_cancel_ = std::move(handler);
    }
    virtual void set_timer(time, std::chrono::nanoseconds) {
        PLR_ASSERT(false, "set_timer() of a source that is no timer");
    }

    void suspend() noexcept;
    void resume();
    void cancel() noexcept;
    [[nodiscard]] bool is_cancelled() const noexcept { return is(kCancelled); }
    [[nodiscard]] std::uint64_t data() const noexcept { return data_; }

  protected:
    static constexpr std::uint64_t kSubmitted = 1;   // the item is under way, or runs
    static constexpr std::uint64_t kAgain = 2;       // it is to run once more
    static constexpr std::uint64_t kReleased = 4;    // by the last handle
    static constexpr std::uint64_t kFinished = 8;    // the cancel handler has run
    static constexpr std::uint64_t kHeld = 16;       // hold()
    static constexpr std::uint64_t kCancelled = 32;  // for good
    static constexpr std::uint64_t kArmed = 64;      // resumed once
    static constexpr std::uint64_t kSuspended = 128;
    static constexpr std::uint64_t kEvent = 256;  // from here on, their count

    [[nodiscard]] bool is(std::uint64_t bits) const noexcept {
        return state_.load(std::memory_order_acquire) & bits;
    }
    [[nodiscard]] queue_core* target() const noexcept { return queue_.get(); }

    // Something happened `count` times.
    void add_events(std::uint64_t count) noexcept PLR_REQUIRES(lock_);
    // The handler runs soon: has it fetched. The source is armed and not cancelled.
    void fetch_handler() const noexcept PLR_REQUIRES(lock_) { __builtin_prefetch(on_event_.get()); }
    // Something else keeps a pointer to the source.
    void hold() noexcept PLR_REQUIRES(lock_) { change(kHeld, 0); }
    // May destroy the source.
    void let_go() noexcept;

    // The first resume(), unless cancelled before.
    virtual void arm() PLR_REQUIRES(lock_) = 0;
    // Cancelled, and armed before.
    virtual void disarm() noexcept PLR_REQUIRES(lock_) {}
    // On the queue: after the event handler ran; after cancelling, when armed before.
    virtual void handled() noexcept {}
    virtual void ended() noexcept {}

    spin_lock& lock_;

  private:
    struct work : embedded_item {
        explicit work(source_core& owner) noexcept : embedded_item(&work::call), self(owner) {}
        static void call(embedded_item* item) noexcept { static_cast<work*>(item)->self.run(); }
        source_core& self;
    };

    // Sets and clears bits; returns what was before.
    std::uint64_t change(std::uint64_t set, std::uint64_t clear) noexcept PLR_REQUIRES(lock_);
    // Sets bits and has the item run. Returns whether the caller is to submit it.
    [[nodiscard]] bool look(std::uint64_t set) noexcept PLR_REQUIRES(lock_);
    void submit_work() noexcept { submit(target(), &work_); }
    void run() noexcept;
    void handle() noexcept;
    void finish() noexcept;
    void leave(bool finished) noexcept;

    std::atomic<std::uint64_t> state_{kSuspended};
    std::atomic<std::uint32_t> handles_{1};
    std::uint32_t suspensions_ PLR_GUARDED_BY(lock_) = 1;
    const queue queue_;
    work work_;
    // On the queue once armed.
    block<void()> on_event_;
    block<void()> on_cancel_;
    std::uint64_t data_ = 0;
};

}  // namespace dispatch::detail
