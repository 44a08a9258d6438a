#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>

#include "kel/kel.h"
#include "platform/linux/kel/record.h"

// The messages that wait, bounded, with exact counts of those that found no
// room. Not locked.
namespace kel {

class backlog {
  public:
    void set_limits(std::size_t messages, std::size_t bytes) noexcept {
        most_messages_ = messages;
        most_bytes_ = bytes;
    }

    // Whether there was room; otherwise the message is counted as lost.
    [[nodiscard]] bool push(record&& message);
    // Something went wrong with the newest before it could be pushed.
    void lose_newest() noexcept { lost_at_end_++; }

    [[nodiscard]] bool empty() const noexcept { return waiting_.empty(); }
    [[nodiscard]] std::size_t size() const noexcept { return waiting_.size(); }
    [[nodiscard]] const std::deque<record>& all() const noexcept { return waiting_; }
    // The oldest; stays where it is while others are pushed.
    [[nodiscard]] const record& first() const noexcept { return waiting_.front(); }
    void pop() noexcept;
    // The messages lost in front of the oldest, or at all when none waits; from
    // then on they are the caller's to report.
    [[nodiscard]] std::uint64_t take_loss() noexcept;

  private:
    static std::size_t cost(const record& message) noexcept {
        return message.bytes.size() + KEL_MESSAGE_OVERHEAD;
    }
    [[nodiscard]] bool has_room(std::size_t more) const noexcept;

    std::deque<record> waiting_;
    std::size_t bytes_ = 0;  // cost() of all
    std::size_t most_messages_ = KEL_DEFAULT_MESSAGES;
    std::size_t most_bytes_ = KEL_DEFAULT_BYTES;
    std::uint64_t lost_at_end_ = 0;
};

}  // namespace kel
