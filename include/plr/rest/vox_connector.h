#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/vox_client_helper.h"
#include "plr/rest/operation.h"

// The client end of the REST protocol: an author's name, and the connection to
// a server.
//
// Owner:   it is part of the object that gets the messages (vox_client_helper.h).
// Queue:   that object's; every member is called there.
namespace plr::rest {

class PLR_EXPORT VoxConnector {
  public:
    // `name` goes into the "a" of every message.
    explicit VoxConnector(const std::string& name);

    // Replaces the connection; messages and the server's error go to `target`.
    template <class T>
    void connect(vox::connection server, const dispatch::queue& queue, std::weak_ptr<T> target) {
        helper_.setServer(std::move(server), queue, std::move(target));
    }
    // Closes the connection once everything sent was handed to the kernel.
    void disconnect() { helper_.setServer(nullptr); }
    [[nodiscard]] bool isConnected() const noexcept { return bool(helper_.getServer()); }

    // Sends one message. While disconnected nothing happens.
    void send(Operation operation, std::string_view path, const vox::object& value) const;
    // The same asking for a reply: `handler` runs once on `queue`, with the reply
    // or an error.
    void sendWithReply(Operation operation, std::string_view path, const vox::object& value,
                       const dispatch::queue& queue,
                       dispatch::block<void(vox::object)> handler) const;
    // The same with a time limit (plr/ipc/connection.h).
    vox::request sendRequest(Operation operation, std::string_view path, const vox::object& value,
                             std::chrono::milliseconds timeout, const dispatch::queue& queue,
                             dispatch::block<void(vox::object)> handler) const;

    // Whether `message` came on a connection that is not the present one.
    [[nodiscard]] bool isFromElsewhere(const vox::dict& message) const noexcept;
    // Answers a ping of the server. False when `message` is none.
    bool handlePing(const vox::dict& message) const;

    // As VoxClientHelper::flush().
    void flush(const dispatch::group& group) const { helper_.flush(group); }

  private:
    [[nodiscard]] vox::dict messageOf(Operation operation, std::string_view path,
                                      const vox::object& value) const;

    const vox::object author_;
    VoxClientHelper helper_;
};

}  // namespace plr::rest
