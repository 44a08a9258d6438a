#include "plr/ipc/auto_reply.h"

#include <utility>

namespace vox {

auto_reply::auto_reply(dict reply) : holder_(new dict(std::move(reply))) {}

auto_reply::auto_reply(dict reply, connection connection)
    : holder_(new dict(std::move(reply)), Deleter(std::move(connection))) {}

void auto_reply::connect(dict&& reply) {
    if (holder_)
        *holder_ = std::move(reply);
}

void auto_reply::deleter(dict* holder) {
    if (!holder)
        return;
    const connection remote(object::retain(vox_dictionary_get_remote_connection(holder->get())));
    deleter_with_conn(holder, remote);
}

void auto_reply::deleter_with_conn(dict* holder, const connection& connection) {
    const std::unique_ptr<dict> owned(holder);
    if (owned && *owned)
        connection.send_message(*owned);
}

void auto_reply::Deleter::operator()(dict* holder) const {
    hasConnection ? deleter_with_conn(holder, to) : deleter(holder);
}

}  // namespace vox
