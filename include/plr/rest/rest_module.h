#pragma once

#include <functional>
#include <memory>
#include <string>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/rest/rest_module_state.h"

// A RestModule is what a client holds to talk to a REST server: it observes
// properties and events, sets properties, sends requests and answers those for
// paths that it serves itself. What is registered is remembered: a later
// connect() with a fresh connection brings it all back on the server.
//
//   RestModule module(queue, "net.example.dialer");
//   queue.sync([&] {
//       module.observeProperty("/radio/signal", [](vox::object dBm) { … });
//       module.connect(vox::connection::create("net.example.radio"));
//   });
//
// Owner:   copies share one state, which goes with the last of them. A module
//          made without arguments holds none: only assignment, isConnected()
//          (false), getWeakHandle() and destruction.
// Queue:   a serial queue of the creator's. Members are called on it (flush()
//          excepted), which debug builds check; handlers and callbacks run on it.
// Paths:   exactly as the server notifies them, with the leading '/'.
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

    RestModule() noexcept = default;
    // `name` is the author of every message. Any thread.
    RestModule(dispatch::queue queue, std::string name);

    // Connects over `server`, a connection that is not started yet, and brings
    // the registrations to it. Throws std::invalid_argument for the null object.
    void connect(vox::connection server) const;
    // Closes the connection, once everything sent was handed to the kernel.
    void disconnect() const;
    // From connect() until disconnect() or the server's error.
    [[nodiscard]] bool isConnected() const;
    // What to call when the connection has ended by itself, with the error. The
    // module is disconnected then and does not reconnect by itself; the handler
    // may connect() again.
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

    // Answers the requests for `path`. Registering again replaces the handler;
    // an empty one deregisters.
    void registerAsRequestSink(const std::string& path, RequestHandler handler) const;
    void registerAsRequestSink(const std::string& path, const RequestHandlerBlock& handler) const;
    void deregisterAsRequestSink(const std::string& path) const;

    // One message each; nothing is remembered. The callback as above.
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

}  // namespace plr
