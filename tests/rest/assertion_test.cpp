#include "plr/rest/assertion_resource.h"

#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <regex>
#include <string>

#include "support/raw_rest_client.h"

namespace {

using namespace plr::test;
using namespace plr::rest;

constexpr Operation kGet = Operation::kGet;
constexpr Operation kSet = Operation::kSet;
constexpr Operation kPush = Operation::kPush;
constexpr Operation kPop = Operation::kPop;

// Assertions that remember whether they handled the last message.
class RecordingAssertions : public AssertionRestResource {
  public:
    using AssertionRestResource::AssertionRestResource;
    bool handleMessage(RestResourceContext& context, const PathView& path) override {
        return handled = AssertionRestResource::handleMessage(context, path);
    }
    bool handled = false;  // touched on the server's queue only
};

// Assertions of which "x" goes on where a former process left it.
class PrimedAssertions : public AssertionRestResource {
  public:
    PrimedAssertions() { createIfNotPresent("x").generation = 4294967295; }
};

// What one client does, and what is heard of it then, each as
// "client path generation state", by the client's name.
struct Step {
    const char* client;
    Operation operation;
    std::string path;
    vox::object value;
    Texts heard;
};

vox::object number(std::int64_t value) {
    return vox::int64(value);
}

// A server with assertions at /a, and with their kinds elsewhere; three clients
// that it knows, and one, "stranger", that it does not.
class Assertion : public testing::Test {
  protected:
    Assertion() {
        rig_.add("/a", assertions_);
        rig_.add("/held", std::make_shared<AssertionRestResource>(hold_off));
        rig_.add("/own", std::make_shared<AssertionRestResource>(provider_only));
        rig_.add("/primed", std::make_shared<PrimedAssertions>());
        rig_.start();
        for (const char* name : {"me", "other", "power"})
            clients_[name] = rig_.registeredClient(name);
        clients_["stranger"] = rig_.client("stranger");
    }

    std::string get(const std::string& path) { return clients_["me"]->textAt(path); }
    // What all clients heard since the last call, of messages that were handled.
    Texts heard() {
        static const std::regex state(
            R"re(^notify (.*) \{"generation": (\d+),"state": "(.*)"\}$)re");
        Texts all;
        for (const auto& entry : clients_)
            for (const std::string& message : entry.second->takeMessages())
                all.push_back(std::regex_replace(message, state, "$1 $2 $3"));
        return all;
    }
    Texts does(const Step& step) {
        clients_[step.client]->send(step.operation, step.path, step.value);
        static_cast<void>(clients_[step.client]->get(""));  // behind the step
        return heard();
    }
    void play(const std::vector<Step>& steps) {
        for (const Step& step : steps)
            EXPECT_EQ(does(step), step.heard) << step.client << ' ' << asString(step.operation)
                                              << ' ' << step.path << ' ' << step.value.to_string();
    }
    void drop(const char* client) {
        clients_.erase(client);
        ASSERT_TRUE(rig_.waitForDrop());
    }

    const std::shared_ptr<RecordingAssertions> assertions_ =
        std::make_shared<RecordingAssertions>();
    RestServerRig rig_;
    std::map<std::string, std::unique_ptr<RawRestClient>> clients_;
};

TEST_F(Assertion, IsGrantedToWhoWaitsAndEndsWithTheLast) {
    play({
        {"power", kPush, "/a/x/provider", {}, {"power /a/x/provider 1 0:kIdle"}},
        {"me", kPush, "/a/x", {}, {"power /a/x/provider 1 1:kPending"}},
        {"other", kPush, "/a/x", {}, {}},
        {"power", kSet, "/a/x/granted", number(2), {}},
        {"power", kSet, "/a/x/granted", vox::string("1"), {}},
        {"power", kSet, "/a/y/granted", number(1), {}},
        {"power",
         kSet,
         "/a/x/granted",
         number(1),
         {"me /a/x 1 2:kGranted", "other /a/x 1 2:kGranted", "power /a/x/provider 1 2:kGranted"}},
        {"me", kPush, "/a/x", {}, {}},
        {"me", kPop, "/a/x", {}, {}},
        {"me", kPush, "/a/x", {}, {"me /a/x 1 2:kGranted"}},
        {"me", kPop, "/a/x", {}, {}},
        {"other", kPop, "/a/x", {}, {"power /a/x/provider 2 0:kIdle"}},
        {"other", kPop, "/a/x", {}, {}},
        {"me", kPush, "/a/x", {}, {"power /a/x/provider 2 1:kPending"}},
        {"power", kSet, "/a/x/granted", number(1), {}},
        {"me", kPop, "/a/x", {}, {"power /a/x/provider 3 0:kIdle"}},
        {"me", kPop, "/a/y", {}, {}},
    });
    EXPECT_EQ(get("/a"), R"([0: "x"])");
}

}  // namespace
