#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "dispatch/group.h"
#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/result.h"
#include "plr/rest/path_map.h"
#include "plr/rest/reconnect_policy.h"
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
    using ResultHandler = std::function<void(Result<vox::object>)>;

    // A subscription that also learns when a connection has ended, by itself or
    // because its owner closed or replaced it. Called on the queue; held weakly.
    class Follower {
      public:
        virtual ~Follower() = default;
        virtual void handleNotify(const vox::object& value) = 0;
        virtual void handleConnectionEnd() = 0;
    };

    [[nodiscard]] static std::shared_ptr<RestModuleState> create(dispatch::queue queue,
                                                                 const std::string& name);
    ~RestModuleState();

    void connect(vox::connection server);
    void connectToService(const std::string& serviceName, const ReconnectPolicy& policy);
    void disconnect();
    [[nodiscard]] bool isConnected() const;
    void setConnectionHandler(std::function<void(bool)> handler);
    void setServerErrorHandler(Handler handler);
    void flush(const dispatch::group& group) const;
    // Any thread but the queue.
    void flush() const;

    void observe(const std::string& path, Handler handler, bool forceResubscribe);
    void unobserve(const std::string& path);
    void registerAsRequestSink(const std::string& path, RequestHandler handler);
    void deregisterAsRequestSink(const std::string& path);
    // Observes `path` for `follower`, who is told nothing that was meant for one
    // before him. False when the path is observed already.
    [[nodiscard]] bool follow(const std::string& path, std::weak_ptr<Follower> follower);
    void unfollow(const std::string& path);
    // Null when nobody follows `path`.
    [[nodiscard]] std::shared_ptr<Follower> followerOf(const std::string& path);

    void send(rest::Operation operation, const std::string& path, const vox::object& value) const;
    // `callback` gets what answers, as it came; null when disconnected.
    void sendGet(const std::string& path, const vox::object& value, Handler callback);
    vox::request sendRequest(const std::string& path, const vox::object& value,
                             std::chrono::milliseconds timeout, ResultHandler callback);

    [[nodiscard]] const dispatch::queue& queue() const { return ownQueue_.queue(); }

    // Where VoxClientHelper delivers; on the queue.
    void handleMessage(const vox::dict& message);
    void handleServerError(const vox::object& error);

  private:
    RestModuleState(dispatch::queue queue, const std::string& name);

    // Handlers are shared, so that one may change the registrations, its own too.
    template <class Function>
    using Registrations = rest::PathMap<std::shared_ptr<const Function>>;

    // The service that connectToService() keeps connecting to.
    struct Service {
        std::string name;
        ReconnectPolicy policy;
        unsigned failures = 0;  // attempts in a row that did not reach it
    };

    // What is said of a connection that has ended, once its successor is there.
    struct EndedConnection {
        bool existed = false;
        bool wasReached = false;
    };

    void start_sync(vox::connection server) PLR_ON(ownQueue_);
    [[nodiscard]] EndedConnection stop_sync() PLR_ON(ownQueue_);
    void tellOfTheEnd_sync(EndedConnection ended) PLR_ON(ownQueue_);
    void attempt_sync() PLR_ON(ownQueue_);
    void attemptLater_sync() PLR_ON(ownQueue_);
    void probeAnswered_sync(const vox::object& reply) PLR_ON(ownQueue_);
    // Runs `work` with this object and the reply, or the error.
    template <class Work>
    dispatch::block<void(vox::object)> onReply(Work work);

    void send_sync(rest::Operation operation, std::string_view path,
                   const vox::object& value = {}) const PLR_ON(ownQueue_);
    bool handleNotify_sync(const vox::dict& message) PLR_ON(ownQueue_);
    bool handleRequest_sync(const vox::dict& message) PLR_ON(ownQueue_);

    rest::VoxConnector connector_ PLR_CONFINED_TO(ownQueue_);
    Registrations<Handler> subscriptions_ PLR_CONFINED_TO(ownQueue_);
    Registrations<RequestHandler> requestHandlers_ PLR_CONFINED_TO(ownQueue_);
    // With those who have left since the connection was made, who are gone.
    rest::PathMap<std::weak_ptr<Follower>> followers_ PLR_CONFINED_TO(ownQueue_);
    Handler serverErrorHandler_ PLR_CONFINED_TO(ownQueue_);
    std::function<void(bool)> connectionHandler_ PLR_CONFINED_TO(ownQueue_);

    std::optional<Service> service_ PLR_CONFINED_TO(ownQueue_);
    bool isReached_ PLR_CONFINED_TO(ownQueue_)
    = false;  // the service has answered
    // Counts starts and ends of connections: what was meant for another time is
    // known by its number.
    std::uint64_t era_ PLR_CONFINED_TO(ownQueue_)
    = 0;
};

}  // namespace plr
