#include "plr/rest/property_resource.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "support/raw_rest_client.h"

namespace {

using namespace plr::test;
using plr::rest::Operation;
using plr::rest::PropertyRestResource;

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
        rig_.add("/events", std::make_shared<PropertyRestResource>(false));
        rig_.start();
        client_ = rig_.registeredClient("me");
        set("/kept/x", valueOfX());
        set("/events/x", valueOfX());
    }

    std::string get(const std::string& path) { return client_->textAt(path); }
    void set(const std::string& path, const vox::object& value) {
        client_->send(Operation::kSet, path, value);
    }
    void push(const std::string& path) { client_->send(Operation::kPush, path); }
    void pop(const std::string& path) { client_->send(Operation::kPop, path); }
    Texts news() { return client_->takeMessages(); }
    // What `client_` hears of what another one does.
    Texts newsOf(const std::unique_ptr<RawRestClient>& other, Operation operation,
                 const char* path) {
        other->send(operation, path, vox::int64(1));
        static_cast<void>(other->takeMessages());
        return news();
    }

    const std::shared_ptr<RecordingProperties> kept_ = std::make_shared<RecordingProperties>(true);
    RestServerRig rig_;
    std::unique_ptr<RawRestClient> client_;
};

// One kind of path: what it answers, which operations are handled there, and what
// a PUSH sends to its author at once.
struct Cell {
    const char* kind;
    const char* path;  // below the resource
    const char* got;
    const char* handled;  // of GET, SET, PUSH and POP, never NOTIFY
    Texts pushNews;
};

std::vector<Cell> cells() {
    const Texts x = {std::string("notify me /kept/x ") + kValueOfX};
    const char* const all = "get set push pop ";
    const char* const some = "get set ";
    return {
        {"Root", "", R"([0: "x"])", all, {R"(notify me /kept [0: "x"])"}},
        {"Meta", "/_", R"([0: "watchers",1: "watched"])", all, {}},
        {"MetaWatchers", "/_/watchers", "[]", all, {}},
        {"MetaWatched", "/_/watched", "[]", all, {"notify me /kept/_/watched []"}},
        {"MetaWatchedMetaWatchers", "/_/watched/_/watchers", "[]", all, {}},
        {"DumpState", "/*", R"({"x": {"k": [0: 5]}})", "get ", {}},
        {"Resource", "/x", kValueOfX, all, x},
        {"Resource below", "/x/other", kValueOfX, all, x},
        {"Resource below _", "/x/_/other", kValueOfX, all, x},
        {"Resource below watchers", "/x/_/watchers/y", kValueOfX, all, x},
        {"part", "/x@k.0", "5", "get push pop ", x},
        {"no part", "/x@", kValueOfX, all, x},
        {"ResourceMeta", "/x/_", R"([0: "watchers"])", all, {}},
        {"ResourceWatchers", "/x/_/watchers", "[]", all, {}},
        {"ResourceWatchers of a new name", "/y/_/watchers", "[]", all, {}},
        {"Unknown word", "/_/other", "null", some, {}},
        {"Unknown below watchers", "/_/watchers/x", "null", some, {}},
        {"Unknown below watched", "/_/watched/x", "null", some, {}},
        {"Unknown watched meta", "/_/watched/_", "null", some, {}},
        {"Unknown deep", "/_/watched/_/watchers/x", "null", some, {}},
        {"Unknown below the dump", "/*/x", "null", some, {}},
    };
}

TEST_F(Property, HandlesEveryOperationOnEveryKindOfPath) {
    for (const Cell& cell : cells()) {
        SCOPED_TRACE(cell.kind);
        const std::string path = std::string("/kept") + cell.path;
        std::string handled;
        const auto note = [&](const char* operation) {
            handled += rig_.queue().sync([&] { return kept_->handled; }) ? operation : "";
        };
        EXPECT_EQ(get(path), cell.got);
        note("get ");
        set(path, vox::string("new"));
        EXPECT_EQ(news(), Texts());
        note("set ");
        const bool setsX = cell.got == std::string(kValueOfX);
        EXPECT_EQ(get("/kept/x"), setsX ? R"("new")" : kValueOfX) << "only properties are set";
        set("/kept/x", valueOfX());
        push(path);
        EXPECT_EQ(news(), cell.pushNews);
        note("push ");
        pop(path);
        EXPECT_EQ(news(), Texts());
        note("pop ");
        client_->send(Operation::kNotify, path, vox::int64(1));
        EXPECT_EQ(news(), Texts());
        note("notify ");
        EXPECT_EQ(handled, cell.handled);
    }
    EXPECT_EQ(get("/kept"), R"([0: "x"])") << "none of these makes a property";
}

TEST_F(Property, GivesPartsOfItsValue) {
    const struct {
        const char* path;
        const char* expected;
    } rows[] = {
        {"/kept/x@k", "[0: 5]"},
        {"/kept/x@k.word", "null"},  // the conversion throws
        {"/kept/x@k.99999999999999999999999", "null"},
        {"/kept/new@k", "null"},
        {"/events/x@k", "null"},
        {"/events/x", "null"},
        {"/events/*", R"({"x": null})"},
        {"/events", R"([0: "x"])"},
        {"*", R"({"connections": [0: "me"],"events": {"x": null},"kept": {"x": {"k": [0: 5]}}})"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(get(row.path), row.expected) << row.path;
}

TEST_F(Property, EverySetNotifiesChangedOrNotUnderItsPathWithTheWatchersName) {
    push("kept/x");
    EXPECT_EQ(news(), (Texts{R"(notify me kept/x {"k": [0: 5]})"}));
    set("/kept/x", vox::int64(1));
    set("/kept/x", vox::int64(1));
    set("/kept/x@part", vox::int64(2));
    EXPECT_EQ(news(), (Texts{"notify me /kept/x 1", "notify me /kept/x 1"}));
    const auto setter = rig_.registeredClient("setter");
    EXPECT_EQ(newsOf(setter, Operation::kSet, "/kept/x/below"), (Texts{"notify me /kept/x 1"}));
    pop("/kept/x");
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(newsOf(setter, Operation::kSet, "/kept/x"), Texts());
    // Where values are not kept, only sets are told.
    push("/events/x");
    set("/events/x", vox::int64(2));
    EXPECT_EQ(news(), (Texts{"notify me /events/x 2"}));
}

TEST_F(Property, ANewNameIsAnnouncedToWhoWatchesTheNames) {
    push("/kept");
    push("/kept/new");
    EXPECT_EQ(news(), (Texts{R"(notify me /kept [0: "x"])", R"(notify me /kept [0: "new",1: "x"])",
                             "notify me /kept/new null"}));
    set("/kept/a", vox::int64(1));
    set("/kept/a", vox::int64(1));
    EXPECT_EQ(news(), (Texts{R"(notify me /kept [0: "a",1: "new",2: "x"])"}));
    EXPECT_EQ(get("/kept/_/watchers"), R"([0: "me"])");
    pop("/kept");
    set("/kept/b", vox::int64(1));
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(get("/kept/_/watchers"), "[]");
}

TEST_F(Property, WhatIsWatchedIsAnnouncedToWhoWatchesThat) {
    const auto other = rig_.registeredClient("other");
    push("/kept/_/watched");
    EXPECT_EQ(news(), (Texts{"notify me /kept/_/watched []"}));
    EXPECT_EQ(get("/kept/_/watched/_/watchers"), R"([0: "me"])");
    const struct {
        Operation operation;
        const char* path;
        Texts news;
    } rows[] = {
        {Operation::kPush, "/kept/x", {R"(notify me /kept/_/watched [0: "x"])"}},
        {Operation::kPush, "/kept/x", {}},
        {Operation::kPush, "/kept/y", {R"(notify me /kept/_/watched [0: "x",1: "y"])"}},
        {Operation::kPop, "/kept/z", {}},
        {Operation::kPop, "/kept/x", {R"(notify me /kept/_/watched [0: "y"])"}},
        {Operation::kPop, "/kept/x", {}},
    };
    for (const auto& row : rows)
        EXPECT_EQ(newsOf(other, row.operation, row.path), row.news) << row.path;
    EXPECT_EQ(get("/kept/_/watched"), R"([0: "y"])");
    EXPECT_EQ(get("/kept/y/_/watchers"), R"([0: "other"])");
    EXPECT_EQ(get("/kept"), R"([0: "x",1: "y"])") << "properties stay";
    pop("/kept/_/watched");
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(newsOf(other, Operation::kPop, "/kept/y"), Texts());
}

TEST_F(Property, AnUnknownClientWatchesNothingButMakesProperties) {
    push("/kept");
    news();
    const auto stranger = rig_.client("stranger");
    for (const char* path : {"/kept/new", "/kept", "/kept/_/watched"})
        for (const Operation operation : {Operation::kPush, Operation::kPop})
            stranger->send(operation, path);
    EXPECT_EQ(stranger->takeMessages(), Texts());
    EXPECT_EQ(news(), (Texts{R"(notify me /kept [0: "new",1: "x"])"}));
    EXPECT_EQ(get("/kept/new/_/watchers"), "[]");
}

TEST_F(Property, WatchersThatWentAwayExpireAndStillCountOnce) {
    push("/kept/_/watched");
    auto other = rig_.registeredClient("other");
    EXPECT_EQ(news(), (Texts{"notify me /kept/_/watched []"}));
    EXPECT_EQ(newsOf(other, Operation::kPush, "/kept/x"),
              (Texts{R"(notify me /kept/_/watched [0: "x"])"}));
    other.reset();
    ASSERT_TRUE(rig_.waitForDrop());
    EXPECT_EQ(get("/kept/x/_/watchers"), "[]");
    EXPECT_EQ(get("/kept/_/watched"), "[]");
    set("/kept/x", vox::int64(1));
    EXPECT_EQ(news(), Texts());
    // The expired entry still counts as a watcher: nobody is told of the new one.
    push("/kept/x");
    EXPECT_EQ(news(), (Texts{"notify me /kept/x 1"}));
    EXPECT_EQ(get("/kept/_/watched"), R"([0: "x"])");
    // That PUSH has cleaned up, so that now the last one leaves.
    pop("/kept/x");
    EXPECT_EQ(news(), (Texts{"notify me /kept/_/watched []"}));
}

TEST(Watchable, KnowsItsWatchersOnce) {
    plr::rest::WatchableRestResourceHelper watchers;
    std::shared_ptr<plr::rest::RestResourceConnection> first =
        std::make_shared<FakeRestConnection>("1");
    const std::shared_ptr<plr::rest::RestResourceConnection> second =
        std::make_shared<FakeRestConnection>("2");
    EXPECT_TRUE(watchers.addWatcher(first));
    EXPECT_FALSE(watchers.addWatcher(first));
    EXPECT_TRUE(watchers.addWatcher(second));
    first.reset();
    EXPECT_EQ(oneLine(watchers.getWatcherNames()), R"([0: "2"])");
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
