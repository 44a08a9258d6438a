// Access rules: where messages arrive decides, however they spell it.
#include "plr/rest/access_rules.h"

#include <unistd.h>

#include <stdexcept>

#include "support/raw_rest_client.h"
#include "support/runtime.h"
#include "support/scripted_resource.h"

namespace {

using namespace plr::rest;
using namespace plr::test;
using enum Operation;

const uid_t kMe = ::getuid();
const uid_t kStranger = ::getuid() + 1;
const gid_t kMyGroup = ::getgid();
const gid_t kNoGroup = 4'000'000'000;
const std::vector<AccessRule> kNobody = {{.path = "/"}};

// ---- Every spelling --------------------------------------------------------------

// A resource that shows all it has at its own path, and says nothing of itself.
std::shared_ptr<RestResource> open() {
    const auto show = [](RestResourceContext& context, const PathView& path) {
        const bool shows = !path || path.current() == "*" || path.current() == "x";
        return shows && context.sendReplyWithValue(vox::string("SECRET"));
    };
    return std::make_shared<ScriptedResource>(show, [show](auto& context, const PathView& path) {
        return context.getRestOperation() == asObject(kPush) && show(context, path);
    });
}

// The secret is the property x at /kept and at /t/kept, and x of /open.
class Secrets {
  public:
    Secrets() {
        install("t", std::make_shared<TreeRestResource>());
        install("t/kept", std::make_shared<PropertyRestResource>(true));
        install("kept", std::make_shared<PropertyRestResource>(true));
        install("open", open());
        hide();
    }
    // Whether a message shows or changes it.
    bool isReachedBy(Operation operation, const std::string& path) {
        bool reached = send(operation, path, "new");
        for (const vox::dict& message : client_->sent)
            reached |= isSecret(message["v"]);
        for (const char* secret : {"kept/x", "t/kept/x"})
            reached |= !send(kGet, secret, "");
        hide();
        return reached;
    }
    TreeRestResource root;

  private:
    static bool isSecret(const vox::object& value) {
        return value.to_string().find("SECRET") != std::string::npos;
    }
    void install(const char* path, std::shared_ptr<RestResourceBase> resource) {
        EXPECT_TRUE(root.installSubResource(PathView(path), std::move(resource)));
    }
    bool send(Operation operation, const std::string& path, const char* value) {
        FakeRestContext context(operation, vox::string(std::string_view(value)), client_);
        static_cast<void>(root.handleMessage(context, PathView(path)));
        return std::any_of(context.replies().begin(), context.replies().end(), isSecret);
    }
    void hide() {
        send(kSet, "kept/x", "SECRET");
        send(kSet, "t/kept/x", "SECRET");
        client_->sent.clear();
    }

    const std::shared_ptr<FakeRestConnection> client_ = std::make_shared<FakeRestConnection>("me");
};

// Calls `function` with every path of up to three of some segments behind some
// beginnings.
void forEachPath(const std::function<void(const std::string&)>& function) {
    const char* const segments[] = {"kept", "x",        "_",  "*",   "watchers", "watched",
                                    "",     "x@length", "_@", "*@x", "open",     "t"};
    std::vector<std::string> paths = {"", "/", "/kept/", "kept/x/", "/kept/x/_/", "t/kept/"};
    for (int depth = 0; depth < 3; ++depth) {
        std::vector<std::string> longer;
        for (const std::string& path : paths) {
            for (const char* segment : segments)
                longer.push_back(path + segment + (depth < 2 ? "/" : ""));
        }
        for (const std::string& path : longer)
            function(path);
        paths = std::move(longer);
    }
}

TEST(AccessRules, NoSpellingOfAPathGetsRoundThem) {
    Secrets secrets;
    const AccessRules tight({{.path = "/", .everybody = true},
                             {.path = "/kept/x", .users = {kStranger}},
                             {.path = "t/kept/x/", .users = {kStranger}},
                             {.path = "/open/x", .users = {kStranger}}});
    // What is open is not a way to what is not.
    const AccessRules loose({{.path = "", .users = {kStranger}},
                             {.path = "/kept/_", .everybody = true},
                             {.path = "/kept/x/_", .everybody = true},
                             {.path = "/kept/x/_/watchers", .everybody = true},
                             {.path = "/t/kept/y", .everybody = true}});
    int reaching = 0;
    int allowed = 0;
    forEachPath([&](const std::string& path) {
        for (const Operation operation : {kGet, kSet, kPush}) {
            const Reached reached = reachedBy(secrets.root, operation, PathView(path));
            const bool byTight = tight.allows(operation, reached, nullptr);
            const bool byLoose = loose.allows(operation, reached, nullptr);
            const bool isReached = secrets.isReachedBy(operation, path);
            EXPECT_FALSE(isReached && (byTight || byLoose)) << asString(operation) << " " << path;
            reaching += isReached ? 1 : 0;
            allowed += byLoose ? 1 : 0;
        }
    });
    EXPECT_GT(reaching, 1000);
    EXPECT_GT(allowed, 100);
}

TEST(AccessRules, RefusePathsThatNoMessageHas) {
    for (const char* path : {"/a@b", "*", "/a/*/b", "/a//b", "//a", "a//"})
        EXPECT_THROW(AccessRules({{.path = path}}), std::invalid_argument) << path;
    EXPECT_TRUE(AccessRules().empty());
    EXPECT_TRUE(AccessRules(std::vector<AccessRule>()).empty());
    EXPECT_FALSE(AccessRules(kNobody).empty());
}

// ---- A server --------------------------------------------------------------------

class AccessRulesOfAServer : public testing::Test {
  protected:
    AccessRulesOfAServer() {
        rig.add("/kept", std::make_shared<PropertyRestResource>(true));
        rig.add("/t", std::make_shared<TreeRestResource>());
        rig.add("/t/kept", std::make_shared<PropertyRestResource>(true));
        rig.add("/t/open", open());
        rig.start();
        client = rig.registeredClient("me");
    }
    // How many messages are refused for sending this one.
    std::uint64_t refusals(const vox::dict& message) {
        const std::uint64_t before = rig.server().accessRefusals();
        client->send(message);
        static_cast<void>(client->takeMessages());
        return rig.server().accessRefusals() - before;
    }

    RestServerRig rig;
    std::unique_ptr<RawRestClient> client;
};

TEST_F(AccessRulesOfAServer, TheLongestPathThatNamesTheOperationDecides) {
    rig.server().setAccessRules({
        {.path = "/kept/x", .users = {kStranger}},
        {.path = "/kept/_", .operations = {kSet}, .users = {kStranger}},
        {.path = "/kept/set", .operations = {kSet}, .users = {kStranger}},
        {.path = "/t", .users = {kStranger}},
        {.path = "/t/kept/mine", .users = {kStranger, kMe}},
        {.path = "/t/kept/mine/deeper", .operations = {kSet}, .users = {kStranger}},
        {.path = "/t/kept/ours", .groups = {kNoGroup, kMyGroup}},
        {.path = "/t/kept/theirs", .groups = {kNoGroup}},
        {.path = "/t/kept/either", .users = {kStranger}},
        {.path = "/t/kept/either", .everybody = true},
        {.path = "/t/kept/unknown", .users = {static_cast<uid_t>(-1)}},
        {.path = "/t/open", .users = {kStranger}},
        {.path = "/t/open/mine", .users = {kMe}},
    });
    const struct {
        const char* path;
        Operation operation;
        bool isAllowed;
    } rows[] = {
        {"/", kGet, true},
        {"/kept", kGet, true},  // the names only
        {"/kept/x", kGet, false},
        {"kept/x/", kPush, false},
        {"/kept/x/_/watchers", kGet, false},
        {"/kept/x@part", kGet, false},
        {"/kept/xx", kGet, true},
        {"/kept//x", kGet, true},  // the names again
        {"/kept/x@y@", kGet, false},
        {"/kept/_", kSet, false},
        {"/kept/_@", kSet, true},   // a property of the name "_"
        {"/kept/_/x", kSet, true},  // nothing
        {"/kept/*", kGet, false},   // x is among them
        {"/*", kGet, false},
        {"/*/x", kGet, false},
        {"/*", kSet, true},  // does nothing
        {"/kept/set", kSet, false},
        {"/kept/set", kGet, true},
        {"/t", kGet, false},
        {"/t/kept/mine", kSet, true},
        {"/t/kept/mine@part", kGet, true},
        {"/t/open/mine", kGet, true},
        {"/t/open/mine@part", kGet, false},   // or a name below /t/open
        {"/t/kept/mine/deeper", kSet, true},  // means the property
        {"/t/kept/ours", kGet, true},
        {"/t/kept/theirs", kGet, false},
        {"/t/kept/either", kGet, true},
        {"/t/kept/unknown", kGet, false},
        {"/t/nothing", kGet, false},
    };
    for (const auto& row : rows)
        EXPECT_EQ(refusals(client->message(row.operation, row.path)), row.isAllowed ? 0U : 1U)
            << asString(row.operation) << " " << row.path;
}

TEST_F(AccessRulesOfAServer, RefusedMessagesDoNothingAndAreToldOfByOneLineASecond) {
    const Reports reports;
    rig.server().setAccessRules({{.path = "/kept", .users = {kStranger}}});
    constexpr std::uint64_t kMany = 1000;
    const vox::dict set = client->message(kSet, "/kept/x\n\x1b", vox::int64(1));
    for (std::uint64_t i = 0; i < kMany; ++i)
        client->send(set);
    EXPECT_EQ(client->takeMessages(), Texts());
    EXPECT_EQ(rig.server().accessRefusals(), kMany);
    EXPECT_EQ(oneLine(client->exchange(client->message(kGet, "/kept/x"))),
              R"({"o": "get","r": "/kept/x","e": "access denied"})");
    EXPECT_LT(reports.count("access denied"), kMany);
    EXPECT_GE(reports.count("access denied to user " + std::to_string(kMe) +
                            ": set of /kept/x?? (refused since the last such line: 1)"),
              1U);
    // The service itself may do anything.
    EXPECT_TRUE(rig.handleOwn(client->message(kSet, "/kept/x", vox::int64(2))));
    rig.server().setAccessRules({});
    EXPECT_EQ(client->textAt("/kept/x"), "2");
    EXPECT_EQ(client->textAt("/kept"), R"([0: "x"])") << "no refused one made a property";
    // Something that is no path is the root, for rules too.
    rig.server().setAccessRules(AccessRules(kNobody));
    vox::dict rootless = client->message(kGet, "");
    rootless["r"] = vox::int64(7);
    EXPECT_EQ(oneLine(client->exchange(rootless)), R"({"o": "get","r": 7,"e": "access denied"})");
}

TEST_F(AccessRulesOfAServer, ARedirectedMessageNeedsBoth) {
    rig.add("/elsewhere", std::make_shared<ScriptedResource>(
                              [](auto& context, auto&&) { return context.redirect("/kept/x"); }));
    const auto answer = [&] {
        return oneLine(client->exchange(client->message(kGet, "/elsewhere")));
    };
    EXPECT_EQ(answer(), R"({"o": "get","r": "/elsewhere","v": null})");
    for (const char* path : {"/kept/x", "/elsewhere"}) {
        rig.server().setAccessRules({{.path = path, .users = {kStranger}}});
        EXPECT_EQ(answer(), R"({"o": "get","r": "/elsewhere","e": "access denied"})") << path;
    }
}

TEST_F(AccessRulesOfAServer, DescriptionsShowWhatAClientMayGet) {
    RestServerExample& server = rig.server();
    EXPECT_TRUE(server.registerResource("/map", open(), {"map", "Open."}));
    EXPECT_FALSE(server.registerResource("/no/map", open(), {"map", ""}));
    server.describe("kept/x/", {"int64", "old"});
    server.describe("/kept/x", {"int64", "X."});
    server.describe("/keptother", {"", ""});
    EXPECT_TRUE(server.registerResource("/descriptions", server.descriptions()));
    const std::string map = R"("/map": {"type": "map","doc": "Open."})";
    const std::string x = R"("/kept/x": {"type": "int64","doc": "X."})";
    const std::string other = R"("/keptother": {"type": "","doc": ""})";
    const std::string all = "{" + x + "," + other + "," + map + "}";
    const std::pair<const char*, std::string> rows[] = {
        {"", all},
        {"/*", all},
        {"//kept", all},
        {"/kept", "{" + x + "}"},
        {"/kept/x", "{" + x + "}"},
        {"/kept/x/y", "{}"},
        {"/map/", "{" + map + "}"},
    };
    for (const auto& [path, expected] : rows)
        EXPECT_EQ(client->textAt(std::string("/descriptions") + path), expected) << path;
    server.setAccessRules(
        {{.path = "/kept", .users = {kStranger}}, {.path = "/map", .operations = {kSet}}});
    EXPECT_EQ(client->textAt("/descriptions"), "{" + other + "," + map + "}");
    EXPECT_EQ(client->textAt("/descriptions/kept"), "{}");
}

}  // namespace
