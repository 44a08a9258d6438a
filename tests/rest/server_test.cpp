#include "plr/rest/rest_server_example.h"

#include <gmock/gmock.h>

#include <stdexcept>

#include "support/module_client.h"
#include "support/raw_rest_client.h"
#include "support/runtime.h"
#include "support/scripted_resource.h"

namespace {

using namespace plr::rest;
using namespace plr::test;
using enum Operation;

// Answers what it sees of the author.
std::shared_ptr<RestResourceBase> author() {
    return std::make_shared<ScriptedResource>([](RestResourceContext& context, auto&&) {
        EXPECT_EQ(context.getAuthorCredentials().pid, ::getpid());
        return context.sendReplyWithValue(
            vox::string("%s, says %s", context.getAuthorResource() ? "known" : "unknown",
                        context.getRestAuthor().to_string().c_str()));
    });
}

class RestServer : public testing::Test {
  protected:
    // Starts the server; a client that it does not know.
    RawRestClient& start() {
        rig.start();
        client = rig.client("me");
        return *client;
    }

    RestServerRig rig;
    std::unique_ptr<RawRestClient> client;
};

TEST_F(RestServer, RefusesWhatIsNothingOrBelowNoNode) {
    EXPECT_THAT([this] { rig.server().connect(vox::connection()); },
                testing::ThrowsMessage<std::invalid_argument>(
                    "RestServer::connect cannot be called with a null connection"));
    EXPECT_FALSE(rig.server().registerResource("/a/b", std::make_shared<RestResource>()));
    EXPECT_FALSE(rig.server().registerResource("/", std::make_shared<RestResource>()));
    EXPECT_FALSE(rig.server().registerResource("/a", nullptr));
    rig.add("///a/", std::make_shared<TreeRestResource>());
    rig.add("a/b", std::make_shared<RestResource>());
    // From the server's own queue too.
    rig.queue().sync([&] { rig.add("/a/c", std::make_shared<RestResource>()); });
    EXPECT_EQ(start().textAt("/a"), R"([0: "b",1: "c"])");
}

TEST(RestServers, KnowAuthorsThroughTheFirstConnectionsResource) {
    const auto connections = [] { return std::make_shared<ConnectionRestResource>(); };
    const struct {
        const char* path;
        std::shared_ptr<RestResourceBase> resource;
        const char* expected;
    } rows[] = {
        {"/connections", connections(), R"("known, says "me"")"},
        // Deliberate: only this spelling makes it the server's own.
        {"connections", connections(), R"("unknown, says "me"")"},
        {"//connections", connections(), R"("unknown, says "me"")"},
        {"/connections", std::make_shared<FakeRestResource>(), R"("unknown, says "me"")"},
    };
    for (const auto& row : rows) {
        const auto server = RestServerExample::create(dispatch::queue::create("server"), "");
        EXPECT_TRUE(server->registerResource(row.path, row.resource));
        EXPECT_TRUE(server->registerResource("/author", author()));
        const auto listener = vox::listener::create_anonymous();
        server->connect(listener);
        const RawRestClient client(vox::endpoint::create(listener).connect(), "me");
        client.registerName();
        EXPECT_EQ(client.textAt("/author"), row.expected) << row.path;
    }
}

TEST_F(RestServer, ListsConnectionsThatRegisteredOnceAndForgetsThem) {
    rig.add("/author", author());
    const RawRestClient& me = start();
    me.registerName();
    EXPECT_EQ(me.textAt("/connections"), R"([0: "me"])");
    auto other = rig.registeredClient("b");
    EXPECT_EQ(other->textAt("/connections"), R"([0: "b",1: "me"])");
    const auto third = rig.registeredClient("b");
    EXPECT_EQ(third->textAt("/connections"), R"([0: "b",1: "b",2: "me"])");
    // A second registration changes nothing.
    vox::dict again = me.message(kPush, "/connections");
    again["a"] = vox::string("renamed");
    me.send(again);
    EXPECT_EQ(me.textAt("/connections"), R"([0: "b",1: "b",2: "me"])");
    me.send(kPop, "/connections");
    me.send(kPop, "/connections");
    EXPECT_TRUE(rig.waitForDrop()) << "for the others it is gone";
    EXPECT_EQ(me.textAt("/connections/*"), R"([0: "b",1: "b"])");
    EXPECT_EQ(me.textAt("/author"), R"("unknown, says "me"")");
    other.reset();
    EXPECT_TRUE(rig.waitForDrop());
    EXPECT_EQ(me.textAt("/connections"), R"([0: "b"])");
}

TEST_F(RestServer, BoundsTheNamesOfConnections) {
    start();
    const std::string longest(ConnectionRestResource::kMaximumNameLength, 'n');
    const std::pair<vox::object, std::string> rows[] = {
        {vox::string(std::string_view(longest)), "[0: \"" + longest + "\"]"},
        {vox::string(longest + "n"), "[]"},
        {vox::int64(5), R"([0: ""])"},
    };
    for (const auto& [name, expected] : rows) {
        vox::dict message = client->message(kPush, "/connections");
        message["a"] = name;
        client->send(message);
        EXPECT_EQ(client->textAt("/connections"), expected);
        client->send(kPop, "/connections");
    }
    client->send(kPush, "/connections/below");
    EXPECT_EQ(client->textAt("/connections"), "[]");
}

TEST_F(RestServer, BoundsTheNamesThatClientsMakeWhereThatIsWanted) {
    const auto assertions = std::make_shared<AssertionRestResource>();
    const auto properties = std::make_shared<PropertyRestResource>(true);
    assertions->limitNames(1);
    properties->limitNames(2);
    rig.add("/a", assertions);
    rig.add("/p", properties);
    start().registerName();
    for (const char* path : {"/a/x", "/a/y", "/a/y/provider", "/a/x/provider", "/p/x", "/p/y"})
        client->send(kPush, path);
    for (const char* path : {"/p/z", "/p/y"})
        client->send(kSet, path, vox::int64(1));
    client->send(kPush, "/p/z");
    EXPECT_EQ(client->takeMessages(),
              (Texts{R"(notify me /a/x/provider {"generation": 1,)"
                     R"("state": "1:kPending"})",
                     "notify me /p/x null", "notify me /p/y null", "notify me /p/y 1"}));
    // The service itself is not bound.
    EXPECT_TRUE(rig.handleOwn(client->message(kSet, "/p/own", vox::int64(1))));
    EXPECT_EQ(client->textAt("/p"), R"([0: "own",1: "x",2: "y"])");
    EXPECT_EQ(client->textAt("/a"), R"([0: "x"])");
}

TEST_F(RestServer, RepliesWithOperationAndPathAndDropsWhatIsUnhandled) {
    rig.add("/leaf", std::make_shared<FakeRestResource>());
    start();
    EXPECT_EQ(oneLine(client->exchange(client->message(kGet, "/leaf/x"))),
              R"({"o": "get","r": "/leaf/x","v": "value"})");
    vox::dict rootless = client->message(kGet, "");
    rootless["r"] = vox::int64(7);
    EXPECT_EQ(oneLine(client->exchange(rootless)),
              R"({"o": "get","r": 7,"v": [0: "connections",1: "leaf",2: "~drops"]})")
        << "something that is no path is the root";
    // None of these is answered: only the GET of the root behind each of them is.
    client->ask(createPingMessage());
    client->ask(vox::dict::create());
    const std::pair<Operation, const char*> unanswered[] = {{kGet, "/unknown"},
                                                            {kGet, "/connections/unknown"},
                                                            {kPing, "/leaf"},
                                                            {kNone, "/leaf"},
                                                            {kSet, "*"}};
    for (const auto& [operation, path] : unanswered)
        client->ask(client->message(operation, path));
    // Nor is what wants no answer.
    for (const char* path : {"/leaf", "", "*", "/connections"})
        client->send(kGet, path);
    EXPECT_EQ(client->takeMessages(), Texts());
    EXPECT_TRUE(client->replies().empty());
    // They are answered by the end of the connection.
    client->connection().cancel();
    EXPECT_TRUE(client->waitForEnd());
    EXPECT_EQ(client->replies().size(), 2 + std::size(unanswered));
}

TEST_F(RestServer, RedirectsAMessageTenTimesAtMost) {
    int reached = 0;
    rig.add("/loop",
            std::make_shared<ScriptedResource>(
                [&](RestResourceContext& context, auto&&) {
                    ++reached;
                    return context.redirect("/loop/again");
                },
                [](RestResourceContext& context, auto&&) { return context.redirect("/leaf"); }));
    const auto leaf = std::make_shared<FakeRestResource>();
    rig.add("/leaf", leaf);
    const auto send = [this](Operation operation) {
        return rig.handleOwn(
            createRestMessage(asObject(operation), nullptr, vox::string("/loop"), nullptr));
    };
    EXPECT_FALSE(send(kGet));
    EXPECT_EQ(reached, 11);
    EXPECT_FALSE(send(kGet)) << "each message has its own ten";
    EXPECT_EQ(reached, 22);
    EXPECT_TRUE(send(kSet));
    EXPECT_EQ(leaf->calls, (Texts{"SET "}));
}

// A GET is passed on to the client that has pushed itself there.
TEST_F(RestServer, ForwardsAGetAndItsAnswer) {
    std::shared_ptr<RestResourceConnection> provider;
    const auto forward = [&](RestResourceContext& context, auto&&) {
        return provider &&
               context.sendGet(*provider, context.getRestAuthor(), vox::string("/forwarded"),
                               context.getRestValue(), context.takeAutoReplyValue());
    };
    const auto provide = [&](RestResourceContext& context, auto&&) {
        provider = context.getAuthorResource();
        return true;
    };
    rig.add("/forward", std::make_shared<ScriptedResource>(forward, provide));
    start();
    const ModuleClient other("provider");
    Event ready;
    other.on([&] {
        other.module.connect(rig.connect());
        other.module.registerAsRequestSink(
            "/forwarded", [](const vox::object& value, const std::shared_ptr<vox::object>& reply) {
                *reply = vox::string("answer to %s", value.to_string().c_str());
            });
        other.module.sendRawPush("/forward", nullptr);
        other.module.getPropertyOnce("", [&ready](const vox::object&) { ready.signal(); });
    });
    ASSERT_TRUE(ready.wait());
    EXPECT_EQ(oneLine(client->get("/forward", vox::int64(1))), R"("answer to 1")");
    other.on([&] { other.module.disconnect(); });
    ASSERT_TRUE(rig.waitForDrop());
    EXPECT_EQ(oneLine(client->get("/forward", vox::int64(2))), "null") << "nobody can answer";
}

TEST_F(RestServer, DeferredRepliesLeaveWithTheirLastHolder) {
    std::vector<std::shared_ptr<vox::object>> replies;  // touched on the server's queue only
    rig.add("/late", std::make_shared<ScriptedResource>([&](RestResourceContext& context, auto&&) {
                replies.push_back(context.takeAutoReplyValue());
                EXPECT_FALSE(context.takeAutoReplyValue()) << "there is one reply";
                EXPECT_FALSE(context.sendReplyWithValue(vox::int64(1)));
                return true;
            }));
    start();
    for (int i = 0; i < 3; ++i)
        client->ask(client->message(kGet, "/late"));
    client->send(kGet, "/late");  // wants no answer, and leaves nothing to hold
    EXPECT_EQ(client->takeMessages(), Texts());
    auto held = rig.queue().sync([&] { return std::exchange(replies, {}); });
    ASSERT_EQ(held.size(), 4U);
    EXPECT_FALSE(held[3]);
    // Out of order, on another thread: an error, nothing, a value.
    *held[2] = vox::error(7, "too late");
    held.resize(2);
    EXPECT_TRUE(client->replied.wait());
    held.erase(held.begin());
    EXPECT_TRUE(client->replied.wait());
    *held[0] = vox::int64(5);
    auto copy = held[0];
    held.clear();
    copy.reset();
    EXPECT_TRUE(client->replied.wait());
    Texts texts;
    for (const vox::object& answer : client->replies())
        texts.push_back(oneLine(answer));
    EXPECT_EQ(texts,
              (Texts{R"({"o": "get","r": "/late","e": "too late"})", R"({"o": "get","r": "/late"})",
                     R"({"o": "get","r": "/late","v": 5})"}));
}

TEST_F(RestServer, SurvivesAResourceThatThrows) {
    const Reports reports;
    rig.add("/throws", std::make_shared<ScriptedResource>(nullptr, [](auto& context, auto&&) {
                return vox::dyn_cast_or_default(context.getRestValue(), 0ULL) != 0;
            }));
    start().send(kSet, "/throws", vox::int64(-1));
    EXPECT_EQ(client->takeMessages(), Texts());
    EXPECT_EQ(reports.count("dyn_cast to uint64_t requires nonnegative values"), 1U);
}

TEST_F(RestServer, IgnoresItsClientsOnceItIsGone) {
    EXPECT_EQ(start().textAt("/connections"), "[]");
    rig.stop();
    client->ask(client->message(kGet, ""));
    client->connection().cancel();
    EXPECT_TRUE(client->waitForEnd());
    ASSERT_EQ(client->replies().size(), 1U);
    EXPECT_EQ(client->replies()[0].type(), VOX_TYPE_ERROR);
    const auto late = rig.client("late");
}

TEST_F(RestServer, ListensAnewAndTellsOfItsPresentListenersEnd) {
    start().registerName();
    EXPECT_EQ(client->textAt("/connections"), R"([0: "me"])");
    vox::object why;  // touched on the server's queue only
    Event failed;
    rig.server().setListenerErrorHandler([&](const vox::object& error) {
        EXPECT_FALSE(why) << "also of the old one's";
        why = error;
        failed.signal();
    });
    const auto listener = vox::listener::create_anonymous();
    rig.server().connect(listener);
    const RawRestClient other(vox::endpoint::create(listener).connect(), "other");
    other.registerName();
    EXPECT_EQ(other.textAt("/connections"), R"([0: "me",1: "other"])");
    EXPECT_EQ(client->textAt("/connections"), R"([0: "me",1: "other"])");
    listener.cancel();
    EXPECT_TRUE(failed.wait());
    EXPECT_EQ(rig.queue().sync([&] { return why; }).type(), VOX_TYPE_ERROR);
    rig.server().setListenerErrorHandler({});
}

}  // namespace
