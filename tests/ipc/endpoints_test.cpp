#include "dispatch/group.h"
#include "plr/ipc.h"
#include "support/waiting.h"

// What VoxServer and VoxClient promise whoever derives from them; see also
// tests/log/remote_log_test.cpp.
namespace {

using namespace plr::test;
using Texts = std::vector<std::string>;

vox::dict message(const std::string& text) {
    const vox::dict made = vox::dict::create();
    made["text"] = vox::string(text);
    return made;
}
std::string textOf(const vox::dict& message) {
    return std::string(message.text("text"));
}

// Remembers what it is told and echoes requests. All on the queue only, the events
// apart.
class EchoServer : public plr::VoxServer {
  public:
    static std::shared_ptr<EchoServer> create(const vox::connection& listener) {
        auto made = make_shared_ptr(new EchoServer);
        made->listenAt(listener);
        return made;
    }
    void listenAt(const vox::connection& listener) {
        execute_wrapped_sync([&] {
            ownQueue_.assertCurrent();
            setListener_sync(listener);
            EXPECT_EQ(getListener_sync().get(), listener.get());
            startListener_sync();
        });
    }
    bool refuses = false;
    Texts heard;
    int listenerErrors = 0;
    Event clientError;
    Event listenerError;
    const dispatch::queue& queue = ownQueue_.queue();

  protected:
    void handleListenerErrorImpl(vox::object) override {
        ++listenerErrors;
        listenerError.signal();
    }
    void handleClientErrorImpl(vox::connection, vox::object) override { clientError.signal(); }
    MessageHandler newClientHandlerImpl(vox::connection) override {
        if (refuses)
            return nullptr;
        return MessageHandler([this](const vox::connection& client, const vox::dict& received) {
            heard.push_back(textOf(received));
            if (vox::dict reply = vox::object::adopt(vox_dictionary_create_reply(received.get())))
                answer(client, std::move(reply));
        });
    }

  private:
    EchoServer() : VoxServer("echo", nullptr) {}

    // An auto_reply in each of its forms sends it, once that is gone.
    void answer(const vox::connection& client, vox::dict reply) {
        reply["text"] = vox::string(heard.back());
        if (heard.back() == "to its own connection") {
            vox::auto_reply owner(reply);
            vox::auto_reply moved(std::move(owner));
            EXPECT_EQ(moved.get().get(), reply.get());
        } else if (heard.back() == "to a given one") {
            const vox::auto_reply owner(reply, client);
        } else {
            // The holder starts with a dictionary that cannot be sent anywhere.
            vox::auto_reply owner(vox::dict::create());
            owner.connect(std::move(reply));
            EXPECT_FALSE(reply);  // NOLINT(bugprone-use-after-move): so it says
        }
    }
};

class RememberingClient : public plr::VoxClient {
  public:
    template <class... Queue>
    static std::shared_ptr<RememberingClient> create(const Queue&... given) {
        return make_shared_ptr(new RememberingClient(given...));
    }
    void setServer(const vox::connection& server) {
        on([&](auto&) {
            ownQueue_.assertCurrent();
            setServer_sync(server);
        });
    }
    void send(const std::string& text) {
        on([&](auto& helper) { helper.getServer().send_message(message(text)); });
    }
    // Whether what `group` waits for is over.
    bool flush(dispatch::time limit) {
        const dispatch::group sent;
        on([&](auto& helper) { helper.flush(sent); });
        return sent.wait(limit) == 0;
    }
    // The text that answers.
    std::string ask(const std::string& text) {
        Event answered;
        std::string answer;
        const dispatch::block<void(vox::object)> handler([&](const vox::dict& reply) {
            answer = textOf(reply);
            answered.signal();
        });
        on([&](auto& helper) {
            helper.getServer().send_message_with_reply(message(text), dispatch::queue::global(),
                                                       handler);
        });
        EXPECT_TRUE(answered.wait());
        return answer;
    }

    Event told;
    Event error;
    int errors = 0;  // on the queue only
    const dispatch::queue& queue = ownQueue_.queue();

  protected:
    void handleServerErrorImpl(vox::object) override {
        ++errors;
        error.signal();
    }
    void handleMessageImpl(vox::dict received) override {
        EXPECT_EQ(textOf(received), "hello");
        told.signal();
    }

  private:
    template <class... Queue>
    explicit RememberingClient(const Queue&... given) : VoxClient("remembering", given...) {}

    // Runs with the connection to the server on the client's queue.
    template <class Callable>
    void on(Callable&& work) {
        execute_wrapped_sync([&] {
            ownQueue_.assertCurrent();
            work(helper_sync());
        });
    }
};

class Endpoints : public testing::Test {
  protected:
    ~Endpoints() override {
        const dispatch::queue ending = client_->queue;
        client_.reset();
        drain(ending);
        server_.reset();
    }
    static vox::connection anonymous() { return vox::listener::create_anonymous(); }
    [[nodiscard]] vox::connection connect() const {
        return vox::endpoint::create(listener_).connect();
    }
    int errors() {
        return client_->queue.sync([this] { return client_->errors; });
    }

    const dispatch::queue queue_ = dispatch::queue::create("given");
    const vox::connection listener_ = anonymous();
    std::shared_ptr<EchoServer> server_ = EchoServer::create(listener_);
    std::shared_ptr<RememberingClient> client_ = RememberingClient::create();
};

TEST_F(Endpoints, TalkToEachOther) {
    client_->setServer(connect());
    client_->send("one");
    const Texts asked = {"to its own connection", "to a given one", "to a connected one"};
    for (const std::string& text : asked)
        EXPECT_EQ(client_->ask(text), text);
    const auto other = RememberingClient::create(queue_);
    EXPECT_EQ(other->queue, queue_);
    other->setServer(connect());
    for (int i = 0; i < 1000; ++i)
        other->send(std::to_string(i));
    EXPECT_TRUE(other->flush(dispatch::time::after(kBound)));
    other->send("the last");
    other->setServer(nullptr);  // sends what waits
    EXPECT_TRUE(other->flush(dispatch::immediately)) << "nothing to wait for";
    EXPECT_TRUE(server_->clientError.wait());
    server_->queue.sync([this] {
        EXPECT_EQ(server_->heard.size(), 1 + 3 + 1000 + 1U);
        EXPECT_EQ(server_->heard.back(), "the last");
    });
    EXPECT_EQ(errors(), 0);
}

TEST_F(Endpoints, OfARefusedOrEndedServerAreTold) {
    server_->queue.sync([this] { server_->refuses = true; });
    client_->setServer(connect());
    client_->send("lost");
    EXPECT_TRUE(client_->error.wait());
    server_->queue.sync([this] {
        EXPECT_EQ(server_->heard, Texts());
        server_->refuses = false;
    });
    client_->setServer(connect());
    EXPECT_EQ(client_->ask("here"), "here");
    const dispatch::queue queue = server_->queue;
    server_.reset();  // cancels its listener, and hears nothing more
    drain(queue);
    client_->send("to nobody");
    client_->setServer(connect());
    EXPECT_TRUE(client_->error.wait());
    EXPECT_EQ(errors(), 2);
}

TEST_F(Endpoints, HearOfTheirPresentConnectionsOnly) {
    const auto next = anonymous();
    server_->listenAt(next);
    client_->setServer(vox::endpoint::create(next).connect());
    EXPECT_EQ(client_->ask("through it"), "through it");
    next.cancel();
    EXPECT_TRUE(server_->listenerError.wait());
    EXPECT_EQ(server_->queue.sync([this] { return server_->listenerErrors; }), 1);
    server_->listenAt(vox::connection());  // none any more

    auto [mine, theirs] = vox::connection::create_pair();
    client_->setServer(mine);
    theirs.resume();
    theirs.send_message(message("hello"));
    EXPECT_TRUE(client_->told.wait());
    EXPECT_EQ(errors(), 0);
    // What arrives once it is gone is dropped.
    const dispatch::queue queue = client_->queue;
    Event go;
    queue.async([&go] { EXPECT_TRUE(go.wait()); });
    theirs.send_message(message("too late"));
    client_ = RememberingClient::create();
    go.signal();
    drain(queue);
}

TEST(AutoReply, WithoutAHolderOrADictionarySendsNothing) {
    vox::auto_reply::deleter(nullptr);
    vox::auto_reply::deleter_with_conn(nullptr, nullptr);
    vox::auto_reply empty;
    EXPECT_FALSE(empty.get());
    vox::dict kept = vox::dict::create();
    empty.connect(std::move(kept));
    EXPECT_TRUE(kept);  // NOLINT(bugprone-use-after-move): nobody took it
    const vox::auto_reply nothing{vox::dict()};
    const vox::auto_reply nowhere(vox::dict::create(), nullptr);
}

}  // namespace
