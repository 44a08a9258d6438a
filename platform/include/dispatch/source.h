#pragma once

#include <chrono>
#include <cstdint>
#include <utility>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "dispatch/time.h"
#include "plr/base/export.h"

// A source turns a timer or a descriptor's readiness into calls of its event
// handler on its queue.
//
// Owner:   handles count references. Dropping the last handle cancels, except
//          that a handler which captures its own source keeps it alive until
//          cancel(): cancelling releases both handlers.
// Threads: members on any thread; handlers run on the source's queue, never
//          two at once.
// Order:   the cancel handler runs once, after the last event handler, then
//          both handlers are destroyed on the queue.
//
// A source is made suspended; resume() arms it.
namespace dispatch {

namespace detail {
class source_core;
PLR_EXPORT void retain(source_core* core) noexcept;
PLR_EXPORT void release(source_core* core) noexcept;
}  // namespace detail

class source {
  public:
    source() noexcept {}  // a null handle

    // A timer whose handlers run on `on`; nothing happens before set_timer().
    [[nodiscard]] PLR_EXPORT static source timer(const queue& on);
    // Calls the event handler while `fd` is readable (at end of file too) or
    // writable. The descriptor stays its owner's, who closes it only after the
    // cancel handler has run. A regular file is always ready. Throws
    // std::system_error (EBADF).
    [[nodiscard]] PLR_EXPORT static source readable(int fd, const queue& on);
    [[nodiscard]] PLR_EXPORT static source writable(int fd, const queue& on);

    source(const source& other) noexcept : core_(other.core_) {
        if (core_)
            detail::retain(core_);
    }
    source(source&& other) noexcept : core_(std::exchange(other.core_, nullptr)) {}
    source& operator=(source other) noexcept {
        std::swap(core_, other.core_);
        return *this;
    }
    ~source() {
        if (core_)
            detail::release(core_);
    }

    // Before the first resume() only.
    PLR_EXPORT void set_event_handler(block<void()> handler) const;
    PLR_EXPORT void set_cancel_handler(block<void()> handler) const;

    // First call at `start`, then every `interval` counted from it, so that no
    // delay adds up; an interval of dispatch::kOnce, as any that is not positive,
    // means once. Firings that were missed arrive as one call, see data().
    // `leeway`: the delay that the caller would not mind; kept for callers' sake,
    // timers are always as exact as the system. Setting again replaces. Timers
    // only. Cost: a few instructions, whatever else is pending; a system call
    // only when it becomes the earliest of all (bench/timers_cases.h).
    PLR_EXPORT void set_timer(time start, std::chrono::nanoseconds interval,
                              std::chrono::nanoseconds leeway = {}) const;

    // Counted, as for queues; one suspension stands from the start.
    // The first resume() of a descriptor's source throws std::system_error when
    // the kernel cannot watch it (EPERM, EEXIST, ENOSPC).
    PLR_EXPORT void suspend() const noexcept;
    PLR_EXPORT void resume() const;

    // No event handler starts after cancel() was called on the source's queue;
    // called elsewhere, one that was already submitted may still run. Works on
    // a suspended source too. Again: nothing.
    PLR_EXPORT void cancel() const noexcept;
    [[nodiscard]] PLR_EXPORT bool is_cancelled() const noexcept;

    // In an event handler: how often the timer fired since the last call.
    [[nodiscard]] PLR_EXPORT std::uint64_t data() const noexcept;

    explicit operator bool() const noexcept { return core_ != nullptr; }
    friend bool operator==(const source&, const source&) noexcept = default;

  private:
    static source adopt(detail::source_core* owned) noexcept;

    detail::source_core* core_ = nullptr;
};

// The interval of a timer that fires once: all 64 bits set, as in forever.
inline constexpr std::chrono::nanoseconds kOnce{-1};

}  // namespace dispatch
