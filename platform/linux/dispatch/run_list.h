#pragma once

#include <sched.h>

#include <atomic>

#include "dispatch/queue.h"
#include "platform/linux/dispatch/futex.h"

namespace dispatch::detail {

// A first-in, first-out list of work for the workers: any thread pushes with
// one exchange, one thread at a time takes (the pool's lock sees to that).
class run_list {
  public:
    // Returns whether the list was empty.
    bool push(item* work) noexcept {
        work->next.store(nullptr, std::memory_order_relaxed);
        item* previous = tail_.exchange(work, std::memory_order_seq_cst);
        if (previous)
            previous->next.store(work, std::memory_order_release);
        else
            head_.store(work, std::memory_order_release);
        return !previous;
    }

    [[nodiscard]] bool empty() const noexcept {
        return tail_.load(std::memory_order_seq_cst) == nullptr;
    }

    // Forgets what is in it. For the child of a fork.
    void clear() noexcept {
        tail_.store(nullptr, std::memory_order_relaxed);
        head_.store(nullptr, std::memory_order_relaxed);
    }

    // Null when empty.
    item* take() noexcept {
        if (empty())
            return nullptr;
        item* first = settled(head_);
        item* next = first->next.load(std::memory_order_acquire);
        if (!next) {
            head_.store(nullptr, std::memory_order_relaxed);
            item* expected = first;
            if (tail_.compare_exchange_strong(expected, nullptr, std::memory_order_acq_rel))
                return first;
            next = settled(first->next);
        }
        head_.store(next, std::memory_order_relaxed);
        return first;
    }

  private:
    // A producer is between its exchange and its store.
    static item* settled(std::atomic<item*>& place) noexcept {
        for (unsigned spins = 1;; ++spins) {
            if (item* found = place.load(std::memory_order_acquire))
                return found;
            if (spins % 64 == 0)
                ::sched_yield();
            else
                cpu_relax();
        }
    }

    alignas(64) std::atomic<item*> tail_{nullptr};
    alignas(64) std::atomic<item*> head_{nullptr};
};

}  // namespace dispatch::detail
