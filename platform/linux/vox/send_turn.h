#pragma once

#include <cstdint>

#include "dispatch/queue.h"

// What one thread sends while it delivers a batch of received messages.
//
// While more messages of the batch wait, frames for connections of the same
// queue are put together, and written at the end of the turn or 100 µs after
// the first (up to 1 ms when they go to many): a burst of requests is answered
// with few system calls, a lone request at once (bench/vox_cases.h). When a
// handler takes long or blocks, another thread writes them after a millisecond or
// two.
namespace vox_link {

class peer_connection;

class send_turn {
  public:
    explicit send_turn(dispatch::detail::queue_core* queue) noexcept;
    ~send_turn();
    send_turn(const send_turn&) = delete;
    send_turn& operator=(const send_turn&) = delete;

    // The innermost turn of the calling thread, if it is on `queue`, or null.
    [[nodiscard]] static send_turn* on(dispatch::detail::queue_core* queue) noexcept;

    // Whether the turn delivers more messages after this one.
    [[nodiscard]] bool has_more() const noexcept { return has_more_; }
    void set_more(bool more) noexcept { has_more_ = more; }
    // Writes what `sender` has waiting, when the time comes; holds it.
    void add(peer_connection* sender);
    // Between two messages.
    void flush_if_due();

  private:
    void flush();

    dispatch::detail::queue_core* queue_;
    send_turn* outer_;
    bool has_more_ = false;
    std::int64_t began_ = 0;    // ns, when the first sender was added; 0: none was
    std::int64_t senders_ = 0;  // added since then
};

}  // namespace vox_link
