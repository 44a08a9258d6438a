#include "plr/log/vox_log_server.h"

#include <algorithm>
#include <utility>

#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"
#include "plr/log/vox_logger_proxy.h"
#include "src/log/remote_log_format.h"

namespace plr {
namespace {

bool isFit(std::string_view name) {
    return !name.empty() && name.size() <= remote_log::kLongestName;
}

std::string descriptionOf(const vox::object& error) {
    const auto description =
        vox::object::retain(vox_error_get_value(error.get(), vox_error_key_description));
    return std::string(description.text());
}

const void* addressOf(const vox::connection& connection) {
    return connection.get();
}

}  // namespace

std::shared_ptr<VoxLogServer> VoxLogServer::create(std::shared_ptr<LogServer> logServer,
                                                   std::string name, std::string domain) {
    auto server = make_shared_ptr(new VoxLogServer(std::move(logServer), name, domain));
    server->connectToLogServer_sync();
    return server;
}

VoxLogServer::VoxLogServer(std::shared_ptr<LogServer> logServer, const std::string& name,
                           const std::string& domain)
    : VoxServer(name, nullptr),
      Loggable(domain.c_str(), logServer),
      logServer_(std::move(logServer)) {}

VoxLogServer::~VoxLogServer() {
    ownQueue_.assertCurrent();
    for (const ProxyPtr& proxy : proxies_)
        proxy->getConnection().cancel();
}

void VoxLogServer::startListeningOn(vox::connection listener) {
    execute_wrapped([this, listener = std::move(listener)] {
        ownQueue_.assertCurrent();
        setListener_sync(listener);
        startListener_sync();
    });
}

vox::endpoint VoxLogServer::getEndpoint() const {
    return perform([this] {
        ownQueue_.assertCurrent();
        return vox::endpoint::create(getListener_sync());
    });
}

template <class... Parts>
void VoxLogServer::logParts(LogLevel level, const Parts&... parts) const {
    if (!enabled(level))
        return;
    LogMessageBuffer text;
    static_cast<void>((text << ... << parts));
    forceLog(level, std::move(text));
}

bool VoxLogServer::handleNewLogger_sync(const std::string& /*name*/, std::string& /*domain*/) {
    return true;
}

VoxServer::MessageHandler VoxLogServer::newClientHandlerImpl(vox::connection client) {
    return handleNewClient_sync(client);
}

// The proxy is looked up once a connection, not once a message. After a refusal
// there is none, whatever still comes.
VoxServer::MessageHandler VoxLogServer::handleNewClient_sync(const vox::connection& /*client*/) {
    return MessageHandler([this, proxy = std::weak_ptr<VoxLoggerProxy>(), checkedIn = false](
                              const vox::connection& from, const vox::dict& message) mutable {
        ownQueue_.assertCurrent();
        if (!std::exchange(checkedIn, true))
            proxy = checkIn_sync(from, message);
        else if (const ProxyPtr known = proxy.lock())
            known->handleMessage(message);
    });
}

VoxLogServer::ProxyPtr VoxLogServer::checkIn_sync(const vox::connection& client,
                                                  const vox::dict& message) {
    const std::string name(message.text(remote_log::kLoggerName));
    std::string domain(message.text(remote_log::kLoggerDomain));
    if (!isFit(name) || !isFit(domain)) {
        logParts(LogLevel::Error, "Got request for new logger, but check in failed");
        client.cancel();
        return nullptr;
    }
    if (!handleNewLogger_sync(name, domain)) {
        logParts(LogLevel::Info, "Request DENIED for new logger '", name, "' in domain '", domain,
                 "'");
        client.cancel();
        return nullptr;
    }
    logParts(LogLevel::Info, "Got client checkin for client '", name, "' in domain '", domain, "'");
    // In front of the level: who hears of a level first takes it that nobody confirms.
    if (const vox::dict reply = remote_log::replyTo(message))
        client.send_message(reply);
    return proxies_.emplace_back(VoxLoggerProxy::create(logServer_, client, name, domain));
}

void VoxLogServer::handleClientErrorImpl(vox::connection client, vox::object error) {
    handleClientError_sync(client, error);
}

void VoxLogServer::handleClientError_sync(const vox::connection& client, const vox::object& error) {
    const auto found = std::ranges::find(proxies_, client, &VoxLoggerProxy::getConnection);
    if (found == proxies_.end()) {
        logParts(LogLevel::Error, "Got client error for conn ", addressOf(client),
                 ", but no client found: ", descriptionOf(error));
        return;
    }
    logParts(LogLevel::Debug, "Client disconnected (", addressOf(client), ": ",
             (*found)->getTrackedLoggerName(), ")");
    proxies_.erase(found);
}

void VoxLogServer::handleListenerErrorImpl(vox::object error) {
    handleServerError_sync(error);
}

void VoxLogServer::handleServerError_sync(const vox::object& error) {
    logParts(LogLevel::Info, "Server error: ", descriptionOf(error));
}

}  // namespace plr
