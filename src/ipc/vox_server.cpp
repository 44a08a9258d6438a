#include "plr/ipc/vox_server.h"

#include <utility>

namespace plr {

VoxServer::VoxServer(const std::string& name, vox::connection listener)
    : SharedSynchronizable(name), name_(name), helper_(std::move(listener)) {}

VoxServer::~VoxServer() = default;

void VoxServer::setListener_sync(vox::connection listener) {
    helper_.setListener(std::move(listener));
}

vox::connection VoxServer::getListener_sync() const {
    return helper_.getListener();
}

void VoxServer::startListener_sync() {
    helper_.startListener(ownQueue_.queue(), weak_from_this());
}

bool VoxServer::handleNewClient(vox::connection client) {
    ownQueue_.assertCurrent();
    MessageHandler handler = newClientHandlerImpl(client);
    if (!handler)
        return false;
    helper_.acceptClient(std::move(client), ownQueue_.queue(), weak_from_this(),
                         std::move(handler));
    return true;
}

void VoxServer::handleClientMessage(vox::connection client, vox::dict message,
                                    const MessageHandler& handler) {
    handler(std::move(client), std::move(message));
}

void VoxServer::handleClientError(vox::connection client, vox::object error) {
    ownQueue_.assertCurrent();
    handleClientErrorImpl(std::move(client), std::move(error));
}

void VoxServer::handleListenerError(vox::object error) {
    ownQueue_.assertCurrent();
    handleListenerErrorImpl(std::move(error));
}

}  // namespace plr
