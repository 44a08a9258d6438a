#include <array>
#include <atomic>
#include <cstdint>
#include <new>

#include "dispatch/queue.h"
#include "platform/linux/dispatch/fork.h"
#include "src/base/magazines.h"

// Recycled nodes of queues' lists.
namespace dispatch::detail {
namespace {

// Nodes come from the heap a page at a time. A page goes back when all its nodes
// were discarded.
struct slabs {
    static constexpr std::size_t kMagazine = 63;
    [[maybe_unused]] static constexpr std::size_t kDepotMagazines = 256;  // 1 MiB of nodes

    struct alignas(4096) slab {
        std::atomic<unsigned> discarded{0};
        alignas(64) std::array<closure_item, kMagazine> items;
    };
    static_assert(sizeof(slab) == 4096);

    static void fill(std::array<closure_item*, kMagazine>& places) {
        auto* made = new slab;
        for (std::size_t i = 0; i < kMagazine; ++i)
            places[i] = &made->items[i];
    }
    static void discard(closure_item* node) noexcept {
        auto* home =
            reinterpret_cast<slab*>(reinterpret_cast<std::uintptr_t>(node) & ~(alignof(slab) - 1));
        if (home->discarded.fetch_add(1, std::memory_order_acq_rel) == kMagazine - 1)
            delete home;
    }
};

using store = plr::detail::Magazines<closure_item, slabs>;

}  // namespace

void forks::lock_items(moment when) noexcept {
    hold(store::depotLock(), when);
}

closure_item* allocate_item() {
    if constexpr (plr::detail::kRecycle)
        return store::take();
    else
        return new closure_item;
}

void recycle_item(closure_item* unused) noexcept {
    if constexpr (plr::detail::kRecycle)
        store::give(unused);
    else
        delete unused;
}

// A block is never an item: the node's bytes are all there is to it.
void* allocate_small() {
    static_assert(sizeof(closure_item) == kSmallBlock);
    return allocate_item();
}

void recycle_small(void* unused) noexcept {
    recycle_item(::new (unused) closure_item);
}

}  // namespace dispatch::detail
