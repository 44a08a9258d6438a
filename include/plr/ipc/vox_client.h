#pragma once

#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/vox_client_helper.h"

// A VoxClient owns one connection to a server and delivers the server's
// messages and errors. Derive from it and implement the two …Impl members,
// which run on the client's queue.
//
// Owner:   a std::shared_ptr from make_shared_ptr(), in the deriving class's
//          create(). A client that is gone receives nothing more.
// Queue:   its own, labelled with the client's name, or the one given.
namespace plr {

class PLR_EXPORT VoxClient : public SharedSynchronizable<VoxClient> {
  public:
    explicit VoxClient(std::string name);
    VoxClient(std::string name, dispatch::queue queue);

    // Connects over `server`, or disconnects with the null object. The previous
    // connection is cancelled once everything sent on it was handed to the
    // kernel; its errors are not delivered any more.
    void setServer_sync(vox::connection server) PLR_ON(ownQueue_);

    // Where VoxClientHelper delivers; on the queue.
    void handleMessage(vox::dict message);
    void handleServerError(vox::object error);

  protected:
    // The connection ended. Connecting again is up to the owner.
    virtual void handleServerErrorImpl(vox::object error) PLR_ON(ownQueue_)
    = 0;
    virtual void handleMessageImpl(vox::dict message) PLR_ON(ownQueue_)
    = 0;

  public:
    virtual ~VoxClient();

  protected:
    // To send on, and to flush; the null object while disconnected.
    [[nodiscard]] const VoxClientHelper& helper_sync() const PLR_ON(ownQueue_)
    { return helper_; }

  private:
    VoxClientHelper helper_ PLR_CONFINED_TO(ownQueue_);
    const std::string name_;
};

}  // namespace plr
