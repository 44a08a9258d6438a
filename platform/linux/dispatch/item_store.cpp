#include <array>
#include <cstdint>
#include <new>
#include <utility>

#include "dispatch/queue.h"
#include "platform/linux/dispatch/spin_lock.h"

// Recycled nodes. A node is usually made on one thread and freed on another, so
// each thread takes nodes from one magazine and puts freed ones into another, and
// exchanges whole magazines with a common depot: one lock for every kMagazine
// nodes.
//
// A magazine is an array beside the nodes and first in, first out: taking a node
// reads nothing of it, so the producer does not wait for a cache line that the
// consumer had, and nodes keep the order of their addresses, which hardware
// prefetches.
namespace dispatch::detail {
namespace {

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define PLR_PLAIN_NODES 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define PLR_PLAIN_NODES 1
#endif
#endif

#ifndef PLR_PLAIN_NODES

constexpr unsigned kMagazine = 63;
constexpr unsigned kDepotMagazines = 256;  // 1 MiB of nodes; more go back to the heap

// Where nodes come from, a page at a time. It goes back to the heap when all its
// nodes were discarded.
struct alignas(4096) slab {
    std::atomic<unsigned> discarded{0};
    alignas(64) std::array<closure_item, kMagazine> items;
};
static_assert(sizeof(slab) == 4096);

void discard(closure_item* node) noexcept {
    auto* home =
        reinterpret_cast<slab*>(reinterpret_cast<std::uintptr_t>(node) & ~(alignof(slab) - 1));
    if (home->discarded.fetch_add(1, std::memory_order_acq_rel) == kMagazine - 1)
        delete home;
}

struct magazine {
    magazine* next = nullptr;  // in the depot
    std::array<closure_item*, kMagazine> items;
};

class depot {
  public:
    // A full magazine, null when there is none.
    magazine* take_full() noexcept { return take(full_, full_count_); }
    // An empty one. Throws std::bad_alloc.
    magazine* take_empty() {
        magazine* taken = take(empty_, empty_count_);
        return taken ? taken : new magazine;
    }
    void give_full(magazine* given) noexcept {
        if (give(full_, full_count_, given))
            return;
        for (closure_item* node : given->items)
            discard(node);
        give_empty(given);
    }
    void give_empty(magazine* given) noexcept {
        if (!give(empty_, empty_count_, given))
            delete given;
    }

  private:
    magazine* take(magazine*& list, unsigned& count) noexcept {
        const scoped_lock guard(lock_);
        if (!list)
            return nullptr;
        --count;
        return std::exchange(list, list->next);
    }
    bool give(magazine*& list, unsigned& count, magazine* given) noexcept {
        const scoped_lock guard(lock_);
        if (count == kDepotMagazines)
            return false;
        ++count;
        given->next = std::exchange(list, given);
        return true;
    }

    // The lists change under the lock.
    spin_lock lock_;
    magazine* full_ = nullptr;
    magazine* empty_ = nullptr;
    unsigned full_count_ = 0;
    unsigned empty_count_ = 0;
};
constinit depot shared;

// Plain data, so that the hot path has no guard to check.
struct local_store {
    closure_item** next;  // to take, in `taking`
    closure_item** end;
    closure_item** place;  // for the next freed one, in `giving`
    closure_item** last;   // one past the last place
    magazine* taking;
    magazine* giving;
};
[[gnu::tls_model("initial-exec")]] thread_local constinit local_store local{};

// Discards what a thread held when it ends.
struct local_owner {
    ~local_owner() {
        local_store ended = std::exchange(local, {});
        while (ended.next != ended.end)
            discard(*ended.next++);
        while (ended.giving && ended.place != ended.giving->items.data())
            discard(*--ended.place);
        delete ended.taking;
        delete ended.giving;
    }
};

void own_local_store() {
    static thread_local local_owner owner;
    static_cast<void>(&owner);
}

void load(magazine* filled, std::size_t count) noexcept {
    local.taking = filled;
    local.next = filled->items.data();
    local.end = local.next + count;
}

void fill_with_new_nodes(magazine* empty) {
    auto* made = new slab;
    for (std::size_t i = 0; i < kMagazine; ++i)
        empty->items[i] = &made->items[i];
}

[[gnu::noinline]] closure_item* refill() {
    own_local_store();
    if (magazine* full = shared.take_full()) {
        if (local.taking)
            shared.give_empty(local.taking);
        load(full, kMagazine);
    } else if (local.giving && local.place != local.giving->items.data()) {
        // What this thread freed itself.
        const auto count = static_cast<std::size_t>(local.place - local.giving->items.data());
        std::swap(local.taking, local.giving);
        load(local.taking, count);
        local.place = local.giving ? local.giving->items.data() : nullptr;
        local.last = local.giving ? local.place + kMagazine : nullptr;
    } else {
        magazine* empty = local.taking ? local.taking : shared.take_empty();
        local.taking = empty;
        fill_with_new_nodes(empty);
        load(empty, kMagazine);
    }
    return *local.next++;
}

// Out of memory for a magazine: the node just goes.
[[gnu::noinline]] void make_place(closure_item* unused) noexcept {
    try {
        own_local_store();
        if (local.giving)
            shared.give_full(std::exchange(local.giving, nullptr));
        local.place = local.last = nullptr;
        local.giving = shared.take_empty();
        local.place = local.giving->items.data();
        local.last = local.place + kMagazine;
        *local.place++ = unused;
    } catch (const std::bad_alloc&) {
        discard(unused);
    }
}

#endif

}  // namespace

#ifdef PLR_PLAIN_NODES
// Sanitizers see every node's life.
closure_item* allocate_item() {
    return new closure_item;
}
void recycle_item(closure_item* unused) noexcept {
    delete unused;
}
#else
closure_item* allocate_item() {
    if (local.next == local.end) [[unlikely]]
        return refill();
    return *local.next++;
}

void recycle_item(closure_item* unused) noexcept {
    if (local.place == local.last) [[unlikely]]
        return make_place(unused);
    *local.place++ = unused;
}
#endif

}  // namespace dispatch::detail
