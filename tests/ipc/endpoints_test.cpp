#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "dispatch/group.h"
#include "plr/ipc.h"
#include "support/waiting.h"

namespace {

using plr::test::drain;
using plr::test::Event;
using Texts = std::vector<std::string>;

vox::dict message(const char* text) {
    const vox::dict made = vox::dict::create();
    made["text"] = vox::string(std::string_view(text));
    return made;
}

// A server that remembers what it is told and echoes requests.
class EchoServer : public plr::VoxServer {
  public:
    static std::shared_ptr<EchoServer> create(vox::connection listener) {
        auto made = make_shared_ptr(new EchoServer(std::move(listener)));
        made->execute_wrapped_sync([&] {
            made->ownQueue_.assertCurrent();
            made->startListener_sync();
        });
        return made;
    }
    // Runs on the server's queue, with its state.
    template <class Callable>
    auto on(Callable&& work) {
        return execute_wrapped_sync([&] { return work(*this); });
    }
    [[nodiscard]] const dispatch::queue& queue() const { return ownQueue_.queue(); }
    void replaceListener(vox::connection listener) {
        execute_wrapped_sync([&] {
            ownQueue_.assertCurrent();
            setListener_sync(std::move(listener));
            startListener_sync();
        });
    }
    vox::connection listener() {
        return execute_wrapped_sync([this] {
            ownQueue_.assertCurrent();
            return getListener_sync();
        });
    }

    bool refuses = false;  // on the queue only, as what follows
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
    static std::shared_ptr<RememberingClient> create() {
        return make_shared_ptr(new RememberingClient());
    }
    static std::shared_ptr<RememberingClient> create(const dispatch::queue& queue) {
        return make_shared_ptr(new RememberingClient(queue));
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
    Texts heard() {
        return execute_wrapped_sync([this] { return heard_; });
    }
    int errors() {
        return execute_wrapped_sync([this] { return errors_; });
    }
    Event message;
    Event error;

  protected:
    void handleServerErrorImpl(vox::object) override {
        ++errors_;
        error.signal();
    }
    void handleMessageImpl(vox::dict received) override {
        heard_.emplace_back(vox::object(received["text"]).text());
        message.signal();
    }

  private:
    RememberingClient() : VoxClient("remembering") {}
    explicit RememberingClient(const dispatch::queue& queue) : VoxClient("remembering", queue) {}
    Texts heard_;     // on the queue only
    int errors_ = 0;  // on the queue only
};

// One end of a connection, by hand: remembers messages and its end.
struct Peer {
    explicit Peer(vox::connection started) : connection(std::move(started)) {
        connection.set_event_handler([this](const vox::object& event) {
            if (event.type() == VOX_TYPE_ERROR)
                return ended.signal();
            heard.emplace_back(vox::object(vox::dict(event)["text"]).text());
            message.signal();
        });
        connection.set_target_queue(queue);
        connection.resume();
    }
    ~Peer() {
        if (connection)
            connection.cancel();
        if (!hasEnded) {
            EXPECT_TRUE(ended.wait());
        }
    }
    bool waitForEnd() { return hasEnded = ended.wait(); }
    vox::object ask(const char* text) {
        Event answered;
        vox::object answer;
        connection.send_message_with_reply(
            ::message(text), queue, dispatch::block<void(vox::object)>([&](vox::object reply) {
                answer = std::move(reply);
                answered.signal();
            }));
        EXPECT_TRUE(answered.wait());
        return answer;
    }
    const dispatch::queue queue = dispatch::queue::create("peer");
    const vox::connection connection;
    Texts heard;  // on the queue only
    Event message;
    Event ended;
    bool hasEnded = false;
};

// A server on an anonymous listener.
class Server : public testing::Test {
  protected:
    ~Server() override {
        const dispatch::queue queue = server_ ? server_->queue() : dispatch::queue::create("none");
        server_.reset();
        drain(queue);
    }
    [[nodiscard]] vox::connection connect() const {
        return vox::endpoint::create(listener_).connect();
    }

    const vox::connection listener_ = vox::connection::create_anonymous_listener();
    std::shared_ptr<EchoServer> server_ = EchoServer::create(listener_);
};

TEST_F(Server, HandsMessagesToTheClientsHandler) {
    Peer first(connect());
    Peer second(connect());
    first.connection.send_message(message("one"));
    EXPECT_EQ(first.ask("two").to_string(), "{\n\t\"text\": \"two\"\n}");
    EXPECT_EQ(second.ask("three").type(), VOX_TYPE_DICTIONARY);
    EXPECT_EQ(server_->on([](EchoServer& self) { return self.heard; }),
              (Texts{"one", "two", "three"}));
}

TEST_F(Server, RefusesAClientWithoutAHandler) {
    server_->on([](EchoServer& self) { self.refuses = true; });
    Peer refused(connect());
    refused.connection.send_message(message("lost"));
    EXPECT_TRUE(refused.waitForEnd());
    server_->on([](EchoServer& self) {
        EXPECT_EQ(self.heard, Texts());
        EXPECT_EQ(self.clientErrors, 0);
        self.refuses = false;
    });
    Peer accepted(connect());
    EXPECT_EQ(accepted.ask("heard").type(), VOX_TYPE_DICTIONARY);
}

TEST_F(Server, LearnsOfAClientsEnd) {
    std::optional<Peer> client(connect());
    EXPECT_EQ(client->ask("here").type(), VOX_TYPE_DICTIONARY);
    client.reset();
    EXPECT_TRUE(server_->clientError.wait());
    EXPECT_EQ(server_->on([](EchoServer& self) { return self.clientErrors; }), 1);
}

TEST_F(Server, HearsOfItsPresentListenersErrorsOnly) {
    const auto next = vox::connection::create_anonymous_listener();
    server_->replaceListener(next);
    EXPECT_EQ(server_->listener().get(), next.get());
    Peer client(vox::endpoint::create(next).connect());
    EXPECT_EQ(client.ask("through the new one").type(), VOX_TYPE_DICTIONARY);
    EXPECT_EQ(server_->on([](EchoServer& self) { return self.listenerErrors; }), 0);
    next.cancel();
    EXPECT_TRUE(server_->listenerError.wait());
    EXPECT_EQ(server_->on([](EchoServer& self) { return self.listenerErrors; }), 1);
    server_->replaceListener(nullptr);
    EXPECT_FALSE(server_->listener());
}

TEST_F(Server, CancelsItsListenerAndHearsNothingOnceItIsGone) {
    Peer client(connect());
    EXPECT_EQ(client.ask("here").type(), VOX_TYPE_DICTIONARY);
    const dispatch::queue queue = server_->queue();
    server_.reset();
    drain(queue);
    client.connection.send_message(message("to nobody"));
    Peer late(connect());
    EXPECT_TRUE(late.waitForEnd());
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

    std::shared_ptr<RememberingClient> client_ = RememberingClient::create();
    vox::connection mine_;
    std::unique_ptr<Peer> peer_;
};

TEST_F(Client, HandsOnMessagesAndTheServersError) {
    peer_->connection.send_message(message("hello"));
    EXPECT_TRUE(client_->message.wait());
    EXPECT_EQ(client_->heard(), (Texts{"hello"}));
    peer_.reset();
    EXPECT_TRUE(client_->error.wait());
    EXPECT_EQ(client_->errors(), 1);
}

TEST_F(Client, SendsWhatWaitsBeforeItDisconnects) {
    Texts expected;
    for (int i = 0; i < 1000; ++i) {
        expected.push_back(std::to_string(i));
        client_->send(message(expected.back().c_str()));
    }
    client_->setServer(nullptr);
    EXPECT_TRUE(peer_->waitForEnd());
    EXPECT_EQ(peer_->queue.sync([this] { return peer_->heard; }), expected);
    drain(client_->queue());
    EXPECT_EQ(client_->errors(), 0) << "its own doing is no error of the server";
}

TEST_F(Client, HearsOfItsPresentConnectionsErrorsOnly) {
    const auto first = std::move(peer_);
    connect();
    EXPECT_TRUE(first->waitForEnd());
    peer_->connection.send_message(message("new"));
    EXPECT_TRUE(client_->message.wait());
    EXPECT_EQ(client_->errors(), 0);
    peer_.reset();
    EXPECT_TRUE(client_->error.wait());
    EXPECT_EQ(client_->errors(), 1);
}

TEST_F(Client, FlushesIntoAGroup) {
    const dispatch::group group;
    for (int i = 0; i < 100; ++i)
        client_->send(message("x"));
    client_->flush(group);
    EXPECT_EQ(group.wait(), 0);
    EXPECT_EQ(mine_.statistics().messages_sent, 100U);
    client_->setServer(nullptr);
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
}

TEST_F(Client, MayRunOnAGivenQueue) {
    const auto queue = dispatch::queue::create("given");
    const auto client = RememberingClient::create(queue);
    EXPECT_EQ(client->queue(), queue);
}

// Requests are answered with what `answer` makes of an empty reply.
vox::object askThrough(const dispatch::block<void(vox::connection, vox::dict)>& answer) {
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
    Peer peer(mine);
    return peer.ask("?");
}

TEST(AutoReply, IsSentOnceItsOwnerGoes) {
    using Answer = dispatch::block<void(vox::connection, vox::dict)>;
    const auto textOf = [](const vox::object& reply) {
        return std::string(vox::object(vox::dict(reply)["text"]).text());
    };
    EXPECT_EQ(textOf(askThrough(Answer([](const vox::connection&, const vox::dict& reply) {
                  vox::auto_reply owner(reply);
                  vox::auto_reply moved(std::move(owner));
                  moved.get()["text"] = vox::string("remote");
              }))),
              "remote");
    EXPECT_EQ(textOf(askThrough(Answer([](const vox::connection& to, const vox::dict& reply) {
                  const vox::auto_reply owner(reply, to);
                  owner.get()["text"] = vox::string("given");
              }))),
              "given");
    EXPECT_EQ(textOf(askThrough(Answer([](const vox::connection&, vox::dict reply) {
                  // The holder starts with a dictionary that cannot be sent anywhere.
                  vox::auto_reply owner(vox::dict::create());
                  reply["text"] = vox::string("connected");
                  owner.connect(std::move(reply));
                  EXPECT_FALSE(reply);  // NOLINT(bugprone-use-after-move): so it says
              }))),
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
