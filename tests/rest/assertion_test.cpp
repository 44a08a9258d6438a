#include "plr/rest/assertion_resource.h"

#include <regex>
#include <sstream>

#include "support/raw_rest_client.h"

namespace {

using namespace plr::test;
using namespace plr::rest;
using enum Operation;

// A server with assertions at /a; three clients that it knows, and one, "stranger",
// that it does not.
class Parties {
  public:
    Parties() {
        rig_.add("/a", assertions_);
        rig_.start();
        for (const char* name : {"me", "other", "power"})
            clients_[name] = rig_.registeredClient(name);
        clients_["stranger"] = rig_.client("stranger");
    }

    std::string get(const std::string& path) { return clients_["me"]->textAt(path); }
    // What all hear, "me x 1 Granted, power x/provider 1 Granted", behind what `client`
    // sent before.
    std::string heard(const std::string& client = "me") {
        static_cast<void>(clients_[client]->get(""));
        static const std::regex notification(
            R"re(notify (.*?) (?:/a/)?(.*) \{"generation": (.*),"state": "\d:k(.*)"\})re");
        std::string all;
        for (const auto& entry : clients_)
            for (const std::string& message : entry.second->takeMessages())
                all += (all.empty() ? "" : ", ") +
                       std::regex_replace(message, notification, "$1 $2 $3 $4");
        return all;
    }
    // "me grants x 1" or "me asserts x". Returns what is heard of it.
    std::string does(const std::string& what, const std::string& mount = "/a/") {
        static const std::map<std::string, std::pair<Operation, const char*>> verbs = {
            {"asserts", {kPush, ""}},           {"releases", {kPop, ""}},
            {"provides", {kPush, "/provider"}}, {"leaves", {kPop, "/provider"}},
            {"grants", {kSet, "/granted"}},     {"revokes", {kSet, "/revoked"}},
        };
        std::string client;
        std::string verb;
        std::string name;
        std::int64_t generation = 0;
        std::istringstream(what) >> client >> verb >> name >> generation;
        const auto& [operation, word] = verbs.at(verb);
        clients_.at(client)->send(operation, mount + name + word, vox::int64(generation));
        return heard(client);
    }
    void drop(const char* client) {
        clients_.erase(client);
        ASSERT_TRUE(rig_.waitForDrop());
    }

    RawRestClient& client(const std::string& name) { return *clients_.at(name); }
    // Whether the last message to /a was handled.
    [[nodiscard]] bool wasHandled() const {
        return rig_.queue().sync([this] { return assertions_->handled; });
    }

  private:
    const std::shared_ptr<Recording<AssertionRestResource>> assertions_ =
        std::make_shared<Recording<AssertionRestResource>>();
    RestServerRig rig_;
    std::map<std::string, std::unique_ptr<RawRestClient>> clients_;
};

// ---- Every operation on every kind of path ---------------------------------------

// The document of "x" that "me" provides and was revoked from, and that "other"
// waits for, and the same after an effect.
constexpr const char* kBefore =
    R"({"generation": 2,"state": "1:kPending","granted": [],"waiting": [0: "other"],)"
    R"("revoked": [0: "me"],"provider": "me"})";
constexpr const char* kIsGranted =
    R"({"generation": 2,"state": "2:kGranted","granted": [0: "other"],"waiting": [],)"
    R"("revoked": [0: "me"],"provider": "me"})";
constexpr const char* kIsRevoked =
    R"({"generation": 3,"state": "1:kPending","granted": [],"waiting": [0: "other"],)"
    R"("revoked": [0: "me"],"provider": "me"})";
constexpr const char* kBothWait =
    R"({"generation": 2,"state": "1:kPending","granted": [],"waiting": (both),)"
    R"("revoked": [],"provider": "me"})";
constexpr const char* kIsReleased =
    R"({"generation": 2,"state": "1:kPending","granted": [],"waiting": [0: "other"],)"
    R"("revoked": [],"provider": "me"})";
constexpr const char* kIsLeft =
    R"({"generation": 2,"state": "1:kPending","granted": [],"waiting": [0: "other"],)"
    R"("revoked": [0: "me"],"provider": null})";

// What is heard when "me" does something, and the document then.
struct Effect {
    const char* heard = "";
    const char* document = kBefore;
    bool isHandled = true;
};
constexpr Effect kUnhandled = {"", kBefore, false};
constexpr Effect kGrants = {"me x/provider 2 Granted, other x 2 Granted", kIsGranted};
constexpr Effect kRevokes = {"me x/provider 3 Pending", kIsRevoked};
constexpr Effect kAsserts = {"", kBothWait};
constexpr Effect kReleases = {"", kIsReleased};
constexpr Effect kProvides = {"me x/provider 2 Pending"};
constexpr Effect kLeaves = {"", kIsLeft};

std::string dumpOf(const std::string& document) {
    return R"({"x": )" + document + '}';
}

// One operation, which wants a reply; none but a GET has one.
void expectEffect(Operation operation, const char* path, const std::string& reply,
                  const Effect& effect) {
    SCOPED_TRACE(asString(operation) + std::string(" of ") + path);
    Parties parties;
    for (const char* what : {"me provides x", "me asserts x", "other asserts x", "me grants x 1",
                             "me revokes x 1", "other asserts x"})
        parties.does(what);
    RawRestClient& me = parties.client("me");
    me.ask(me.message(operation, std::string("/a") + path, vox::int64(2)));
    EXPECT_EQ(parties.heard(), effect.heard);
    std::string replies;
    for (const vox::object& answer : me.replies())
        replies += oneLine(getReplyValue(vox::dict(answer)));
    EXPECT_EQ(replies, reply);
    EXPECT_EQ(parties.wasHandled(), effect.isHandled);
    const std::regex both(R"re(\[0: "(me|other)",1: "(me|other)"\])re");
    EXPECT_EQ(std::regex_replace(parties.get("/a/*"), both, "(both)"), dumpOf(effect.document));
}

TEST(AssertionPath, HasTheEffectOfItsKindAndNoOther) {
    const struct {
        const char* path;  // below the resource
        std::string got;
        Effect set, push, pop;
    } rows[] = {
        {"", R"([0: "x"])", kUnhandled, kUnhandled, kUnhandled},
        {"/*", dumpOf(kBefore), kUnhandled, kUnhandled, kUnhandled},
        {"/*/granted", dumpOf(kBefore), kUnhandled, kUnhandled, kUnhandled},
        {"/x", kBefore, kUnhandled, kAsserts, kReleases},
        {"/x/other", kBefore, kUnhandled, kAsserts, kReleases},
        {"/x/Granted/granted", kBefore, kUnhandled, kAsserts, kReleases},
        {"/x/granted", "[]", kGrants, kUnhandled, kUnhandled},
        {"/x/granted/below", "[]", kGrants, kUnhandled, kUnhandled},
        {"/x/revoked", R"([0: "me"])", kRevokes, kUnhandled, kUnhandled},
        {"/x/waiting", R"([0: "other"])", kUnhandled, kUnhandled, kUnhandled},
        {"/x/provider", R"("me")", kUnhandled, kProvides, kLeaves},
        {"/x/provider/below", R"("me")", kUnhandled, kProvides, kLeaves},
    };
    for (const auto& row : rows) {
        expectEffect(kGet, row.path, row.got, Effect{});
        expectEffect(kSet, row.path, "", row.set);
        expectEffect(kPush, row.path, "", row.push);
        expectEffect(kPop, row.path, "", row.pop);
        expectEffect(kNotify, row.path, "", kUnhandled);
    }
    // A GET makes no assertion.
    expectEffect(kGet, "/y", "null", Effect{});
    expectEffect(kGet, "/y/waiting", "[]", Effect{});
    expectEffect(kGet, "/y/provider", "null", Effect{});
}

// What else happens is the model's, in assertion_model_test.cpp.
TEST(Assertion, IsOneHoweverItIsSpelledAndEndsWithWhoDrops) {
    Parties parties;
    EXPECT_EQ(parties.does("power provides x"), "power x/provider 1 Idle");
    EXPECT_EQ(parties.does("me asserts x", "a/"), "power a/x/provider 1 Pending");
    EXPECT_EQ(parties.does("stranger asserts x"), "");
    EXPECT_EQ(parties.does("stranger grants x 1"), "me x 1 Granted, power x/provider 1 Granted");
    parties.drop("me");
    EXPECT_EQ(parties.heard("power"), "power x/provider 2 Idle");
}

TEST(AssertionAcquireState, IsReadAsItIsWritten) {
    const AssertionAcquireState written = {4294967295, AssertionState::kGranted};
    EXPECT_EQ(oneLine(write_rest_value(written)),
              R"({"generation": 4294967295,"state": "2:kGranted"})");
    EXPECT_EQ(oneLine(write_rest_value({1, static_cast<AssertionState>(7)})),
              R"({"generation": 1,"state": "7:???"})");
    AssertionAcquireState read;
    read_rest_value(read, write_rest_value(written));
    EXPECT_EQ(read, written);
    read_rest_value(read, vox::string("2:kGranted"));
    const vox::dict odd = vox::dict::create();
    odd["generation"] = vox::string("1");
    odd["state"] = vox::int64(1);
    read_rest_value(read, odd);
    EXPECT_EQ(read, written) << "what cannot be read keeps what there was";
}

}  // namespace
