#pragma once

#include <cstdint>

#include "dispatch/queue.h"
#include "platform/linux/vox/value_layout.h"

// Requests on both ends: what their connections keep of them, and the marks of the
// dictionaries that are requests or replies.
//
// A received request may get one reply dictionary. A reply dictionary knows its
// connection and the request's id, and is sent once.
namespace vox_link {

using reply_block = dispatch::block<void(vox_object_t)>;

// A request of this side.
struct waiting_reply {
    std::uint64_t id = 0;
    dispatch::queue queue;
    reply_block handler;
    std::int64_t deadline = 0;  // ns, monotonic; 0 for none
};

// A request of the peer that has got no reply. Stays when it is cancelled, until the
// service lets go of it: what it holds is not less for that.
struct open_request {
    std::uint64_t id = 0;
    bool cancelled = false;
    dispatch::block<void()> cancel_handler = {};
};

inline constexpr std::uint8_t kOpenRequest = 1;  // received, no reply made yet
inline constexpr std::uint8_t kReply = 2;
inline constexpr std::uint8_t kReplySent = 4;

[[nodiscard]] inline bool is_reply(const vox_dictionary_object& dictionary) noexcept {
    return (dictionary.flags.load(std::memory_order_relaxed) & kReply) != 0;
}
// Whether it is the one that keeps its request open: the request while it has no
// reply, then the reply until it is sent.
[[nodiscard]] inline bool keeps_request_open(const vox_dictionary_object& dictionary) noexcept {
    const std::uint8_t marks = dictionary.flags.load(std::memory_order_acquire);
    return (marks & kOpenRequest) != 0 || (marks & (kReply | kReplySent)) == kReply;
}
// Whether the caller is the one that may send this reply now.
[[nodiscard]] inline bool claim_reply(vox_dictionary_object& reply) noexcept {
    return (reply.flags.fetch_or(kReplySent, std::memory_order_acq_rel) & kReplySent) == 0;
}
inline void unclaim_reply(vox_dictionary_object& reply) noexcept {
    reply.flags.fetch_and(static_cast<std::uint8_t>(~kReplySent), std::memory_order_acq_rel);
}
// A reply for `request`, or null when it is none or has got one.
[[nodiscard]] inline vox_dictionary_object* make_reply(vox_dictionary_object& request) noexcept {
    const auto closed = static_cast<std::uint8_t>(~kOpenRequest);
    if ((request.flags.fetch_and(closed, std::memory_order_acq_rel) & kOpenRequest) == 0)
        return nullptr;
    vox_dictionary_object* reply = vox_values::make_dictionary(4);
    reply->remote = vox_retain(request.remote);
    reply->reply_id = request.reply_id;
    reply->flags.store(kReply, std::memory_order_relaxed);
    return reply;
}

}  // namespace vox_link
