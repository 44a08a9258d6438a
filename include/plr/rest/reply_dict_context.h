#pragma once

#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/rest/resource_context.h"

// A ReplyDictRestResourceContextDecorator lets several answers to one message
// become the entries of one reply dictionary. Everything but answering is
// forwarded to the context inside.
//
// Owner:   the stack, as the context inside. The reply leaves when this object
//          and every deferred answer taken from it are gone.
namespace plr::rest {

class PLR_EXPORT ReplyDictRestResourceContextDecorator : public RestResourceContext {
  public:
    // Takes the deferred reply of `inner`.
    explicit ReplyDictRestResourceContextDecorator(RestResourceContext& inner);
    ~ReplyDictRestResourceContextDecorator() override;

    // Answers from now on are stored under `key`. Deliberate: one key, which
    // replaces the last one; there is no stack.
    void pushScope(std::string key) { scope_ = std::move(key); }

    // False without a scope.
    bool sendReplyWithValue(const vox::object& value) override;
    [[nodiscard]] std::shared_ptr<vox::object> takeAutoReplyValue() override;

    [[nodiscard]] std::shared_ptr<RestResourceConnection> getAuthorResource() override;
    [[nodiscard]] vox::connection getRawAuthorConnection() const override;
    [[nodiscard]] vox::object getRestAuthor() const override;
    [[nodiscard]] vox::object getRestOperation() const override;
    [[nodiscard]] vox::object getRestValue() const override;
    bool sendNotify(const RestResourceConnection& to, const vox::object& author,
                    const vox::object& resource, const vox::object& value) override;
    bool sendGet(const RestResourceConnection& to, const vox::object& author,
                 const vox::object& resource, const vox::object& value,
                 std::shared_ptr<vox::object> autoReply) override;
    bool redirect(const std::string& path) override;

  private:
    RestResourceContext& inner_;
    const std::shared_ptr<vox::object> reply_;  // empty when no reply is wanted
    std::string scope_;
};

}  // namespace plr::rest
