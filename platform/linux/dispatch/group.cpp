#include "dispatch/group.h"

#include <atomic>
#include <cstdint>
#include <utility>
#include <vector>

#include "platform/linux/dispatch/futex.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/spin_lock.h"
#include "plr/base/assert.h"

namespace dispatch {
namespace detail {

// The count and, in its lowest bit, whether anybody waits for it to be 0. While
// the bit is clear, enter() and leave() are one atomic operation; the bit, the
// list and the epoch change under the lock only, the last leave() included, so
// that everything registered is released exactly once.
class group_core {
  public:
    void retain() noexcept { references_.fetch_add(1, std::memory_order_relaxed); }
    void release() noexcept {
        if (references_.fetch_sub(1, std::memory_order_acq_rel) != 1)
            return;
        PLR_ASSERT(state_.load() < kOne, "a group went while it was entered");
        delete this;
    }

    void enter() noexcept { state_.fetch_add(kOne, std::memory_order_relaxed); }
    void leave() noexcept;
    [[nodiscard]] long wait(time until);
    void notify(const queue& on, block<void()>&& work);

  private:
    static constexpr std::uint64_t kAwaited = 1;
    static constexpr std::uint64_t kOne = 2;

    struct notification {
        queue on;
        block<void()> work;
    };

    // Whether the count is not 0; then the bit is set.
    [[nodiscard]] bool await() noexcept PLR_REQUIRES(lock_);
    // Counts the calling worker unless `epoch` is over: then returns false.
    [[nodiscard]] bool rest(std::uint32_t epoch, int more) noexcept;

    std::atomic<std::uint32_t> references_{1};
    std::atomic<std::uint64_t> state_{0};
    spin_lock lock_;
    std::vector<notification> notifications_ PLR_GUARDED_BY(lock_);
    std::atomic<std::uint32_t> epoch_{0};    // futex of the waiters
    int resting_ PLR_GUARDED_BY(lock_) = 0;  // workers among them, see pool::rest()
};

bool group_core::await() noexcept {
    std::uint64_t seen = state_.load(std::memory_order_acquire);
    while (seen >= kOne)
        if (state_.compare_exchange_weak(seen, seen | kAwaited, std::memory_order_acq_rel))
            return true;
    return false;
}

void group_core::leave() noexcept {
    std::uint64_t seen = state_.load(std::memory_order_relaxed);
    while (seen != (kOne | kAwaited)) {
        PLR_ASSERT(seen >= kOne, "leave() without enter()");
        if (state_.compare_exchange_weak(seen, seen - kOne, std::memory_order_acq_rel))
            return;
    }
    std::vector<notification> released;
    {
        scoped_lock guard(lock_);
        // Others may have entered meanwhile, or been first.
        const std::uint64_t before = state_.fetch_sub(kOne, std::memory_order_acq_rel);
        if (before != (kOne | kAwaited))
            return;
        state_.fetch_and(~kAwaited, std::memory_order_acq_rel);
        released.swap(notifications_);
        epoch_.fetch_add(1, std::memory_order_release);
        if (resting_ != 0)
            pool::shared().rest(-std::exchange(resting_, 0));
    }
    futex_wake_all(epoch_);
    for (notification& each : released)
        each.on.async(std::move(each.work));
}

long group_core::wait(time until) {
    std::uint32_t epoch;
    {
        scoped_lock guard(lock_);
        if (!await())
            return 0;
        epoch = epoch_.load(std::memory_order_relaxed);
    }
    if (until == immediately)
        return 1;
    blocking_section blocked;
    if (!rest(epoch, 1))
        return 0;
    while (futex_wait(epoch_, epoch, until))
        if (epoch_.load(std::memory_order_acquire) != epoch)
            return 0;
    return rest(epoch, -1) ? 1 : 0;
}

bool group_core::rest(std::uint32_t epoch, int more) noexcept {
    scoped_lock guard(lock_);
    if (epoch_.load(std::memory_order_relaxed) != epoch)
        return false;
    if (pool::is_worker()) {
        resting_ += more;
        pool::shared().rest(more);
    }
    return true;
}

void group_core::notify(const queue& on, block<void()>&& work) {
    {
        scoped_lock guard(lock_);
        if (await()) {
            notifications_.push_back({on, std::move(work)});
            return;
        }
    }
    on.async(std::move(work));
}

void retain(group_core* core) noexcept {
    core->retain();
}
void release(group_core* core) noexcept {
    core->release();
}

}  // namespace detail

group::group() : core_(new detail::group_core) {}
void group::enter() const noexcept {
    core_->enter();
}

void group::leave() const noexcept {
    // Whoever this releases may drop the last handle.
    const group held(*this);
    core_->leave();
}

long group::wait(time until) const {
    return core_->wait(until);
}
void group::notify(const queue& on, block<void()> work) const {
    core_->notify(on, std::move(work));
}

}  // namespace dispatch
