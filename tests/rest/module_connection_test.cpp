#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "rest/module_fixture.h"

// A module without a server, and what happens when one comes and goes.
namespace {

using plr::RestModule;
using plr::rest::Operation;
using plr::test::drain;
using plr::test::Event;
using plr::test::Module;
using plr::test::RawRestClient;
using plr::test::Texts;
using Reply = std::shared_ptr<vox::object>;

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
