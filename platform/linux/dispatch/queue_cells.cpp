#include "platform/linux/dispatch/queue_cells.h"

#include <sched.h>

#include <new>

#include "platform/linux/dispatch/fork.h"
#include "src/base/magazines.h"

namespace dispatch::detail {

void queue_cell::end() noexcept {
    std::uint32_t expected = kLive;
    while (!state.compare_exchange_weak(expected, kFree, std::memory_order_acq_rel)) {
        expected = kLive;
        ::sched_yield();
    }
}

namespace queue_cells {
namespace {

// Its cells follow it.
struct alignas(64) page {
    page* next = nullptr;
    page* previous = nullptr;
    std::size_t count = 0;
    std::atomic<std::size_t> discarded{0};

    [[nodiscard]] queue_cell* cells() noexcept { return reinterpret_cast<queue_cell*>(this + 1); }
};
static_assert(sizeof(page) == 64);

class register_of_pages {
  public:
    page* make(std::size_t count, std::align_val_t alignment) {
        forks::expect();
        void* memory = ::operator new(sizeof(page) + count * sizeof(queue_cell), alignment);
        page* made = ::new (memory) page;
        made->count = count;
        for (std::size_t i = 0; i < count; ++i)
            ::new (static_cast<void*>(made->cells() + i)) queue_cell;
        const plr::detail::BriefLock guard(lock_);
        made->next = first_;
        if (first_)
            first_->previous = made;
        first_ = made;
        return made;
    }

    void discard(page* unused, std::align_val_t alignment) noexcept {
        {
            const plr::detail::BriefLock guard(lock_);
            (unused->previous ? unused->previous->next : first_) = unused->next;
            if (unused->next)
                unused->next->previous = unused->previous;
        }
        ::operator delete(unused, alignment);
    }

    void for_each(const std::function<void(queue_core&)>& look) {
        const plr::detail::BriefLock guard(lock_);
        for (page* each = first_; each; each = each->next)
            for (std::size_t i = 0; i < each->count; ++i)
                look_at(each->cells()[i], look);
    }

    void if_live(const queue_core* core, const std::function<void(queue_core&)>& look) {
        const plr::detail::BriefLock guard(lock_);
        queue_cell* const wanted = queue_cell::of(core);
        for (page* each = first_; each; each = each->next)
            if (std::less_equal<>()(each->cells(), wanted) &&
                std::less<>()(wanted, each->cells() + each->count))
                look_at(*wanted, look);
    }

    plr::detail::BriefMutex& lock() noexcept { return lock_; }

  private:
    struct looking {
        queue_cell& at;
        ~looking() { at.state.store(queue_cell::kLive, std::memory_order_release); }
    };
    static void look_at(queue_cell& cell, const std::function<void(queue_core&)>& look) {
        std::uint32_t expected = queue_cell::kLive;
        if (!cell.state.compare_exchange_strong(expected, queue_cell::kLookedAt,
                                                std::memory_order_acq_rel))
            return;
        const looking until_the_end{cell};
        look(*cell.core());
    }

    plr::detail::BriefMutex lock_;
    page* first_ PLR_GUARDED_BY(lock_) = nullptr;
};

constinit register_of_pages pages;

struct store_source {
    static constexpr std::size_t kMagazine = (4096 - sizeof(page)) / sizeof(queue_cell);
    [[maybe_unused]] static constexpr std::size_t kDepotMagazines = 64;
    static constexpr std::align_val_t kPage{4096};

    [[maybe_unused]] static void fill(std::array<queue_cell*, kMagazine>& places) {
        page* made = pages.make(kMagazine, kPage);
        for (std::size_t i = 0; i < kMagazine; ++i)
            places[i] = made->cells() + i;
    }
    [[maybe_unused]] static void discard(queue_cell* cell) noexcept {
        auto* home =
            reinterpret_cast<page*>(reinterpret_cast<std::uintptr_t>(cell) & ~std::uintptr_t{4095});
        if (home->discarded.fetch_add(1, std::memory_order_acq_rel) == kMagazine - 1)
            pages.discard(home, kPage);
    }
};
using store = plr::detail::Magazines<queue_cell, store_source>;

// A page for one, where sanitizers are to see the life of each queue.
constexpr std::align_val_t kSingle{alignof(page)};

}  // namespace

queue_cell* take() {
    if constexpr (plr::detail::kRecycle)
        return store::take();
    else
        return pages.make(1, kSingle)->cells();
}

void give(queue_cell* unused) noexcept {
    if constexpr (plr::detail::kRecycle)
        store::give(unused);
    else
        pages.discard(reinterpret_cast<page*>(unused) - 1, kSingle);
}

void for_each(const std::function<void(queue_core&)>& look) {
    pages.for_each(look);
}
void if_live(const queue_core* core, const std::function<void(queue_core&)>& look) {
    pages.if_live(core, look);
}

}  // namespace queue_cells

void forks::lock_queues(moment when) noexcept {
    hold(queue_cells::pages.lock(), when);
    hold(queue_cells::store::depotLock(), when);
}

}  // namespace dispatch::detail
