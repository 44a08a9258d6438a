#include "plr/ipc/connection.h"

#include <algorithm>
#include <cerrno>
#include <limits>

#include "plr/ipc/values.h"
#include "vox/listener.h"
#include "vox/tap.h"

namespace vox {
namespace {

dispatch::block<void(vox_object_t)> adapted(dispatch::block<void(object)> handler) {
    return dispatch::block<void(vox_object_t)>(
        [handler = std::move(handler)](vox_object_t reply) { handler(object::retain(reply)); });
}

void fail(const dispatch::queue& queue, dispatch::block<void(object)> handler) {
    queue.async([handler = std::move(handler)] {
        handler(error(VOX_ERROR_CONNECTION_INVALID, "there is no connection"));
    });
}

std::uint32_t limited(std::chrono::milliseconds timeout) noexcept {
    constexpr std::chrono::milliseconds::rep kMost = std::numeric_limits<std::uint32_t>::max();
    return static_cast<std::uint32_t>(
        std::clamp(timeout.count(), std::chrono::milliseconds::rep{1}, kMost));
}

}  // namespace

connection connection::create_tap(const char* name) {
    return object::adopt(vox_connection_create_tap(name));
}

std::pair<connection, connection> connection::create_pair(const vox_limits_t* limits) {
    vox_connection_t left = nullptr;
    vox_connection_t right = nullptr;
    vox_connection_create_pair(&left, &right, limits);
    return {connection(object::adopt(left)), connection(object::adopt(right))};
}

void connection::set_raw_event_handler(const dispatch::block<void(vox_object_t)>& handler) const {
    if (*this)
        vox_connection_set_event_handler(get(), &handler);
}

void connection::set_target_queue(const dispatch::queue& queue) const {
    if (*this)
        vox_connection_set_target_queue(get(), &queue);
}

void connection::resume() const {
    if (*this)
        vox_connection_resume(get());
}

void connection::suspend() const {
    if (*this)
        vox_connection_suspend(get());
}

void connection::cancel() const {
    if (*this)
        vox_connection_cancel(get());
}

int connection::send_message(const dict& message) const {
    return *this ? vox_connection_send_message(get(), message.get()) : ENOTCONN;
}

void connection::send_message_with_reply(const dict& message, const dispatch::queue& queue,
                                         dispatch::block<void(object)> handler) const {
    if (!*this)
        return fail(queue, std::move(handler));
    const auto on_reply = adapted(std::move(handler));
    vox_connection_send_message_with_reply(get(), message.get(), &queue, &on_reply);
}

request connection::send_request(const dict& message, std::chrono::milliseconds timeout,
                                 const dispatch::queue& queue,
                                 dispatch::block<void(object)> handler) const {
    if (!*this) {
        fail(queue, std::move(handler));
        return {};
    }
    const auto on_reply = adapted(std::move(handler));
    return {*this,
            vox_connection_send_request(get(), message.get(), limited(timeout), &queue, &on_reply)};
}

void connection::send_barrier(const dispatch::block<void()>& barrier) const {
    if (*this)
        vox_connection_send_barrier(get(), &barrier);
}

vox_statistics_t connection::statistics() const {
    vox_statistics_t result{};
    if (*this)
        vox_connection_get_statistics(get(), &result);
    return result;
}

credentials connection::peer() const {
    if (!*this)
        return {};
    return {.pid = vox_connection_get_pid(get()),
            .uid = vox_connection_get_uid(get()),
            .gid = vox_connection_get_gid(get())};
}

std::vector<gid_t> connection::peer_groups() const {
    if (!*this)
        return {};
    std::vector<gid_t> groups(vox_connection_get_groups(get(), nullptr, 0));
    groups.resize(
        std::min(groups.size(), vox_connection_get_groups(get(), groups.data(), groups.size())));
    return groups;
}

bool request::cancel() const {
    return number_ != 0 && vox_connection_cancel_request(connection_.get(), number_) == 0;
}

bool is_cancelled(const dict& message) {
    return vox_dictionary_is_cancelled(message.get()) != 0;
}

bool set_cancel_handler(const dict& message, const dispatch::block<void()>& handler) {
    return vox_dictionary_set_cancel_handler(message.get(), &handler) == 0;
}

endpoint endpoint::create(const connection& listener) {
    return listener ? object::adopt(vox_endpoint_create(listener.get())) : object();
}

connection endpoint::connect() const {
    return *this ? object::adopt(vox_connection_create_from_endpoint(get())) : object();
}

}  // namespace vox
