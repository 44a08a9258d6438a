#include "plr/rest/property_resource.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "support/raw_rest_client.h"

namespace {

using plr::rest::Operation;
using plr::rest::PropertyRestResource;
using plr::test::RawRestClient;
using plr::test::RestServerRig;
using Texts = std::vector<std::string>;

// A property resource that remembers whether it handled the last message.
class RecordingProperties : public PropertyRestResource {
  public:
    using PropertyRestResource::PropertyRestResource;
    bool handleMessage(plr::rest::RestResourceContext& context,
                       const plr::rest::PathView& path) override {
        return handled = PropertyRestResource::handleMessage(context, path);
    }
    bool handled = false;  // touched on the server's queue only
};

constexpr const char* kValueOfX = R"({"k": [0: 5]})";

vox::dict valueOfX() {
    const vox::array list = vox::array::create();
    list.append(vox::int64(5));
    const vox::dict value = vox::dict::create();
    value["k"] = list;
    return value;
}

// A server with properties at /kept and /events (not kept), and a client that
// is known to it. "x" is set at both, to {"k": [5]}.
class Property : public testing::Test {
  protected:
    Property() {
        rig_.add("/kept", kept_);
        rig_.add("/events", events_);
        rig_.start();
        client_ = rig_.registeredClient("me");
        client_->send(Operation::kSet, "/kept/x", valueOfX());
        client_->send(Operation::kSet, "/events/x", valueOfX());
        EXPECT_EQ(client_->takeNotifications(), Texts());
    }

    // Whether the resource handled the last message of `client_`.
    bool lastHandled(const RecordingProperties& resource) {
        return rig_.queue().sync([&] { return resource.handled; });
    }
    std::string get(const std::string& path) { return RawRestClient::oneLine(client_->get(path)); }
    void set(const std::string& path, const vox::object& value) {
        client_->send(Operation::kSet, path, value);
    }
    void push(const std::string& path) { client_->send(Operation::kPush, path); }
    void pop(const std::string& path) { client_->send(Operation::kPop, path); }
    Texts news() { return client_->takeNotifications(); }

    RestServerRig rig_;
    const std::shared_ptr<RecordingProperties> kept_ = std::make_shared<RecordingProperties>(true);
    const std::shared_ptr<RecordingProperties> events_ =
        std::make_shared<RecordingProperties>(false);
    std::unique_ptr<RawRestClient> client_;
};

struct Cell {
    const char* kind;
    const char* path;  // below the resource
    const char* got;   // of the resource that keeps values
    bool handlesSet;
    bool handlesPush;
    bool handlesPop;
    Texts pushNews;  // what a PUSH sends to its author at once
};

const std::vector<Cell>& cells() {
    static const auto& rows = *new std::vector<Cell>{
        {"Root", "", R"([0: "x"])", true, true, true, {"me /kept [0: \"x\"]"}},
        {"Meta", "/_", R"([0: "watchers",1: "watched"])", true, true, true, {}},
        {"MetaWatchers", "/_/watchers", "[]", true, true, true, {}},
        {"MetaWatched", "/_/watched", "[]", true, true, true, {"me /kept/_/watched []"}},
        {"MetaWatchedMetaWatchers", "/_/watched/_/watchers", "[]", true, true, true, {}},
        {"DumpState", "/*", R"({"x": {"k": [0: 5]}})", false, false, false, {}},
        {"Resource", "/x", kValueOfX, true, true, true, {"me /kept/x {\"k\": [0: 5]}"}},
        {"Resource below", "/x/other", kValueOfX, true, true, true, {"me /kept/x {\"k\": [0: 5]}"}},
        {"Resource below _",
         "/x/_/other",
         kValueOfX,
         true,
         true,
         true,
         {"me /kept/x {\"k\": [0: 5]}"}},
        {"Resource below watchers",
         "/x/_/watchers/y",
         kValueOfX,
         true,
         true,
         true,
         {"me /kept/x {\"k\": [0: 5]}"}},
        {"part", "/x@k.0", "5", false, true, true, {"me /kept/x {\"k\": [0: 5]}"}},
        {"no part", "/x@", kValueOfX, true, true, true, {"me /kept/x {\"k\": [0: 5]}"}},
        {"ResourceMeta", "/x/_", R"([0: "watchers"])", true, true, true, {}},
        {"ResourceWatchers", "/x/_/watchers", "[]", true, true, true, {}},
        {"ResourceWatchers of a new name", "/y/_/watchers", "[]", true, true, true, {}},
        {"Unknown word", "/_/other", "null", true, false, false, {}},
        {"Unknown below watchers", "/_/watchers/x", "null", true, false, false, {}},
        {"Unknown below watched", "/_/watched/x", "null", true, false, false, {}},
        {"Unknown watched meta", "/_/watched/_", "null", true, false, false, {}},
        {"Unknown deep", "/_/watched/_/watchers/x", "null", true, false, false, {}},
        {"Unknown below the dump", "/*/x", "null", true, false, false, {}},
    };
    return rows;
}

TEST_F(Property, AnswersEveryKindOfPath) {
    for (const Cell& cell : cells()) {
        EXPECT_EQ(get("/kept" + std::string(cell.path)), cell.got) << cell.kind;
        EXPECT_TRUE(lastHandled(*kept_)) << cell.kind;
    }
    EXPECT_EQ(get("/kept"), R"([0: "x"])") << "a GET makes no property";
    EXPECT_EQ(news(), Texts());
}

TEST_F(Property, HandlesEveryOperationOnEveryKindOfPath) {
    for (const Cell& cell : cells()) {
        SCOPED_TRACE(cell.kind);
        const std::string path = "/kept" + std::string(cell.path);
        pop(path);
        EXPECT_EQ(news(), Texts());
        EXPECT_EQ(lastHandled(*kept_), cell.handlesPop);
        push(path);
        EXPECT_EQ(news(), cell.pushNews);
        EXPECT_EQ(lastHandled(*kept_), cell.handlesPush);
        pop(path);
        EXPECT_EQ(news(), Texts());
        client_->send(Operation::kNotify, path, vox::int64(1));
        EXPECT_EQ(news(), Texts());
        EXPECT_FALSE(lastHandled(*kept_));
    }
    EXPECT_EQ(get("/kept"), R"([0: "x"])");
}

TEST_F(Property, SetsNothingButProperties) {
    for (const Cell& cell : cells()) {
        SCOPED_TRACE(cell.kind);
        set("/kept" + std::string(cell.path), vox::string("new"));
        EXPECT_EQ(news(), Texts());
        EXPECT_EQ(lastHandled(*kept_), cell.handlesSet);
        const bool setsX = cell.handlesSet && cell.got == std::string(kValueOfX);
        EXPECT_EQ(get("/kept/x"), setsX ? R"("new")" : kValueOfX);
        set("/kept/x", valueOfX());
    }
    EXPECT_EQ(get("/kept"), R"([0: "x"])");
}

TEST_F(Property, GivesPartsOfItsValue) {
    const struct {
        const char* path;
        const char* expected;
    } rows[] = {
        {"/kept/x@k", "[0: 5]"},  {"/kept/x@k.0", "5"},
        {"/kept/x@k.1", "null"},  {"/kept/x@k.word", "null"},  // the conversion throws
        {"/kept/x@k.", "null"},   {"/kept/x@k.99999999999999999999999", "null"},
        {"/kept/x@k.-1", "null"}, {"/kept/x@z", "null"},
        {"/kept/x@k@0", "null"},  {"/kept/new@k", "null"},
        {"/kept/@k", "null"},     {"/events/x@k", "null"},
        {"/events/x", "null"},    {"/kept/new", "null"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(get(row.path), row.expected) << row.path;
}

TEST_F(Property, EverySetNotifiesChangedOrNot) {
    push("/kept/x");
    news();
    set("/kept/x", vox::int64(1));
    set("/kept/x", vox::int64(1));
    set("/kept/x@part", vox::int64(2));
    EXPECT_EQ(news(), (Texts{"me /kept/x 1", "me /kept/x 1"}));
    EXPECT_EQ(get("/kept/x"), "1");
    pop("/kept/x");
    set("/kept/x", vox::int64(3));
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(get("/kept/x"), "3");
}

TEST_F(Property, NotifiesUnderThePathOfTheSetWithTheWatchersName) {
    const auto setter = rig_.registeredClient("setter");
    push("kept/x");
    EXPECT_EQ(news(), (Texts{"me kept/x {\"k\": [0: 5]}"}));
    setter->send(Operation::kSet, "/kept/x/below", vox::int64(1));
    EXPECT_EQ(setter->takeNotifications(), Texts());
    EXPECT_EQ(news(), (Texts{"me /kept/x 1"}));
}

TEST_F(Property, ANewNameIsAnnouncedToWhoWatchesTheNames) {
    push("/kept");
    EXPECT_EQ(news(), (Texts{"me /kept [0: \"x\"]"}));
    push("/kept/new");
    EXPECT_EQ(news(), (Texts{"me /kept [0: \"new\",1: \"x\"]", "me /kept/new null"}));
    set("/kept/a", vox::int64(1));
    EXPECT_EQ(news(), (Texts{"me /kept [0: \"a\",1: \"new\",2: \"x\"]"}));
    set("/kept/a", vox::int64(1));
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(get("/kept/_/watchers"), R"([0: "me"])");
    pop("/kept");
    set("/kept/b", vox::int64(1));
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(get("/kept/_/watchers"), "[]");
}

TEST_F(Property, WhatIsWatchedIsAnnouncedToWhoWatchesThat) {
    const auto other = rig_.registeredClient("other");
    push("/kept/_/watched");
    EXPECT_EQ(news(), (Texts{"me /kept/_/watched []"}));
    EXPECT_EQ(get("/kept/_/watched/_/watchers"), R"([0: "me"])");
    const auto tell = [&](Operation operation, const char* path) {
        other->send(operation, path);
        static_cast<void>(other->takeMessages());
        return news();
    };
    EXPECT_EQ(tell(Operation::kPush, "/kept/x"), (Texts{"me /kept/_/watched [0: \"x\"]"}));
    EXPECT_EQ(tell(Operation::kPush, "/kept/x"), Texts());
    EXPECT_EQ(tell(Operation::kPush, "/kept/y"), (Texts{"me /kept/_/watched [0: \"x\",1: \"y\"]"}));
    EXPECT_EQ(get("/kept/_/watched"), R"([0: "x",1: "y"])");
    EXPECT_EQ(get("/kept/x/_/watchers"), R"([0: "other"])");
    EXPECT_EQ(tell(Operation::kPop, "/kept/z"), Texts());
    EXPECT_EQ(tell(Operation::kPop, "/kept/x"), (Texts{"me /kept/_/watched [0: \"y\"]"}));
    EXPECT_EQ(tell(Operation::kPop, "/kept/x"), Texts());
    EXPECT_EQ(get("/kept"), R"([0: "x",1: "y"])") << "properties stay";
    pop("/kept/_/watched");
    EXPECT_EQ(tell(Operation::kPop, "/kept/y"), Texts());
}

TEST_F(Property, WithoutKeptValuesOnlySetsAreTold) {
    push("/events/x");
    EXPECT_EQ(news(), Texts());
    set("/events/x", vox::int64(1));
    EXPECT_EQ(news(), (Texts{"me /events/x 1"}));
    EXPECT_EQ(get("/events/x"), "null");
    EXPECT_EQ(get("/events/*"), R"({"x": null})");
    EXPECT_EQ(get("/events"), R"([0: "x"])");
    push("/events");
    EXPECT_EQ(news(), (Texts{"me /events [0: \"x\"]"}));
}

TEST_F(Property, AnUnknownClientWatchesNothingButMakesProperties) {
    push("/kept");
    news();
    const auto stranger = rig_.client("stranger");
    for (const char* path : {"/kept/new", "/kept", "/kept/_/watched"})
        for (const Operation operation : {Operation::kPush, Operation::kPop})
            stranger->send(operation, path);
    EXPECT_EQ(stranger->takeNotifications(), Texts());
    EXPECT_EQ(news(), (Texts{"me /kept [0: \"new\",1: \"x\"]"}));
    EXPECT_EQ(get("/kept/new/_/watchers"), "[]");
}

TEST_F(Property, WatchersThatWentAwayExpireAndStillCountOnce) {
    push("/kept/_/watched");
    auto other = rig_.registeredClient("other");
    other->send(Operation::kPush, "/kept/x");
    static_cast<void>(other->takeMessages());
    EXPECT_EQ(news(), (Texts{"me /kept/_/watched []", "me /kept/_/watched [0: \"x\"]"}));
    other.reset();
    ASSERT_TRUE(rig_.waitForDrop());
    EXPECT_EQ(get("/kept/x/_/watchers"), "[]");
    EXPECT_EQ(get("/kept/_/watched"), "[]");
    set("/kept/x", vox::int64(1));
    EXPECT_EQ(news(), Texts());
    // The expired entry still counts as a watcher: nobody is told of the new one.
    push("/kept/x");
    EXPECT_EQ(news(), (Texts{"me /kept/x 1"}));
    EXPECT_EQ(get("/kept/_/watched"), R"([0: "x"])");
    // That PUSH has cleaned up, so that now the last one leaves.
    pop("/kept/x");
    EXPECT_EQ(news(), (Texts{"me /kept/_/watched []"}));
}

TEST_F(Property, DumpsAllItsValuesAsPartOfTheTree) {
    set("/kept/a", vox::int64(1));
    EXPECT_EQ(get("/kept/*"), R"({"a": 1,"x": {"k": [0: 5]}})");
    EXPECT_EQ(get("*"), R"({"connections": [0: "me"],"events": {"x": null},)"
                        R"("kept": {"a": 1,"x": {"k": [0: 5]}}})");
}

TEST(Watchable, KnowsItsWatchersOnce) {
    class Silent : public plr::rest::RestResourceConnection {
      public:
        using RestResourceConnection::RestResourceConnection;
        void send(vox::dict) const override {}
        void sendWithReply(vox::dict, dispatch::queue, ReplyHandler) const override {}
    };
    plr::rest::WatchableRestResourceHelper watchers;
    std::shared_ptr<plr::rest::RestResourceConnection> first = std::make_shared<Silent>("1");
    const std::shared_ptr<plr::rest::RestResourceConnection> second = std::make_shared<Silent>("2");
    EXPECT_TRUE(watchers.addWatcher(first));
    EXPECT_FALSE(watchers.addWatcher(first));
    EXPECT_TRUE(watchers.addWatcher(second));
    EXPECT_EQ(watchers.getWatcherNames().count(), 2U);
    first.reset();
    EXPECT_EQ(RawRestClient::oneLine(watchers.getWatcherNames()), R"([0: "2"])");
    EXPECT_FALSE(watchers.removeWatcher(nullptr));
    EXPECT_TRUE(watchers.removeWatcher(second));
    EXPECT_FALSE(watchers.removeWatcher(second));
    EXPECT_TRUE(watchers.hasWatchers());
    EXPECT_FALSE(watchers.hasActiveWatchers());
    watchers.cleanupExpired();
    EXPECT_FALSE(watchers.hasWatchers());
    watchers.addWatcher(second);
    watchers.removeWatchers();
    EXPECT_FALSE(watchers.hasWatchers());
}

}  // namespace
