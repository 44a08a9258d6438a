#include "plr/ipc/vox_client.h"

#include <utility>

namespace plr {

VoxClient::VoxClient(std::string name) : SharedSynchronizable(name), name_(std::move(name)) {}

VoxClient::VoxClient(std::string name, dispatch::queue queue)
    : SharedSynchronizable(std::move(queue)), name_(std::move(name)) {}

VoxClient::~VoxClient() = default;

void VoxClient::setServer_sync(vox::connection server) {
    if (server)
        helper_.setServer(std::move(server), ownQueue_.queue(), weak_from_this());
    else
        helper_.setServer(nullptr);
}

void VoxClient::handleMessage(vox::dict message) {
    ownQueue_.assertCurrent();
    handleMessageImpl(std::move(message));
}

void VoxClient::handleServerError(vox::object error) {
    ownQueue_.assertCurrent();
    handleServerErrorImpl(std::move(error));
}

}  // namespace plr
