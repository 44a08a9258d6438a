#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "dispatch/group.h"
#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/ipc/connection.h"
#include "plr/rest/path_map.h"
#include "plr/rest/vox_connector.h"

// What RestModule handles share: the connection to the server and everything
// that was registered. rest_module.h says what the members do; they are called
// on the module's queue, which debug builds check.
//
// Owner:   RestModule, by std::shared_ptr. Replies under way hold it weakly.
// Queue:   the one given, its creator's own.
namespace plr {

class PLR_EXPORT RestModuleState : public SharedSynchronizable<RestModuleState> {
  public:
    using Handler = std::function<void(vox::object)>;
    using RequestHandler = std::function<void(vox::object, std::shared_ptr<vox::object>)>;

    [[nodiscard]] static std::shared_ptr<RestModuleState> create(dispatch::queue queue,
                                                                 const std::string& name);
    ~RestModuleState();

    void connect(vox::connection server);
    void disconnect();
    [[nodiscard]] bool isConnected() const;
    void setServerErrorHandler(Handler handler);
    void flush(const dispatch::group& group) const;
    // Any thread but the queue.
    void flush() const;

    void observe(const std::string& path, Handler handler, bool forceResubscribe);
    void unobserve(const std::string& path);
    void registerAsRequestSink(const std::string& path, RequestHandler handler);
    void deregisterAsRequestSink(const std::string& path);

    void send(rest::Operation operation, const std::string& path, const vox::object& value) const;
    void sendGet(const std::string& path, const vox::object& value, Handler callback);

    // Where VoxClientHelper delivers; on the queue.
    void handleMessage(const vox::dict& message);
    void handleServerError(const vox::object& error);

  private:
    RestModuleState(dispatch::queue queue, const std::string& name);

    // Handlers are shared, so that one may change the registrations, its own too.
    template <class Function>
    using Registrations = rest::PathMap<std::shared_ptr<const Function>>;

    void send_sync(rest::Operation operation, std::string_view path,
                   const vox::object& value = {}) const PLR_ON(ownQueue_);
    bool handleNotify_sync(const vox::dict& message) PLR_ON(ownQueue_);
    bool handleRequest_sync(const vox::dict& message) PLR_ON(ownQueue_);

    rest::VoxConnector connector_ PLR_CONFINED_TO(ownQueue_);
    Registrations<Handler> subscriptions_ PLR_CONFINED_TO(ownQueue_);
    Registrations<RequestHandler> requestHandlers_ PLR_CONFINED_TO(ownQueue_);
    Handler serverErrorHandler_ PLR_CONFINED_TO(ownQueue_);
};

}  // namespace plr
