#pragma once

#include <cstdint>
#include <vector>

#include "dispatch/queue.h"
#include "vox/value.h"

// The requests of one connection that wait for their replies.
//
// Owner:   one connection, under its mutex.
// Cost:    a few slots are looked at for each request and reply; no allocation
//          while the number of outstanding requests is usual.
namespace vox_link {

using reply_block = dispatch::block<void(vox_object_t)>;

struct waiting_reply {
    std::uint64_t id = 0;  // 0: an empty slot
    dispatch::queue queue;
    reply_block handler;
};

class reply_table {
  public:
    // `reply.id` is new and not 0.
    void insert(waiting_reply reply);
    // Removes and returns the entry of `id`; one with the id 0 when there is none.
    [[nodiscard]] waiting_reply take(std::uint64_t id);
    // Removes all, in the order of their ids.
    [[nodiscard]] std::vector<waiting_reply> take_all();
    [[nodiscard]] std::size_t size() const noexcept { return used_; }

  private:
    // Ids count up: they must not lie side by side, because a gap among them is
    // closed by looking at all that follow without one (Fibonacci hashing).
    [[nodiscard]] std::size_t home(std::uint64_t id) const noexcept {
        return static_cast<std::size_t>((id * 0x9E3779B97F4A7C15u) >> 32) & (slots_.size() - 1);
    }
    [[nodiscard]] std::size_t after(std::size_t slot) const noexcept {
        return (slot + 1) & (slots_.size() - 1);
    }
    void place(waiting_reply reply);
    void close_gap(std::size_t gap);
    void resize(std::size_t slots);

    std::vector<waiting_reply> slots_;  // open addressing, a power of two
    std::size_t used_ = 0;
};

}  // namespace vox_link
