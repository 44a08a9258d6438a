#include "plr/rest/rest_module.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/raw_rest_client.h"

namespace {

using plr::RestModule;
using plr::rest::Operation;
using plr::test::drain;
using plr::test::Event;
using plr::test::RawRestClient;
using Texts = std::vector<std::string>;
using Reply = std::shared_ptr<vox::object>;

// A module and, at the other end of its connection, a server played by hand.
class Module : public testing::Test {
  protected:
    ~Module() override {
        module_.reset();
        drain(queue_);
    }

    // Runs on the module's queue, as its owner's calls do.
    template <class Callable>
    auto on(Callable&& work) {
        return queue_.sync(std::forward<Callable>(work));
    }
    void connect() {
        auto [mine, theirs] = vox::connection::create_pair();
        server_ = std::make_unique<RawRestClient>(theirs, "server");
        on([this, &mine = mine] { module_->connect(mine); });
    }
    // What the module has sent since the last call, as "operation path value".
    Texts heard() {
        Texts texts;
        for (const vox::dict& message :
             server_->takeMessagesBefore(plr::rest::createPingMessage())) {
            EXPECT_EQ(vox::object(message["a"]).text(), "me");
            texts.push_back(std::string(vox::object(message["o"]).text()) + " " +
                            std::string(vox::object(message["r"]).text()) + " " +
                            RawRestClient::oneLine(message["v"]));
        }
        return texts;
    }
    // Sends to the module and waits until that was handled.
    void tell(const vox::dict& message) {
        server_->send(message);
        static_cast<void>(heard());
    }
    void notify(const char* path, const vox::object& value) {
        tell(server_->message(Operation::kNotify, path, value));
    }
    // A handler that remembers what it is called with.
    RestModule::Handler remember(const char* label) {
        return [this, label](const vox::object& value) {
            calls_.push_back(label + (" " + RawRestClient::oneLine(value)));
        };
    }
    Texts calls() {
        return on([this] { return std::exchange(calls_, {}); });
    }

    const dispatch::queue queue_ = dispatch::queue::create("module");
    std::optional<RestModule> module_{std::in_place, queue_, "me"};
    std::unique_ptr<RawRestClient> server_;
    Texts calls_;  // touched on the module's queue only
};

TEST_F(Module, RestoresRegistrationsInOrder) {
    on([this] {
        module_->observeProperty("/b", remember("b"));
        module_->observeEvent("/a", remember("a"));
        module_->registerAsRequestSink("/z", RestModule::RequestHandler([](auto&&...) {}));
        module_->registerAsRequestSink("/y", RestModule::RequestHandler([](auto&&...) {}));
        EXPECT_FALSE(module_->isConnected());
    });
    const Texts all = {"push /connections null", "push /y null", "push /z null", "push /a null",
                       "push /b null"};
    connect();
    EXPECT_EQ(heard(), all);
    on([this] {
        EXPECT_TRUE(module_->isConnected());
        module_->disconnect();
        EXPECT_FALSE(module_->isConnected());
        module_->unobserveEvent("/a");
        module_->deregisterAsRequestSink("/y");
    });
    EXPECT_TRUE(server_->waitForEnd());
    connect();
    EXPECT_EQ(heard(), (Texts{"push /connections null", "push /z null", "push /b null"}));
    // A second connection in place of the first.
    const auto first = std::move(server_);
    connect();
    EXPECT_TRUE(first->waitForEnd());
    EXPECT_EQ(heard(), (Texts{"push /connections null", "push /z null", "push /b null"}));
}

TEST_F(Module, ObservingAgainKeepsTheFirstHandler) {
    connect();
    heard();
    on([this] {
        module_->observeProperty("/p", remember("first"));
        module_->observeProperty("/p", remember("second"));
        module_->observeEvent("/p", remember("third"));
    });
    EXPECT_EQ(heard(), (Texts{"push /p null"}));
    on([this] { module_->observeProperty("/p", remember("forced"), plr::force_resubscribe); });
    EXPECT_EQ(heard(), (Texts{"push /p null"}));
    notify("/p", vox::int64(1));
    EXPECT_EQ(calls(), (Texts{"first 1"}));
    on([this] {
        module_->unobserveProperty("/p");
        module_->unobserveProperty("/p");
        module_->observeProperty("/p", RestModule::Handler());
    });
    EXPECT_EQ(heard(), (Texts{"pop /p null"}));
    notify("/p", vox::int64(2));
    EXPECT_EQ(calls(), Texts());
    on([this] { module_->observeProperty("/new", remember("new"), plr::force_resubscribe); });
    EXPECT_EQ(heard(), (Texts{"push /new null"}));
}

TEST_F(Module, RegisteringASinkAgainReplacesItsHandler) {
    connect();
    heard();
    const auto answering = [](const char* text) {
        return RestModule::RequestHandler([text](const vox::object&, const Reply& reply) {
            *reply = vox::string(std::string_view(text));
        });
    };
    on([&] {
        module_->registerAsRequestSink("/r", answering("first"));
        module_->registerAsRequestSink("/r", answering("second"));
    });
    EXPECT_EQ(heard(), (Texts{"push /r null"}));
    EXPECT_EQ(server_->get("/r"), vox::string("second"));
    on([&] {
        module_->deregisterAsRequestSink("/r");
        module_->registerAsRequestSink("/r", RestModule::RequestHandler());
    });
    EXPECT_EQ(heard(), (Texts{"pop /r null"}));
}

TEST_F(Module, AnswersARequestWhenItsHolderLetsGo) {
    Reply kept;  // touched on the queue only
    connect();
    on([&] {
        module_->registerAsRequestSink("/r", [&kept](const vox::object& value, const Reply& reply) {
            EXPECT_EQ(value, vox::int64(1));
            kept = reply;
        });
    });
    auto answered = std::make_shared<Event>();
    server_->connection().send_message_with_reply(
        server_->message(Operation::kGet, "/r", vox::int64(1)), server_->queue(),
        dispatch::block<void(vox::object)>([answered](const vox::object& reply) {
            EXPECT_EQ(RawRestClient::oneLine(reply), R"({"o": "get","r": "/r","v": 2})");
            answered->signal();
        }));
    heard();
    on([&] {
        ASSERT_TRUE(kept);
        *kept = vox::int64(2);
        kept.reset();
    });
    EXPECT_TRUE(answered->wait());
}

TEST_F(Module, DropsWhatItDoesNotKnow) {
    connect();
    on([this] {
        module_->observeProperty("/p", remember("p"));
        module_->registerAsRequestSink("/r", [this](const vox::object&, const Reply& reply) {
            calls_.push_back(reply ? "request" : "request without reply");
        });
    });
    heard();
    const auto odd = [this](const char* key, const vox::object& value) {
        const vox::dict message = server_->message(Operation::kNotify, "/p");
        message[key] = value;
        return message;
    };
    const vox::dict messages[] = {
        server_->message(Operation::kNotify, "/unknown"),
        server_->message(Operation::kNotify, "/p/"),
        server_->message(Operation::kNotify, ""),
        server_->message(Operation::kGet, "/p"),
        server_->message(Operation::kGet, ""),
        server_->message(Operation::kSet, "/p"),
        server_->message(Operation::kPush, "/r"),
        odd("o", vox::int64(5)),
        odd("o", nullptr),
        odd("r", vox::int64(5)),
        odd("r", vox::dict::create()),
        vox::dict::create(),
    };
    for (const vox::dict& message : messages)
        tell(message);
    EXPECT_EQ(calls(), Texts());
    tell(server_->message(Operation::kGet, "/r"));
    const vox::dict bare = vox::dict::create();
    bare["o"] = vox::string("notify");
    bare["r"] = vox::string("/p");
    tell(bare);
    EXPECT_EQ(calls(), (Texts{"request without reply", "p null"}));
}

TEST_F(Module, AnswersAPingWithItsOperation) {
    connect();
    EXPECT_EQ(RawRestClient::oneLine(server_->exchange(plr::rest::createPingMessage())),
              R"({"o": "ping"})");
    tell(plr::rest::createPingMessage());  // one that wants no answer
}

TEST_F(Module, SendsWhatItIsTold) {
    on([this] { module_->setProperty("/lost", vox::int64(0)); });
    connect();
    heard();
    on([this] {
        module_->setProperty("/p", vox::int64(1));
        module_->sendEvent("/e", vox::int64(2));
        module_->sendRawSet("/s", nullptr);
        module_->sendRawPush("/u", vox::int64(3));
        module_->sendRawPop("/o", vox::int64(4));
        module_->sendRawNotify("/n", vox::int64(5));
    });
    EXPECT_EQ(heard(), (Texts{"set /p 1", "set /e 2", "set /s null", "push /u 3", "pop /o 4",
                              "notify /n 5"}));
}

TEST_F(Module, AnswersAtOnceWhileDisconnected) {
    on([this] {
        module_->sendRequest("/r", vox::int64(1), remember("request"));
        module_->getPropertyOnce("/p", remember("once"));
        module_->sendRawGet("/g", dispatch::block<void(vox::object)>(remember("raw")));
        EXPECT_EQ(calls_, (Texts{"request null", "once null", "raw null"}));
        module_->sendRequest("/r", vox::int64(1), RestModule::Handler());
    });
}

// A server's end that answers every GET with a given reply.
class Replies : public Module {
  protected:
    vox::object ask(const std::function<void(const vox::dict& reply)>& fillIn) {
        const auto listener = vox::connection::create_anonymous_listener();
        const auto serverQueue = dispatch::queue::create("server");
        listener.set_event_handler([serverQueue, fillIn](const vox::object& event) {
            const vox::connection client(event);
            client.set_event_handler([client, fillIn](const vox::object& received) {
                if (const vox::dict reply = plr::rest::createReply(vox::dict(received))) {
                    fillIn(reply);
                    client.send_message(reply);
                }
            });
            client.set_target_queue(serverQueue);
            client.resume();
        });
        listener.set_target_queue(serverQueue);
        listener.resume();
        Event answered;
        vox::object answer;
        on([&] {
            module_->connect(vox::endpoint::create(listener).connect());
            module_->sendRequest("/r", vox::int64(1), [&](const vox::object& value) {
                EXPECT_TRUE(queue_.is_current());
                answer = value;
                answered.signal();
            });
        });
        EXPECT_TRUE(answered.wait());
        on([&] { module_->disconnect(); });
        listener.cancel();
        return answer;
    }
};

TEST_F(Replies, GiveTheirValueOrNull) {
    EXPECT_EQ(ask([](const vox::dict& reply) { reply["v"] = vox::int64(5); }), vox::int64(5));
    EXPECT_EQ(ask([](const vox::dict& reply) { reply["e"] = vox::string("late"); }), vox::object());
    EXPECT_EQ(ask([](const vox::dict&) {}), vox::object());
}

TEST_F(Module, EachOf100RequestsInFlightIsAnsweredOnceWhenTheServerGoes) {
    connect();
    std::vector<int> counts(100);  // touched on the queue only
    on([&] {
        for (int& count : counts)
            module_->getPropertyOnce("/p", [&count](const vox::object& value) {
                EXPECT_EQ(value, vox::object());
                ++count;
            });
    });
    heard();
    Event gone;
    on([&] { module_->setServerErrorHandler([&](const vox::object&) { gone.signal(); }); });
    server_.reset();
    EXPECT_TRUE(gone.wait());
    EXPECT_EQ(on([&] { return counts; }), std::vector<int>(100, 1));
}

TEST_F(Module, LearnsOfTheServersEndAndMayConnectAgain) {
    connect();
    on([this] { module_->observeProperty("/p", remember("p")); });
    heard();
    Event reconnected;
    std::unique_ptr<RawRestClient> next;
    on([&] {
        module_->setServerErrorHandler([&](const vox::object& error) {
            EXPECT_EQ(error.type(), VOX_TYPE_ERROR);
            EXPECT_FALSE(module_->isConnected());
            auto [mine, theirs] = vox::connection::create_pair();
            next = std::make_unique<RawRestClient>(theirs, "server");
            module_->connect(mine);
            reconnected.signal();
        });
    });
    server_.reset();
    ASSERT_TRUE(reconnected.wait());
    server_ = std::move(next);
    EXPECT_EQ(heard(), (Texts{"push /connections null", "push /p null"}));
    on([&] { module_->setServerErrorHandler(RestModule::Handler()); });
}

TEST_F(Module, RefusesToConnectToNothing) {
    connect();
    on([this] {
        try {
            module_->connect(vox::connection());
            ADD_FAILURE();
        } catch (const std::invalid_argument& error) {
            EXPECT_STREQ(error.what(),
                         "RestModule::connect cannot be called with a null connection");
        }
        EXPECT_TRUE(module_->isConnected());
    });
    EXPECT_EQ(heard(), (Texts{"push /connections null"}));
}

TEST_F(Module, AHandlerMayChangeTheRegistrations) {
    connect();
    on([this] {
        module_->observeProperty("/p", [this](const vox::object& value) {
            module_->unobserveProperty("/p");
            for (const char* path : {"/1", "/2", "/3", "/4", "/5", "/6", "/7", "/8"})
                module_->observeProperty(path, remember(path));
            calls_.push_back("once " + RawRestClient::oneLine(value));
        });
    });
    notify("/p", vox::int64(1));
    notify("/p", vox::int64(2));
    notify("/8", vox::int64(3));
    EXPECT_EQ(calls(), (Texts{"once 1", "/8 3"}));
}

TEST_F(Module, DropsCallbacksWhenItGoes) {
    connect();
    heard();
    Event released;
    std::shared_ptr<void> held(nullptr, [&released](void*) { released.signal(); });
    on([&] {
        module_->getPropertyOnce("/p", [held](const vox::object&) { FAIL(); });
        module_->observeProperty("/p", [held](const vox::object&) { FAIL(); });
        held.reset();
        EXPECT_TRUE(module_->getWeakHandle().lock());
        module_.reset();
    });
    EXPECT_TRUE(server_->waitForEnd());
    EXPECT_TRUE(released.wait());
    module_.emplace();
    EXPECT_FALSE(module_->isConnected());
    EXPECT_FALSE(module_->getWeakHandle().lock());
}

TEST_F(Module, FlushWaitsUntilAllIsHandedOver) {
    on([this] { static_cast<void>(module_->isConnected()); });
    module_->flush();  // returns at once while disconnected
    auto [mine, theirs] = vox::connection::create_pair();
    server_ = std::make_unique<RawRestClient>(theirs, "server");
    const dispatch::group group;
    on([this, &group, &mine = mine] {
        module_->connect(mine);
        for (int i = 0; i < 1000; ++i)
            module_->setProperty("/p", vox::string("%d", i));
        module_->flush(group);
    });
    module_->flush();
    EXPECT_EQ(group.wait(), 0);
    EXPECT_EQ(mine.statistics().queued_messages, 0U);
    EXPECT_GE(mine.statistics().messages_sent, 1001U);
    EXPECT_EQ(heard().size(), 1001U);
}

TEST_F(Module, TakesBlocksToo) {
    using Block = dispatch::block<void(vox::object)>;
    connect();
    on([this] {
        module_->observeProperty("/p", Block(remember("p")));
        module_->observeProperty("/p", Block(remember("q")), plr::force_resubscribe);
        module_->observeEvent("/e", Block(remember("e")));
        module_->observeEvent("/e", Block());
        module_->registerAsRequestSink(
            "/r", RestModule::RequestHandlerBlock(
                      [](const vox::object& value, const Reply& reply) { *reply = value; }));
    });
    notify("/p", vox::int64(1));
    notify("/e", vox::int64(2));
    EXPECT_EQ(calls(), (Texts{"p 1"}));
    EXPECT_EQ(server_->get("/r", vox::int64(3)), vox::int64(3));
}

#ifdef PLR_DEBUG
TEST(ModuleDeathTest, RefusesCallsOffItsQueueInDebugBuilds) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(
        {
            const RestModule module(dispatch::queue::create("module.queue"), "me");
            static_cast<void>(module.isConnected());
        },
        "module.queue");
}
#endif

}  // namespace
