#pragma once

#include <memory>
#include <string>

#include "dispatch/block.h"
#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/ipc/listener.h"
#include "plr/ipc/vox_server_helper.h"

// A VoxServer owns a listener, accepts or refuses each new client, and delivers
// the clients' messages and errors. Derive from it and implement the three
// …Impl members, all of which run on the server's queue.
//
// Owner:   a std::shared_ptr from make_shared_ptr(), in the deriving class's
//          create(). A server that is gone receives nothing more.
// Queue:   its own, labelled with the server's name.
namespace plr {

class PLR_EXPORT VoxServer : public SharedSynchronizable<VoxServer> {
  public:
    // What is called with each message of one client.
    using MessageHandler = dispatch::block<void(vox::connection, vox::dict)>;

    // `listener` is ready to be started, or the null object.
    VoxServer(const std::string& name, vox::connection listener);

    // Replaces the listener; the old one is cancelled at once, and its errors
    // are not delivered any more.
    void setListener_sync(vox::connection listener) PLR_ON(ownQueue_);
    [[nodiscard]] vox::connection getListener_sync() const PLR_ON(ownQueue_);
    // Starts to accept clients.
    void startListener_sync() PLR_ON(ownQueue_);

    // Where VoxServerHelper delivers; on the queue.
    bool handleNewClient(vox::connection client);
    void handleClientMessage(vox::connection client, vox::dict message,
                             const MessageHandler& handler);
    void handleClientError(vox::connection client, vox::object error);
    void handleListenerError(vox::object error);

  protected:
    // The listener failed, for good.
    virtual void handleListenerErrorImpl(vox::object error) PLR_ON(ownQueue_)
    = 0;
    // A new client: returns the block that takes its messages; an empty one
    // refuses it.
    virtual MessageHandler newClientHandlerImpl(vox::connection client) PLR_ON(ownQueue_)
    = 0;
    // The connection of a client ended.
    virtual void handleClientErrorImpl(vox::connection client, vox::object error) PLR_ON(ownQueue_)
    = 0;

  public:
    virtual ~VoxServer();

  private:
    const std::string name_;
    VoxServerHelper helper_ PLR_CONFINED_TO(ownQueue_);
};

}  // namespace plr
