#pragma once

#include <string>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"

// A RestResourceConnection stands for one client of a server: what resources
// remember their watchers by.
//
// Owner:   the connections resource, by std::shared_ptr; resources hold it
//          weakly, so that a client that goes expires everywhere.
// Queue:   the server's.
namespace plr::rest {

class PLR_EXPORT RestResourceConnection {
  public:
    using ReplyHandler = dispatch::block<void(vox::object)>;

    explicit RestResourceConnection(std::string name);
    RestResourceConnection(const RestResourceConnection&) = delete;
    RestResourceConnection& operator=(const RestResourceConnection&) = delete;
    virtual ~RestResourceConnection();

    // The client's name; the same as a Vox string.
    [[nodiscard]] const std::string& name() const noexcept { return name_; }
    [[nodiscard]] const vox::object& nameValue() const noexcept { return nameValue_; }

    // Sends to the client. What cannot be sent is dropped; the connection's own
    // error event tells when it has ended.
    virtual void send(vox::dict message) const = 0;
    // `handler` runs once on `queue`, with the reply or an error.
    virtual void sendWithReply(vox::dict message, dispatch::queue queue,
                               ReplyHandler handler) const = 0;

  private:
    const std::string name_;
    // Kept, so that a notification to many clients makes no string for each.
    const vox::object nameValue_;
};

// A client behind a Vox connection.
class PLR_EXPORT VoxRestResourceConnection : public RestResourceConnection {
  public:
    VoxRestResourceConnection(vox::connection connection, std::string&& name);
    ~VoxRestResourceConnection() override;

    [[nodiscard]] const vox::connection& connection() const noexcept { return connection_; }

    void send(vox::dict message) const override;
    void sendWithReply(vox::dict message, dispatch::queue queue,
                       ReplyHandler handler) const override;

  private:
    const vox::connection connection_;
};

}  // namespace plr::rest
