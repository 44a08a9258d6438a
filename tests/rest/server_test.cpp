#include "plr/rest/rest_server_example.h"

#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "plr/base/report.h"
#include "support/fake_rest.h"
#include "support/raw_rest_client.h"

namespace {

using plr::rest::Operation;
using plr::rest::PathView;
using plr::rest::RestResource;
using plr::rest::RestResourceConnection;
using plr::rest::RestResourceContext;
using plr::rest::RestServerExample;
using plr::rest::TreeRestResource;
using plr::test::Event;
using plr::test::FakeRestResource;
using plr::test::RawRestClient;
using plr::test::RestServerRig;
using Texts = std::vector<std::string>;

std::string text(const vox::object& value) {
    return RawRestClient::oneLine(value);
}

TEST(RestServer, RefusesToConnectToNothing) {
    const auto server =
        RestServerExample::create(dispatch::queue::create("server"), "any name at all");
    try {
        server->connect(vox::connection());
        FAIL();
    } catch (const std::invalid_argument& error) {
        EXPECT_STREQ(error.what(), "RestServer::connect cannot be called with a null connection");
    }
}

TEST(RestServer, RegistersResourcesBelowTheirNodes) {
    const RestServerRig rig;
    EXPECT_FALSE(rig.server().registerResource("/a/b", std::make_shared<RestResource>()));
    EXPECT_FALSE(rig.server().registerResource("/", std::make_shared<RestResource>()));
    EXPECT_FALSE(rig.server().registerResource("/a", nullptr));
    rig.add("///a/", std::make_shared<TreeRestResource>());
    rig.add("a/b", std::make_shared<FakeRestResource>());
    // From the server's own queue too.
    rig.queue().sync([&] { rig.add("/a/c", std::make_shared<FakeRestResource>()); });
    rig.start();
    EXPECT_EQ(text(rig.client("me")->get("/a")), R"([0: "b",1: "c"])");
}

// Answers what it sees of the author.
class Author : public RestResource {
  public:
    bool handleRestMessage_GET(RestResourceContext& context, const PathView&) override {
        const auto author = context.getAuthorResource();
        context.sendReplyWithValue(vox::string("%s, says %s", author ? "known" : "unknown",
                                               context.getRestAuthor().to_string().c_str()));
        return true;
    }
};

TEST(RestServer, KnowsAuthorsThroughTheFirstConnectionsResource) {
    const struct {
        const char* name;
        const char* path;
        std::shared_ptr<plr::rest::RestResourceBase> resource;
        const char* expected;
    } rows[] = {
        {"connections", "/connections", std::make_shared<plr::rest::ConnectionRestResource>(),
         R"("known, says "me"")"},
        // Deliberate: only this spelling makes it the server's own.
        {"no slash", "connections", std::make_shared<plr::rest::ConnectionRestResource>(),
         R"("unknown, says "me"")"},
        {"two slashes", "//connections", std::make_shared<plr::rest::ConnectionRestResource>(),
         R"("unknown, says "me"")"},
        {"another type", "/connections", std::make_shared<FakeRestResource>(),
         R"("unknown, says "me"")"},
    };
    for (const auto& row : rows) {
        const auto server = RestServerExample::create(dispatch::queue::create("server"), "");
        EXPECT_TRUE(server->registerResource(row.path, row.resource)) << row.name;
        EXPECT_TRUE(server->registerResource("/author", std::make_shared<Author>()));
        const auto listener = vox::connection::create_anonymous_listener();
        server->connect(listener);
        const RawRestClient client(vox::endpoint::create(listener).connect(), "me");
        client.registerName();
        EXPECT_EQ(text(client.get("/author")), row.expected) << row.name;
    }
}

TEST(Connections, AreListedRegisteredOnceAndForgotten) {
    const RestServerRig rig;
    rig.add("/author", std::make_shared<Author>());
    rig.start();
    const auto me = rig.registeredClient("me");
    EXPECT_EQ(text(me->get("/connections")), R"([0: "me"])");
    auto other = rig.registeredClient("b");
    EXPECT_EQ(text(other->get("/connections")), R"([0: "b",1: "me"])");
    auto third = rig.registeredClient("b");
    EXPECT_EQ(text(third->get("/connections")), R"([0: "b",1: "b",2: "me"])");
    // A second registration changes nothing.
    vox::dict again = me->message(Operation::kPush, "/connections");
    again["a"] = vox::string("renamed");
    me->send(again);
    EXPECT_EQ(text(me->get("/connections")), R"([0: "b",1: "b",2: "me"])");
    me->send(Operation::kPop, "/connections");
    me->send(Operation::kPop, "/connections");
    EXPECT_EQ(text(me->get("/connections")), R"([0: "b",1: "b"])");
    EXPECT_EQ(text(me->get("/author")), R"("unknown, says "me"")");
    other.reset();
    EXPECT_TRUE(rig.waitForDrop());
    EXPECT_EQ(text(me->get("/connections")), R"([0: "b"])");
    EXPECT_EQ(text(me->get("/connections/*")), R"([0: "b"])");
}

TEST(Connections, BoundTheirNames) {
    const RestServerRig rig;
    rig.start();
    const auto client = rig.client("me");
    const auto registerAs = [&](const vox::object& author) {
        vox::dict message = client->message(Operation::kPush, "/connections");
        message["a"] = author;
        client->send(message);
        const std::string names = text(client->get("/connections"));
        client->send(Operation::kPop, "/connections");
        return names;
    };
    const std::string longest(plr::rest::ConnectionRestResource::kMaximumNameLength, 'n');
    EXPECT_EQ(registerAs(vox::string(std::string_view(longest))), "[0: \"" + longest + "\"]");
    EXPECT_EQ(registerAs(vox::string(longest + "n")), "[]");
    EXPECT_EQ(registerAs(vox::int64(5)), R"([0: ""])");
    EXPECT_EQ(registerAs(nullptr), R"([0: ""])");
    client->send(Operation::kPush, "/connections/below");
    EXPECT_EQ(text(client->get("/connections")), "[]");
}

TEST(RestServer, RepliesWithOperationAndPathAndDropsWhatIsUnhandled) {
    const RestServerRig rig;
    rig.add("/leaf", std::make_shared<FakeRestResource>());
    rig.start();
    const auto client = rig.client("me");
    EXPECT_EQ(text(client->exchange(client->message(Operation::kGet, "/leaf/x"))),
              R"({"o": "get","r": "/leaf/x","v": "value"})");
    vox::dict rootless = client->message(Operation::kGet, "");
    rootless["r"] = vox::int64(7);
    EXPECT_EQ(text(client->exchange(rootless)),
              R"({"o": "get","r": 7,"v": [0: "connections",1: "leaf",2: "~drops"]})")
        << "something that is no path is the root";
    // None of these is answered: only the GET of the root behind each of them is.
    const vox::dict unanswered[] = {
        plr::rest::createPingMessage(),
        vox::dict::create(),
        client->message(Operation::kGet, "/unknown"),
        client->message(Operation::kGet, "/connections/unknown"),
        client->message(Operation::kPing, "/leaf"),
        client->message(Operation::kNone, "/leaf"),
        client->message(Operation::kSet, "*"),
    };
    int replies = 0;  // touched on the client's queue only
    for (const vox::dict& message : unanswered)
        client->connection().send_message_with_reply(
            message, client->queue(),
            dispatch::block<void(vox::object)>([&](const vox::object&) { ++replies; }));
    EXPECT_TRUE(client->takeMessages().empty());
    EXPECT_EQ(client->queue().sync([&] { return replies; }), 0);
    // They are answered by the end of the connection.
    client->connection().cancel();
    EXPECT_TRUE(client->waitForEnd());
    EXPECT_EQ(client->queue().sync([&] { return replies; }), 7);
}

// Redirects to itself; counts how often it is reached.
class Loop : public RestResource {
  public:
    int reached = 0;
    bool handleRestMessage_GET(RestResourceContext& context, const PathView&) override {
        ++reached;
        return context.redirect("/loop/again");
    }
    bool handleRestMessage_SET(RestResourceContext& context, const PathView&) override {
        return context.redirect("/leaf");
    }
};

TEST(RestServer, RedirectsAMessageTenTimesAtMost) {
    const RestServerRig rig;
    const auto loop = std::make_shared<Loop>();
    const auto leaf = std::make_shared<FakeRestResource>();
    rig.add("/loop", loop);
    rig.add("/leaf", leaf);
    rig.queue().sync([&] {
        const auto send = [&](Operation operation) {
            return rig.server().handleRestMessage(
                nullptr, plr::rest::createRestMessage(asObject(operation), nullptr,
                                                      vox::string("/loop"), nullptr));
        };
        EXPECT_FALSE(send(Operation::kGet));
        EXPECT_EQ(loop->reached, 11);
        EXPECT_FALSE(send(Operation::kGet)) << "each message has its own ten";
        EXPECT_EQ(loop->reached, 22);
        EXPECT_TRUE(send(Operation::kSet));
        EXPECT_EQ(leaf->calls, (Texts{"SET "}));
    });
}

// Passes a GET on to the client that has pushed itself here.
class Forwarder : public RestResource {
  public:
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView&) override {
        provider_ = context.getAuthorResource();
        return true;
    }
    bool handleRestMessage_GET(RestResourceContext& context, const PathView&) override {
        return provider_ &&
               context.sendGet(*provider_, context.getRestAuthor(), vox::string("/forwarded"),
                               context.getRestValue(), context.takeAutoReplyValue());
    }

  private:
    std::shared_ptr<RestResourceConnection> provider_;
};

TEST(RestServer, ForwardsAGetAndItsAnswer) {
    const RestServerRig rig;
    rig.add("/forward", std::make_shared<Forwarder>());
    rig.start();
    const auto moduleQueue = dispatch::queue::create("provider");
    const plr::RestModule provider(moduleQueue, "provider");
    Event ready;
    moduleQueue.sync([&] {
        provider.connect(rig.connect());
        provider.registerAsRequestSink(
            "/forwarded", [](const vox::object& value, const std::shared_ptr<vox::object>& reply) {
                *reply = vox::string("answer to %s", value.to_string().c_str());
            });
        provider.sendRawPush("/forward", nullptr);
        provider.getPropertyOnce("", [&ready](const vox::object&) { ready.signal(); });
    });
    ASSERT_TRUE(ready.wait());
    const auto client = rig.client("me");
    EXPECT_EQ(text(client->get("/forward", vox::int64(1))), R"("answer to 1")");
    moduleQueue.sync([&] { provider.disconnect(); });
    ASSERT_TRUE(rig.waitForDrop());
    EXPECT_EQ(text(client->get("/forward", vox::int64(2))), "null") << "nobody can answer";
}

// Keeps its replies.
class Late : public RestResource {
  public:
    std::vector<std::shared_ptr<vox::object>> replies;
    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override {
        if (path)
            return false;
        replies.push_back(context.takeAutoReplyValue());
        EXPECT_FALSE(context.takeAutoReplyValue()) << "there is one reply";
        EXPECT_FALSE(context.sendReplyWithValue(vox::int64(1)));
        return true;
    }
};

TEST(RestServer, DeferredRepliesLeaveWithTheirLastHolder) {
    const RestServerRig rig;
    const auto late = std::make_shared<Late>();
    rig.add("/late", late);
    rig.start();
    const auto client = rig.client("me");
    std::vector<vox::object> answers;  // touched on the client's queue only
    Event answered;
    for (int i = 0; i < 3; ++i)
        client->connection().send_message_with_reply(
            client->message(Operation::kGet, "/late"), client->queue(),
            dispatch::block<void(vox::object)>([&](const vox::object& answer) {
                answers.push_back(answer);
                answered.signal();
            }));
    EXPECT_TRUE(client->takeMessages().empty());
    auto replies = rig.queue().sync([&] { return std::exchange(late->replies, {}); });
    ASSERT_EQ(replies.size(), 3U);
    // Out of order, on another thread: an error, nothing, a value.
    *replies[2] = vox::error(7, "too late");
    replies.pop_back();
    EXPECT_TRUE(answered.wait());
    replies.erase(replies.begin());
    EXPECT_TRUE(answered.wait());
    *replies[0] = vox::int64(5);
    auto copy = replies[0];
    replies.clear();
    copy.reset();
    EXPECT_TRUE(answered.wait());
    Texts texts;
    for (const vox::object& answer : client->queue().sync([&] { return answers; }))
        texts.push_back(text(answer));
    EXPECT_EQ(texts,
              (Texts{R"({"o": "get","r": "/late","e": "too late"})", R"({"o": "get","r": "/late"})",
                     R"({"o": "get","r": "/late","v": 5})"}));
}

// A message that wants no answer gets none, and leaves nothing to hold.
TEST(RestServer, MessagesWithoutReplyAreHandledSilently) {
    const RestServerRig rig;
    const auto late = std::make_shared<Late>();
    rig.add("/late", late);
    rig.add("/leaf", std::make_shared<FakeRestResource>());
    rig.start();
    const auto client = rig.client("me");
    for (const char* path : {"/late", "/leaf", "", "*", "/connections"})
        client->send(Operation::kGet, path);
    EXPECT_TRUE(client->takeMessages().empty());
    rig.queue().sync([&] {
        ASSERT_EQ(late->replies.size(), 1U);
        EXPECT_FALSE(late->replies[0]);
        late->replies.clear();
    });
}

class Thrower : public RestResource {
  public:
    bool handleRestMessage_SET(RestResourceContext& context, const PathView&) override {
        // As a resource would that trusts its clients.
        return vox::dyn_cast_or_default(context.getRestValue(), 0ULL) != 0;
    }
};

TEST(RestServer, SurvivesAResourceThatThrows) {
    static std::string reported;
    const RestServerRig rig;
    rig.add("/throws", std::make_shared<Thrower>());
    rig.start();
    const auto client = rig.client("me");
    const plr::ReportHook before =
        plr::setReportHook([](const char* line) noexcept { reported = line; });
    client->send(Operation::kSet, "/throws", vox::int64(-1));
    EXPECT_TRUE(client->takeMessages().empty());
    plr::setReportHook(before);
    EXPECT_NE(reported.find("dyn_cast to uint64_t requires nonnegative values"), std::string::npos)
        << reported;
}

TEST(RestServer, IgnoresItsClientsOnceItIsGone) {
    RestServerRig rig;
    rig.start();
    const auto client = rig.registeredClient("me");
    EXPECT_EQ(text(client->get("/connections")), R"([0: "me"])");
    rig.stop();
    bool answered = false;  // touched on the client's queue only
    client->connection().send_message_with_reply(
        client->message(Operation::kGet, ""), client->queue(),
        dispatch::block<void(vox::object)>([&](const vox::object& reply) {
            EXPECT_EQ(reply.type(), VOX_TYPE_ERROR);
            answered = true;
        }));
    client->connection().cancel();
    EXPECT_TRUE(client->waitForEnd());
    EXPECT_TRUE(client->queue().sync([&] { return answered; }));
    const RawRestClient late(rig.connect(), "late");
    EXPECT_NE(late.connection().get(), nullptr);
}

TEST(RestServer, TellsOfItsListenersEnd) {
    const RestServerRig rig;
    rig.start();
    Event failed;
    vox::object why;
    rig.server().setListenerErrorHandler([&](const vox::object& error) {
        why = error;
        failed.signal();
    });
    rig.listener().cancel();
    EXPECT_TRUE(failed.wait());
    EXPECT_EQ(why.type(), VOX_TYPE_ERROR);
    rig.server().setListenerErrorHandler({});
}

TEST(RestServer, ListensAnewAndDropsTheOldListenersErrors) {
    const RestServerRig rig;
    rig.start();
    const auto client = rig.registeredClient("me");
    EXPECT_EQ(text(client->get("/connections")), R"([0: "me"])");
    rig.server().setListenerErrorHandler([](const vox::object&) { FAIL(); });
    const auto listener = vox::connection::create_anonymous_listener();
    rig.server().connect(listener);
    const RawRestClient other(vox::endpoint::create(listener).connect(), "other");
    other.registerName();
    EXPECT_EQ(text(other.get("/connections")), R"([0: "me",1: "other"])");
    EXPECT_EQ(text(client->get("/connections")), R"([0: "me",1: "other"])");
    rig.server().setListenerErrorHandler({});
}

}  // namespace
