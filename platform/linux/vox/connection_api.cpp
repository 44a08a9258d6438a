// The functions of vox/connection.h.
#include "vox/connection.h"

#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <utility>
#include <vector>

#include "platform/linux/vox/limits.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/request.h"
#include "plr/base/assert.h"
#include "vox/tap.h"

using vox_link::connection;
using vox_link::peer_connection;
using vox_link::peer_origin;

namespace {

// The connection that a caller must have given.
connection& required(vox_connection_t object) {
    connection* found = connection::from(object);
    PLR_ASSERT(found, "a Vox value that is no connection was used as one");
    return *found;
}

// The same; null for listeners, which send nothing.
peer_connection* peer(vox_connection_t object) {
    connection& found = required(object);
    return found.is_listener() ? nullptr : static_cast<peer_connection*>(&found);
}

// The same; null for taps too.
peer_connection* sender(vox_connection_t object) {
    peer_connection* found = peer(object);
    return found && !found->is_tap() ? found : nullptr;
}

// Of a request or the reply made for it; null for others.
peer_connection* asker_of(const vox_dictionary_object& message) {
    return message.reply_id != 0 ? static_cast<peer_connection*>(connection::from(message.remote))
                                 : nullptr;
}

vox_connection_t make_peer(const char* name, const vox_limits_t* limits, peer_origin origin) {
    return new peer_connection(name, vox_link::usable_limits(limits), std::move(origin));
}

vox_connection_t make_from_socket(int descriptor, const vox_limits_t* limits) {
    peer_origin origin;
    origin.fd = descriptor;
    return make_peer("", limits, std::move(origin));
}

}  // namespace

// ---- Making connections --------------------------------------------------------------

vox_connection_t vox_connection_create(const char* name) {
    peer_origin origin;
    origin.from = peer_origin::kind::service;
    return make_peer(name ? name : "", nullptr, std::move(origin));
}

vox_connection_t vox_connection_create_from_endpoint(vox_endpoint_t endpoint) {
    peer_origin origin;
    origin.from = peer_origin::kind::endpoint;
    origin.endpoint = vox_retain(endpoint);
    return make_peer("", nullptr, std::move(origin));
}

vox_connection_t vox_connection_create_tap(const char* name) {
    peer_origin origin;
    origin.from = peer_origin::kind::service;
    origin.tap = true;
    return make_peer(name ? name : "", nullptr, std::move(origin));
}

void vox_connection_create_pair(vox_connection_t* left, vox_connection_t* right,
                                const vox_limits_t* limits) {
    // Without descriptors both ends fail when they are resumed.
    std::array<int, 2> ends = {-1, -1};
    static_cast<void>(
        !::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends.data()));
    *left = make_from_socket(ends[0], limits);
    *right = make_from_socket(ends[1], limits);
}

vox_connection_t vox_connection_create_from_socket(int descriptor, const vox_limits_t* limits) {
    return make_from_socket(descriptor, limits);
}

// ---- Setting up ----------------------------------------------------------------------

void vox_connection_set_event_handler(vox_connection_t object,
                                      const dispatch::block<void(vox_object_t)>* handler) {
    required(object).set_event_handler(handler ? *handler : nullptr);
}

void vox_connection_set_target_queue(vox_connection_t object, const dispatch::queue* queue) {
    required(object).set_target_queue(queue ? *queue : dispatch::queue());
}

void vox_connection_resume(vox_connection_t object) {
    required(object).resume();
}

void vox_connection_suspend(vox_connection_t object) {
    required(object).suspend();
}

void vox_connection_cancel(vox_connection_t object) {
    required(object).cancel();
}

// ---- Sending -------------------------------------------------------------------------

int vox_connection_send_message(vox_connection_t object, vox_object_t message) {
    peer_connection* to = sender(object);
    return to ? to->send_message(message) : EINVAL;
}

void vox_connection_send_message_with_reply(vox_connection_t object, vox_object_t message,
                                            const dispatch::queue* queue,
                                            const dispatch::block<void(vox_object_t)>* handler) {
    vox_connection_send_request(object, message, 0, queue, handler);
}

uint64_t vox_connection_send_request(vox_connection_t object, vox_object_t message,
                                     uint32_t timeout_ms, const dispatch::queue* queue,
                                     const dispatch::block<void(vox_object_t)>* handler) {
    PLR_ASSERT(queue && *queue && handler && *handler, "a Vox reply needs a queue and a handler");
    if (peer_connection* to = sender(object))
        return to->send_request(message, timeout_ms, *queue, *handler);
    peer_connection::fail_request({.queue = *queue, .handler = *handler}, EINVAL);
    return 0;
}

int vox_connection_cancel_request(vox_connection_t object, uint64_t number) {
    peer_connection* of = peer(object);
    return of ? of->cancel_request(number) : ESRCH;
}

void vox_connection_send_barrier(vox_connection_t object, const dispatch::block<void()>* barrier) {
    peer_connection* to = peer(object);
    PLR_ASSERT(to && barrier && *barrier, "a Vox barrier needs a connection and a block");
    to->send_barrier(*barrier);
}

// ---- Requests and replies ------------------------------------------------------------

vox_object_t vox_dictionary_create_reply(vox_object_t request) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(request);
    return dictionary ? vox_link::make_reply(*dictionary) : nullptr;
}

int vox_dictionary_is_cancelled(vox_object_t message) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    peer_connection* asker = dictionary ? asker_of(*dictionary) : nullptr;
    return asker && asker->is_cancelled(*dictionary) ? 1 : 0;
}

int vox_dictionary_set_cancel_handler(vox_object_t message,
                                      const dispatch::block<void()>* handler) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    peer_connection* asker = dictionary ? asker_of(*dictionary) : nullptr;
    return asker ? asker->set_cancel_handler(*dictionary, handler ? *handler : nullptr) : EINVAL;
}

vox_connection_t vox_dictionary_get_remote_connection(vox_object_t message) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    return dictionary ? dictionary->remote : nullptr;
}

// ---- Looking -------------------------------------------------------------------------

const char* vox_connection_get_name(vox_connection_t object) {
    return required(object).name().c_str();
}

pid_t vox_connection_get_pid(vox_connection_t object) {
    peer_connection* of = peer(object);
    return of ? of->credentials().pid : -1;
}

uid_t vox_connection_get_uid(vox_connection_t object) {
    peer_connection* of = peer(object);
    return of ? of->credentials().uid : static_cast<uid_t>(-1);
}

gid_t vox_connection_get_gid(vox_connection_t object) {
    peer_connection* of = peer(object);
    return of ? of->credentials().gid : static_cast<gid_t>(-1);
}

size_t vox_connection_get_groups(vox_connection_t object, gid_t* groups, size_t most) {
    peer_connection* of = peer(object);
    const std::vector<gid_t> found = of ? of->groups() : std::vector<gid_t>();
    std::copy_n(found.begin(), std::min(most, found.size()), groups);
    return found.size();
}

void vox_connection_get_statistics(vox_connection_t object, vox_statistics_t* statistics) {
    peer_connection* of = peer(object);
    *statistics = of ? of->statistics() : vox_statistics_t{};
}
