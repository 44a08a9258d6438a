#include "plr/rest/property_resource.h"

#include "support/raw_rest_client.h"
#include "tests/rest/property_model.h"

namespace {

using namespace plr::rest;
using namespace plr::test;
using enum Operation;
namespace model = plr::test::property_model;

// Every operation on every kind of path, by "me", who watches nothing or all: the
// model's answers and notifications come, and the resource shows the model's state.
class PropertyTable : public testing::TestWithParam<bool> {
  protected:
    PropertyTable() {
        rig_.add("/kept", properties_);
        rig_.start();
        client_ = rig_.registeredClient("me");
    }
    void play(Operation operation, const model::Path& path) {
        const model::Step step{operation,
                               path.kind,
                               "/kept",
                               path.name,
                               path.subpath,
                               "/kept" + path.text,
                               model::partsOf(vox::int64(7))};
        SCOPED_TRACE(asString(operation) + (" " + step.path));
        const model::Outcome expected = model_.apply(step, me_);
        Texts seen;
        if (operation == kGet)
            seen.push_back("answer " + client_->textAt(step.path));
        else
            client_->send(operation, step.path, step.value);
        for (const std::string& message : client_->takeMessages())
            seen.push_back("me: " + message);
        EXPECT_EQ(seen, expected.lines);
        EXPECT_EQ(rig_.queue().sync([this] { return properties_->handled; }), expected.handled);
    }
    void watchAll() {
        for (const model::Path& path : {kRoot, kWatched, kX})
            play(kPush, path);
    }
    void expectSameState() {
        for (const model::Path& path : model::kRootPaths)
            play(kGet, path);
        play(kGet, {model::Kind::ResourceWatchers, "/x/_/watchers", "x"});
    }

    const model::Path kRoot = model::kRootPaths[0];
    const model::Path kWatched = model::kRootPaths[3];
    const model::Path kX = {model::Kind::Resource, "/x", "x"};
    const std::shared_ptr<Recording<PropertyRestResource>> properties_ =
        std::make_shared<Recording<PropertyRestResource>>(GetParam());
    RestServerRig rig_;
    std::unique_ptr<RawRestClient> client_;
    model::Model model_{GetParam()};
    const model::Connection me_ = std::make_shared<FakeRestConnection>("me");
};

TEST_P(PropertyTable, HasTheModelsCells) {
    using model::Kind;
    std::vector<model::Path> paths = {
        kX,
        {Kind::Resource, "/x/other", "x"},
        {Kind::Resource, "/x/_/other", "x"},
        {Kind::Resource, "/x/_/watchers/y", "x"},
        {Kind::Resource, "/x@k.1", "x", "k.1"},
        {Kind::Resource, "/x@k.word", "x", "k.word"},
        {Kind::Resource, std::string("/x@") + model::kHuge, "x", model::kHuge},
        {Kind::Resource, "/new@k", "new", "k"},
        {Kind::Resource, "/x@", "x"},
        {Kind::ResourceMeta, "/x/_", "x"},
        {Kind::ResourceWatchers, "/x/_/watchers", "x"},
        {Kind::ResourceWatchers, "/y/_/watchers", "y"}};
    paths.insert(paths.end(), std::begin(model::kRootPaths), std::end(model::kRootPaths));
    play(kSet, kX);
    for (const model::Path& path : paths)
        for (const bool watches : {false, true})
            for (const Operation operation : {kGet, kSet, kPush, kPop, kNotify}) {
                if (watches)
                    watchAll();
                play(operation, path);
                expectSameState();
                for (const model::Path& watched : {kRoot, kWatched, kX})
                    play(kPop, watched);
            }
}

INSTANTIATE_TEST_SUITE_P(Values, PropertyTable, testing::Values(true, false),
                         [](const auto& keeps) { return keeps.param ? "Kept" : "PassedOn"; });

// However it goes. Nothing is left of it then: the next watcher is the first.
TEST(Property, WhenAClientWentWhoWatchesWhatIsWatchedIsToldOnce) {
    RestServerRig rig;
    rig.add("/tree", std::make_shared<plr::rest::TreeRestResource>());
    rig.add("/tree/kept", std::make_shared<PropertyRestResource>(true));
    rig.start();
    const auto client = rig.registeredClient("me");
    client->send(kPush, "/tree/kept/_/watched");
    EXPECT_EQ(client->takeMessages().size(), 1U);
    for (const bool isByPop : {false, true}) {
        auto other = rig.registeredClient("other");
        other->send(kPush, "/tree/kept/x");
        other->send(kPush, "/tree/kept/y");
        static_cast<void>(other->takeMessages());
        EXPECT_EQ(client->takeMessages().size(), 2U);
        if (isByPop)
            other->send(kPop, "/connections");
        else
            other.reset();
        Texts told;
        EXPECT_TRUE(eventually([&] { return !(told = client->takeMessages()).empty(); }));
        EXPECT_EQ(told, (Texts{"notify me /tree/kept/_/watched []"}));
    }
}

TEST(Watchable, HasItsWatchersOnceUntilTheyAreRemoved) {
    WatchableRestResourceHelper watchers;
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
