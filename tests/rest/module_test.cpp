#include "plr/rest/rest_module.h"

#include <gmock/gmock.h>

#include "support/raw_rest_client.h"

// What a module sends, what it does with what it gets, and what happens when its
// server comes and goes.
namespace {

using namespace plr;
using namespace plr::rest;
using namespace plr::test;
using Reply = std::shared_ptr<vox::object>;
using Block = dispatch::block<void(vox::object)>;

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
    static void ignore(const vox::object&, const Reply&) {}
    // A new server at the other end; the connection for the module.
    vox::connection newServer() {
        auto [mine, theirs] = vox::connection::create_pair();
        server_ = std::make_unique<RawRestClient>(theirs, "server");
        return mine;
    }
    void connect() {
        on([this, mine = newServer()] { module_->connect(mine); });
    }
    // What the module has sent since the last call, as "operation me path value".
    Texts heard() { return server_->takeMessagesBefore(createPingMessage()); }
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
            calls_.push_back(label + (" " + oneLine(value)));
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
        module_->setProperty("/lost", vox::int64(0));
        module_->observeProperty("/b", remember("b"));
        module_->observeEvent("/a", remember("a"));
        module_->registerAsRequestSink("/z", RestModule::RequestHandler(ignore));
        module_->registerAsRequestSink("/y", RestModule::RequestHandler(ignore));
        EXPECT_FALSE(module_->isConnected());
    });
    connect();
    EXPECT_EQ(heard(), (Texts{"push me /connections null", "push me /y null", "push me /z null",
                              "push me /a null", "push me /b null"}));
    on([this] {
        EXPECT_TRUE(module_->isConnected());
        module_->disconnect();
        EXPECT_FALSE(module_->isConnected());
        module_->unobserveEvent("/a");
        module_->deregisterAsRequestSink("/y");
    });
    EXPECT_TRUE(server_->waitForEnd());
    const Texts rest = {"push me /connections null", "push me /z null", "push me /b null"};
    connect();
    EXPECT_EQ(heard(), rest);
    // A second connection in place of the first, and one that cannot be.
    const auto first = std::move(server_);
    connect();
    EXPECT_TRUE(first->waitForEnd());
    EXPECT_EQ(heard(), rest);
    on([this] {
        EXPECT_THAT([this] { module_->connect(vox::connection()); },
                    testing::ThrowsMessage<std::invalid_argument>(
                        "RestModule::connect cannot be called with a null connection"));
        EXPECT_TRUE(module_->isConnected());
    });
}

TEST_F(Module, ObservingAgainKeepsTheFirstHandler) {
    connect();
    heard();
    on([this] {
        module_->observeProperty("/p", remember("first"));
        module_->observeProperty("/p", Block(remember("second")));
        module_->observeEvent("/p", Block(remember("third")));
    });
    EXPECT_EQ(heard(), (Texts{"push me /p null"}));
    on([this] { module_->observeProperty("/p", Block(remember("forced")), force_resubscribe); });
    EXPECT_EQ(heard(), (Texts{"push me /p null"}));
    notify("/p", vox::int64(1));
    EXPECT_EQ(calls(), (Texts{"first 1"}));
    on([this] {
        module_->unobserveProperty("/p");
        module_->unobserveProperty("/p");
        module_->observeProperty("/p", RestModule::Handler());
        module_->observeEvent("/p", Block());
        module_->observeProperty("/new", remember("new"), force_resubscribe);
    });
    EXPECT_EQ(heard(), (Texts{"pop me /p null", "push me /new null"}));
    notify("/p", vox::int64(2));
    EXPECT_EQ(calls(), Texts());
}

TEST_F(Module, RegisteringASinkAgainReplacesItsHandler) {
    connect();
    heard();
    const auto answering = [](const char* text) {
        return RestModule::RequestHandlerBlock([text](const vox::object&, const Reply& reply) {
            *reply = vox::string(std::string_view(text));
        });
    };
    on([&] {
        module_->registerAsRequestSink("/r", answering("first"));
        module_->registerAsRequestSink("/r", answering("second"));
    });
    EXPECT_EQ(heard(), (Texts{"push me /r null"}));
    EXPECT_EQ(server_->get("/r"), vox::string("second"));
    on([&] {
        module_->deregisterAsRequestSink("/r");
        module_->registerAsRequestSink("/r", RestModule::RequestHandler());
    });
    EXPECT_EQ(heard(), (Texts{"pop me /r null"}));
}

TEST_F(Module, AnswersARequestWhenItsHolderLetsGoAndAPingAtOnce) {
    Reply kept;  // touched on the queue only
    connect();
    on([&] {
        module_->registerAsRequestSink("/r", [&kept](const vox::object& value, const Reply& reply) {
            EXPECT_EQ(value, vox::int64(1));
            kept = reply;
        });
    });
    server_->ask(server_->message(Operation::kGet, "/r", vox::int64(1)));
    EXPECT_EQ(oneLine(server_->exchange(createPingMessage())), R"({"o": "ping"})");
    tell(createPingMessage());  // one that wants no answer
    on([&] {
        ASSERT_TRUE(kept);
        *kept = vox::int64(2);
        kept.reset();
    });
    EXPECT_TRUE(server_->replied.wait());
    EXPECT_EQ(oneLine(server_->replies()[0]), R"({"o": "get","r": "/r","v": 2})");
}

TEST_F(Module, DropsWhatItDoesNotKnow) {
    connect();
    on([this] {
        module_->observeProperty("/p", remember("p"));
        module_->registerAsRequestSink("/r", [this](const vox::object&, const Reply& reply) {
            calls_.push_back(reply ? "request" : "request without reply");
        });
    });
    const auto message = [](const vox::object& operation, const vox::object& path) {
        return createRestMessage(operation, nullptr, path, nullptr);
    };
    const vox::object get = vox::string("get"), notify = vox::string("notify");
    const vox::object p = vox::string("/p"), r = vox::string("/r");
    const vox::dict messages[] = {
        message(notify, vox::string("/unknown")),
        message(notify, vox::string("/p/")),
        message(notify, vox::string(std::string())),
        message(get, vox::string(std::string())),
        message(get, p),
        message(vox::string("set"), p),
        message(vox::string("push"), r),
        message(vox::int64(5), p),
        message(nullptr, p),
        message(notify, vox::int64(5)),
        message(notify, vox::dict::create()),
        vox::dict::create(),
    };
    for (const vox::dict& dropped : messages)
        tell(dropped);
    EXPECT_EQ(calls(), Texts());
    tell(message(get, r));
    const vox::dict bare = vox::dict::create();
    bare["o"] = notify;
    bare["r"] = p;
    tell(bare);
    EXPECT_EQ(calls(), (Texts{"request without reply", "p null"}));
}

TEST_F(Module, SendsWhatItIsTold) {
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
    EXPECT_EQ(heard(), (Texts{"set me /p 1", "set me /e 2", "set me /s null", "push me /u 3",
                              "pop me /o 4", "notify me /n 5"}));
}

TEST_F(Module, AHandlerMayChangeTheRegistrations) {
    connect();
    on([this] {
        module_->observeProperty("/p", [this](const vox::object& value) {
            module_->unobserveProperty("/p");
            for (const char* path : {"/1", "/2", "/3", "/4", "/5", "/6", "/7", "/8"})
                module_->observeProperty(path, Block(remember(path)));
            calls_.push_back("once " + oneLine(value));
        });
    });
    notify("/p", vox::int64(1));
    notify("/p", vox::int64(2));
    notify("/8", vox::int64(3));
    EXPECT_EQ(calls(), (Texts{"once 1", "/8 3"}));
}

// ---- Requests, and a server that comes and goes ---------------------------------------

TEST_F(Module, AnswersAtOnceWhileDisconnected) {
    on([this] {
        module_->sendRequest("/r", vox::int64(1), remember("request"));
        module_->getPropertyOnce("/p", remember("once"));
        module_->sendRawGet("/g", Block(remember("raw")));
        EXPECT_EQ(calls_, (Texts{"request null", "once null", "raw null"}));
        module_->sendRequest("/r", vox::int64(1), RestModule::Handler());
        module_->flush(dispatch::group());
    });
    module_->flush();  // returns at once
}

TEST_F(Module, LearnsOfTheServersEndAndMayConnectAgain) {
    connect();
    on([this] {
        module_->observeProperty("/p", remember("p"));
        module_->getPropertyOnce("/p", remember("unanswered"));
    });
    heard();
    Event reconnected;
    const auto first = std::move(server_);
    on([&] {
        module_->setServerErrorHandler([&](const vox::object& error) {
            EXPECT_EQ(error.type(), VOX_TYPE_ERROR);
            EXPECT_FALSE(module_->isConnected());
            EXPECT_EQ(calls_, (Texts{"unanswered null"}));
            module_->connect(newServer());
            reconnected.signal();
        });
    });
    first->connection().cancel();
    ASSERT_TRUE(reconnected.wait());
    EXPECT_EQ(heard(), (Texts{"push me /connections null", "push me /p null"}));
    on([&] { module_->setServerErrorHandler(RestModule::Handler()); });
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
    const vox::connection mine = newServer();
    const dispatch::group group;
    on([&] {
        module_->connect(mine);
        for (int i = 0; i < 1000; ++i)
            module_->setProperty("/p", vox::int64(i));
        module_->flush(group);
    });
    module_->flush();
    EXPECT_EQ(group.wait(), 0);
    EXPECT_EQ(mine.statistics().queued_messages, 0U);
    EXPECT_GE(mine.statistics().messages_sent, 1001U);
    EXPECT_EQ(heard().size(), 1001U);
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
