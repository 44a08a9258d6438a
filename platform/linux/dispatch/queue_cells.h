#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string_view>

#include "plr/base/thread_annotations.h"
#include "src/base/brief_mutex.h"

// The memory of queues, which is the register of those that live: a page is cut
// into cells, and who looks for queues goes through the pages. So making a queue
// takes no lock, most times.
namespace dispatch::detail {

class queue_core;

// Room for one queue_core and a short label.
struct alignas(64) queue_cell {
    static constexpr std::size_t kCore = 128;
    static constexpr std::size_t kLabel = 60;

    [[nodiscard]] queue_core* core() noexcept { return reinterpret_cast<queue_core*>(bytes); }
    static queue_cell* of(const queue_core* core) noexcept {
        return const_cast<queue_cell*>(reinterpret_cast<const queue_cell*>(core));
    }
    // The queue is complete; it is about to go: waits while it is looked at.
    void begin() noexcept { state.store(kLive, std::memory_order_release); }
    void end() noexcept;

    static constexpr std::uint32_t kFree = 0;
    static constexpr std::uint32_t kLive = 1;
    static constexpr std::uint32_t kLookedAt = 2;

    alignas(64) std::byte bytes[kCore];
    std::atomic<std::uint32_t> state{kFree};
    char label[kLabel];
};
static_assert(sizeof(queue_cell) == 192);

namespace queue_cells {

// Throws std::bad_alloc.
[[nodiscard]] queue_cell* take();
void give(queue_cell* unused) noexcept;

// Calls `look` with every live queue, which lives until it returns; queues that
// are made or go meanwhile may be missed. One at a time; `look` makes no queue and
// releases none.
void for_each(const std::function<void(queue_core&)>& look);
// The same for one queue if it lives; `core` may be anything.
void if_live(const queue_core* core, const std::function<void(queue_core&)>& look);

}  // namespace queue_cells
}  // namespace dispatch::detail
