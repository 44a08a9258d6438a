#include "plr/rest/resource_connection.h"

#include <utility>

#include "plr/ipc/values.h"

namespace plr::rest {

RestResourceConnection::RestResourceConnection(std::string name)
    : name_(std::move(name)), nameValue_(vox::string(std::string_view(name_))) {}

RestResourceConnection::~RestResourceConnection() = default;

VoxRestResourceConnection::VoxRestResourceConnection(vox::connection connection, std::string&& name)
    : RestResourceConnection(std::move(name)), connection_(std::move(connection)) {}

VoxRestResourceConnection::~VoxRestResourceConnection() = default;

void VoxRestResourceConnection::send(vox::dict message) const {
    connection_.send_message(message);
}

void VoxRestResourceConnection::sendWithReply(vox::dict message, dispatch::queue queue,
                                              ReplyHandler handler) const {
    connection_.send_message_with_reply(message, queue, std::move(handler));
}

}  // namespace plr::rest
