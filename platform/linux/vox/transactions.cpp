#include "platform/linux/vox/transactions.h"

#include <atomic>

#include "plr/base/assert.h"
#include "vox/service.h"

namespace {

// The upper half counts those that ever began, the lower half those that are open.
std::atomic<std::uint64_t> transactions{0};
constexpr std::uint64_t kBegun = std::uint64_t{1} << 32;
constexpr std::uint64_t kOpen = kBegun - 1;

}  // namespace

void vox_transaction_begin(void) {
    transactions.fetch_add(kBegun + 1, std::memory_order_relaxed);
}

void vox_transaction_end(void) {
    const std::uint64_t before = transactions.fetch_sub(1, std::memory_order_release);
    PLR_ASSERT((before & kOpen) > 0, "vox_transaction_end() without vox_transaction_begin()");
}

uint64_t vox_transaction_count(void) {
    return transactions.load(std::memory_order_acquire) & kOpen;
}

std::uint32_t vox_link::transactions_begun() noexcept {
    return static_cast<std::uint32_t>(transactions.load(std::memory_order_relaxed) >> 32);
}
