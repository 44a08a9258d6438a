#pragma once

#include <future>
#include <string_view>

#include "plr/test/fake_rest.h"
#include "support/waiting.h"

namespace plr::test {

using Texts = std::vector<std::string>;

// A client of a REST server that sends whatever a test wants, and keeps every
// message that it gets.
class RawRestClient {
  public:
    // `connection` is not started yet.
    RawRestClient(vox::connection connection, std::string name)
        : connection_(std::move(connection)), name_(std::move(name)) {
        connection_.set_event_handler([this](const vox::object& event) { take(event); });
        connection_.set_target_queue(queue_);
        connection_.resume();
    }
    // Waits for the last event, which may find this object otherwise.
    ~RawRestClient() {
        connection_.cancel();
        EXPECT_TRUE(waitForEnd());
    }

    [[nodiscard]] const vox::connection& connection() const { return connection_; }

    [[nodiscard]] vox::dict message(rest::Operation operation, std::string_view path,
                                    const vox::object& value = {}) const {
        return rest::createRestMessage(rest::asObject(operation), vox::string(name_),
                                       vox::string(path), value);
    }
    int send(const vox::dict& message) const { return connection_.send_message(message); }
    int send(rest::Operation operation, std::string_view path,
             const vox::object& value = {}) const {
        return send(message(operation, path, value));
    }
    // Makes the client known to the server.
    void registerName() const { send(rest::Operation::kPush, "/connections"); }

    // Asks; what answers is added to replies().
    void ask(const vox::dict& message) {
        connection_.send_message_with_reply(
            message, queue_, dispatch::block<void(vox::object)>([this](const vox::object& reply) {
                replies_.push_back(reply);
                replied.signal();
            }));
    }
    // What answered so far, errors included.
    [[nodiscard]] std::vector<vox::object> replies() const {
        return queue_.sync([this] { return replies_; });
    }
    // The reply to a message; an error when it was not answered in time.
    [[nodiscard]] vox::object exchange(const vox::dict& message) const {
        const auto answer = std::make_shared<std::promise<vox::object>>();
        auto future = answer->get_future();
        connection_.send_message_with_reply(
            message, queue_, dispatch::block<void(vox::object)>([answer](const vox::object& reply) {
                answer->set_value(reply);
            }));
        if (future.wait_for(kBound) == std::future_status::ready)
            return future.get();
        ADD_FAILURE() << "no reply to " << message.to_string();
        return vox::error(VOX_ERROR_APPLICATION, "no reply");
    }
    [[nodiscard]] vox::object get(std::string_view path, const vox::object& value = {}) const {
        return rest::getReplyValue(exchange(message(rest::Operation::kGet, path, value)));
    }
    [[nodiscard]] std::string textAt(std::string_view path) const { return oneLine(get(path)); }

    // The messages that came since the last call, each as "operation author path
    // value"; all that the other end sent before now included: it answers `probe`
    // behind them.
    [[nodiscard]] Texts takeMessagesBefore(const vox::dict& probe) {
        EXPECT_TRUE(vox::dict(exchange(probe))) << "the other end does not answer";
        return queue_.sync([this] { return std::exchange(messages_, {}); });
    }
    // The same with a probe that every server answers.
    [[nodiscard]] Texts takeMessages() {
        return takeMessagesBefore(message(rest::Operation::kGet, ""));
    }

    // Whether the connection ended.
    [[nodiscard]] bool waitForEnd() { return hasEnded_ || (hasEnded_ = end_.wait()); }

    Event replied;

  private:
    void take(const vox::object& event) {
        const vox::dict message(event);
        if (!message)
            return end_.signal();
        std::string text;
        for (const char* key : {"o", "a", "r"})
            text.append(vox::object(message[key]).text()) += ' ';
        messages_.push_back(text + oneLine(message["v"]));
    }

    const vox::connection connection_;
    const std::string name_;
    const dispatch::queue queue_ = dispatch::queue::create("raw.client");
    Texts messages_;                    // touched on the queue only
    std::vector<vox::object> replies_;  // touched on the queue only
    Event end_;
    bool hasEnded_ = false;
};

// A server with an anonymous listener, or the one given, and clients for it.
class RestServerRig {
  public:
    explicit RestServerRig(const vox_limits_t& limits = vox_limits_default())
        : RestServerRig(vox::listener::create_anonymous(&limits)) {}
    explicit RestServerRig(vox::connection listener) : listener_(std::move(listener)) {
        add("/connections", std::make_shared<rest::ConnectionRestResource>());
        add("/~drops", drops_);  // the last to be told
    }

    void add(const char* path, std::shared_ptr<rest::RestResourceBase> resource) const {
        EXPECT_TRUE(server_->registerResource(path, std::move(resource))) << path;
    }
    void start() const { server_->connect(listener_); }

    // A new connection to the server, not started.
    [[nodiscard]] vox::connection connect() const {
        return vox::endpoint::create(listener_).connect();
    }
    [[nodiscard]] std::unique_ptr<RawRestClient> client(std::string name) const {
        return std::make_unique<RawRestClient>(connect(), std::move(name));
    }
    // One that the server knows.
    [[nodiscard]] std::unique_ptr<RawRestClient> registeredClient(std::string name) const {
        auto made = client(std::move(name));
        made->registerName();
        return made;
    }

    // Whether one more client that was registered has been forgotten.
    [[nodiscard]] bool waitForDrop() const { return drops_->dropped.wait(); }

    [[nodiscard]] const dispatch::queue& queue() const { return queue_; }
    [[nodiscard]] rest::RestServerExample& server() const { return *server_; }
    [[nodiscard]] const vox::connection& listener() const { return listener_; }

    // What the service does itself.
    bool handleOwn(const vox::dict& message) const {
        return queue_.sync([&] { return server_->handleRestMessage(nullptr, message); });
    }
    // Which operations `resource` handles at a path, "get push ", when `client` sends
    // them without a value.
    template <class Resource>
    [[nodiscard]] std::string handledBy(const Recording<Resource>& resource,
                                        const RawRestClient& client, const char* path) const {
        using enum rest::Operation;
        std::string handled;
        for (const rest::Operation operation : {kGet, kPush, kPop, kSet, kNotify}) {
            client.send(operation, path);
            static_cast<void>(client.get(""));
            if (queue_.sync([&] { return resource.handled; }))
                handled += rest::asString(operation) + std::string(" ");
        }
        return handled;
    }

    // Stops listening and ignores the clients from now on.
    void stop() {
        server_.reset();
        drain(queue_);
    }

  private:
    // Signals when the server has told its resources of a client that dropped.
    struct Drops : rest::RestResource {
        void handleDroppedConnection(
            rest::RestResourceContext&, const rest::PathView&,
            const std::shared_ptr<rest::RestResourceConnection>&) override {
            dropped.signal();
        }
        Event dropped;
    };

    const std::shared_ptr<Drops> drops_ = std::make_shared<Drops>();
    const dispatch::queue queue_ = dispatch::queue::create("rest.server");
    std::shared_ptr<rest::RestServerExample> server_ =
        rest::RestServerExample::create(queue_, "rig");
    const vox::connection listener_;
};

}  // namespace plr::test
