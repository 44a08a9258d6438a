#include "plr/rest/rest_module_state.h"

#include <random>
#include <stdexcept>
#include <utility>

#include "plr/concurrency/while_alive.h"
#include "plr/ipc/values.h"
#include "plr/rest/auto_reply.h"
#include "plr/rest/message.h"

namespace plr {

using rest::Operation;

namespace {

// Of what answered a request: a reply, or an error object.
Result<vox::object> resultOf(const vox::object& answer) {
    const vox::dict reply(answer);
    if (!reply)
        return Result<vox::object>::failure(answer);
    if (const vox::object error = reply[rest::key::kError])
        return Result<vox::object>::failure(
            vox::error(VOX_ERROR_APPLICATION, std::string(error.text()).c_str()));
    return rest::getReplyValue(reply);
}

}  // namespace

std::shared_ptr<RestModuleState> RestModuleState::create(dispatch::queue queue,
                                                         const std::string& name) {
    return make_shared_ptr(new RestModuleState(std::move(queue), name));
}

RestModuleState::RestModuleState(dispatch::queue queue, const std::string& name)
    : SharedSynchronizable(std::move(queue)), connector_(name) {}

RestModuleState::~RestModuleState() = default;

// ---- Connections ------------------------------------------------------------------------

void RestModuleState::connect(vox::connection server) {
    if (!server)
        throw std::invalid_argument("RestModule::connect cannot be called with a null connection");
    ownQueue_.assertCurrent();
    service_.reset();
    const EndedConnection ended = stop_sync();
    start_sync(std::move(server));
    tellOfTheEnd_sync(ended);
}

void RestModuleState::connectToService(const std::string& serviceName,
                                       const ReconnectPolicy& policy) {
    rest::requireValid(policy);
    ownQueue_.assertCurrent();
    service_ = {serviceName, policy};
    const EndedConnection ended = stop_sync();
    attempt_sync();
    tellOfTheEnd_sync(ended);
}

void RestModuleState::disconnect() {
    ownQueue_.assertCurrent();
    service_.reset();
    tellOfTheEnd_sync(stop_sync());
}

bool RestModuleState::isConnected() const {
    ownQueue_.assertCurrent();
    return connector_.isConnected();
}

void RestModuleState::setConnectionHandler(std::function<void(bool)> handler) {
    ownQueue_.assertCurrent();
    connectionHandler_ = std::move(handler);
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

void RestModuleState::handleServerError(const vox::object& error) {
    ownQueue_.assertCurrent();
    const EndedConnection ended = stop_sync();
    if (service_) {
        service_->failures = ended.wasReached ? 0 : service_->failures + 1;
        attemptLater_sync();
    }
    tellOfTheEnd_sync(ended);
    if (const Handler handler = serverErrorHandler_)
        handler(error);
}

void RestModuleState::start_sync(vox::connection server) {
    ++era_;
    connector_.connect(std::move(server), ownQueue_.queue(), weak_from_this());
    // The name first, so that the server knows whom the rest is for; then what
    // this module serves, then what it wants to see.
    send_sync(Operation::kPush, "/connections");
    for (const auto& entry : requestHandlers_)
        send_sync(Operation::kPush, entry.first);
    for (const auto& entry : subscriptions_)
        send_sync(Operation::kPush, entry.first);
}

RestModuleState::EndedConnection RestModuleState::stop_sync() {
    ++era_;
    const EndedConnection ended{connector_.isConnected(), std::exchange(isReached_, false)};
    connector_.disconnect();
    return ended;
}

// Whoever is told may do with this module what he likes, so this comes last.
void RestModuleState::tellOfTheEnd_sync(EndedConnection ended) {
    if (!ended.existed)
        return;
    rest::PathMap<std::weak_ptr<Follower>> present;
    for (const auto& entry : followers_)
        if (!entry.second.expired())
            present.insert(entry.first, entry.second);
    followers_ = present;
    for (const auto& entry : present)
        if (const auto follower = entry.second.lock())
            follower->handleConnectionEnd();
    const auto handler = connectionHandler_;
    if (ended.wasReached && handler)
        handler(false);
}

// ---- Connecting by itself ---------------------------------------------------------------

void RestModuleState::attempt_sync() {
    start_sync(vox::connection::create(service_->name.c_str()));
    // Behind all else: its reply says that what was observed has come.
    connector_.sendWithReply(Operation::kGet, "", nullptr, ownQueue_.queue(),
                             onReply([era = era_](RestModuleState& self, const vox::object& reply) {
                                 self.ownQueue_.assertCurrent();
                                 if (self.era_ == era)
                                     self.probeAnswered_sync(reply);
                             }));
}

void RestModuleState::attemptLater_sync() {
    std::random_device random;
    const double share = std::uniform_real_distribution<>()(random);
    const auto pause = rest::pauseAfter(service_->failures, service_->policy, share);
    ownQueue_.queue().after(
        dispatch::time::after(pause),
        dispatch::block<void()>(whileAlive(weak_from_this(), [era = era_](RestModuleState& self) {
            self.ownQueue_.assertCurrent();
            if (self.era_ == era)
                self.attempt_sync();
        })));
}

void RestModuleState::probeAnswered_sync(const vox::object& reply) {
    // Refused requests are answers too. Other errors are the connection's, whose
    // own error event follows.
    const bool isAnswer =
        vox::dict(reply) || vox_error_get_code(reply.get()) == VOX_ERROR_MESSAGE_REFUSED;
    if (!isAnswer)
        return;
    isReached_ = true;
    if (const auto handler = connectionHandler_)
        handler(true);
}

// ---- Registrations -----------------------------------------------------------------------

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

bool RestModuleState::follow(const std::string& path, std::weak_ptr<Follower> follower) {
    ownQueue_.assertCurrent();
    if (subscriptions_.find(path) || followerOf(path))
        return false;
    const auto [place, isFirst] = followers_.insert(path, follower);
    *place = follower;
    const auto subscribe = [this, path, follower](const vox::object&) {
        const auto present = follower.lock();
        if (!present || present != followerOf(path))
            return;  // has left meanwhile
        observe(path,
                whileAlive(follower, [](Follower& self,
                                        const vox::object& value) { self.handleNotify(value); }),
                false);
    };
    // What the server sent to the last follower is on its way until an answer
    // comes behind it; until then there is nobody to get it.
    if (isFirst)
        subscribe(nullptr);
    else
        sendGet("", nullptr, subscribe);
    return true;
}

void RestModuleState::unfollow(const std::string& path) {
    ownQueue_.assertCurrent();
    unobserve(path);
    if (auto* const follower = followers_.find(path))
        follower->reset();
}

std::shared_ptr<RestModuleState::Follower> RestModuleState::followerOf(const std::string& path) {
    ownQueue_.assertCurrent();
    const auto* found = followers_.find(path);
    return found ? found->lock() : nullptr;
}

// ---- Messages ----------------------------------------------------------------------------

void RestModuleState::send(Operation operation, const std::string& path,
                           const vox::object& value) const {
    ownQueue_.assertCurrent();
    send_sync(operation, path, value);
}

void RestModuleState::send_sync(Operation operation, std::string_view path,
                                const vox::object& value) const {
    connector_.send(operation, path, value);
}

template <class Work>
dispatch::block<void(vox::object)> RestModuleState::onReply(Work work) {
    return dispatch::block<void(vox::object)>(whileAlive(weak_from_this(), std::move(work)));
}

void RestModuleState::sendGet(const std::string& path, const vox::object& value, Handler callback) {
    ownQueue_.assertCurrent();
    if (!callback)
        callback = [](const vox::object&) {};
    if (!connector_.isConnected())
        return callback(nullptr);
    connector_.sendWithReply(
        Operation::kGet, path, value, ownQueue_.queue(),
        onReply([callback = std::move(callback)](RestModuleState&, const vox::object& reply) {
            callback(reply);
        }));
}

vox::request RestModuleState::sendRequest(const std::string& path, const vox::object& value,
                                          std::chrono::milliseconds timeout,
                                          ResultHandler callback) {
    ownQueue_.assertCurrent();
    if (!callback)
        callback = [](const Result<vox::object>&) {};
    if (!connector_.isConnected()) {
        callback(resultOf(vox::error(VOX_ERROR_CONNECTION_INTERRUPTED, "not connected")));
        return {};
    }
    return connector_.sendRequest(
        Operation::kGet, path, value, timeout, ownQueue_.queue(),
        onReply([callback = std::move(callback)](RestModuleState&, const vox::object& reply) {
            callback(resultOf(reply));
        }));
}

void RestModuleState::handleMessage(const vox::dict& message) {
    ownQueue_.assertCurrent();
    // What nobody accepts is dropped without an answer.
    static_cast<void>(handleNotify_sync(message) || handleRequest_sync(message) ||
                      connector_.handlePing(message));
}

// Hot path: no copy of the path, one count on the handler;
// bench/fanout_pelorin.cpp.
bool RestModuleState::handleNotify_sync(const vox::dict& message) {
    if (rest::asOperation(message.text(rest::key::kOperation)) != Operation::kNotify)
        return false;
    // What a connection that was replaced still brings may be older than what the
    // present one has brought.
    if (connector_.isFromElsewhere(message))
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
