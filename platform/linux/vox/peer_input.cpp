// Receiving: one turn reads what is there and delivers it, in order, on the
// target queue.
#include <sys/epoll.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>

#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/read_memory.h"
#include "platform/linux/vox/request.h"
#include "platform/linux/vox/send_turn.h"
#include "platform/linux/vox/socket_io.h"
#include "platform/linux/vox/user_turns.h"

namespace vox_link {
namespace {

constexpr unsigned kFramesPerLook = 16;         // at the clock
constexpr std::int64_t kLongestTurn = 500'000;  // ns

}  // namespace

// A turn ends after so much, so that other work of the queue gets its turn.
struct peer_connection::turn_budget {
    unsigned frames = 256;
    unsigned reads = 4;
    std::int64_t first_look = 0;  // ns; 0: none yet

    void spend_frame() noexcept {
        if (--frames % kFramesPerLook != 0)
            return;
        const std::int64_t now = dispatch::time::now().nanoseconds();
        first_look = first_look == 0 ? now : first_look;
        if (now - first_look > kLongestTurn)
            frames = 0;
    }
};

void peer_connection::handle_events() {
    queue_role_.entered();
    if (watch_over_) {
        unhold();
        return;
    }
    const std::uint32_t events = watch_.take_events();
    if ((events & (EPOLLIN | EPOLLRDHUP | EPOLLHUP | EPOLLERR)) != 0)
        readable_ = true;
    if ((events & (EPOLLRDHUP | EPOLLHUP | EPOLLERR)) != 0)
        hung_up_ = true;
    if ((events & (EPOLLOUT | EPOLLHUP | EPOLLERR)) != 0)
        writable_ = true;
    turn();
}

void peer_connection::turn() {
    if (in_line_)
        return;
    if (turns_ && !turns_->may_go(*this))
        in_line_ = true;
    else
        take_turn();
}

void peer_connection::take_turn() {
    queue_role_.entered();
    in_line_ = false;
    if (is_ending())
        return;
    if (std::exchange(writable_, false)) {
        if (stage_ == stage::tap && tapped_.hub()) [[unlikely]]
            unblock_tap();
        else
            unblock();
    }
    if (may_deliver())
        read_turn();
}

// Hot path: bench/vox_cases.h.
void peer_connection::read_turn() {
    // Without users nobody is to hear anything; cancelling is under way.
    const borrowed_reference reference(this);
    if (!reference)
        return;
    send_turn sends(queue().get());
    const read_memory memory;
    turn_budget budget;
    while (deliver_frames(sends, budget) && budget.reads > 0 && receive(memory.bytes()))
        --budget.reads;
    if (stage_ == stage::messages)
        tapped_.opened();
    reader_.keep();
    undelivered_.store(reader_.in_frame(), std::memory_order_relaxed);
    if (!count_partial() || !may_deliver())
        return;
    if (budget.frames == 0 || budget.reads == 0)
        schedule();
    else
        limit_incomplete_frame();
}

// Returns true when all complete frames were delivered and more bytes are wanted.
bool peer_connection::deliver_frames(send_turn& sends, turn_budget& budget) {
    while (may_deliver()) {
        if (budget.frames == 0)
            return false;
        frame arrived;
        switch (reader_.next(arrived)) {
            case frame_reader::outcome::more:
                return true;
            case frame_reader::outcome::error:
                violation(reader_.error());
                return false;
            case frame_reader::outcome::frame:
                break;
        }
        budget.spend_frame();
        incomplete_since_ = 0;
        sends.set_more(reader_.has_next());
        handle(arrived);
        sends.flush_if_due();
    }
    return false;
}

// Reads once. Returns false when there is nothing more to read now.
bool peer_connection::receive(std::span<std::uint8_t> memory) {
    const int fd = fd_.load(std::memory_order_relaxed);
    if (fd < 0)
        return false;
    const bool broken = broken_.load(std::memory_order_acquire);
    if ((!readable_ && !broken) || !count_partial())
        return false;
    const std::span<std::uint8_t> space = reader_.space(memory);
    received got;
    receive_once(fd, space, got);
    if (got.error != 0) {
        readable_ = false;
        if (got.error != EAGAIN || (broken && !awaits_replies()))
            read_failed(got.error);
        return false;
    }
    if (got.lost_descriptors) {
        got.close_descriptors();
        limit_exceeded(
            "descriptors were lost: no more can be open in this process, or too many came");
        return false;
    }
    if (got.descriptor_count > 0 && !hold_descriptors(got.descriptor_count)) {
        got.close_descriptors();
        return false;
    }
    if (got.bytes == 0) {
        if (!is_own_end())
            read_failed(ECONNRESET);
        return false;
    }
    // The kernel ends a read behind bytes that came with descriptors, so only
    // one without says that nothing is left.
    if (got.bytes < space.size() && got.descriptor_count == 0 && !hung_up_)
        readable_ = false;
    reader_.arrived(got.bytes, got.taken());
    return true;
}

// EAGAIN: writing failed before, and now everything is read that is of use.
void peer_connection::read_failed(int error) {
    if (error == EAGAIN || error == ECONNRESET)
        fail(VOX_ERROR_CONNECTION_INTERRUPTED,
             reader_.in_frame() ? "the peer closed the connection in the middle of a frame"
                                : "the peer closed the connection");
    else
        fail(VOX_ERROR_CONNECTION_INVALID, std::string("cannot read: ") + ::strerrordesc_np(error));
}

void peer_connection::violation(std::string reason) {
    fail(VOX_ERROR_CONNECTION_INVALID, std::move(reason), blame::protocol);
}

void peer_connection::handle(const frame& arrived) {
    const bool message = carries_message(arrived.header.type);
    if (message && stage_ == stage::messages) [[likely]]
        return handle_message(arrived);
    if (arrived.header.type == frame_type::hello)
        return handle_hello(arrived);
    if (stage_ == stage::hello) {
        let_go(arrived.descriptors);
        return violation("the first frame is not a hello");
    }
    if (message)
        return handle_stray(arrived);
    handle_control(arrived);
}

void peer_connection::handle_hello(const frame& arrived) {
    if (stage_ != stage::hello)
        return violation("second hello");
    vox_wire::codec_limits accepted;
    std::string why;
    if (!read_hello(arrived.body, accepted, why))
        return violation(std::move(why));
    stage_ = origin_.tap ? stage::tap : stage::messages;
    if (incomplete_timer_)
        incomplete_timer_.cancel();
    incomplete_timer_ = {};
    incomplete_armed_ = false;
    greet(accepted);
}

void peer_connection::handle_message(const frame& arrived) {
    if (arrived.header.type == frame_type::request && !enter_request(arrived))
        return;
    vox_dictionary_object* message = decode(arrived);
    if (!message)
        return;
    message->remote = vox_retain(this);
    messages_received_.store(messages_received_.load(std::memory_order_relaxed) + 1,
                             std::memory_order_relaxed);
    heard_.store(true, std::memory_order_relaxed);
    if (tapped_.is_watched()) [[unlikely]]
        tapped_.show(tap_way::in, arrived.header, arrived.body);
    if (arrived.header.type == frame_type::reply) {
        waiting_reply reply;
        {
            const lock_guard guard(lock_);
            reply = take_waiting(arrived.header.id);
        }
        // One that nobody waits for is ignored.
        if (reply.id != 0)
            run_reply(reply, message);
    } else {
        if (arrived.header.type == frame_type::request) {
            message->reply_id = arrived.header.id;
            message->flags.store(kOpenRequest, std::memory_order_relaxed);
        }
        deliver(message);
    }
    vox_release(message);
}

// The message in `arrived`; null when it is none, and the connection fails.
vox_dictionary_object* peer_connection::decode(const frame& arrived) {
    const char* why = nullptr;
    const vox_object_t value =
        vox_wire::decode(arrived.body, arrived.descriptors, accepts_, why, this);
    vox_dictionary_object* message = vox_values::as_dictionary(value);
    if (message) [[likely]]
        return message;
    violation(value ? "message is no dictionary" : why);
    vox_release(value);
    return nullptr;
}

void peer_connection::handle_control(const frame& arrived) {
    switch (arrived.header.type) {
        case frame_type::ping:
        case frame_type::cancel:
            if (!is_null_body(arrived.body))
                return violation("ping or cancel with a body that is not null");
            if (arrived.header.type == frame_type::cancel) {
                if (tapped_.is_watched())
                    tapped_.show(tap_way::in, arrived.header, arrived.body);
                handle_cancel(arrived.header.id);
            } else if ((arrived.header.flags & kPingWantsAnswer) != 0) {
                send_control(frame_type::ping, 0, arrived.header.id, vox_null_create());
            }
            return;
        case frame_type::refused:
            return handle_refused(arrived);
        case frame_type::tap:
            return handle_tap(arrived);
        default: {
            const std::int64_t count = read_dropped(arrived.body);
            if (count < 0)
                return violation("count of dropped messages is no number");
            peer_dropped_.fetch_add(static_cast<std::uint64_t>(count), std::memory_order_relaxed);
            if (origin_.tap)
                deliver_missed(static_cast<std::uint64_t>(count));
            else if (tapped_.is_watched())
                tapped_.show(tap_way::in, arrived.header, arrived.body);
        }
    }
}

}  // namespace vox_link
