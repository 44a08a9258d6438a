#include "plr/rest/request_resource.h"

#include "support/module_client.h"
#include "support/raw_rest_client.h"

namespace {

using namespace plr::rest;
using namespace plr::test;
using Reply = std::shared_ptr<vox::object>;
using Client = std::unique_ptr<RawRestClient>;
using enum Operation;

std::string errorOf(const vox::object& reply) {
    return std::string(vox::dict(reply).text("e"));
}

// A module that provides /requests/call, as services do; touched on its queue.
class Sink : public ModuleClient {
  public:
    Sink(const vox::connection& server, const plr::RestModule::RequestHandler& handler)
        : ModuleClient("sink") {
        Event registered;
        on([&] {
            module.registerAsRequestSink("/requests/call", handler);
            module.connect(server);
            module.getPropertyOnce("", [&](auto&&) { registered.signal(); });
        });
        EXPECT_TRUE(registered.wait());
    }
};

// Servers' /requests refuse without a provider, their /queued keep two a name and
// three in all. `asker_` is registered; raw providers never answer.
class Requests : public testing::Test {
  protected:
    Requests() {
        rig_.add("/requests", requests_);
        rig_.add("/queued",
                 std::make_shared<RequestRestResource>(queue_requests{.limit = 2, .total = 3}));
        rig_.start();
        asker_ = rig_.registeredClient("asker");
    }

    [[nodiscard]] Client provider(const char* name, const char* path) const {
        Client made = rig_.registeredClient(name);
        made->send(kPush, path);
        static_cast<void>(made->takeMessages());
        return made;
    }
    void ask(const char* path, int value) const {
        asker_->ask(asker_->message(kGet, path, vox::int64(value)));
    }
    [[nodiscard]] std::string exchange(const char* path) const {
        return errorOf(asker_->exchange(asker_->message(kGet, path)));
    }
    // The errors of the next `count` answers to what was asked.
    [[nodiscard]] Texts nextErrors(std::size_t count) {
        Texts errors;
        for (std::size_t i = 0; i < count; i++) {
            EXPECT_TRUE(asker_->replied.wait());
            errors.push_back(errorOf(asker_->replies().at(seen_++)));
        }
        return errors;
    }
    // What the provider got since the last call.
    [[nodiscard]] Texts gotBy(const Client& client) const {
        static_cast<void>(asker_->textAt(""));  // all that was asked has been handled
        return client->takeMessages();
    }

    const std::shared_ptr<Recording<RequestRestResource>> requests_ =
        std::make_shared<Recording<RequestRestResource>>();
    RestServerRig rig_;
    Client asker_;
    std::size_t seen_ = 0;
};

TEST_F(Requests, AreAnsweredByTheirProviderNowOrLaterWithAValueOrAnError) {
    std::vector<Reply> kept;  // touched on the sink's queue
    Event came;
    const Sink sink(rig_.connect(), [&](const vox::object& value, const Reply& reply) {
        if (!value)
            return;
        if (value == vox::string("later"))
            kept.push_back(reply);
        else
            *reply =
                value == vox::string("bad") ? vox::error(VOX_ERROR_APPLICATION, "busy") : value;
        came.signal();
    });
    EXPECT_EQ(asker_->get("/requests/call", vox::int64(5)), vox::int64(5));
    const auto answer = [&](const vox::object& value) {
        return oneLine(asker_->exchange(asker_->message(kGet, "requests/call", value)));
    };
    EXPECT_EQ(answer(vox::string("bad")), R"({"o": "get","r": "requests/call","e": "busy"})");
    EXPECT_EQ(answer(nullptr), R"({"o": "get","r": "requests/call"})");
    EXPECT_TRUE(came.wait() && came.wait());

    asker_->ask(asker_->message(kGet, "/requests/call", vox::string("later")));
    EXPECT_TRUE(came.wait());
    EXPECT_EQ(asker_->textAt("/requests/call/waiting"), "1");
    sink.on([&] {
        *kept.at(0) = vox::int64(7);
        kept.clear();
    });
    EXPECT_TRUE(asker_->replied.wait());
    EXPECT_EQ(getReplyValue(asker_->replies().at(0)), vox::int64(7));
    EXPECT_EQ(asker_->textAt("/requests/call/waiting"), "0");
}

TEST_F(Requests, AProviderKilledInMidRequestIsToldToWhoWaitsAndASecondTakesOver) {
    Client first = provider("first", "/requests/call");
    ask("/requests/call", 1);
    asker_->send(kGet, "/requests/call", vox::int64(2));  // wants no reply
    EXPECT_EQ(gotBy(first), (Texts{"get asker /requests/call 1", "get asker /requests/call 2"}));
    EXPECT_EQ(asker_->textAt("/requests/*"), R"({"call": {"provider": "first","waiting": 2}})");
    first.reset();
    EXPECT_EQ(nextErrors(1), (Texts{"provider is gone"}));
    ASSERT_TRUE(rig_.waitForDrop());
    EXPECT_EQ(asker_->textAt("/requests"), "[]");
    EXPECT_EQ(exchange("/requests/call"), "no provider");

    // Not at the path of the asker, but at its own.
    const Client second = provider("second", "requests/call");
    ask("/requests/call", 3);
    EXPECT_EQ(gotBy(second), (Texts{"get asker requests/call 3"}));
}

TEST_F(Requests, ASecondProviderTakesTheFirstOnesPlaceAndAPopEndsEach) {
    const Client first = provider("first", "/requests/call");
    ask("/requests/call", 1);
    EXPECT_EQ(gotBy(first), (Texts{"get asker /requests/call 1"}));
    const Client second = provider("second", "/requests/call");
    ask("/requests/call", 2);
    EXPECT_EQ(gotBy(second), (Texts{"get asker /requests/call 2"}));
    asker_->send(kPop, "/requests/call");
    EXPECT_EQ(asker_->textAt("/requests/call/waiting"), "2") << "only its own POP ends a provider";
    first->send(kPop, "/requests/call");
    EXPECT_EQ(nextErrors(1), (Texts{"provider is gone"}));
    EXPECT_EQ(asker_->textAt("/requests/*"), R"({"call": {"provider": "second","waiting": 1}})");
    second->send(kPop, "/requests/call");
    EXPECT_EQ(nextErrors(1), (Texts{"provider is gone"}));
    EXPECT_EQ(asker_->textAt("/requests"), "[]");
}

TEST_F(Requests, WaitForAProviderInOrderAndWithinLimits) {
    for (int i = 1; i <= 3; i++)
        ask("/queued/a", i);  // the third is one too many
    EXPECT_EQ(nextErrors(1), (Texts{"too many requests"}));
    asker_->send(kGet, "/queued/b", vox::int64(4));
    EXPECT_EQ(exchange("/queued/c"), "too many requests") << "three wait in all";
    EXPECT_EQ(asker_->textAt("/queued/*"),
              R"({"a": {"provider": null,"waiting": 2},"b": {"provider": null,"waiting": 1}})");

    Client first = rig_.registeredClient("first");
    first->send(kPush, "/queued/a");
    EXPECT_EQ(first->takeMessages(), (Texts{"get asker /queued/a 1", "get asker /queued/a 2"}));
    ask("/queued/a", 5);
    EXPECT_EQ(gotBy(first), (Texts{"get asker /queued/a 5"}));
    first.reset();
    EXPECT_EQ(nextErrors(3), Texts(3, "provider is gone"));
    ASSERT_TRUE(rig_.waitForDrop());
    ask("/queued/a", 6);
    EXPECT_EQ(gotBy(provider("second", "/queued/b")), Texts()) << "it got them at its PUSH";
    EXPECT_EQ(asker_->textAt("/queued/a/waiting"), "1");
}

TEST_F(Requests, OfAClientThatDropsWaitNoMore) {
    const Client provider = this->provider("provider", "/queued/call");
    Client other = rig_.registeredClient("other");
    for (const char* path : {"/queued/call", "/queued/a", "/queued/a"})
        other->ask(other->message(kGet, path));
    static_cast<void>(other->takeMessages());
    ask("/queued/a", 1);
    EXPECT_EQ(nextErrors(1), (Texts{"too many requests"}));
    other.reset();
    ASSERT_TRUE(rig_.waitForDrop());
    EXPECT_EQ(asker_->textAt("/queued/*"), R"({"call": {"provider": "provider","waiting": 0}})");
    for (const char* path : {"/queued/a", "/queued/a", "/queued/b"})
        ask(path, 1);
    EXPECT_EQ(asker_->textAt("/queued/a/waiting") + asker_->textAt("/queued/b/waiting"), "21");
}

TEST_F(Requests, AtAProviderHaveALimitToo) {
    const Client provider = this->provider("provider", "/requests/call");
    for (std::size_t i = 0; i < RequestRestResource::kMaximumWaiting; i++)
        ask("/requests/call", 1);
    EXPECT_EQ(exchange("/requests/call"), "too many requests");
    EXPECT_EQ(asker_->textAt("/requests/call/waiting"), "1024");
    provider->send(kPop, "/requests/call");
    EXPECT_EQ(nextErrors(1), (Texts{"provider is gone"}));
}

TEST_F(Requests, HandleTheseMessagesOnly) {
    const Client provider = this->provider("provider", "/requests/call");
    const Client stranger = rig_.client("stranger");
    const struct {
        const char* path;
        const char* handled;  // of GET, PUSH, POP, SET and NOTIFY
        const char* got;      // of GET, "" where it is not answered
    } rows[] = {
        {"/requests", "get ", R"([0: "call"])"},
        {"/requests/*", "get ", R"({"call": {"provider": "provider","waiting": 0}})"},
        {"/requests/new", "get pop ", "null"},
        {"/requests/new/provider", "get ", "null"},
        {"/requests/new/waiting", "get ", "0"},
        {"/requests/call/provider", "get ", "\"provider\""},
        {"/requests/call/waiting", "get ", "0"},
        {"/requests/call/other", "", ""},
        {"/requests/call/waiting/x", "", ""},
        {"/requests/*/x", "", ""},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.path);
        EXPECT_EQ(rig_.handledBy(*requests_, *stranger, row.path), row.handled);
        if (*row.got) {
            EXPECT_EQ(stranger->textAt(row.path), row.got);
        }
    }
    EXPECT_EQ(stranger->textAt("/requests"), R"([0: "call"])") << "none of these makes a name";
}

}  // namespace
