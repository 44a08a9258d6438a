#pragma once

#include <memory>
#include <string>
#include <utility>

#include "plr/rest/resource_context.h"

// The context that a server builds for each message: it answers from the
// message's dictionary, and leaves the rest to the server.
namespace plr::rest {

template <class Server>
class RestResourceContextDelegater : public DictRestResourceContext {
  public:
    RestResourceContextDelegater(vox::dict message, Server& server) noexcept
        : DictRestResourceContext(std::move(message)), server_(&server) {}

    [[nodiscard]] std::shared_ptr<RestResourceConnection> getAuthorResource() override {
        return server_->getAuthorResource(getRawAuthorConnection());
    }
    bool sendReplyWithValue(const vox::object& value) override {
        return server_->sendReplyWithValue(message(), value);
    }
    [[nodiscard]] std::shared_ptr<vox::object> takeAutoReplyValue() override {
        return server_->takeAutoReplyValue(message());
    }
    bool sendNotify(const RestResourceConnection& to, const vox::object& author,
                    const vox::object& resource, const vox::object& value) override {
        return server_->sendNotify(to, author, resource, value);
    }
    bool sendGet(const RestResourceConnection& to, const vox::object& author,
                 const vox::object& resource, const vox::object& value,
                 std::shared_ptr<vox::object> autoReply) override {
        return server_->sendGet(to, author, resource, value, std::move(autoReply));
    }
    bool redirect(const std::string& path) override {
        if (redirects_ == 0)
            return false;
        --redirects_;
        return server_->redirect(*this, path);
    }

  private:
    // Deliberate: enough for every honest use, and the end of every loop.
    unsigned redirects_ = 10;
    Server* server_;
};

}  // namespace plr::rest
