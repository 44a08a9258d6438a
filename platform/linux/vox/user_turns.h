#pragma once

#include <deque>
#include <memory>

#include "dispatch/queue.h"
#include "platform/linux/dispatch/io_watch.h"

// The turns that the clients of one user take on one target queue.
//
// While other work waits in the queue, they have one place in its line together,
// not one each: a user with many busy clients is served as often as one with a
// single client, and as often as everything else on the queue.
//
// Owner:   the clients share it.
// Threads: on the queue.
// Order:   the clients take turns in the order in which they asked.
// Cost:    a look at the queue when nothing waits there; bench/vox_cases.h.
namespace vox_link {

class peer_connection;

class user_turns : public std::enable_shared_from_this<user_turns> {
  public:
    explicit user_turns(dispatch::queue on) noexcept;

    [[nodiscard]] bool is_on(const dispatch::queue& queue) const noexcept {
        return queue_ == queue;
    }
    // Whether `client` may take its turn at once. If not, its take_turn() will be
    // called; it does not ask again before.
    [[nodiscard]] bool may_go(peer_connection& client);

  private:
    struct place : dispatch::detail::embedded_item {
        explicit place(user_turns* of) noexcept;
        user_turns* owner;
    };
    void take_place();
    void next();

    const dispatch::queue queue_;
    place place_;
    std::shared_ptr<user_turns> self_;      // while the place is in the queue
    std::deque<peer_connection*> waiting_;  // each held
};

}  // namespace vox_link
