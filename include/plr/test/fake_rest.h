#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "plr/rest.h"

// Stand-ins for a REST server and its clients: they remember what a resource
// sends.
namespace plr::test {

// A value on one line.
inline std::string oneLine(const vox::object& value) {
    std::string text = value.to_string();
    std::erase_if(text, [](char c) { return c == '\n' || c == '\t'; });
    return text;
}

class FakeRestConnection : public rest::RestResourceConnection {
  public:
    using RestResourceConnection::RestResourceConnection;

    void send(vox::dict message) const override { sent.push_back(std::move(message)); }
    void sendWithReply(vox::dict message, dispatch::queue, ReplyHandler handler) const override {
        sent.push_back(std::move(message));
        replyHandlers.push_back(std::move(handler));
    }

    mutable std::vector<vox::dict> sent;
    mutable std::vector<ReplyHandler> replyHandlers;
};

class FakeRestContext : public rest::RestResourceContext {
  public:
    explicit FakeRestContext(rest::Operation operation, vox::object value = {},
                             std::shared_ptr<rest::RestResourceConnection> author = {})
        : operation_(rest::asObject(operation)),
          value_(std::move(value)),
          author_(std::move(author)) {}

    // The answers, deferred ones too, in the order in which they left.
    [[nodiscard]] const std::vector<vox::object>& replies() const { return *replies_; }
    [[nodiscard]] const std::vector<std::string>& redirects() const { return redirects_; }

    std::shared_ptr<rest::RestResourceConnection> getAuthorResource() override { return author_; }
    [[nodiscard]] vox::connection getRawAuthorConnection() const override { return {}; }
    [[nodiscard]] vox::object getRestAuthor() const override {
        return author_ ? author_->nameValue() : vox::object();
    }
    [[nodiscard]] vox::object getRestOperation() const override { return operation_; }
    [[nodiscard]] vox::object getRestValue() const override { return value_; }
    bool sendReplyWithValue(const vox::object& value) override {
        replies_->push_back(value);
        return true;
    }
    std::shared_ptr<vox::object> takeAutoReplyValue() override {
        return rest::createAutoReplyWithAction(
            [replies = replies_](const vox::object& value) { replies->push_back(value); });
    }
    bool sendNotify(const rest::RestResourceConnection& to, const vox::object& author,
                    const vox::object& resource, const vox::object& value) override {
        to.send(rest::createNotify(author, resource, value));
        return true;
    }
    bool sendGet(const rest::RestResourceConnection& to, const vox::object& author,
                 const vox::object& resource, const vox::object& value,
                 std::shared_ptr<vox::object> autoReply) override {
        to.sendWithReply(
            rest::createRestMessage(rest::asObject(rest::Operation::kGet), author, resource, value),
            dispatch::queue::global(),
            rest::RestResourceConnection::ReplyHandler(
                [autoReply = std::move(autoReply)](const vox::object& answer) mutable {
                    const std::shared_ptr<vox::object> slot = std::move(autoReply);
                    if (const vox::dict reply(answer); slot && reply)
                        *slot = rest::getReplyValue(reply);
                }));
        return true;
    }
    bool redirect(const std::string& path) override {
        redirects_.push_back(path);
        return true;
    }

  private:
    const vox::object operation_;
    const vox::object value_;
    const std::shared_ptr<rest::RestResourceConnection> author_;
    // Shared with the deferred answers, which may outlive the context.
    const std::shared_ptr<std::vector<vox::object>> replies_ =
        std::make_shared<std::vector<vox::object>>();
    std::vector<std::string> redirects_;
};

// A resource that remembers whether it handled the last message.
template <class Resource>
struct Recording : Resource {
    using Resource::Resource;
    bool handleMessage(rest::RestResourceContext& context, const rest::PathView& path) override {
        return handled = Resource::handleMessage(context, path);
    }
    bool handled = false;  // touched on the server's queue only
};

// A leaf that answers every operation it is asked for, and remembers the calls.
class FakeRestResource : public rest::RestResource {
  public:
    std::vector<std::string> calls;    // "GET current segment"
    std::vector<std::string> dropped;  // "path client"

    bool handleRestMessage_GET(rest::RestResourceContext& context,
                               const rest::PathView& path) override {
        context.sendReplyWithValue(vox::string("value"));
        return remember("GET", path);
    }
    bool handleRestMessage_SET(rest::RestResourceContext&, const rest::PathView& path) override {
        return remember("SET", path);
    }
    bool handleRestMessage_PUSH(rest::RestResourceContext&, const rest::PathView& path) override {
        return remember("PUSH", path);
    }
    bool handleRestMessage_POP(rest::RestResourceContext&, const rest::PathView& path) override {
        return remember("POP", path);
    }
    bool handleRestMessage_NOTIFY(rest::RestResourceContext&, const rest::PathView& path) override {
        return remember("NOTIFY", path);
    }
    void handleDroppedConnection(
        rest::RestResourceContext&, const rest::PathView& path,
        const std::shared_ptr<rest::RestResourceConnection>& connection) override {
        dropped.push_back(std::string(path.full()) + " " + connection->name());
    }

  private:
    bool remember(const char* operation, const rest::PathView& path) {
        calls.push_back(std::string(operation) + " " + std::string(path.current()));
        return true;
    }
};

}  // namespace plr::test
