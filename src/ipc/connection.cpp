#include "plr/ipc/connection.h"

#include <cerrno>

#include "plr/ipc/values.h"

namespace vox {

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
    if (!*this) {
        queue.async([handler = std::move(handler)] {
            handler(error(VOX_ERROR_CONNECTION_INVALID, "there is no connection"));
        });
        return;
    }
    const dispatch::block<void(vox_object_t)> adapted(
        [handler = std::move(handler)](vox_object_t reply) { handler(object::retain(reply)); });
    vox_connection_send_message_with_reply(get(), message.get(), &queue, &adapted);
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

endpoint endpoint::create(const connection& listener) {
    return listener ? object::adopt(vox_endpoint_create(listener.get())) : object();
}

connection endpoint::connect() const {
    return *this ? object::adopt(vox_connection_create_from_endpoint(get())) : object();
}

}  // namespace vox
