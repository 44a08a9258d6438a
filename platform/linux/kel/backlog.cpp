#include "platform/linux/kel/backlog.h"

#include <utility>

namespace kel {

// After a loss, room is made before messages are taken again: otherwise a flood
// would be a message, a note about a gap, a message, and so on.
bool backlog::has_room(std::size_t more) const noexcept {
    if (waiting_.empty())
        return true;
    const bool gap = lost_at_end_ > 0;
    const std::size_t messages = gap ? most_messages_ / 4 * 3 : most_messages_;
    const std::size_t bytes = gap ? most_bytes_ / 4 * 3 : most_bytes_;
    return waiting_.size() < messages && bytes_ < bytes && more <= bytes - bytes_;
}

bool backlog::push(record&& message) {
    const std::size_t more = cost(message);
    if (!has_room(more)) {
        lost_at_end_++;
        return false;
    }
    waiting_.push_back(std::move(message));
    waiting_.back().lost_before = lost_at_end_;
    lost_at_end_ = 0;
    bytes_ += more;
    return true;
}

void backlog::pop() noexcept {
    bytes_ -= cost(waiting_.front());
    waiting_.pop_front();
}

std::uint64_t backlog::take_loss() noexcept {
    return std::exchange(waiting_.empty() ? lost_at_end_ : waiting_.front().lost_before, 0);
}

}  // namespace kel
