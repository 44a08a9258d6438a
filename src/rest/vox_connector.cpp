#include "plr/rest/vox_connector.h"

#include "plr/ipc/values.h"
#include "plr/rest/message.h"

namespace plr::rest {

VoxConnector::VoxConnector(const std::string& name)
    : author_(vox::string(std::string_view(name))) {}

void VoxConnector::send(Operation operation, std::string_view path,
                        const vox::object& value) const {
    if (isConnected())
        helper_.getServer().send_message(messageOf(operation, path, value));
}

void VoxConnector::sendWithReply(Operation operation, std::string_view path,
                                 const vox::object& value, const dispatch::queue& queue,
                                 dispatch::block<void(vox::object)> handler) const {
    helper_.getServer().send_message_with_reply(messageOf(operation, path, value), queue,
                                                std::move(handler));
}

bool VoxConnector::handlePing(const vox::dict& message) const {
    if (asOperation(message.text(key::kOperation)) != Operation::kPing)
        return false;
    if (const vox::dict reply = createReply(message))
        helper_.getServer().send_message(reply);
    return true;
}

vox::dict VoxConnector::messageOf(Operation operation, std::string_view path,
                                  const vox::object& value) const {
    return createRestMessage(asObject(operation), author_, vox::string(path), value);
}

}  // namespace plr::rest
