#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "dispatch/group.h"
#include "plr/ipc.h"
#include "support/waiting.h"

namespace {

using namespace plr::test;
using Texts = std::vector<std::string>;

vox::dict message(const char* text) {
    const vox::dict made = vox::dict::create();
    made["text"] = vox::string(std::string_view(text));
    return made;
}

// A server that remembers what it is told and echoes requests.
class EchoServer : public plr::VoxServer {
  public:
    static std::shared_ptr<EchoServer> create(const vox::connection& listener) {
        auto made = make_shared_ptr(new EchoServer(listener));
        made->execute_wrapped_sync([&] {
            made->ownQueue_.assertCurrent();
            made->startListener_sync();
        });
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
    [[nodiscard]] const dispatch::queue& queue() const { return ownQueue_.queue(); }

    // All on the queue only, the events apart.
    bool refuses = false;
    Texts heard;
    int clientErrors = 0;
    int listenerErrors = 0;
    Event clientError;
    Event listenerError;

  protected:
    void handleListenerErrorImpl(vox::object) override {
        ++listenerErrors;
        listenerError.signal();
    }
    MessageHandler newClientHandlerImpl(vox::connection) override {
        if (refuses)
            return nullptr;
        return MessageHandler([this](const vox::connection& client, const vox::dict& received) {
            heard.emplace_back(vox::object(received["text"]).text());
            if (const vox::dict reply =
                    vox::object::adopt(vox_dictionary_create_reply(received.get()))) {
                reply["text"] = received["text"];
                client.send_message(reply);
            }
        });
    }
    void handleClientErrorImpl(vox::connection, vox::object) override {
        ++clientErrors;
        clientError.signal();
    }

  private:
    explicit EchoServer(vox::connection listener) : VoxServer("echo", std::move(listener)) {}
};

class RememberingClient : public plr::VoxClient {
  public:
    template <class... Queue>
    static std::shared_ptr<RememberingClient> create(const Queue&... queue) {
        return make_shared_ptr(new RememberingClient(queue...));
    }
    // Runs on the client's queue.
    template <class Callable>
    auto on(Callable&& work) {
        return execute_wrapped_sync([&] { return work(*this); });
    }
    void setServer(const vox::connection& server) {
        execute_wrapped_sync([&] {
            ownQueue_.assertCurrent();
            setServer_sync(server);
        });
    }
    void flush(const dispatch::group& group) {
        execute_wrapped_sync([&] {
            ownQueue_.assertCurrent();
            helper_sync().flush(group);
        });
    }
    void send(const vox::dict& sent) {
        execute_wrapped_sync([&] {
            ownQueue_.assertCurrent();
            helper_sync().getServer().send_message(sent);
        });
    }
    [[nodiscard]] const dispatch::queue& queue() const { return ownQueue_.queue(); }

    Texts heard;     // on the queue only
    int errors = 0;  // on the queue only
    Event message;
    Event error;

  protected:
    void handleServerErrorImpl(vox::object) override {
        ++errors;
        error.signal();
    }
    void handleMessageImpl(vox::dict received) override {
        heard.emplace_back(vox::object(received["text"]).text());
        message.signal();
    }

  private:
    template <class... Queue>
    explicit RememberingClient(const Queue&... queue) : VoxClient("remembering", queue...) {}
};

// One end of a connection, by hand: remembers messages and its end.
struct Peer {
    explicit Peer(vox::connection started) : connection(std::move(started)) {
        connection.set_event_handler([this](const vox::object& event) {
            if (event.type() == VOX_TYPE_ERROR)
                return ended.signal();
            heard.emplace_back(vox::object(vox::dict(event)["text"]).text());
        });
        connection.set_target_queue(queue);
        connection.resume();
    }
    ~Peer() {
        connection.cancel();
        EXPECT_TRUE(waitForEnd());
    }
    bool waitForEnd() { return hasEnded || (hasEnded = ended.wait()); }
    // The text that answers.
    std::string ask(const char* text) {
        Event answered;
        std::string answer;
        connection.send_message_with_reply(
            message(text), queue, dispatch::block<void(vox::object)>([&](const vox::object& reply) {
                answer = vox::object(vox::dict(reply)["text"]).text();
                answered.signal();
            }));
        EXPECT_TRUE(answered.wait());
        return answer;
    }
    const dispatch::queue queue = dispatch::queue::create("peer");
    const vox::connection connection;
    Texts heard;  // on the queue only
    Event ended;
    bool hasEnded = false;
};

TEST(VoxServer, HandsMessagesToTheHandlersThatItsClientsGet) {
    const auto listener = vox::connection::create_anonymous_listener();
    const auto connect = [&] { return vox::endpoint::create(listener).connect(); };
    auto server = EchoServer::create(listener);
    const dispatch::queue queue = server->queue();
    {
        Peer client(connect());
        client.connection.send_message(message("one"));
        EXPECT_EQ(client.ask("two"), "two");
        EXPECT_EQ(Peer(connect()).ask("three"), "three");
        EXPECT_TRUE(server->clientError.wait());
        queue.sync([&] { server->refuses = true; });
        Peer refused(connect());
        refused.connection.send_message(message("lost"));
        EXPECT_TRUE(refused.waitForEnd());
        EXPECT_EQ(client.ask("four"), "four");
        queue.sync([&] {
            EXPECT_EQ(server->heard, (Texts{"one", "two", "three", "four"}));
            EXPECT_EQ(server->clientErrors, 1);
        });
        // It cancels its listener and hears nothing once it is gone.
        server.reset();
        drain(queue);
        client.connection.send_message(message("to nobody"));
        Peer late(connect());
        EXPECT_TRUE(late.waitForEnd());
    }
}

TEST(VoxServer, HearsOfItsPresentListenersErrorsOnly) {
    const auto server = EchoServer::create(vox::connection::create_anonymous_listener());
    const auto next = vox::connection::create_anonymous_listener();
    server->listenAt(next);
    EXPECT_EQ(Peer(vox::endpoint::create(next).connect()).ask("through it"), "through it");
    next.cancel();
    EXPECT_TRUE(server->listenerError.wait());
    EXPECT_EQ(server->queue().sync([&] { return server->listenerErrors; }), 1);
    server->listenAt(vox::connection());  // none any more
}

// A client and the other end of its connection.
class Client : public testing::Test {
  protected:
    Client() { connect(); }
    void connect() {
        auto [mine, theirs] = vox::connection::create_pair();
        mine_ = mine;
        client_->setServer(mine);
        peer_ = std::make_unique<Peer>(theirs);
    }
    int errors() {
        return client_->on([](RememberingClient& self) { return self.errors; });
    }

    std::shared_ptr<RememberingClient> client_ = RememberingClient::create();
    vox::connection mine_;
    std::unique_ptr<Peer> peer_;
};

TEST_F(Client, HearsOfItsPresentConnectionOnly) {
    const auto first = std::move(peer_);
    connect();
    EXPECT_TRUE(first->waitForEnd());
    peer_->connection.send_message(message("new"));
    EXPECT_TRUE(client_->message.wait());
    EXPECT_EQ(client_->on([](RememberingClient& self) { return self.heard; }), (Texts{"new"}));
    EXPECT_EQ(errors(), 0);
    peer_.reset();
    EXPECT_TRUE(client_->error.wait());
    EXPECT_EQ(errors(), 1);
}

TEST_F(Client, SendsWhatWaitsBeforeItFlushesOrDisconnects) {
    const dispatch::group group;
    Texts expected;
    for (int i = 0; i < 1000; ++i) {
        expected.push_back(std::to_string(i));
        client_->send(message(expected.back().c_str()));
        if (i == 100) {
            client_->flush(group);
            EXPECT_EQ(group.wait(), 0);
            EXPECT_EQ(mine_.statistics().messages_sent, 101U);
        }
    }
    client_->setServer(nullptr);
    EXPECT_TRUE(peer_->waitForEnd());
    EXPECT_EQ(peer_->queue.sync([this] { return peer_->heard; }), expected);
    EXPECT_EQ(errors(), 0) << "its own doing is no error of the server";
    client_->flush(group);
    EXPECT_EQ(group.wait(dispatch::immediately), 0) << "nothing to wait for without a connection";
}

TEST_F(Client, DropsWhatArrivesOnceItIsGone) {
    const dispatch::queue queue = client_->queue();
    Event go;
    queue.async([&go] { EXPECT_TRUE(go.wait()); });
    peer_->connection.send_message(message("too late"));
    client_.reset();
    go.signal();
    EXPECT_TRUE(peer_->waitForEnd());
    drain(queue);
    EXPECT_EQ(RememberingClient::create(queue)->queue(), queue) << "it may run on a given one";
}

// Requests are answered with what `answer` makes of an empty reply.
std::string askThrough(
    const dispatch::block<void(const vox::connection&, const vox::dict&)>& answer) {
    auto [mine, theirs] = vox::connection::create_pair();
    const auto queue = dispatch::queue::create("answering");
    theirs.set_event_handler([connection = theirs, answer](const vox::object& event) {
        const vox::dict request(event);
        const vox::dict reply = vox::object::adopt(vox_dictionary_create_reply(request.get()));
        if (reply)
            answer(connection, reply);
    });
    theirs.set_target_queue(queue);
    theirs.resume();
    return Peer(mine).ask("?");
}

TEST(AutoReply, IsSentOnceItsOwnerGoes) {
    using Answer = dispatch::block<void(const vox::connection&, const vox::dict&)>;
    EXPECT_EQ(askThrough(Answer([](const vox::connection&, const vox::dict& reply) {
                  vox::auto_reply owner(reply);
                  vox::auto_reply moved(std::move(owner));
                  moved.get()["text"] = vox::string("remote");
              })),
              "remote");
    EXPECT_EQ(askThrough(Answer([](const vox::connection& to, const vox::dict& reply) {
                  vox::auto_reply(reply, to).get()["text"] = vox::string("given");
              })),
              "given");
    EXPECT_EQ(askThrough(Answer([](const vox::connection&, vox::dict reply) {
                  // The holder starts with a dictionary that cannot be sent anywhere.
                  vox::auto_reply owner(vox::dict::create());
                  reply["text"] = vox::string("connected");
                  owner.connect(std::move(reply));
                  EXPECT_FALSE(reply);  // NOLINT(bugprone-use-after-move): so it says
              })),
              "connected");
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
