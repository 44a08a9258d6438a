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

vox::request VoxConnector::sendRequest(Operation operation, std::string_view path,
                                       const vox::object& value, std::chrono::milliseconds timeout,
                                       const dispatch::queue& queue,
                                       dispatch::block<void(vox::object)> handler) const {
    return helper_.getServer().send_request(messageOf(operation, path, value), timeout, queue,
                                            std::move(handler));
}

// Hot path, for each notification: two loads; bench/fanout_pelorin.cpp.
bool VoxConnector::isFromElsewhere(const vox::dict& message) const noexcept {
    const vox_connection_t origin = vox_dictionary_get_remote_connection(message.get());
    return origin && origin != helper_.getServer().get();
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
