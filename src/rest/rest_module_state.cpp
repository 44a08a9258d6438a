#include "plr/rest/rest_module_state.h"

#include <stdexcept>
#include <utility>

#include "plr/concurrency/while_alive.h"
#include "plr/rest/auto_reply.h"
#include "plr/rest/message.h"

namespace plr {

using rest::Operation;

std::shared_ptr<RestModuleState> RestModuleState::create(dispatch::queue queue,
                                                         const std::string& name) {
    return make_shared_ptr(new RestModuleState(std::move(queue), name));
}

RestModuleState::RestModuleState(dispatch::queue queue, const std::string& name)
    : SharedSynchronizable(std::move(queue)), connector_(name) {}

RestModuleState::~RestModuleState() = default;

void RestModuleState::connect(vox::connection server) {
    if (!server)
        throw std::invalid_argument("RestModule::connect cannot be called with a null connection");
    ownQueue_.assertCurrent();
    connector_.connect(std::move(server), ownQueue_.queue(), weak_from_this());
    // The name first, so that the server knows whom the rest is for; then what
    // this module serves, then what it wants to see.
    send_sync(Operation::kPush, "/connections");
    for (const auto& entry : requestHandlers_)
        send_sync(Operation::kPush, entry.first);
    for (const auto& entry : subscriptions_)
        send_sync(Operation::kPush, entry.first);
}

void RestModuleState::disconnect() {
    ownQueue_.assertCurrent();
    connector_.disconnect();
}

bool RestModuleState::isConnected() const {
    ownQueue_.assertCurrent();
    return connector_.isConnected();
}

void RestModuleState::setServerErrorHandler(Handler handler) {
    ownQueue_.assertCurrent();
    serverErrorHandler_ = std::move(handler);
}

void RestModuleState::flush(const dispatch::group& group) const {
    ownQueue_.assertCurrent();
    connector_.flush(group);
}

void RestModuleState::flush() const {
    const dispatch::group group;
    execute_wrapped_sync([this, &group] { flush(group); });
    static_cast<void>(group.wait());
}

void RestModuleState::observe(const std::string& path, Handler handler, bool forceResubscribe) {
    ownQueue_.assertCurrent();
    if (!handler)
        return unobserve(path);
    // Deliberate: the first handler stays, in the forced form too.
    const bool inserted =
        subscriptions_.insert(path, std::make_shared<const Handler>(std::move(handler))).second;
    if (inserted || forceResubscribe)
        send_sync(Operation::kPush, path);
}

void RestModuleState::unobserve(const std::string& path) {
    ownQueue_.assertCurrent();
    if (subscriptions_.erase(path))
        send_sync(Operation::kPop, path);
}

void RestModuleState::registerAsRequestSink(const std::string& path, RequestHandler handler) {
    ownQueue_.assertCurrent();
    if (!handler)
        return deregisterAsRequestSink(path);
    const auto shared = std::make_shared<const RequestHandler>(std::move(handler));
    const auto [registered, inserted] = requestHandlers_.insert(path, shared);
    if (inserted)
        return send_sync(Operation::kPush, path);
    // Deliberate: unlike a subscription, the handler is replaced.
    *registered = shared;
}

void RestModuleState::deregisterAsRequestSink(const std::string& path) {
    ownQueue_.assertCurrent();
    if (requestHandlers_.erase(path))
        send_sync(Operation::kPop, path);
}

void RestModuleState::send(Operation operation, const std::string& path,
                           const vox::object& value) const {
    ownQueue_.assertCurrent();
    send_sync(operation, path, value);
}

void RestModuleState::send_sync(Operation operation, std::string_view path,
                                const vox::object& value) const {
    connector_.send(operation, path, value);
}

void RestModuleState::sendGet(const std::string& path, const vox::object& value, Handler callback) {
    ownQueue_.assertCurrent();
    if (!callback)
        callback = [](const vox::object&) {};
    if (!connector_.isConnected())
        return callback(nullptr);
    connector_.sendWithReply(Operation::kGet, path, value, ownQueue_.queue(),
                             dispatch::block<void(vox::object)>(whileAlive(
                                 weak_from_this(), [callback = std::move(callback)](
                                                       RestModuleState&, const vox::object& reply) {
                                     callback(rest::getReplyValue(vox::dict(reply)));
                                 })));
}

void RestModuleState::handleMessage(const vox::dict& message) {
    ownQueue_.assertCurrent();
    // What nobody accepts is dropped without an answer.
    static_cast<void>(handleNotify_sync(message) || handleRequest_sync(message) ||
                      connector_.handlePing(message));
}

void RestModuleState::handleServerError(const vox::object& error) {
    ownQueue_.assertCurrent();
    connector_.disconnect();
    if (const Handler handler = serverErrorHandler_)
        handler(error);
}

// Hot path: no copy of the path, one count on the handler;
// bench/fanout_pelorin.cpp.
bool RestModuleState::handleNotify_sync(const vox::dict& message) {
    if (rest::asOperation(message.text(rest::key::kOperation)) != Operation::kNotify)
        return false;
    const auto* found = subscriptions_.find(message.text(rest::key::kResource));
    if (!found)
        return false;
    const std::shared_ptr<const Handler> handler = *found;
    (*handler)(message[rest::key::kValue]);
    return true;
}

bool RestModuleState::handleRequest_sync(const vox::dict& message) {
    if (requestHandlers_.empty() ||
        rest::asOperation(message.text(rest::key::kOperation)) != Operation::kGet)
        return false;
    const std::string_view path = message.text(rest::key::kResource);
    const auto* found = requestHandlers_.find(path);
    if (path.empty() || !found)
        return false;
    const std::shared_ptr<const RequestHandler> handler = *found;
    (*handler)(message[rest::key::kValue], rest::createAutoReplyValue(message));
    return true;
}

}  // namespace plr
