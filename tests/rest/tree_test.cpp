#include "plr/rest/tree_resource.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "support/fake_rest.h"

namespace {

using plr::rest::Operation;
using plr::rest::PathView;
using plr::rest::ReplyDictRestResourceContextDecorator;
using plr::rest::RestResource;
using plr::rest::RestResourceBase;
using plr::rest::TreeRestResource;
using plr::test::FakeRestConnection;
using plr::test::FakeRestContext;
using plr::test::FakeRestResource;

constexpr Operation kOperations[] = {Operation::kNone, Operation::kSet, Operation::kGet,
                                     Operation::kPush, Operation::kPop, Operation::kNotify,
                                     Operation::kPing};

TEST(RestResource, CallsTheHandlerOfTheOperation) {
    const std::vector<std::vector<std::string>> expected = {
        {}, {"SET a"}, {"GET a"}, {"PUSH a"}, {"POP a"}, {"NOTIFY a"}, {}};
    for (const Operation operation : kOperations) {
        FakeRestResource resource;
        FakeRestContext context(operation);
        const auto& calls = expected[static_cast<std::size_t>(operation)];
        EXPECT_EQ(resource.handleMessage(context, PathView("a")), !calls.empty());
        EXPECT_EQ(resource.calls, calls);
    }
}

TEST(RestResource, HandlesNothingByItself) {
    for (const Operation operation : kOperations) {
        RestResource resource;
        FakeRestContext context(operation);
        EXPECT_FALSE(resource.handleMessage(context, PathView()));
        EXPECT_TRUE(context.replies().empty());
    }
    RestResource resource;
    EXPECT_FALSE(resource.installSubResource(PathView("a"), std::make_shared<RestResource>()));
}

// The tree
//   a          a leaf
//   t          a tree
//   t/b        a leaf
//   t/empty    a tree
class Tree : public testing::Test {
  protected:
    Tree() {
        EXPECT_TRUE(install("t", std::make_shared<TreeRestResource>()));
        EXPECT_TRUE(install("t/b", b_));
        EXPECT_TRUE(install("t/empty", std::make_shared<TreeRestResource>()));
        EXPECT_TRUE(install("a", a_));
    }
    bool install(const char* path, std::shared_ptr<RestResourceBase> resource) {
        return root_.installSubResource(PathView(path), std::move(resource));
    }
    // Whether a message is handled, and what answers it.
    struct Outcome {
        bool handled;
        std::vector<vox::object> replies;
    };
    Outcome send(Operation operation, const char* path) {
        FakeRestContext context(operation);
        const bool handled = root_.handleMessage(context, PathView(path));
        return {handled, context.replies()};
    }
    std::string get(const char* path) {
        const Outcome outcome = send(Operation::kGet, path);
        EXPECT_TRUE(outcome.handled) << path;
        EXPECT_EQ(outcome.replies.size(), 1U) << path;
        return outcome.replies.empty() ? "" : outcome.replies[0].to_string();
    }

    TreeRestResource root_;
    const std::shared_ptr<FakeRestResource> a_ = std::make_shared<FakeRestResource>();
    const std::shared_ptr<FakeRestResource> b_ = std::make_shared<FakeRestResource>();
};

TEST_F(Tree, RoutesByWholeSegments) {
    for (const char* path : {"a", "/a", "a/x", "/a/x/y"})
        EXPECT_TRUE(send(Operation::kSet, path).handled) << path;
    EXPECT_EQ(a_->calls, (std::vector<std::string>{"SET ", "SET ", "SET x", "SET x"}));
    EXPECT_TRUE(send(Operation::kPush, "/t/b/c").handled);
    EXPECT_EQ(b_->calls, (std::vector<std::string>{"PUSH c"}));
    for (const char* path : {"A", "aa", "t/a", "t/b2", "b", "**", "t/bb", "t/*x"})
        for (const Operation operation : kOperations)
            EXPECT_FALSE(send(operation, path).handled) << path << " " << asString(operation);
}

TEST_F(Tree, ListsItsChildrenInOrder) {
    EXPECT_EQ(get(""), "[\n\t0: \"a\",\n\t1: \"t\"\n]");
    EXPECT_EQ(get("/"), get(""));
    EXPECT_EQ(get("/t"), "[\n\t0: \"b\",\n\t1: \"empty\"\n]");
    EXPECT_EQ(get("/t/"), get("/t"));
    EXPECT_EQ(get("/t/empty"), "[]");
    // An empty segment looks like the end of the path.
    EXPECT_EQ(get("//a"), get(""));
    for (const Operation operation : {Operation::kSet, Operation::kPush, Operation::kPop,
                                      Operation::kNotify, Operation::kPing, Operation::kNone})
        EXPECT_FALSE(send(operation, "/t").handled) << asString(operation);
}

TEST_F(Tree, DumpsTheStateOfAllChildrenInOneReply) {
    const std::string whole =
        "{\n\t\"a\": \"value\",\n\t\"t\": {\n\t\t\"b\": \"value\",\n\t\t\"empty\": {}\n\t}\n}";
    EXPECT_EQ(get("*"), whole);
    EXPECT_EQ(get("/*"), whole);
    EXPECT_EQ(get("/t/*"), "{\n\t\"b\": \"value\",\n\t\"empty\": {}\n}");
    EXPECT_EQ(get("*/ignored"), whole);
    EXPECT_EQ(a_->calls.at(0), "GET *");
    EXPECT_EQ(b_->calls.at(0), "GET *");
}

TEST_F(Tree, OtherOperationsOnTheDumpAreHandledAndUnanswered) {
    for (const Operation operation : kOperations) {
        if (operation == Operation::kGet)
            continue;
        const Outcome outcome = send(operation, "*");
        EXPECT_TRUE(outcome.handled) << asString(operation);
        EXPECT_TRUE(outcome.replies.empty()) << asString(operation);
    }
    EXPECT_TRUE(a_->calls.empty());
}

TEST_F(Tree, AChildOfThatNameGoesBeforeTheDump) {
    const auto star = std::make_shared<FakeRestResource>();
    EXPECT_TRUE(install("*", star));
    EXPECT_EQ(get("*"), "\"value\"");
    EXPECT_EQ(star->calls, (std::vector<std::string>{"GET "}));
}

TEST_F(Tree, InstallsBelowNodesThatExist) {
    const auto late = std::make_shared<FakeRestResource>();
    for (const char* path : {"", "/", "x/y", "t/x/y", "a/x", "t/b/x"})
        EXPECT_FALSE(install(path, late)) << path;
    EXPECT_TRUE(install("t/new/", late));
    EXPECT_TRUE(send(Operation::kSet, "t/new").handled);
    // A name that is taken stays with its first resource.
    EXPECT_TRUE(install("a", late));
    EXPECT_TRUE(send(Operation::kSet, "a").handled);
    EXPECT_EQ(a_->calls.size(), 1U);
    EXPECT_EQ(late->calls.size(), 1U);
}

TEST_F(Tree, TellsEveryResourceOfADroppedConnection) {
    const std::shared_ptr<plr::rest::RestResourceConnection> gone =
        std::make_shared<FakeRestConnection>("gone");
    FakeRestContext context(Operation::kNone);
    root_.handleDroppedConnection(context, PathView("/"), gone);
    EXPECT_EQ(a_->dropped, (std::vector<std::string>{"/a gone"}));
    EXPECT_EQ(b_->dropped, (std::vector<std::string>{"/t/b gone"}));
}

// A resource that changes the tree while the tree is being walked.
class Installer : public FakeRestResource {
  public:
    explicit Installer(TreeRestResource& root) : root_(root) {}
    bool handleRestMessage_GET(plr::rest::RestResourceContext& context,
                               const PathView& path) override {
        for (const char* name : {"0", "1", "2", "3", "4", "5", "6", "7", "8"})
            root_.installSubResource(PathView(name), std::make_shared<RestResource>());
        return FakeRestResource::handleRestMessage_GET(context, path);
    }

  private:
    TreeRestResource& root_;
};

TEST_F(Tree, AHandlerMayInstallResources) {
    EXPECT_TRUE(install("installer", std::make_shared<Installer>(root_)));
    EXPECT_EQ(
        get("*"),
        "{\n\t\"a\": \"value\",\n\t\"installer\": \"value\",\n\t\"t\": {\n\t\t\"b\": \"value\","
        "\n\t\t\"empty\": {}\n\t}\n}");
    EXPECT_EQ(get("installer"), "\"value\"");
    EXPECT_FALSE(send(Operation::kGet, "8").handled);
}

TEST(ReplyDict, CollectsAnswersUnderTheirScope) {
    FakeRestContext inner(Operation::kGet, vox::int64(7),
                          std::make_shared<FakeRestConnection>("me"));
    std::shared_ptr<vox::object> deferred;
    {
        ReplyDictRestResourceContextDecorator answers(inner);
        EXPECT_FALSE(answers.sendReplyWithValue(vox::int64(0)));
        answers.pushScope("now");
        EXPECT_TRUE(answers.sendReplyWithValue(vox::int64(1)));
        answers.pushScope("later");
        deferred = answers.takeAutoReplyValue();
        *deferred = vox::int64(2);
        // Everything else is the inner context's.
        EXPECT_EQ(answers.getAuthorResource()->name(), "me");
        EXPECT_EQ(answers.getRestAuthor().text(), "me");
        EXPECT_EQ(answers.getRestOperation().text(), "get");
        EXPECT_EQ(answers.getRestValue(), vox::int64(7));
        EXPECT_TRUE(answers.redirect("/elsewhere"));
        EXPECT_EQ(inner.redirects(), (std::vector<std::string>{"/elsewhere"}));
    }
    EXPECT_TRUE(inner.replies().empty());
    deferred.reset();
    ASSERT_EQ(inner.replies().size(), 1U);
    EXPECT_EQ(inner.replies()[0].to_string(), "{\n\t\"now\": 1,\n\t\"later\": 2\n}");
}

}  // namespace
