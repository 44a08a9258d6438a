#include "plr/rest/map_resource.h"

#include "support/module_client.h"
#include "support/raw_rest_client.h"

namespace {

using namespace plr::rest;
using namespace plr::test;

// A server with a map that has one entry, "k": {"part": 5}, and one whose entries
// are owned; a client that is known to it.
class Map : public testing::Test {
  protected:
    Map() {
        rig_.add("/map", map_);
        rig_.add("/owned", std::make_shared<MapRestResource>(owned_entries));
        rig_.start();
        client_ = rig_.registeredClient("me");
        set(*client_, "/map/k", valueOfK());
    }

    static vox::dict valueOfK() {
        const vox::dict value = vox::dict::create();
        value["part"] = vox::int64(5);
        return value;
    }
    // Each is handled when it returns.
    static void send(RawRestClient& client, Operation operation, const char* path,
                     const vox::object& value = {}) {
        client.send(operation, path, value);
        static_cast<void>(client.textAt(""));
    }
    static void set(RawRestClient& client, const char* path, const vox::object& value) {
        send(client, Operation::kSet, path, value);
    }
    std::string get(const char* path) { return client_->textAt(path); }
    Texts news() { return client_->takeMessages(); }

    const std::shared_ptr<Recording<MapRestResource>> map_ =
        std::make_shared<Recording<MapRestResource>>();
    RestServerRig rig_;
    std::unique_ptr<RawRestClient> client_;
};

TEST_F(Map, HandlesTheseMessagesOnly) {
    const Texts whole = {
        R"(notify me /map {"whole": true,"set": {"k": {"part": 5}},"removed": []})"};
    const Texts ofK = {R"(notify me /map/k {"part": 5})"};
    const struct {
        const char* path;
        const char* got;      // "" where a GET is not answered
        const char* handled;  // of GET, PUSH, POP, SET (to null) and NOTIFY
        Texts pushNews;
    } rows[] = {
        {"map", R"({"k": {"part": 5}})", "get push pop ", whole},
        {"/map/*", R"({"k": {"part": 5}})", "get ", {}},
        {"/map/_/watchers", "[]", "get ", {}},
        {"map/k", R"({"part": 5})", "get push pop set ", ofK},
        {"/map/k@", R"({"part": 5})", "get push pop set ", ofK},
        {"/map/k@part", "5", "get ", {}},
        {"/map/k@part.more", "null", "get ", {}},
        {"/map/new", "null", "get push pop set ", {"notify me /map/new null"}},
        {"/map/new@part", "null", "get ", {}},
        {"/map/k/_/watchers", "[]", "get ", {}},
        {"/map/new/_/watchers", "[]", "get ", {}},
        {"/map/k/below", "", "", {}},
        {"/map/k/_", "", "", {}},
        {"/map/_", "", "", {}},
        {"/map/_/watched", "", "", {}},
        {"/map/*/below", "", "", {}},
        {"/map/@part", "", "", {}},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.path);
        EXPECT_EQ(rig_.handledBy(*map_, *client_, row.path), row.handled);
        EXPECT_EQ(news(), row.pushNews);
        set(*client_, "/map/k", valueOfK());
        if (*row.got) {
            EXPECT_EQ(get(row.path), row.got);
        }
    }
    client_->send(Operation::kSet, std::string_view("/map/a\0b", 8), vox::int64(1));
    EXPECT_EQ(get("/map"), R"({"k": {"part": 5}})");
}

TEST_F(Map, WatchersHearOfEveryChangeOnceUntilTheyPop) {
    send(*client_, Operation::kPush, "/map");
    send(*client_, Operation::kPush, "/map/new");
    news();
    const auto other = rig_.registeredClient("other");
    const Texts ofOne = {"notify me /map/new 1",
                         R"(notify me /map {"whole": false,"set": {"new": 1},"removed": []})"};
    const Texts ofNone = {"notify me /map/new null",
                          R"(notify me /map {"whole": false,"set": {},"removed": [0: "new"]})"};
    const std::pair<vox::object, Texts> rows[] = {
        {vox::int64(1), ofOne}, {vox::int64(1), ofOne}, {nullptr, ofNone}, {nullptr, {}}};
    for (const auto& [value, expected] : rows) {
        set(*other, "map/new", value);
        EXPECT_EQ(news(), expected);
    }
    EXPECT_EQ(get("/map/_/watchers") + get("/map/new/_/watchers"), R"([0: "me"][0: "me"])");
    send(*client_, Operation::kPop, "/map/new");
    send(*client_, Operation::kPop, "/map");
    set(*other, "/map/new", vox::int64(2));
    EXPECT_EQ(news(), Texts());
    EXPECT_EQ(get("/map/_/watchers") + get("/map/new/_/watchers"), "[][]");
}

TEST_F(Map, AnOwnersEntriesAreItsOwnAndGoWithItInOneChange) {
    send(*client_, Operation::kPush, "/owned");
    send(*client_, Operation::kPush, "/owned/a");
    auto owner = rig_.registeredClient("owner");
    const auto stranger = rig_.client("stranger");
    const auto service = [this](const char* path, const vox::object& value) {
        EXPECT_TRUE(rig_.handleOwn(client_->message(Operation::kSet, path, value)));
    };
    set(*owner, "/owned/a", vox::int64(1));
    set(*owner, "/owned/b", vox::int64(2));
    set(*client_, "/owned/mine", vox::int64(3));
    service("/owned/service", vox::int64(4));
    for (const auto* intruder : {client_.get(), stranger.get()})
        for (const char* path : {"/owned/a", "/owned/service", "/owned/b"})
            for (const vox::object& value : {vox::object(), vox::int64(9)}) {
                intruder->send(Operation::kSet, path, value);
                EXPECT_EQ(intruder->textAt("/owned"), R"({"a": 1,"b": 2,"mine": 3,"service": 4})")
                    << path;
            }
    set(*stranger, "/owned/new", vox::int64(9));
    service("/owned/b", vox::int64(5));
    set(*owner, "/owned/c", vox::int64(6));
    set(*owner, "/owned/c", nullptr);
    set(*client_, "/owned/c", vox::int64(7));  // the first one's no more
    static_cast<void>(news());
    owner.reset();
    ASSERT_TRUE(rig_.waitForDrop());
    EXPECT_EQ(news(),
              (Texts{"notify me /owned/a null",
                     R"(notify me /owned {"whole": false,"set": {},"removed": [0: "a",1: "b"]})"}));
    EXPECT_EQ(get("/owned"), R"({"c": 7,"mine": 3,"service": 4})");
    set(*client_, "/owned/a", vox::int64(8));
    EXPECT_EQ(get("/owned/a"), "8") << "who comes next owns it";
}

TEST_F(Map, AModuleKeepsACopy) {
    std::map<std::string, vox::object> copy = {{"stale", vox::int64(1)}};
    Event changed;
    const ModuleClient client;
    client.on([&] {
        client.module.watch<MapChange>("/map", [&](const std::optional<MapChange>& change) {
            ASSERT_TRUE(change);
            change->applyTo(copy);
            changed.signal();
        });
        client.module.connect(rig_.connect());
    });
    ASSERT_TRUE(changed.wait());
    set(*client_, "/map/k", nullptr);
    set(*client_, "/map/new", vox::int64(1));
    ASSERT_TRUE(changed.wait() && changed.wait());
    const std::map<std::string, vox::object> expected = {{"new", vox::int64(1)}};
    client.on([&] { EXPECT_EQ(copy, expected); });
}

TEST(MapChange, ReadsLeniently) {
    const vox::dict odd = vox::dict::create();
    odd["whole"] = vox::string("yes");
    odd["set"] = vox::array::create();
    const vox::array removed = vox::array_creator()("a");
    removed.append(vox::int64(5));
    odd["removed"] = removed;
    for (const vox::object& value : {vox::object(odd), vox::object(), vox::object(removed)}) {
        MapChange change{.whole = true, .set = {{"x", vox::int64(1)}}, .removed = {"b"}};
        read_rest_value(change, value);
        EXPECT_EQ(change.whole, false);
        EXPECT_TRUE(change.set.empty());
        EXPECT_EQ(change.removed, value == odd ? Texts{"a"} : Texts());
    }
}

// ---- Without connections -----------------------------------------------------------

using Client = std::shared_ptr<FakeRestConnection>;

bool tell(MapRestResource& map, Operation operation, const std::string& path, const Client& client,
          const vox::object& value = {}) {
    FakeRestContext context(operation, value, client);
    PathView view(path);
    view.advance(1);
    return map.handleMessage(context, view);
}

TEST(MapLimits, HoldForEntriesAndForWatchedKeysUntilTheyGo) {
    using enum Operation;
    MapRestResource map(2);
    auto client = std::make_shared<FakeRestConnection>("client");
    const auto expect = [&](bool accepted, Operation operation, const char* path, int value = 0) {
        const vox::object sent = value == 0 ? vox::object() : vox::int64(value);
        EXPECT_EQ(tell(map, operation, path, client, sent), accepted)
            << asString(operation) << " " << path;
    };
    for (const char* key : {"/map/a", "/map/a", "/map/b", "/map/b"})
        expect(true, kPush, key);
    expect(false, kPush, "/map/c");
    expect(true, kPop, "/map/b");
    expect(true, kPush, "/map/c");
    // Watched keys do not take the place of entries.
    expect(true, kSet, "/map/x", 1);
    expect(true, kSet, "/map/a", 1);
    expect(false, kSet, "/map/c", 1);
    expect(true, kSet, "/map/a", 2);
    expect(true, kSet, "/map/x");
    expect(true, kSet, "/map/c", 1);

    client = std::make_shared<FakeRestConnection>("next");
    expect(false, kPush, "/map/d");
    FakeRestContext context(kNone);
    map.cleanupWatchers(context, PathView("/map"));
    expect(true, kPush, "/map/d");
    expect(true, kPush, "/map/e");
}

TEST(MapDrop, TellsWhoWentNothing) {
    MapRestResource map(owned_entries, 1);
    const auto client = std::make_shared<FakeRestConnection>("client");
    EXPECT_TRUE(tell(map, Operation::kSet, "/map/a", client, vox::int64(1)));
    EXPECT_TRUE(tell(map, Operation::kPush, "/map/a", client));
    EXPECT_TRUE(tell(map, Operation::kPush, "/map", client));
    FakeRestContext context(Operation::kNone);
    map.handleDroppedConnection(context, PathView("/map"), client);
    EXPECT_EQ(client->sent.size(), 2U) << "by each PUSH";
    EXPECT_TRUE(tell(map, Operation::kPush, "/map/b", client)) << "it watches nothing now";
}

}  // namespace
