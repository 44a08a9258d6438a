#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/result.h"
#include "plr/rest/reconnect_policy.h"
#include "plr/rest/rest_module_state.h"
#include "plr/rest/typed_value.h"

// A RestModule is what a client holds to talk to a REST server: it observes
// properties and events, sets properties, sends requests and answers those for
// paths that it serves itself. What is registered is remembered: each new
// connection brings it all back on the server.
//
//   RestModule module(queue, "net.example.dialer");
//   queue.sync([&] {
//       module.watch<int>("/radio/signal", [](std::optional<int> dBm) { … });
//       module.connectToService("net.example.radio");
//   });
//
// connectToService() connects again by itself, as often as it takes; connect() is
// for owners who do that themselves, and for connections without a name.
//
// Owner:   copies share one state, which goes with the last of them. A module
//          made without arguments holds none: only assignment, isConnected()
//          (false), getWeakHandle() and destruction.
// Queue:   a serial queue of the creator's. Members are called on it (flush()
//          excepted), which debug builds check; handlers and callbacks run on it.
// Paths:   exactly as the server notifies them, with the leading '/'.
// Order:   handlers see the values of a path in the order in which the server sent
//          them. Once a connection is closed or replaced, no value that still
//          arrives on it reaches a handler: none is older than one seen before,
//          as long as the server's own values are not.
// Errors:  while disconnected registrations are kept, sends are dropped
//          silently, requests are answered with the null object at once.
namespace plr {

// Selects the form of observeProperty() that subscribes again.
struct force_resubscribe_t {};
inline constexpr force_resubscribe_t force_resubscribe{};

class PLR_EXPORT RestModule {
  public:
    using Handler = std::function<void(vox::object)>;
    using HandlerBlock = dispatch::block<void(vox::object)>;
    // Gets the request's value, and the reply to assign: it leaves when the last
    // holder lets go. The reply is empty when the sender wants none.
    using RequestHandler = std::function<void(vox::object, std::shared_ptr<vox::object>)>;
    using RequestHandlerBlock = dispatch::block<void(vox::object, std::shared_ptr<vox::object>)>;
    using ResultHandler = std::function<void(Result<vox::object>)>;
    using ResultHandlerBlock = dispatch::block<void(Result<vox::object>)>;
    using ConnectionHandler = std::function<void(bool isReached)>;
    using ConnectionHandlerBlock = dispatch::block<void(bool isReached)>;

    RestModule() noexcept = default;
    // `name` is the author of every message. Any thread.
    RestModule(dispatch::queue queue, std::string name);

    // Connects over `server`, a connection that is not started yet, and brings
    // the registrations to it. Throws std::invalid_argument for the null object.
    void connect(vox::connection server) const;
    // Connects to the Vox service of that name, now and again whenever the
    // connection cannot be made or ends, with the policy's pauses, until
    // disconnect(), another connect or the module's end. The registrations go
    // first, then a GET of "": any answer to it, a refusal too, says that the
    // service is reached. One that ends when idle, and is started by its socket, is
    // thus started again. Throws std::invalid_argument for a bad policy.
    void connectToService(const std::string& serviceName, const ReconnectPolicy& policy = {}) const;
    // Closes the connection, once everything sent was handed to the kernel.
    void disconnect() const;
    // From connect() until disconnect() or the server's error. After
    // connectToService() also while the service is yet to be reached, but not in
    // the pauses; what is sent before is lost when it cannot be.
    [[nodiscard]] bool isConnected() const;
    // What to call with true when connectToService() has reached its service, by
    // when the present values of what is observed have been handled, and with
    // false when that connection has ended, whoever ended it. By turns, true
    // first. Nothing is said of the connections of connect().
    void setConnectionHandler(ConnectionHandler handler) const;
    void setConnectionHandler(const ConnectionHandlerBlock& handler) const;
    // What to call when a connection has ended by itself, or could not be made,
    // with the error. The module is disconnected then; the handler may connect()
    // again, which ends the attempts of connectToService().
    void setServerErrorHandler(Handler handler) const;
    void setServerErrorHandler(const HandlerBlock& handler) const;

    // Waits until everything sent before was handed to the kernel, or never can
    // be. Any thread but the module's queue, where that would stop the process.
    void flush() const;
    // Holds `group` entered until then; on the queue.
    void flush(const dispatch::group& group) const;

    [[nodiscard]] std::weak_ptr<RestModuleState> getWeakHandle() const { return state_; }

    // Calls `handler` with each new value at `path`; for a property of a server
    // that keeps values, with the present one first. A path that is observed
    // keeps its handler; the form with force_resubscribe asks the server again.
    // An empty handler unobserves.
    void observeProperty(const std::string& path, Handler handler) const;
    void observeProperty(const std::string& path, const HandlerBlock& handler) const;
    void observeProperty(const std::string& path, Handler handler, force_resubscribe_t) const;
    void observeProperty(const std::string& path, const HandlerBlock& handler,
                         force_resubscribe_t) const;
    void observeEvent(const std::string& path, Handler handler) const;
    void observeEvent(const std::string& path, const HandlerBlock& handler) const;
    void unobserveProperty(const std::string& path) const;
    void unobserveEvent(const std::string& path) const;

    // observeProperty() with the value as a T (typed_value.h): nothing when it is
    // null, as that of a property without a value, or of another type.
    template <class T>
    void watch(const std::string& path, std::function<void(std::optional<T>)> handler) const;

    void setProperty(const std::string& path, const vox::object& value) const;
    void sendEvent(const std::string& path, const vox::object& value) const;

    // One answer, to `callback`: the reply's value; null when there is none, when
    // the connection ends first, or when disconnected (then before the return).
    // When the module goes first, `callback` is dropped uncalled.
    void getPropertyOnce(const std::string& path, Handler callback) const;
    void getPropertyOnce(const std::string& path, const HandlerBlock& callback) const;
    void sendRequest(const std::string& path, const vox::object& value, Handler callback) const;
    void sendRequest(const std::string& path, const vox::object& value,
                     const HandlerBlock& callback) const;

    // The same with a time limit, positive and up to 49 days, and an honest result:
    // the reply's value, or an error object with
    //   VOX_ERROR_APPLICATION               and the server's text: its refusal
    //   VOX_ERROR_REQUEST_TIMED_OUT         no reply in time
    //   VOX_ERROR_REQUEST_CANCELLED         given up through what this returns
    //   VOX_ERROR_CONNECTION_INTERRUPTED    the connection ended, or could not be
    //                                       made; or disconnected
    //   VOX_ERROR_CONNECTION_INVALID        the connection was closed on this side, or
    //                                       ended for good
    //   VOX_ERROR_MESSAGE_REFUSED           it could not be sent
    // The request may be given up on any thread, or be dropped.
    vox::request sendRequest(const std::string& path, const vox::object& value,
                             std::chrono::milliseconds timeout, ResultHandler callback) const;
    vox::request sendRequest(const std::string& path, const vox::object& value,
                             std::chrono::milliseconds timeout,
                             const ResultHandlerBlock& callback) const;

    // Answers the requests for `path`. Registering again replaces the handler;
    // an empty one deregisters.
    void registerAsRequestSink(const std::string& path, RequestHandler handler) const;
    void registerAsRequestSink(const std::string& path, const RequestHandlerBlock& handler) const;
    void deregisterAsRequestSink(const std::string& path) const;

    // One message each; nothing is remembered. `callback` gets the whole reply as
    // it came, a dictionary with "v" or "e" (message.h); the error object when the
    // connection ends first; null when disconnected, then before the return.
    void sendRawGet(const std::string& path, Handler callback) const;
    void sendRawGet(const std::string& path, const HandlerBlock& callback) const;
    void sendRawSet(const std::string& path, const vox::object& value) const;
    void sendRawPush(const std::string& path, const vox::object& value) const;
    void sendRawPop(const std::string& path, const vox::object& value) const;
    void sendRawNotify(const std::string& path, const vox::object& value) const;

  private:
    [[nodiscard]] RestModuleState& state() const;

    std::shared_ptr<RestModuleState> state_;
};

template <class T>
void RestModule::watch(const std::string& path,
                       std::function<void(std::optional<T>)> handler) const {
    if (!handler)
        return unobserveProperty(path);
    observeProperty(path, [handler = std::move(handler)](const vox::object& value) {
        handler(rest::valueAs<T>(value));
    });
}

}  // namespace plr
