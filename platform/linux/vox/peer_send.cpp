// Sending: what callers ask for, until it is accepted.
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "platform/linux/vox/complaint.h"
#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/request.h"

namespace vox_link {
namespace {

// Buffers that grew beyond this are not kept by their thread.
constexpr std::size_t kScratchToKeep = 256u << 10;

// Memory that one thread encodes into.
vox_wire::encoded& scratch() {
    thread_local vox_wire::encoded memory;
    if (memory.bytes.capacity() > kScratchToKeep)
        memory.bytes = {};
    memory.bytes.clear();
    return memory;
}

}  // namespace

int peer_connection::send_message(vox_object_t message) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    if (!dictionary)
        return EINVAL;
    outgoing what{.kind = frame_type::message};
    if (!is_reply(*dictionary))
        return send(message, what);
    if (dictionary->remote != this)
        return EINVAL;
    if (!claim_reply(*dictionary))
        return EALREADY;
    what = {.kind = frame_type::reply, .id = dictionary->reply_id};
    const int error = send(message, what);
    if (error != 0)
        unclaim_reply(*dictionary);
    return error;
}

void peer_connection::send_barrier(dispatch::block<void()> barrier) {
    const lock_guard guard(lock_);
    const bool greeted = greeted_.load(std::memory_order_relaxed);
    barriers_.push_back({greeted ? out_.accepted() : early_.size(), std::move(barrier)});
    if (wound_up_ || fd_.load(std::memory_order_relaxed) >= 0)
        run_finished_barriers();
}

// Before the hello nothing but our own hello leaves.
bool peer_connection::is_finished(const waiting_barrier& barrier) const {
    if (wound_up_)
        return true;
    return greeted_.load(std::memory_order_relaxed)
               ? barrier.behind <= out_.finished()
               : barrier.behind == 0 && out_.finished() == out_.accepted();
}

void peer_connection::run_finished_barriers() {
    while (!barriers_.empty() && is_finished(barriers_.front())) {
        queue().async([work = std::move(barriers_.front().work)] { work(); });
        barriers_.pop_front();
    }
}

// Hot path: bench/vox_cases.h.
int peer_connection::send(vox_object_t message, outgoing& what) {
    for (;;) {
        const bool greeted = greeted_.load(std::memory_order_acquire);
        vox_wire::encoded& made = scratch();
        if (const int error =
                build_frame(what.kind, what.id, message, greeted ? peer_accepts_ : accepts_, made);
            error != 0)
            return error;
        const lock_guard guard(lock_);
        if (greeted != greeted_.load(std::memory_order_relaxed)) {
            discard(made);
            continue;
        }
        const int error = accept(made, what);
        if (error != 0)
            discard(made);
        return error;
    }
}

int peer_connection::accept(vox_wire::encoded& made, outgoing& what) {
    if (what.kind == frame_type::reply && is_given_up(what.id))
        return ECANCELED;
    if (const int error = admit(what.kind, made); error != 0) {
        if (error == ENOBUFS)
            show(made, true);
        return error;
    }
    if (what.kind == frame_type::request) {
        if (!expect_reply(what.request)) {
            settle();
            return EDQUOT;
        }
        write_header_id(what.request.id, made.bytes.data());
    } else if (what.kind == frame_type::reply) {
        what.answered = take_open(what.id);
    }
    show(made);
    if (greeted_.load(std::memory_order_relaxed)) {
        put(made, what.kind);
    } else {
        early_bytes_ += made.bytes.size();
        early_descriptors_ += made.descriptors.size();
        early_.push_back(std::exchange(made, {}));
    }
    return 0;
}

int peer_connection::admit(frame_type kind, const vox_wire::encoded& made) {
    if (abandoned_ || broken_)
        return EPIPE;
    if (is_tap_ && carries_message(kind)) [[unlikely]] {
        ++dropped_;
        return ENOBUFS;
    }
    limit_hit hit = over(made, 1);
    if (!hit) [[likely]]
        return 0;
    if (can_write()) {
        write_waiting();  // it was only put together
        if (abandoned_ || broken_)
            return EPIPE;
        hit = over(made, 1);
        if (!hit)
            return 0;
    }
    if (limits_.overflow == VOX_OVERFLOW_DROP) {
        if (kind == frame_type::message || kind == frame_type::request) {
            ++dropped_;
            ++dropped_untold_;
            settle();
            return ENOBUFS;
        }
        hit = over(made, 2);
        if (!hit)
            return 0;
    }
    overflow(hit);
    return EPIPE;
}

void peer_connection::send_control(frame_type kind, std::uint8_t marks, std::uint64_t id,
                                   vox_object_t value) {
    vox_wire::encoded made;
    build_control(kind, marks, id, value, made);
    const lock_guard guard(lock_);
    if (admit(kind, made) != 0)
        return;
    if (kind == frame_type::refused)
        show(made);
    put(made, kind);
}

// ---- The peer's hello ---------------------------------------------------------------

void peer_connection::greet(const vox_wire::codec_limits& peer) {
    std::vector<std::size_t> given_up;
    {
        const lock_guard guard(lock_);
        peer_accepts_ = peer;
        std::uint64_t moved = 0;
        auto barrier = barriers_.begin();
        const auto place_barriers = [&]() PLR_REQUIRES(lock_) {
            for (; barrier != barriers_.end() && barrier->behind <= moved; ++barrier)
                barrier->behind = out_.accepted();
        };
        place_barriers();
        for (vox_wire::encoded& waiting : early_) {
            if (nobody_waits_for(waiting))
                discard(waiting);
            else if (fit_to_peer(waiting))
                out_.append(waiting);
            else
                given_up.push_back(give_up(waiting));
            ++moved;
            place_barriers();
        }
        early_.clear();
        early_bytes_ = 0;
        early_descriptors_ = 0;
        greeted_.store(true, std::memory_order_release);
        if (can_write())
            write_waiting();
        else
            settle();
    }
    for (const std::size_t bytes : given_up)
        complain("a message of " + std::to_string(bytes) + " bytes to '" + name() +
                 "' is over its limits and was not sent");
}

// Whether the peer accepts what was encoded before its limits were known.
bool peer_connection::fit_to_peer(vox_wire::encoded& made) {
    const std::size_t body = made.bytes.size() - kHeaderBytes;
    if (body > peer_accepts_.bytes || made.descriptors.size() > peer_accepts_.descriptors)
        return false;
    if (accepts_.depth <= peer_accepts_.depth && accepts_.bytes <= peer_accepts_.bytes)
        return true;
    // Only encoding tells the depth and the number of elements.
    const char* why = nullptr;
    const frame_header header = read_own_header(made.bytes.data());
    const vox_object_t message =
        vox_wire::decode(made.bytes.view().subspan(kHeaderBytes), made.descriptors, accepts_, why);
    made.descriptors.clear();
    vox_wire::encoded again;
    const int error =
        message ? build_frame(header.type, header.id, message, peer_accepts_, again) : EINVAL;
    vox_release(message);
    if (error == 0)
        std::swap(made, again);
    return error == 0;
}

// Returns the size of its body.
std::size_t peer_connection::give_up(vox_wire::encoded& made) {
    const frame_header header = read_own_header(made.bytes.data());
    if (header.type == frame_type::request) {
        if (waiting_reply reply = take_waiting(header.id); reply.id != 0)
            fail_request(std::move(reply), EMSGSIZE);
    }
    ++dropped_;
    show(made, true);
    discard(made);
    return header.length;
}

}  // namespace vox_link
