// Requests that are outstanding: those of this side wait for the peer, those of the
// peer are open here.
#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>

#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/now.h"
#include "platform/linux/vox/peer_connection.h"

namespace vox_link {
// ---- Of this side --------------------------------------------------------------------

std::uint64_t peer_connection::send_request(vox_object_t message, std::uint32_t timeout_ms,
                                            dispatch::queue queue, reply_block handler) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    outgoing what{.kind = frame_type::request};
    what.request.queue = std::move(queue);
    what.request.handler = std::move(handler);
    if (timeout_ms != 0)
        what.request.deadline = now() + std::int64_t{timeout_ms} * 1'000'000;
    const int error = !dictionary || is_reply(*dictionary) ? EINVAL : send(message, what);
    if (error == 0)
        return what.request.id;
    if (what.request.handler)
        fail_request(std::move(what.request), error);
    return 0;
}

int peer_connection::cancel_request(std::uint64_t number) {
    waiting_reply reply;
    {
        const lock_guard guard(lock_);
        reply = take_waiting(number);
        if (reply.id == 0)
            return ESRCH;
        tell_given_up({&reply, 1});
    }
    fail_request(std::move(reply), VOX_ERROR_REQUEST_CANCELLED, "the request was cancelled");
    return 0;
}

// Gives a request that was admitted its id and enters it. Unless too many wait:
// then its handler hears of that.
bool peer_connection::expect_reply(waiting_reply& request) {
    limit_hit hit;
    if (replies_.size() >= limits_.max_pending_replies)
        hit = {"max_pending_replies", limits_.max_pending_replies};
    else if (user_ && !user_->take(cost::pending_replies, 1))
        hit = user_->limit(cost::pending_replies);
    if (hit) {
        ++replies_refused_;
        fail_request(std::move(request), VOX_ERROR_MESSAGE_REFUSED,
                     "too many requests wait for their replies: " + hit.text());
        return false;
    }
    request.id = ++last_id_;
    if (request.deadline != 0) {
        deadlines_.emplace_hint(deadlines_.end(), request.deadline, request.id);
        arm_deadline();
    }
    replies_.insert({.id = request.id,
                     .queue = std::move(request.queue),
                     .handler = std::move(request.handler),
                     .deadline = request.deadline});
    return true;
}

// Whoever has taken it is the one that calls its handler.
waiting_reply peer_connection::take_waiting(std::uint64_t id) {
    waiting_reply taken = replies_.take(id);
    if (taken.id == 0)
        return taken;
    if (user_)
        user_->give_back(cost::pending_replies, 1);
    if (taken.deadline != 0)
        deadlines_.erase({taken.deadline, taken.id});
    return taken;
}

std::vector<waiting_reply> peer_connection::take_all_waiting() {
    if (user_)
        user_->give_back(cost::pending_replies, replies_.size());
    deadlines_.clear();
    if (deadline_timer_)
        deadline_timer_.cancel();
    deadline_timer_ = {};
    return replies_.take_all();
}

// Of a frame that waited for the peer's hello.
bool peer_connection::nobody_waits_for(const vox_wire::encoded& made) {
    const frame_header header = read_own_header(made.bytes.data());
    return header.type == frame_type::request && !replies_.find(header.id);
}

// Tells the peer that nobody waits for these any more. A request that still waits
// for the peer's hello is left out when that comes.
void peer_connection::tell_given_up(std::span<const waiting_reply> given_up) {
    if (!greeted_.load(std::memory_order_relaxed))
        return;
    for (const waiting_reply& each : given_up) {
        vox_wire::encoded made;
        build_control(frame_type::cancel, 0, each.id, vox_null_create(), made);
        if (admit(frame_type::cancel, made) != 0)
            return schedule();  // nothing may be left to read for
        show(made);
        out_.append(made);
    }
    if (can_write())
        write_waiting();
    else
        settle();
}

// Those that the peer will never read.
void peer_connection::fail_unsent_requests() {
    for (const std::uint64_t id : out_.waiting_requests()) {
        if (waiting_reply reply = take_waiting(id); reply.id != 0)
            fail_request(std::move(reply), VOX_ERROR_CONNECTION_INTERRUPTED,
                         "the peer reads no more");
    }
}

bool peer_connection::awaits_replies() {
    const lock_guard guard(lock_);
    return greeted_.load(std::memory_order_relaxed) && replies_.size() > 0;
}

// ---- Their time limits ---------------------------------------------------------------

// One timer for all, set to a time that is not after the earliest deadline. It is
// left running when that reply comes in time, and then looks for the next one.
void peer_connection::arm_deadline() {
    const std::int64_t earliest = deadlines_.begin()->first;
    if (armed_for_ != 0 && armed_for_ <= earliest)
        return;
    if (!deadline_timer_) {
        // On a queue that nobody blocks; it holds the connection until it is cancelled.
        deadline_timer_ = dispatch::source::timer(dispatch::queue::global());
        deadline_timer_.set_event_handler(dispatch::block<void()>([this] { deadline_due(); }));
        deadline_timer_.set_cancel_handler(dispatch::block<void()>([this] { unhold(); }));
        hold();
        deadline_timer_.resume();
    }
    armed_for_ = earliest;
    deadline_timer_.set_timer(dispatch::time::at(dispatch::clock::monotonic, earliest),
                              dispatch::kOnce);
}

void peer_connection::deadline_due() {
    std::vector<waiting_reply> late;
    {
        const lock_guard guard(lock_);
        armed_for_ = 0;
        const std::int64_t time = now();
        while (!deadlines_.empty() && deadlines_.begin()->first <= time)
            late.push_back(take_waiting(deadlines_.begin()->second));
        if (!deadlines_.empty())
            arm_deadline();
        tell_given_up(late);
    }
    for (waiting_reply& each : late)
        fail_request(std::move(each), VOX_ERROR_REQUEST_TIMED_OUT, "no reply came in time");
}

// ---- How they end without a reply ----------------------------------------------------

void peer_connection::fail_request(waiting_reply reply, int error) {
    if (error == EPIPE)
        fail_request(std::move(reply), VOX_ERROR_CONNECTION_INVALID, "the connection has ended");
    else
        fail_request(std::move(reply), VOX_ERROR_MESSAGE_REFUSED,
                     std::string("cannot send: ") + ::strerrordesc_np(error));
}

void peer_connection::fail_request(waiting_reply reply, std::int64_t code, const std::string& why) {
    reply.queue.async([handler = std::move(reply.handler),
                       result = vox_error_create(code, why.c_str()), stay = queued_call()] {
        handler(result);
        vox_release(result);
    });
}

// `result` is lent.
void peer_connection::run_reply(waiting_reply& reply, vox_object_t result) {
    if (reply.queue == queue()) {
        reply.handler(result);
        return;
    }
    vox_retain(result);
    reply.queue.async([handler = std::move(reply.handler), result, stay = queued_call()] {
        handler(result);
        vox_release(result);
    });
}

void peer_connection::handle_refused(const frame& arrived) {
    const vox_object_t error = read_refused(arrived.body);
    if (!error)
        return violation("refused without an error");
    if (tapped_.is_watched())
        tapped_.show(tap_way::in, arrived.header, arrived.body);
    waiting_reply reply;
    {
        const lock_guard guard(lock_);
        ++peer_refused_;
        reply = take_waiting(arrived.header.id);
    }
    if (reply.id != 0)
        run_reply(reply, error);
    vox_release(error);
}

// ---- Of the peer ---------------------------------------------------------------------

// Whether the request that arrived is to be delivered.
bool peer_connection::enter_request(const frame& arrived) {
    const std::uint64_t id = arrived.header.id;
    limit_hit hit;
    {
        const lock_guard guard(lock_);
        if (open_.find(id)) {
            fail_locked(VOX_ERROR_CONNECTION_INVALID,
                        "request " + std::to_string(id) + " is open already", blame::protocol);
            let_go(arrived.descriptors);
            return false;
        }
        if (open_.size() >= limits_.max_open_requests)
            hit = {"max_open_requests", limits_.max_open_requests};
        else if (user_ && !user_->take(cost::open_requests, 1))
            hit = user_->limit(cost::open_requests);
        if (!hit) [[likely]] {
            open_.insert({.id = id});
            return true;
        }
        ++requests_refused_;
    }
    if (tapped_.is_watched())
        tapped_.show(tap_way::in, arrived.header, arrived.body);
    let_go(arrived.descriptors);
    const std::string why = "too many requests are open: " + hit.text();
    send_control(frame_type::refused, 0, id,
                 vox_error_create(VOX_ERROR_MESSAGE_REFUSED, why.c_str()));
    return false;
}

open_request peer_connection::take_open(std::uint64_t id) {
    open_request taken = open_.take(id);
    if (taken.id != 0 && user_ && !wound_up_)
        user_->give_back(cost::open_requests, 1);
    return taken;
}

bool peer_connection::is_given_up(std::uint64_t id) {
    const open_request* request = open_.find(id);
    return request && request->cancelled && !abandoned_;
}

void peer_connection::handle_cancel(std::uint64_t id) {
    dispatch::block<void()> handler;
    {
        const lock_guard guard(lock_);
        open_request* request = open_.find(id);
        if (!request)
            return;
        request->cancelled = true;
        handler = std::move(request->cancel_handler);
    }
    if (handler)
        handler();
}

// Those that are open when the connection ends stay known, as cancelled, until
// the service lets go of them. Returns what is to be run.
std::vector<dispatch::block<void()>> peer_connection::cancel_all_open() {
    std::vector<dispatch::block<void()>> handlers;
    if (user_)
        user_->give_back(cost::open_requests, open_.size());
    open_.for_each([&handlers](open_request& request) {
        request.cancelled = true;
        if (request.cancel_handler)
            handlers.push_back(std::move(request.cancel_handler));
    });
    return handlers;
}

void peer_connection::message_gone(vox_dictionary_object& message) noexcept {
    if (!keeps_request_open(message))
        return;
    open_request gone;  // its handler is not released under the lock
    const lock_guard guard(lock_);
    gone = take_open(message.reply_id);
}

bool peer_connection::is_cancelled(const vox_dictionary_object& message) {
    if (is_reply(message) && !keeps_request_open(message))
        return false;
    const lock_guard guard(lock_);
    const open_request* request = open_.find(message.reply_id);
    return request && (request->cancelled || abandoned_);
}

int peer_connection::set_cancel_handler(const vox_dictionary_object& message,
                                        dispatch::block<void()> handler) {
    if (is_reply(message) && !keeps_request_open(message))
        return EINVAL;
    const lock_guard guard(lock_);
    open_request* request = open_.find(message.reply_id);
    if (!request)
        return EINVAL;
    if (!request->cancelled)
        std::swap(request->cancel_handler, handler);  // the old one goes after the guard
    else if (handler)
        queue().async(std::move(handler));
    return 0;
}

}  // namespace vox_link
