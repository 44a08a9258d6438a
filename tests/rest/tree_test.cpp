#include "plr/rest/tree_resource.h"

#include <gtest/gtest.h>

#include "plr/test/fake_rest.h"

namespace {

using namespace plr::rest;
using namespace plr::test;
using Texts = std::vector<std::string>;
using enum Operation;

constexpr Operation kOperations[] = {kNone, kSet, kGet, kPush, kPop, kNotify, kPing};

TEST(RestResource, CallsTheHandlerOfTheOperationAndHandlesNothingByItself) {
    const std::vector<Texts> expected = {{},        {"SET a"},    {"GET a"}, {"PUSH a"},
                                         {"POP a"}, {"NOTIFY a"}, {}};
    for (const Operation operation : kOperations) {
        FakeRestContext context(operation);
        EXPECT_FALSE(RestResource().handleMessage(context, PathView("a")));
        EXPECT_TRUE(context.replies().empty());
        FakeRestResource resource;
        const Texts& calls = expected[static_cast<std::size_t>(operation)];
        EXPECT_EQ(resource.handleMessage(context, PathView("a")), !calls.empty());
        EXPECT_EQ(resource.calls, calls);
    }
    EXPECT_FALSE(
        RestResource().installSubResource(PathView("a"), std::make_shared<RestResource>()));
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
    // What answers a message, "handled" when nothing does, "" when it is not handled.
    std::string send(Operation operation, const char* path) {
        FakeRestContext context(operation);
        const bool handled = root_.handleMessage(context, PathView(path));
        EXPECT_LE(context.replies().size(), handled ? 1U : 0U);
        if (!context.replies().empty())
            return oneLine(context.replies()[0]);
        return handled ? "handled" : "";
    }
    std::string get(const char* path) { return send(kGet, path); }

    TreeRestResource root_;
    const std::shared_ptr<FakeRestResource> a_ = std::make_shared<FakeRestResource>();
    const std::shared_ptr<FakeRestResource> b_ = std::make_shared<FakeRestResource>();
};

TEST_F(Tree, RoutesByWholeSegments) {
    for (const char* path : {"a", "/a", "a/x", "/a/x/y"})
        EXPECT_EQ(send(kSet, path), "handled") << path;
    EXPECT_EQ(a_->calls, (Texts{"SET ", "SET ", "SET x", "SET x"}));
    EXPECT_EQ(send(kPush, "/t/b/c"), "handled");
    EXPECT_EQ(b_->calls, (Texts{"PUSH c"}));
    for (const char* path : {"A", "aa", "t/a", "t/b2", "b", "**", "t/bb", "t/*x"})
        for (const Operation operation : kOperations)
            EXPECT_EQ(send(operation, path), "") << path << " " << asString(operation);
}

TEST_F(Tree, ListsAndDumpsItsChildrenInOrder) {
    const char* const whole = R"({"a": "value","t": {"b": "value","empty": {}}})";
    const struct {
        const char* path;
        const char* got;
    } rows[] = {
        {"", R"([0: "a",1: "t"])"},
        {"/", R"([0: "a",1: "t"])"},
        {"/t", R"([0: "b",1: "empty"])"},
        {"/t/", R"([0: "b",1: "empty"])"},
        {"/t/empty", "[]"},
        {"//a", R"([0: "a",1: "t"])"},  // an empty segment looks like the end of the path
        {"*", whole},
        {"/*", whole},
        {"*/ignored", whole},
        {"/t/*", R"({"b": "value","empty": {}})"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(get(row.path), row.got) << row.path;
    EXPECT_EQ(a_->calls.at(0), "GET *");
    a_->calls.clear();
    for (const Operation operation : kOperations) {
        if (operation == kGet)
            continue;
        EXPECT_EQ(send(operation, "/t"), "") << asString(operation);
        EXPECT_EQ(send(operation, "*"), "handled") << asString(operation);
    }
    EXPECT_TRUE(a_->calls.empty());
    // A child of that name goes before the dump.
    EXPECT_TRUE(install("*", b_));
    EXPECT_EQ(get("*"), "\"value\"");
    EXPECT_EQ(b_->calls.back(), "GET ");
}

TEST_F(Tree, InstallsBelowNodesThatExist) {
    const auto late = std::make_shared<FakeRestResource>();
    for (const char* path : {"", "/", "x/y", "t/x/y", "a/x", "t/b/x"})
        EXPECT_FALSE(install(path, late)) << path;
    EXPECT_TRUE(install("t/new/", late));
    EXPECT_EQ(send(kSet, "t/new"), "handled");
    // A name that is taken stays with its first resource.
    EXPECT_TRUE(install("a", late));
    EXPECT_EQ(send(kSet, "a"), "handled");
    EXPECT_EQ(a_->calls.size(), 1U);
    EXPECT_EQ(late->calls.size(), 1U);
}

TEST_F(Tree, TellsEveryResourceOfADroppedConnection) {
    FakeRestContext context(kNone);
    root_.handleDroppedConnection(context, PathView("/"),
                                  std::make_shared<FakeRestConnection>("gone"));
    EXPECT_EQ(a_->dropped, (Texts{"/a gone"}));
    EXPECT_EQ(b_->dropped, (Texts{"/t/b gone"}));
}

// A resource that changes the tree while the tree is being walked.
class Installer : public FakeRestResource {
  public:
    explicit Installer(TreeRestResource& root) : root_(root) {}
    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override {
        for (const char* name : {"0", "1", "2", "3", "4", "5", "6", "7", "8"})
            root_.installSubResource(PathView(name), std::make_shared<RestResource>());
        return FakeRestResource::handleRestMessage_GET(context, path);
    }

  private:
    TreeRestResource& root_;
};

TEST_F(Tree, AHandlerMayInstallResources) {
    EXPECT_TRUE(install("installer", std::make_shared<Installer>(root_)));
    EXPECT_EQ(get("*"), R"({"a": "value","installer": "value","t": {"b": "value","empty": {}}})");
    EXPECT_EQ(get("installer"), "\"value\"");
}

TEST(ReplyDict, CollectsAnswersUnderTheirScope) {
    FakeRestContext inner(kGet, vox::int64(7), std::make_shared<FakeRestConnection>("me"));
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
        EXPECT_EQ(inner.redirects(), (Texts{"/elsewhere"}));
    }
    EXPECT_TRUE(inner.replies().empty());
    deferred.reset();
    ASSERT_EQ(inner.replies().size(), 1U);
    EXPECT_EQ(oneLine(inner.replies()[0]), R"({"now": 1,"later": 2})");
}

}  // namespace
