#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <optional>
#include <string_view>
#include <type_traits>
#include <utility>

#include "dispatch/block.h"
#include "dispatch/time.h"
#include "plr/base/export.h"

// A serial queue runs the work submitted to it one piece at a time, in the
// order of submission, on worker threads of the process-wide pool.
//
// Owner:   handles count references; work that is queued keeps its queue
//          alive, so the last handle may go while work waits.
// Threads: every member may be called on any thread, the queue's own work
//          included, unless it says otherwise.
// Order:   two submissions of one thread run in that order; what a submitter
//          wrote before it is seen by the work.
// Cost:    async() is one recycled node and one atomic exchange, without a
//          system call unless a worker has to be woken (bench/dispatch_cases.h);
//          an idle queue holds no thread and less than 256 bytes plus its label.
//
// A queue may have a target: its work then runs as part of the target's, so
// that all queues with one target exclude each other, and suspending the target
// suspends them. Queues without a target run on the pool at normal priority, but
// for those of pumps (pump.h), which a thread of the program runs.
//
// Work that blocks: a worker that waits in sync() or group::wait() tells the
// pool, which replaces it; a pool whose workers all block elsewhere (in read(),
// on a mutex) grows while work waits. At most kMaximumWorkers threads exist.
// What a worker submits as its last piece of work is expected to run on that
// worker next: if the submitting piece goes on for long instead, another worker
// takes it after some milliseconds.
//
// An exception that leaves submitted work ends the process.
//
// After fork(2), queues work in the child, which has a pool of its own. What waited
// on them, timers, sources and the watchdog stay with the parent: the child forgets
// them, closures undestroyed. Work that forks goes on in the child; a suspended queue
// stays suspended. What other threads held at that time, such as groups entered,
// mutexes and connections, is held for ever: create anew what the child uses, or
// call exec.
namespace dispatch {

inline constexpr unsigned kMaximumWorkers = 512;

enum class priority : std::uint8_t { high = 0, normal = 1, low = 2 };

namespace detail {

class queue_core;

// One piece of work in a queue's list: 64 bytes, the closure inside when it
// is small. `run` says what it is.
struct item {
    std::atomic<item*> next{nullptr};
    void (*run)(item*) noexcept = nullptr;  // runs and destroys the closure
};

inline constexpr std::size_t kInlineClosure = 48;

struct closure_item : item {
    alignas(16) std::byte storage[kInlineClosure];
};
static_assert(sizeof(closure_item) == 64);

template <class Callable>
inline constexpr bool kFitsInline = sizeof(Callable) <= kInlineClosure && alignof(Callable) <= 16;

// Takes a node from this thread's store. Throws std::bad_alloc.
[[nodiscard]] PLR_EXPORT closure_item* allocate_item();
PLR_EXPORT void recycle_item(closure_item* unused) noexcept;

template <class Callable>
[[nodiscard]] closure_item* make_item(Callable&& callable) {
    using Stored = std::decay_t<Callable>;
    static_assert(std::is_invocable_v<Stored&>, "work takes no arguments");
    closure_item* made = allocate_item();
    struct guard {
        closure_item* owned;
        ~guard() {
            if (owned)
                recycle_item(owned);
        }
    } pending{made};
    if constexpr (kFitsInline<Stored>) {
        ::new (static_cast<void*>(made->storage)) Stored(std::forward<Callable>(callable));
        made->run = [](item* self) noexcept {
            auto* stored =
                std::launder(reinterpret_cast<Stored*>(static_cast<closure_item*>(self)->storage));
            (*stored)();
            stored->~Stored();
        };
    } else {
        auto* stored = new Stored(std::forward<Callable>(callable));
        ::new (static_cast<void*>(made->storage)) Stored*(stored);
        made->run = [](item* self) noexcept {
            Stored* outside = *std::launder(
                reinterpret_cast<Stored**>(static_cast<closure_item*>(self)->storage));
            (*outside)();
            delete outside;
        };
    }
    pending.owned = nullptr;
    return made;
}

PLR_EXPORT void retain(queue_core* core) noexcept;
PLR_EXPORT void release(queue_core* core) noexcept;
PLR_EXPORT void submit(queue_core* core, closure_item* work) noexcept;
// Runs `function(context)` on the queue and returns when it has run.
PLR_EXPORT void submit_and_wait(queue_core* core, void (*function)(void*) noexcept, void* context);

}  // namespace detail

class queue {
  public:
    // A null handle: only assignment, comparison, get() and destruction.
    queue() noexcept {}

    // A new serial queue. `label` is copied and appears in diagnostics. `target`
    // as above, null for none; it is kept alive and never changes. Throws
    // std::bad_alloc.
    [[nodiscard]] PLR_EXPORT static queue create(std::string_view label, const queue& target);
    [[nodiscard]] static queue create(std::string_view label) { return create(label, queue()); }

    // The process-wide concurrent queues: work submitted to them runs on any
    // worker, several pieces at once, higher priorities first. They cannot be
    // suspended; sync() runs in place; barrier_async() is async().
    [[nodiscard]] PLR_EXPORT static queue global(priority level = priority::normal) noexcept;

    queue(const queue& other) noexcept : core_(other.core_) {
        if (core_)
            detail::retain(core_);
    }
    queue(queue&& other) noexcept : core_(std::exchange(other.core_, nullptr)) {}
    queue& operator=(queue other) noexcept {
        std::swap(core_, other.core_);
        return *this;
    }
    // The last handle of a queue that is suspended must not go: that stops the
    // process, because its work could never run.
    ~queue() {
        if (core_)
            detail::release(core_);
    }

    // Queues `work` (any callable without arguments, a block<void()> too) and
    // returns. The callable is destroyed on the queue, right after its run.
    template <class Callable>
    void async(Callable&& work) const {
        detail::submit(core_, detail::make_item(std::forward<Callable>(work)));
    }

    // On a serial queue the same as async(): everything submitted before has
    // run, nothing submitted after has started.
    template <class Callable>
    void barrier_async(Callable&& work) const {
        async(std::forward<Callable>(work));
    }

    // Runs `work` on the calling thread when its turn has come, and returns its
    // result (move-only ones too): at once when the queue is idle, else after
    // everything queued before. Calling it from work of the same queue, or of
    // one that targets it, stops the process with a message that names it. On the
    // queue of a pump (pump.h), or one that targets it, the pump's thread runs it.
    template <class Callable>
    auto sync(Callable&& work) const -> std::invoke_result_t<Callable&> {
        using Result = std::invoke_result_t<Callable&>;
        if constexpr (std::is_void_v<Result>) {
            auto* callable = std::addressof(work);
            detail::submit_and_wait(
                core_,
                [](void* context) noexcept { (*static_cast<decltype(callable)*>(context)[0])(); },
                static_cast<void*>(&callable));
        } else {
            using Stored = std::conditional_t<std::is_reference_v<Result>,
                                              std::remove_reference_t<Result>*, Result>;
            struct call {
                std::remove_reference_t<Callable>* callable;
                std::optional<Stored> result;
            } context{std::addressof(work), std::nullopt};
            detail::submit_and_wait(
                core_,
                [](void* opaque) noexcept {
                    auto* made = static_cast<call*>(opaque);
                    if constexpr (std::is_reference_v<Result>)
                        made->result.emplace(std::addressof((*made->callable)()));
                    else
                        made->result.emplace((*made->callable)());
                },
                &context);
            if constexpr (std::is_reference_v<Result>)
                return static_cast<Result>(**context.result);
            else
                return std::move(*context.result);
        }
    }

    // Queues `work` once `when` has passed; forever never does.
    PLR_EXPORT void after(time when, block<void()> work) const;

    // Counted: work starts only while every suspend() has had its resume(). A
    // piece that runs already runs to its end. More resumes than suspends stop
    // the process.
    PLR_EXPORT void suspend() const noexcept;
    PLR_EXPORT void resume() const noexcept;

    // NUL-terminated; lives as long as the queue.
    [[nodiscard]] PLR_EXPORT const char* label() const noexcept;

    // Queue-specific values: one pointer a key, keys being addresses. Setting
    // replaces; null removes. `destructor` (may be null) is called with a value
    // that was replaced, or that is left when the queue is destroyed.
    PLR_EXPORT void set_specific(const void* key, void* value,
                                 void (*destructor)(void*) = nullptr) const;
    // The value of this queue or else of its nearest target that has one; null
    // when none has.
    [[nodiscard]] PLR_EXPORT void* get_specific(const void* key) const noexcept;

    // Whether the calling thread runs work of this queue, or of one that
    // targets it, also further up its stack through sync().
    [[nodiscard]] PLR_EXPORT bool is_current() const noexcept;
    // Stops the process, naming the queue, when the answer is the other one.
    PLR_EXPORT void assert_current() const noexcept;
    PLR_EXPORT void assert_not_current() const noexcept;

    explicit operator bool() const noexcept { return core_ != nullptr; }
    friend bool operator==(const queue&, const queue&) noexcept = default;

    // A loan, for holders that deliberately do not retain.
    [[nodiscard]] detail::queue_core* get() const noexcept { return core_; }
    [[nodiscard]] static queue from_raw(detail::queue_core* lent) noexcept {
        if (lent)
            detail::retain(lent);
        return adopt(lent);
    }
    // Takes over one reference.
    [[nodiscard]] static queue adopt(detail::queue_core* owned) noexcept {
        queue result;
        result.core_ = owned;
        return result;
    }

  private:
    detail::queue_core* core_ = nullptr;
};

// The value for `key` of the queue whose work the calling thread runs; null
// outside of any.
[[nodiscard]] PLR_EXPORT void* current_specific(const void* key) noexcept;

}  // namespace dispatch
