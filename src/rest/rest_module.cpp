#include "plr/rest/rest_module.h"

#include <utility>

#include "plr/base/assert.h"
#include "plr/rest/message.h"

namespace plr {
namespace {

using rest::Operation;

// A null block becomes an empty function.
template <class... Arguments>
std::function<void(Arguments...)> asFunction(const dispatch::block<void(Arguments...)>& block) {
    if (!block)
        return {};
    return [block](Arguments... arguments) { block(std::forward<Arguments>(arguments)...); };
}

// Of a whole reply, the value; null for everything else.
RestModule::Handler onlyTheValue(RestModule::Handler callback) {
    if (!callback)
        return {};
    return [callback = std::move(callback)](const vox::object& reply) {
        callback(rest::getReplyValue(vox::dict(reply)));
    };
}

}  // namespace

RestModule::RestModule(dispatch::queue queue, std::string name)
    : state_(RestModuleState::create(std::move(queue), name)) {}

RestModuleState& RestModule::state() const {
    PLR_ASSERT(state_, "a RestModule without a queue was used");
    return *state_;
}

void RestModule::connect(vox::connection server) const {
    state().connect(std::move(server));
}
void RestModule::connectToService(const std::string& serviceName,
                                  const ReconnectPolicy& policy) const {
    state().connectToService(serviceName, policy);
}
void RestModule::disconnect() const {
    state().disconnect();
}
bool RestModule::isConnected() const {
    return state_ && state_->isConnected();
}

void RestModule::setConnectionHandler(ConnectionHandler handler) const {
    state().setConnectionHandler(std::move(handler));
}
void RestModule::setConnectionHandler(const ConnectionHandlerBlock& handler) const {
    setConnectionHandler(asFunction(handler));
}
void RestModule::setServerErrorHandler(Handler handler) const {
    state().setServerErrorHandler(std::move(handler));
}
void RestModule::setServerErrorHandler(const HandlerBlock& handler) const {
    setServerErrorHandler(asFunction(handler));
}

void RestModule::flush() const {
    state().flush();
}
void RestModule::flush(const dispatch::group& group) const {
    state().flush(group);
}

void RestModule::observeProperty(const std::string& path, Handler handler) const {
    state().observe(path, std::move(handler), false);
}
void RestModule::observeProperty(const std::string& path, const HandlerBlock& handler) const {
    observeProperty(path, asFunction(handler));
}
void RestModule::observeProperty(const std::string& path, Handler handler,
                                 force_resubscribe_t) const {
    state().observe(path, std::move(handler), true);
}
void RestModule::observeProperty(const std::string& path, const HandlerBlock& handler,
                                 force_resubscribe_t force) const {
    observeProperty(path, asFunction(handler), force);
}
void RestModule::observeEvent(const std::string& path, Handler handler) const {
    observeProperty(path, std::move(handler));
}
void RestModule::observeEvent(const std::string& path, const HandlerBlock& handler) const {
    observeProperty(path, handler);
}
void RestModule::unobserveProperty(const std::string& path) const {
    state().unobserve(path);
}
void RestModule::unobserveEvent(const std::string& path) const {
    state().unobserve(path);
}

// Deliberate: one operation; the server treats the paths of events and of
// properties differently.
void RestModule::setProperty(const std::string& path, const vox::object& value) const {
    sendRawSet(path, value);
}
void RestModule::sendEvent(const std::string& path, const vox::object& value) const {
    sendRawSet(path, value);
}

void RestModule::getPropertyOnce(const std::string& path, Handler callback) const {
    sendRequest(path, nullptr, std::move(callback));
}
void RestModule::getPropertyOnce(const std::string& path, const HandlerBlock& callback) const {
    sendRequest(path, nullptr, callback);
}
void RestModule::sendRequest(const std::string& path, const vox::object& value,
                             Handler callback) const {
    state().sendGet(path, value, onlyTheValue(std::move(callback)));
}
void RestModule::sendRequest(const std::string& path, const vox::object& value,
                             const HandlerBlock& callback) const {
    sendRequest(path, value, asFunction(callback));
}
vox::request RestModule::sendRequest(const std::string& path, const vox::object& value,
                                     std::chrono::milliseconds timeout,
                                     ResultHandler callback) const {
    return state().sendRequest(path, value, timeout, std::move(callback));
}
vox::request RestModule::sendRequest(const std::string& path, const vox::object& value,
                                     std::chrono::milliseconds timeout,
                                     const ResultHandlerBlock& callback) const {
    return sendRequest(path, value, timeout, asFunction(callback));
}

void RestModule::registerAsRequestSink(const std::string& path, RequestHandler handler) const {
    state().registerAsRequestSink(path, std::move(handler));
}
void RestModule::registerAsRequestSink(const std::string& path,
                                       const RequestHandlerBlock& handler) const {
    registerAsRequestSink(path, asFunction(handler));
}
void RestModule::deregisterAsRequestSink(const std::string& path) const {
    state().deregisterAsRequestSink(path);
}

void RestModule::sendRawGet(const std::string& path, Handler callback) const {
    state().sendGet(path, nullptr, std::move(callback));
}
void RestModule::sendRawGet(const std::string& path, const HandlerBlock& callback) const {
    sendRawGet(path, asFunction(callback));
}
void RestModule::sendRawSet(const std::string& path, const vox::object& value) const {
    state().send(Operation::kSet, path, value);
}
void RestModule::sendRawPush(const std::string& path, const vox::object& value) const {
    state().send(Operation::kPush, path, value);
}
void RestModule::sendRawPop(const std::string& path, const vox::object& value) const {
    state().send(Operation::kPop, path, value);
}
void RestModule::sendRawNotify(const std::string& path, const vox::object& value) const {
    state().send(Operation::kNotify, path, value);
}

}  // namespace plr
