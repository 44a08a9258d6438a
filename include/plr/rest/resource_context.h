#pragma once

#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/object.h"
#include "plr/rest/resource_connection.h"

// What a resource is handed with each message, and answers through.
//
// Owner:   the server's stack, for one message: a resource keeps none. A
//          deferred reply may be kept.
// Queue:   the server's.
namespace plr::rest {

class PLR_EXPORT RestResourceContext {
  public:
    // Who sent the message: empty for a client that did not register at
    // "/connections".
    [[nodiscard]] virtual std::shared_ptr<RestResourceConnection> getAuthorResource() = 0;
    // The connection that the message came on; the null object for a message
    // that came on none.
    [[nodiscard]] virtual vox::connection getRawAuthorConnection() const = 0;
    // Who that is, as the kernel says; never what "a" says. All -1 without one.
    [[nodiscard]] vox::credentials getAuthorCredentials() const {
        return getRawAuthorConnection().peer();
    }

    // The message's "a", "o" and "v", null when absent.
    [[nodiscard]] virtual vox::object getRestAuthor() const = 0;
    [[nodiscard]] virtual vox::object getRestOperation() const = 0;
    [[nodiscard]] virtual vox::object getRestValue() const = 0;

    // Answers the message now. False when it wants no answer or has had it.
    virtual bool sendReplyWithValue(const vox::object& value) = 0;
    // Answers it later (auto_reply.h). An empty handle in the same cases.
    [[nodiscard]] virtual std::shared_ptr<vox::object> takeAutoReplyValue() = 0;

    // Sends a notification, or a GET whose answer `autoReply` gets, to a client.
    virtual bool sendNotify(const RestResourceConnection& to, const vox::object& author,
                            const vox::object& resource, const vox::object& value) = 0;
    virtual bool sendGet(const RestResourceConnection& to, const vox::object& author,
                         const vox::object& resource, const vox::object& value,
                         std::shared_ptr<vox::object> autoReply) = 0;

    // Routes the same message again, from the root, to `path`. False when
    // nobody handled it, or after 10 redirects of one message.
    virtual bool redirect(const std::string& path) = 0;

    virtual ~RestResourceContext() = default;
};

// A context over a message's dictionary; the null object has neither author
// nor value.
class PLR_EXPORT DictRestResourceContext : public RestResourceContext {
  public:
    explicit DictRestResourceContext(vox::dict message) noexcept;
    ~DictRestResourceContext() override;

    [[nodiscard]] vox::connection getRawAuthorConnection() const override;
    [[nodiscard]] vox::object getRestAuthor() const override;
    [[nodiscard]] vox::object getRestOperation() const override;
    [[nodiscard]] vox::object getRestValue() const override;

  protected:
    [[nodiscard]] const vox::dict& message() const noexcept { return message_; }

  private:
    const vox::dict message_;
};

}  // namespace plr::rest
