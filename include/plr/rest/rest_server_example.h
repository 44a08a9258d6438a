#pragma once

#include <functional>
#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/rest/connector_server.h"
#include "plr/rest/server_base.h"

// A RestServerExample serves a tree of resources to clients over Vox.
//
//   auto server = RestServerExample::create(queue, "net.example.radio");
//   server->registerResource("/connections", std::make_shared<ConnectionRestResource>());
//   server->registerResource("/radio", std::make_shared<PropertyRestResource>(true));
//   server->connect(vox::listener::create("net.example.radio"));
//
// Owner:   a std::shared_ptr from create(). Letting go of it stops listening;
//          clients that are connected are ignored from then on.
// Queue:   the one given: messages and ends of clients are handled there, one
//          at a time.
namespace plr::rest {

class PLR_EXPORT RestServerExample : public RestServerBase<RestServerExample> {
  public:
    // Any thread. Deliberate: the name is accepted and not used.
    [[nodiscard]] static std::shared_ptr<RestServerExample> create(dispatch::queue queue,
                                                                   std::string name);
    ~RestServerExample();

    // Starts listening, instead of on the listener before. Throws
    // std::invalid_argument for the null object. Any thread: in place on the
    // queue, waiting for it elsewhere.
    void connect(vox::connection listener);

    // What to call, on the queue, when the listener fails for good (its name is
    // taken, …). Without one the failure is reported through the report hook.
    // Any thread, as connect().
    void setListenerErrorHandler(std::function<void(vox::object)> handler);

    // Where VoxConnectorServer delivers; on the queue.
    bool handleNewClient(vox::connection client);
    void handleListenerError(vox::object error);

  private:
    explicit RestServerExample(dispatch::queue queue);

    VoxConnectorServer listener_ PLR_CONFINED_TO(ownQueue_);
    std::function<void(vox::object)> listenerErrorHandler_ PLR_CONFINED_TO(ownQueue_);
};

}  // namespace plr::rest
