#include <new>

#include "dispatch/queue.h"
#include "spin_lock.h"

// Recycled nodes. A node is usually made on one thread and freed on another, so
// each thread keeps a short list and exchanges whole magazines of nodes with a
// common depot: one lock for every kMagazine nodes.
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

constexpr unsigned kMagazine = 64;
constexpr unsigned kDepotMagazines = 256;  // 1 MiB of nodes; more go back to the heap

// Nodes are chained through `next`; the first of a magazine holds the next
// magazine in its storage.
struct depot {
    spin_lock lock;
    closure_item* first PLR_GUARDED_BY(lock) = nullptr;
    unsigned count PLR_GUARDED_BY(lock) = 0;
};
depot shared;

struct local_store {
    closure_item* first;
    unsigned count;
    bool registered;
};
// Plain data, so that the hot path has no guard to check.
[[gnu::tls_model("initial-exec")]] thread_local local_store local{};

closure_item* next_of(closure_item* node) noexcept {
    return static_cast<closure_item*>(node->next.load(std::memory_order_relaxed));
}

closure_item*& next_magazine(closure_item* magazine) noexcept {
    return *reinterpret_cast<closure_item**>(magazine->storage);
}

void free_chain(closure_item* node) noexcept {
    while (node)
        delete std::exchange(node, next_of(node));
}

// Gives a chain of kMagazine nodes to the depot, or to the heap when it is full.
void deposit(closure_item* magazine) noexcept {
    {
        scoped_lock guard(shared.lock);
        if (shared.count < kDepotMagazines) {
            next_magazine(magazine) = std::exchange(shared.first, magazine);
            ++shared.count;
            return;
        }
    }
    free_chain(magazine);
}

// Frees what a thread held when it ends.
struct local_owner {
    ~local_owner() { free_chain(std::exchange(local.first, nullptr)); }
};

closure_item* refill() {
    if (!local.registered) {
        thread_local local_owner owner;
        static_cast<void>(&owner);
        local.registered = true;
    }
    closure_item* magazine;
    {
        scoped_lock guard(shared.lock);
        magazine = shared.first;
        if (magazine) {
            shared.first = next_magazine(magazine);
            --shared.count;
        }
    }
    if (!magazine)
        return new closure_item;
    local.first = next_of(magazine);
    local.count = kMagazine - 1;
    return magazine;
}

void deposit_half() noexcept {
    closure_item* magazine = local.first;
    closure_item* last = magazine;
    for (unsigned i = 1; i < kMagazine; ++i)
        last = next_of(last);
    local.first = next_of(last);
    local.count -= kMagazine;
    last->next.store(nullptr, std::memory_order_relaxed);
    deposit(magazine);
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
    closure_item* node = local.first;
    if (!node) [[unlikely]]
        return refill();
    local.first = next_of(node);
    --local.count;
    return node;
}

void recycle_item(closure_item* unused) noexcept {
    unused->next.store(local.first, std::memory_order_relaxed);
    local.first = unused;
    if (++local.count == 2 * kMagazine) [[unlikely]]
        deposit_half();
}
#endif

}  // namespace dispatch::detail
