#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "rest/module_fixture.h"

// What a module sends, and what it does with what it gets.
namespace {

using plr::RestModule;
using plr::rest::Operation;
using plr::test::drain;
using plr::test::Event;
using plr::test::Module;
using plr::test::RawRestClient;
using plr::test::Texts;
using Reply = std::shared_ptr<vox::object>;

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

}  // namespace
