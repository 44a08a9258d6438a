#pragma once

#include <memory>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/vox_server.h"
#include "plr/log/loggable.h"

// A VoxLogServer lets other processes log into this one's log server: each
// VoxLogger that connects and checks in gets a proxy there.
//
//   const auto remote = plr::VoxLogServer::create(logServer, "remote log", "radio.log");
//   remote->startListeningOn(vox::listener::create_anonymous());
//   // remote->getEndpoint() goes to the clients.
//
// Owner:   the std::shared_ptr of create(), or of a derived class's. When it goes,
//          so do the clients' connections.
// Queue:   its own; all clients are handled there.
// Logs:    who comes, is refused and goes, by a logger of its own.
// Clients: the first message of a connection is the check-in, with a name and a
//          domain of 1 to 256 bytes each; anything else ends the connection. A
//          domain may be that of others, and of this process: a derived class
//          decides who may have which. Writers show no text as a record of its
//          own (docs/logging.md).
namespace plr {

class VoxLoggerProxy;

class PLR_EXPORT VoxLogServer : public VoxServer, public Loggable<VoxLogServer> {
  public:
    // `name` is the queue's label; `domain` that of the server's own logger.
    [[nodiscard]] static std::shared_ptr<VoxLogServer> create(std::shared_ptr<LogServer> logServer,
                                                              std::string name, std::string domain);
    ~VoxLogServer() override;

    // Takes the clients of a listener, named or anonymous, in place of those of
    // the one before; clients that are there stay. Any thread.
    void startListeningOn(vox::connection listener);
    // What lets others connect, a new one each time (vox_endpoint_create()); the
    // null object without a listener. Any thread.
    [[nodiscard]] vox::endpoint getEndpoint() const;

  protected:
    // A derived class's create() calls connectToLogServer_sync() once it is owned.
    VoxLogServer(std::shared_ptr<LogServer> logServer, const std::string& name,
                 const std::string& domain);

    // Whether a client may log; `domain` may be changed. This class takes all.
    virtual bool handleNewLogger_sync(const std::string& name, std::string& domain)
        PLR_ON(ownQueue_);

    [[nodiscard]] MessageHandler handleNewClient_sync(const vox::connection& client)
        PLR_ON(ownQueue_);
    void handleClientError_sync(const vox::connection& client, const vox::object& error)
        PLR_ON(ownQueue_);
    void handleServerError_sync(const vox::object& error) PLR_ON(ownQueue_);

    void handleListenerErrorImpl(vox::object error) override PLR_ON(ownQueue_);
    MessageHandler newClientHandlerImpl(vox::connection client) override PLR_ON(ownQueue_);
    void handleClientErrorImpl(vox::connection client, vox::object error) override
        PLR_ON(ownQueue_);

  private:
    using ProxyPtr = std::shared_ptr<VoxLoggerProxy>;

    // Null for a client that was refused.
    [[nodiscard]] ProxyPtr checkIn_sync(const vox::connection& client, const vox::dict& message)
        PLR_ON(ownQueue_);
    template <class... Parts>
    void logParts(LogLevel level, const Parts&... parts) const;

    const std::shared_ptr<LogServer> logServer_;
    std::vector<ProxyPtr> proxies_ PLR_CONFINED_TO(ownQueue_);  // in order of check-in
};

}  // namespace plr
