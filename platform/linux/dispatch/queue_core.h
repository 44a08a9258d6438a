#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string_view>

#include "dispatch/queue.h"
#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/dispatch/latency.h"
#include "platform/linux/dispatch/pump_core.h"
#include "platform/linux/dispatch/spin_lock.h"

// The state of one queue.
//
// A serial queue is its tail word and one intrusive list with many producers
// and one owner:
//
//   tail_ == null            idle: nobody owns the queue
//   tail_ == the last item   owned; items wait or one runs
//   tail_ == &stub_          owned, nothing waits
//
// push() exchanges the tail. Whoever finds null has become the owner and must
// activate the queue: hand it to its target's list, or to the pool. The owner
// passes on ownership with the queue: activator -> list -> drainer, or drainer ->
// waiter of a sync(). Ownership ends with the compare-exchange of the tail from
// the last item (or the stub) to null. `head_`, `running_`, `stub_`, `counted_`
// are the owner's to change.
//
// An executed item stays in place as the tail until its successor is known, so
// that producers which keep the queue busy touch the tail word only.
//
// Suspension is a second word: a count and the bit kParked, which the owner sets
// instead of going on; the resume() that brings the count to 0 takes ownership
// from it. Before each piece of work its runner, who owns the queue and its targets
// by then, looks at the suspensions of all of them.
//
// A drainer owns the queue and all its targets; a sync() too.
//
// model/queue.pml is all of this as a model that is checked exhaustively; each of its
// steps names the function here. Who changes the one changes the other.
//
// Whoever counts what waits (count_waiting()) sets walked_; nothing leaves the list
// then. What waits begins behind running_, or when that is null or the stub with
// head_ or else behind the stub; before an item may go, the owner writes down that
// the list begins behind it, and then looks at walked_. The one who counts has the
// barrier between for both of them (membarrier(2)).
//
// A queue whose last target is a pump's (dispatch/pump.h) is activated there instead
// of in the pool. Only the thread that serves the pump ever owns it for running: a
// sync() from another thread hands its work over, so no waiter stands in such lists.
namespace dispatch::detail {

// What `item::run` holds for items that are not closures. Never called.
void queue_tag(item*) noexcept;
void waiter_tag(item*) noexcept;
void embedded_tag(item*) noexcept;

// A thread in sync(), on its stack.
struct waiter : item {
    waiter() noexcept { run = &waiter_tag; }
    void wait() noexcept;
    void grant() noexcept;
    [[nodiscard]] bool is_granted() const noexcept {
        return state.load(std::memory_order_acquire) == kGranted;
    }

    // Who sleeps is to be woken.
    enum : std::uint32_t { kAwake, kAsleep, kWorkerAsleep, kGranted };
    std::atomic<std::uint32_t> state{kAwake};
};

struct frame;
namespace frames {
[[gnu::tls_model("initial-exec")]] inline constinit thread_local frame* top = nullptr;
}

// What the calling thread runs: innermost queue first.
struct frame {
    explicit frame(const queue_core* entered, bool drains_it = false) noexcept
        : queue(entered), up(frames::top), drains(drains_it) {
        frames::top = this;
    }
    ~frame() { frames::top = up; }
    frame(const frame&) = delete;
    frame& operator=(const frame&) = delete;
    static frame* top() noexcept { return frames::top; }
    // Whether this thread has more to run when the present work is done.
    static bool more_to_do() noexcept;

    const queue_core* queue;
    frame* up;
    const bool drains;  // what waits on the queue runs on this thread next
};

class queue_core {
  public:
    enum class outcome : std::uint8_t {
        idle,    // drained; ownership and its reference are given up
        parked,  // suspended; resume() goes on
        more,    // the batch is over; the caller activates again
        handed,  // a waiter owns the queue and its targets now
    };

    // `served`: what runs the queue instead of the pool; for one without target.
    static queue_core* create(std::string_view label, queue_core* target,
                              std::unique_ptr<pump_core> served = nullptr);
    static queue_core* global(priority level) noexcept;

    // Global queues live for ever, and everybody shares them: they are not counted.
    void retain() noexcept {
        if (!is_global())
            handles_.fetch_add(1, std::memory_order_relaxed);
    }
    void release() noexcept;

    void push(item* work) noexcept;
    void run_sync(void (*function)(void*) noexcept, void* context);
    void suspend() noexcept;
    void resume() noexcept;
    // For the owner: runs items until one of the outcomes. `budget` counts down.
    outcome drain(unsigned& budget) noexcept;
    // For the owner: drains, and passes on or gives up the ownership. Returns false
    // when a waiter has taken over the targets' as well.
    bool run_owned(unsigned& budget) noexcept;
    // For the owner: on to the target, the pump or the pool.
    void activate() noexcept;
    // For whoever got outcome::idle.
    void release_reference() noexcept;

    [[nodiscard]] bool is_global() const noexcept { return has(kGlobal); }
    // Whether submitting work is more than push().
    [[nodiscard]] bool is_special() const noexcept { return has(kGlobal | kMeasured); }
    void submit_specially(closure_item* work) noexcept;
    void submit_specially(embedded_item* work) noexcept;
    // Null for queues that end in the pool.
    [[nodiscard]] pump_core* pump() const noexcept { return pump_; }
    [[nodiscard]] bool is_current() const noexcept;
    [[nodiscard]] const char* label() const noexcept { return label_; }
    [[nodiscard]] const queue_core* target() const noexcept { return target_; }
    [[nodiscard]] priority level() const noexcept { return priority_; }
    void set_specific(const void* key, void* value, void (*destructor)(void*));
    [[nodiscard]] void* get_specific(const void* key) const noexcept;
    // Ends the process with a message that names the queue.
    [[noreturn]] void stop(const char* why) const noexcept;

    // For the drainer, in its work: whether something waits behind it.
    [[nodiscard]] bool has_more() const noexcept {
        return tail_.load(std::memory_order_relaxed) != running_.load(std::memory_order_relaxed);
    }

    // In the child of a fork: forgets what waits, and threads that are not there.
    void forked() noexcept;

    // Whether its work is known to end soon, for the pool: drained, it is unless it
    // was slow meanwhile, and then the next time.
    [[nodiscard]] bool is_quick() const noexcept {
        return reputation_.load(std::memory_order_relaxed) == reputation::quick;
    }
    void was_drained() noexcept {
        const reputation before = reputation_.load(std::memory_order_relaxed);
        if (before != reputation::quick) [[unlikely]]
            reputation_.store(before == reputation::slow ? reputation::unknown : reputation::quick,
                              std::memory_order_relaxed);
    }
    // It and its targets.
    void was_slow() noexcept;

    // ---- Looking inside: any thread ---------------------------------------------

    void enable_statistics(bool on);
    // Null when they were never enabled.
    [[nodiscard]] latencies* statistics() const noexcept {
        return statistics_.load(std::memory_order_acquire);
    }
    [[nodiscard]] bool keeps_statistics() const noexcept { return has(kMeasured); }
    [[nodiscard]] bool is_busy() const noexcept {
        return tail_.load(std::memory_order_relaxed) != nullptr;
    }
    [[nodiscard]] std::uint32_t suspensions() const noexcept {
        return suspension_.load(std::memory_order_relaxed) / kSuspension;
    }
    struct waiting {
        std::size_t count = 0;
        std::int64_t oldest = 0;  // submitted, monotonic nanoseconds; 0 when not known
        bool is_known = true;     // false where the kernel has no membarrier(2)
    };
    // For one caller at a time, who keeps the queue alive. Holds the queue up.
    [[nodiscard]] waiting count_waiting() noexcept;

    // The queue whose place in a list `work` is.
    static queue_core* of(item* work) noexcept { return static_cast<place*>(work)->owner; }

  private:
    enum class reputation : std::uint8_t { unknown, quick, slow };

    static constexpr std::uint8_t kGlobal = 1;
    static constexpr std::uint8_t kMeasured = 2;
    static constexpr std::uint8_t kPumped = 4;

    static constexpr std::uint32_t kParked = 1;
    static constexpr std::uint32_t kSuspension = 2;

    struct place : item {
        queue_core* owner = nullptr;
    };
    struct specific {
        const void* key;
        std::atomic<void*> value;
        void (*destructor)(void*);
        specific* next;
    };

    queue_core(const char* label, queue_core* target, pump_core* pump, priority level,
               bool global) noexcept;
    ~queue_core();
    static queue_core* make(std::string_view label, queue_core* target, pump_core* pump,
                            priority level, bool global);

    [[nodiscard]] bool has(std::uint8_t kinds) const noexcept {
        return kind_.load(std::memory_order_relaxed) & kinds;
    }
    template <class Item>
    void submit_stamped(Item* work) noexcept;
    void run_sync_specially(void (*function)(void*) noexcept, void* context);
    void run_sync_unmeasured(void (*function)(void*) noexcept, void* context);
    void run_sync_here(void (*function)(void*) noexcept, void* context);

    // The list begins behind `first`, or as `head` says when it is the stub or null.
    void begin_list_at(item* running, item* head) noexcept {
        head_.store(head, std::memory_order_relaxed);
        running_.store(running, std::memory_order_release);
    }
    void let_walk() noexcept {
        std::atomic_signal_fence(std::memory_order_seq_cst);
        if (walked_.load(std::memory_order_acquire)) [[unlikely]]
            wait_for_walk();
    }
    void wait_for_walk() noexcept;
    void put_back(item* work) noexcept { begin_list_at(nullptr, work); }
    void grant(item* first) noexcept;
    [[nodiscard]] item* leave(item* last) noexcept;
    [[nodiscard]] item* first_waiting(bool& settled) const noexcept;
    [[nodiscard]] waiting walk() const noexcept;

    [[nodiscard]] bool is_suspended() const noexcept {
        return suspension_.load(std::memory_order_acquire) >= kSuspension;
    }
    // By itself or by a target.
    [[nodiscard]] bool is_held_back() const noexcept;
    // Whether it is `level`, or a target of it.
    [[nodiscard]] bool is_target_of(const queue_core* level) const noexcept;
    [[nodiscard]] bool try_lock() noexcept;
    void hand_over(void (*function)(void*) noexcept, void* context) noexcept;
    void lock_from_here() noexcept;
    void wait_for_ownership() noexcept;
    void wait_for_resume() noexcept;
    void unlock_chain() noexcept;
    void unlock() noexcept;
    [[nodiscard]] bool park() noexcept;
    [[nodiscard]] item* detach(item* first) noexcept;
    void attach(item* first) noexcept;
    void count_ownership() noexcept;
    [[nodiscard]] item* take_after_stub() noexcept;
    [[nodiscard]] bool run_nested(item* work, unsigned& budget) noexcept;

    // Producers' line.
    std::atomic<item*> tail_{nullptr};
    queue_core* target_;
    pump_core* pump_;                           // the last target's, which owns it
    place place_;                               // in the target's list, or the pool's
    std::atomic<std::uint32_t> references_{1};  // one for all handles, one while owned
    std::atomic<std::uint32_t> handles_{1};
    const priority priority_;
    std::atomic<std::uint8_t> kind_;
    // Owner's line.
    alignas(64) std::atomic<item*> head_{nullptr};  // next to run; null: what follows the stub
    std::atomic<item*> running_{&stub_};
    item stub_;  // its `next` is null whenever it is not in the list
    std::atomic<std::uint32_t> suspension_{0};
    bool counted_ = false;  // ownership holds a reference
    std::atomic<bool> walked_{false};
    std::atomic<reputation> reputation_{reputation::unknown};
    std::atomic<specific*> specifics_{nullptr};
    std::atomic<latencies*> statistics_{nullptr};
    const char* const label_;
};

}  // namespace dispatch::detail
