#include "plr/rest/rest_server_example.h"

#include <stdexcept>
#include <utility>

#include "plr/base/report.h"

namespace plr::rest {

std::shared_ptr<RestServerExample> RestServerExample::create(dispatch::queue queue, std::string) {
    return make_shared_ptr(new RestServerExample(std::move(queue)));
}

RestServerExample::RestServerExample(dispatch::queue queue) : RestServerBase(std::move(queue)) {}

RestServerExample::~RestServerExample() = default;

void RestServerExample::connect(vox::connection listener) {
    if (!listener)
        throw std::invalid_argument("RestServer::connect cannot be called with a null connection");
    perform([this, &listener] {
        ownQueue_.assertCurrent();
        listener_.listen(std::move(listener), ownQueue_.queue(), weak_from_this());
    });
}

void RestServerExample::setListenerErrorHandler(std::function<void(vox::object)> handler) {
    perform([this, &handler] {
        ownQueue_.assertCurrent();
        listenerErrorHandler_ = std::move(handler);
    });
}

bool RestServerExample::handleNewClient(vox::connection client) {
    ownQueue_.assertCurrent();
    listener_.accept(std::move(client), ownQueue_.queue(), weak_from_this());
    return true;
}

void RestServerExample::handleListenerError(vox::object error) {
    ownQueue_.assertCurrent();
    if (listenerErrorHandler_)
        listenerErrorHandler_(std::move(error));
    else
        report("a REST server's listener failed: %s", error.to_string().c_str());
}

}  // namespace plr::rest
