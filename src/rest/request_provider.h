#pragma once

#include <memory>
#include <string_view>

#include "plr/ipc/object.h"
#include "plr/rest/resource_connection.h"

// A RequestProvider is a client as the provider of requests: a connection whose
// replies with an error, and whose refusals to send, come as values, so that they
// reach who asked like any answer.
//
// Owner:   the name that it provides. It holds the client weakly.
// Queue:   the server's.
namespace plr::rest {

class RequestProvider : public RestResourceConnection {
  public:
    // `path`: where it registered.
    RequestProvider(const std::shared_ptr<RestResourceConnection>& client, std::string_view path);
    ~RequestProvider() override;

    [[nodiscard]] const vox::object& path() const noexcept { return path_; }
    [[nodiscard]] bool isGone() const noexcept { return client_.expired(); }
    // Whether that client is who provides. A client that went is nobody.
    [[nodiscard]] bool is(const std::shared_ptr<RestResourceConnection>& client) const {
        return client && client_.lock() == client;
    }

    void send(vox::dict message) const override;
    void sendWithReply(vox::dict message, dispatch::queue queue,
                       ReplyHandler handler) const override;

  private:
    const std::weak_ptr<RestResourceConnection> client_;
    const vox::object path_;
};

}  // namespace plr::rest
