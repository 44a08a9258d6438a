#pragma once

#include <utility>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "dispatch/time.h"
#include "plr/base/export.h"

// A group counts work that is under way and tells when none is.
//
// Owner:   handles count references; sessions and queued work hold one.
// Threads: every member on any thread.
// Order:   what happened before a leave() is seen by whoever the group
//          releases.
namespace dispatch {

namespace detail {
class group_core;
PLR_EXPORT void retain(group_core* core) noexcept;
PLR_EXPORT void release(group_core* core) noexcept;
}  // namespace detail

class group {
  public:
    // A new group with the count 0. Throws std::bad_alloc.
    PLR_EXPORT group();
    group(const group& other) noexcept : core_(other.core_) {
        if (core_)
            detail::retain(core_);
    }
    group(group&& other) noexcept : core_(std::exchange(other.core_, nullptr)) {}
    group& operator=(group other) noexcept {
        std::swap(core_, other.core_);
        return *this;
    }
    ~group() {
        if (core_)
            detail::release(core_);
    }

    // Counts up; counts down. A leave() without its enter() stops the process.
    PLR_EXPORT void enter() const noexcept;
    PLR_EXPORT void leave() const noexcept;

    // Waits until the count is 0 or `until` has passed. Returns 0 when it is 0,
    // non-zero on time-out. A worker may wait: the pool replaces it meanwhile.
    [[nodiscard]] PLR_EXPORT long wait(time until = forever) const;

    // Queues `work` on `on` once, the next time that the count is 0; at once
    // when it is.
    PLR_EXPORT void notify(const queue& on, block<void()> work) const;

    // on.async(work) inside the group.
    template <class Callable>
    void async(const queue& on, Callable&& work) const;

    friend bool operator==(const group&, const group&) noexcept = default;

  private:
    detail::group_core* core_;
};

// Holds a group entered: every copy counts, and leaves when it goes (on any
// thread).
class group_session {
  public:
    explicit group_session(const group& entered) : group_(entered) { group_.enter(); }
    group_session(const group_session& other) : group_session(other.group_) {}
    group_session& operator=(group_session other) noexcept {
        std::swap(group_, other.group_);
        return *this;
    }
    ~group_session() { group_.leave(); }

  private:
    group group_;
};

template <class Callable>
void group::async(const queue& on, Callable&& work) const {
    on.async([session = group_session(*this),
              work = std::decay_t<Callable>(std::forward<Callable>(work))]() mutable { work(); });
}

}  // namespace dispatch
