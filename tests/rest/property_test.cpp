#include "plr/rest/property_resource.h"

#include <algorithm>

#include "support/raw_rest_client.h"

namespace {

using namespace plr::test;
using plr::rest::Operation;
using plr::rest::PropertyRestResource;

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

    const std::shared_ptr<Recording<PropertyRestResource>> kept_ =
        std::make_shared<Recording<PropertyRestResource>>(true);
    RestServerRig rig_;
    std::unique_ptr<RawRestClient> client_;
};

// One kind of path: what it answers to "me", who watches x, the names and what is
// watched; then, watched by nobody, which operations are handled there, and what
// SET and PUSH change. A POP undoes the PUSH, and where they change nothing they do
// nothing.
struct Cell {
    const char* kind;
    const char* path;  // below the resource
    const char* got;
    const char* handled;  // of GET, SET, PUSH and POP, never NOTIFY
    Texts set = {};
    Texts pushed = {};
    Texts pushNews = {};  // what a PUSH sends to its author at once
};

std::vector<Cell> cells() {
    const char* const me = R"([0: "me"])";
    const char* const x = R"([0: "x"])";
    const Texts set = {R"(* {"x": "new"})"};
    const Texts pushed = {R"(_/watched [0: "x"])", R"(x/_/watchers [0: "me"])"};
    const Texts news = {std::string("notify me /kept/x ") + kValueOfX};
    const char* const all = "get set push pop ";
    const char* const some = "get set ";
    return {
        {"Root", "", x, all, {}, {R"(_/watchers [0: "me"])"}, {R"(notify me /kept [0: "x"])"}},
        {"Meta", "/_", R"([0: "watchers",1: "watched"])", all},
        {"MetaWatchers", "/_/watchers", me, all},
        {"MetaWatched",
         "/_/watched",
         x,
         all,
         {},
         {R"(_/watched/_/watchers [0: "me"])"},
         {"notify me /kept/_/watched []"}},
        {"MetaWatchedMetaWatchers", "/_/watched/_/watchers", me, all},
        {"DumpState", "/*", R"({"x": {"k": [0: 5]}})", "get "},
        {"Resource", "/x", kValueOfX, all, set, pushed, news},
        {"Resource below", "/x/other", kValueOfX, all, set, pushed, news},
        {"Resource below _", "/x/_/other", kValueOfX, all, set, pushed, news},
        {"Resource below watchers", "/x/_/watchers/y", kValueOfX, all, set, pushed, news},
        {"part", "/x@k.0", "5", "get push pop ", {}, pushed, news},
        {"no part", "/x@", kValueOfX, all, set, pushed, news},
        {"ResourceMeta", "/x/_", R"([0: "watchers"])", all},
        {"ResourceWatchers", "/x/_/watchers", me, all},
        {"ResourceWatchers of a new name", "/y/_/watchers", "[]", all},
        {"Unknown word", "/_/other", "null", some},
        {"Unknown below watchers", "/_/watchers/x", "null", some},
        {"Unknown below watched", "/_/watched/x", "null", some},
        {"Unknown watched meta", "/_/watched/_", "null", some},
        {"Unknown deep", "/_/watched/_/watchers/x", "null", some},
        {"Unknown below the dump", "/*/x", "null", some},
    };
}

class PropertyTable : public Property {
  protected:
    // All that the resource shows of itself.
    Texts state() {
        Texts lines;
        for (const char* path :
             {"*", "_/watchers", "_/watched", "_/watched/_/watchers", "x/_/watchers"})
            lines.push_back(std::string(path) + ' ' + get(std::string("/kept/") + path));
        return lines;
    }
    // What a message changed of it.
    Texts changedBy(Operation operation, const std::string& path) {
        const Texts before = state();
        client_->send(operation, path, vox::string("new"));
        news_ = news();
        note(operation);
        Texts after = state();
        std::erase_if(after, [&](const std::string& line) {
            return std::find(before.begin(), before.end(), line) != before.end();
        });
        return after;
    }
    // Whether the resource handled the last message.
    void note(Operation operation) {
        if (rig_.queue().sync([this] { return kept_->handled; }))
            handled_.append(plr::rest::asObject(operation).text()) += ' ';
    }
    // Of "me", who watches all that can be watched.
    std::string answerTo(const std::string& path) {
        constexpr const char* kWatchable[] = {"/kept", "/kept/_/watched", "/kept/x"};
        for (const char* watchable : kWatchable)
            push(watchable);
        std::string answer = get(path);
        note(Operation::kGet);
        for (const char* watchable : kWatchable)
            pop(watchable);
        news();
        return answer;
    }
    void check(const Cell& cell) {
        const std::string path = std::string("/kept") + cell.path;
        const Texts before = state();
        handled_.clear();
        EXPECT_EQ(answerTo(path), cell.got);
        EXPECT_EQ(changedBy(Operation::kSet, path), cell.set);
        EXPECT_EQ(news_, Texts());
        set("/kept/x", valueOfX());
        EXPECT_EQ(changedBy(Operation::kPush, path), cell.pushed);
        EXPECT_EQ(news_, cell.pushNews);
        changedBy(Operation::kPop, path);
        EXPECT_EQ(news_, Texts());
        EXPECT_EQ(changedBy(Operation::kNotify, path), Texts());
        EXPECT_EQ(handled_, cell.handled);
        EXPECT_EQ(state(), before);
    }

    std::string handled_;  // the operations that were
    Texts news_;           // after the last of them
};

TEST_F(PropertyTable, HandlesEveryOperationOnEveryKindOfPath) {
    for (const Cell& cell : cells()) {
        SCOPED_TRACE(cell.kind);
        check(cell);
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

// However it goes. Nothing is left of it then: the next watcher is the first.
TEST_F(Property, WhenAClientWentWhoWatchesWhatIsWatchedIsToldOnce) {
    rig_.add("/tree", std::make_shared<plr::rest::TreeRestResource>());
    rig_.add("/tree/kept", std::make_shared<PropertyRestResource>(true));
    push("/tree/kept/_/watched");
    news();
    for (const bool isByPop : {false, true}) {
        auto other = rig_.registeredClient("other");
        other->send(Operation::kPush, "/tree/kept/x");
        other->send(Operation::kPush, "/tree/kept/y");
        static_cast<void>(other->takeMessages());
        EXPECT_EQ(news().size(), 2U);
        if (isByPop)
            other->send(Operation::kPop, "/connections");
        else
            other.reset();
        Texts told;
        EXPECT_TRUE(eventually([&] { return !(told = news()).empty(); }));
        EXPECT_EQ(told, (Texts{"notify me /tree/kept/_/watched []"}));
    }
}

TEST(Watchable, HasItsWatchersOnceUntilTheyAreRemoved) {
    plr::rest::WatchableRestResourceHelper watchers;
    std::shared_ptr<plr::rest::RestResourceConnection> watcher =
        std::make_shared<FakeRestConnection>("me");
    EXPECT_TRUE(watchers.addWatcher(watcher));
    EXPECT_FALSE(watchers.addWatcher(watcher));
    EXPECT_FALSE(watchers.removeWatcher(nullptr));
    watcher.reset();
    EXPECT_TRUE(watchers.hasWatchers());
    EXPECT_FALSE(watchers.hasActiveWatchers());
    watchers.removeWatchers();
    EXPECT_FALSE(watchers.hasWatchers());
}

}  // namespace
