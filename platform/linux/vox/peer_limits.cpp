// What a peer costs, and what happens when that is too much.
#include <unistd.h>

#include <chrono>
#include <utility>

#include "platform/linux/vox/peer_connection.h"

namespace vox_link {
namespace {

// So much may wait without being charged to the user while the peer reads: it is
// being put together, or on its way.
constexpr std::uint64_t kUnchargedBytes = 128u << 10;

}  // namespace

// ---- What waits for the peer ---------------------------------------------------------

peer_connection::burden peer_connection::waiting() const {
    return {.bytes = out_.bytes() + early_bytes_,
            .messages = out_.messages() + early_.size(),
            .descriptors = out_.descriptors() + early_descriptors_};
}

// The limit, `times` over, that would be exceeded if `made` had to wait as well.
// When nothing waits any message may.
limit_hit peer_connection::over(const vox_wire::encoded& made, unsigned times) {
    burden all = waiting();
    const bool first = all.messages == 0 && all.bytes <= kControlBodyBytes;
    if (first && can_write() && greeted_.load(std::memory_order_relaxed)) [[likely]]
        return {};
    all.bytes += made.bytes.size();
    all.messages += 1;
    all.descriptors += made.descriptors.size();
    if (!first && all.bytes > times * std::uint64_t{limits_.max_queued_bytes})
        return {"max_queued_bytes", limits_.max_queued_bytes};
    if (!first && all.messages > times * std::uint64_t{limits_.max_queued_messages})
        return {"max_queued_messages", limits_.max_queued_messages};
    if (!made.descriptors.empty() && all.descriptors + held_.load(std::memory_order_relaxed) >
                                         times * std::uint64_t{limits_.max_held_descriptors})
        return {"max_held_descriptors", limits_.max_held_descriptors};
    return charge(all, times);
}

// Makes what the user is charged for on account of this connection what `all`
// comes to. Hot path: nothing is charged for a peer that reads.
limit_hit peer_connection::charge(const burden& all, unsigned times) {
    if (!user_)
        return {};
    const bool lasts = blocked_ || !greeted_.load(std::memory_order_relaxed) ||
                       fd_.load(std::memory_order_relaxed) < 0 || all.bytes > kUnchargedBytes;
    // What waits for a tap is bounded by itself.
    const burden due = lasts && !is_tap_ ? all : burden{};
    if (due == charged_) [[likely]]
        return {};
    if (!user_->adjust(cost::queued_bytes, charged_.bytes, due.bytes, times))
        return user_->limit(cost::queued_bytes);
    if (!user_->adjust(cost::queued_messages, charged_.messages, due.messages, times))
        return user_->limit(cost::queued_messages);
    if (!user_->adjust(cost::held_descriptors, charged_.descriptors, due.descriptors, times))
        return user_->limit(cost::held_descriptors);
    return {};
}

// After what waits has changed. It may have grown beyond what was admitted: a
// message that nothing waited before was begun and cannot be taken back.
void peer_connection::settle() {
    const unsigned times = limits_.overflow == VOX_OVERFLOW_DROP ? 2 : 1;
    if (const limit_hit hit = charge(waiting(), times))
        overflow(hit);
}

void peer_connection::overflow(const limit_hit& hit) {
    const burden now = waiting();
    fail_locked(VOX_ERROR_CONNECTION_INVALID,
                "the peer does not read: " + std::to_string(now.messages) + " messages, " +
                    std::to_string(now.bytes) + " bytes wait, over " + hit.text(),
                blame::limit);
}

// ---- Descriptors that came -----------------------------------------------------------

// Counts `count` that arrived. They are counted until close_descriptor() or
// let_go() closes them, wherever they are then.
bool peer_connection::hold_descriptors(std::size_t count) {
    limit_hit hit;
    {
        const lock_guard guard(lock_);
        const std::uint64_t all =
            held_.load(std::memory_order_relaxed) + count + out_.descriptors() + early_descriptors_;
        if (all > limits_.max_held_descriptors)
            hit = {"max_held_descriptors", limits_.max_held_descriptors};
        else if (user_ && !user_->take(cost::held_descriptors, count))
            hit = user_->limit(cost::held_descriptors);
        else
            held_.fetch_add(count, std::memory_order_relaxed);
    }
    if (!hit)
        hold(static_cast<std::uint32_t>(count));
    else
        limit_exceeded("too many descriptors are held: " + hit.text());
    return !hit;
}

void peer_connection::descriptor_gone() noexcept {
    held_.fetch_sub(1, std::memory_order_relaxed);
    if (user_)
        user_->give_back(cost::held_descriptors, 1);
    unhold();
}

void peer_connection::let_go(std::span<const int> descriptors) noexcept {
    for (const int descriptor : descriptors)
        vox_values::close_descriptor(descriptor, this);
}

// ---- Frames that do not get whole ----------------------------------------------------

// Counts the bytes of the frame under way.
bool peer_connection::count_partial() {
    const std::uint64_t now = reader_.has_next() ? 0 : reader_.waiting_bytes();
    std::uint64_t counted = partial_bytes_.load(std::memory_order_relaxed);
    if (now == counted) [[likely]]
        return true;
    if (user_ && !user_->adjust(cost::partial_bytes, counted, now)) {
        limit_exceeded("too much of frames that are not whole: " +
                       user_->limit(cost::partial_bytes).text());
        return false;
    }
    partial_bytes_.store(now, std::memory_order_relaxed);
    return true;
}

// The timer is left running when the frame gets whole in time; it then finds
// nothing to do. So a stream that is always cut somewhere costs one timer call
// in all that time.
void peer_connection::limit_incomplete_frame() {
    if (incomplete_since_ != 0 || !(reader_.in_frame() || is_silent()))
        return;
    incomplete_since_ = dispatch::time::now().nanoseconds();
    if (incomplete_armed_)
        return;
    if (!incomplete_timer_) {
        incomplete_timer_ = dispatch::source::timer(queue());
        // The source is cancelled before this object can go.
        incomplete_timer_.set_event_handler(
            dispatch::block<void()>([this] { incomplete_frame_due(); }));
        incomplete_timer_.resume();
    }
    arm_incomplete_timer(std::chrono::milliseconds(limits_.incomplete_frame_ms));
}

void peer_connection::arm_incomplete_timer(std::chrono::nanoseconds delay) {
    incomplete_armed_ = true;
    incomplete_timer_.set_timer(dispatch::time::after(delay), dispatch::kOnce);
}

// What has come meanwhile is read first: the queue may have been busy.
void peer_connection::incomplete_frame_due() {
    queue_role_.entered();
    incomplete_armed_ = false;
    if (may_deliver()) {
        readable_ = true;
        read_turn();
    }
    if (incomplete_since_ == 0 || incomplete_armed_ || is_ending())
        return;
    const std::int64_t now = dispatch::time::now().nanoseconds();
    const std::chrono::nanoseconds limit = std::chrono::milliseconds(limits_.incomplete_frame_ms);
    // Nothing is read while suspended: the peer is not to blame.
    if (is_suspended())
        incomplete_since_ = now;
    const std::chrono::nanoseconds left = limit - std::chrono::nanoseconds(now - incomplete_since_);
    if (left.count() > 0)
        return arm_incomplete_timer(left);
    limit_exceeded((is_silent() ? "no hello after " : "a frame was not whole after ") +
                   std::to_string(limits_.incomplete_frame_ms) + " ms (incomplete_frame_ms)");
}

void peer_connection::limit_exceeded(std::string reason) {
    fail(VOX_ERROR_CONNECTION_INVALID, std::move(reason), blame::limit);
}

// ---- Looking -------------------------------------------------------------------------

void peer_connection::count_blame(blame blamed) {
    if (user_)
        user_->service().count(blamed == blame::limit ? service_account::event::ended_for_limit
                                                      : service_account::event::ended_for_protocol);
}

void peer_connection::add_counts(vox_listener_statistics_t& sums) const {
    const vox_statistics_t own = statistics();
    sums.messages_sent += own.messages_sent;
    sums.messages_received += own.messages_received;
    sums.messages_dropped += own.messages_dropped;
    sums.requests_refused += own.requests_refused;
}

vox_statistics_t peer_connection::statistics() const {
    const lock_guard guard(lock_);
    const burden now = waiting();
    return {.messages_sent = out_.messages_written(),
            .messages_received = messages_received_.load(std::memory_order_relaxed),
            .messages_dropped = dropped_,
            .peer_dropped = peer_dropped_.load(std::memory_order_relaxed),
            .requests_refused = requests_refused_,
            .replies_refused = replies_refused_,
            .peer_refused = peer_refused_,
            .queued_messages = now.messages,
            .queued_bytes = now.bytes,
            .pending_replies = replies_.size(),
            .open_requests = wound_up_ ? 0 : open_.size(),
            .held_descriptors = held_.load(std::memory_order_relaxed) + now.descriptors,
            .partial_bytes = partial_bytes_.load(std::memory_order_relaxed)};
}

}  // namespace vox_link
