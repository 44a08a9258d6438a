#include "plr/rest/path_view.h"

#include <gtest/gtest.h>

namespace {

using namespace plr::rest;

// Head, current segment and tail; '<' and '>' where the view says it has them.
std::string look(const PathView& view) {
    EXPECT_EQ(bool(view), !view.current().empty());
    std::string text(view.head());
    text += view.hasHead() ? '<' : '|';
    text += view.current();
    text += view.hasTail() ? '>' : '|';
    return text.append(view.tail());
}

TEST(PathView, ShowsWhatSurroundsTheCurrentSegment) {
    const struct {
        const char* path;
        std::vector<long> steps;
        const char* expected;
    } rows[] = {
        {"", {0}, "||"},
        {"", {3}, "||"},
        {"/", {0}, "/||"},
        {"/", {1, -1}, "/||"},
        {"//", {0}, "/||"},
        {"a", {0}, "|a|"},
        {"a", {1}, "a<|"},
        {"a", {-1}, "|a|"},
        {"a", {1, -1}, "|a|"},
        {"/a", {0}, "/|a|"},
        {"/a", {1}, "/a<|"},
        {"/a/b/", {0}, "/|a>b"},
        {"/a/b/", {1}, "/a<b|"},
        {"/a/b/", {9}, "/a/b<|"},
        {"/a/b", {2, -1}, "/a<b|"},
        {"/a/b", {2, -2}, "/|a>b"},
        {"/a/b", {1, -9}, "/|a>b"},
        {"a/b/c", {2}, "a/b<c|"},
        {"a/b/c", {1}, "a<b>c"},
        {"a/b/c", {2, -1}, "a<b>c"},
        {"a/b/c", {3, -1}, "a/b<c|"},
        {"a/b/c", {9, -2}, "a<b>c"},
        // Empty segments count, and look like none.
        {"a//b", {1}, "a//b<|"},
        {"a//b", {2}, "a/<b|"},
        {"a//b", {2, -1}, "a//b<|"},
        {"a//b", {2, -2}, "|a>/b"},
        {"//a", {0}, "//a||"},
        {"//a", {1}, "/<a|"},
        {"//a", {1, -1}, "//a||"},
        {"a//", {0}, "|a|"},  // one '/' is dropped, one stays
        {"a//", {1}, "a/<|"},
    };
    for (const auto& row : rows) {
        PathView view(row.path);
        for (const long steps : row.steps)
            view.advance(steps);
        EXPECT_EQ(look(view), row.expected) << "'" << row.path << "'";
    }
    EXPECT_EQ(look(PathView()), "||");
    EXPECT_EQ(PathView("/a/b/").full(), "/a/b");
}

TEST(PathView, SkipsPrefixesAtSegmentBoundaries) {
    const struct {
        const char* path;
        const char* prefix;
        bool skipped;
        const char* current;
    } rows[] = {
        {"a/b", "/a/", true, "b"},  {"a/b", "a", true, "b"},       {"a/b", "a/b", true, ""},
        {"a/b", "ab", false, "a"},  {"a/b", "/", false, "a"},      {"a/b", "", false, "a"},
        {"a/b", "//", false, "a"},  {"abc/d", "ab", false, "abc"}, {"a/b", "a/b/c", false, "a"},
        {"/a/b", "a", true, "b"},   {"/a/b", "/a", true, "b"},     {"/a/b/c", "a/b/", true, "c"},
        {"/", "a", false, ""},      {"a", "a", true, ""},          {"a//b", "a", true, ""},
        {"a//b", "a//b", true, ""}, {"a/b", "b", false, "a"},
    };
    for (const auto& row : rows) {
        PathView view(row.path);
        EXPECT_EQ(view.skip(row.prefix), row.skipped) << row.path << " skip " << row.prefix;
        EXPECT_EQ(view.current(), row.current) << row.path << " skip " << row.prefix;
    }
    PathView onSecond("a/b/c");
    onSecond.advance(1);
    EXPECT_FALSE(onSecond.skip("a"));
    EXPECT_TRUE(onSecond.skip("b/c"));
    EXPECT_FALSE(onSecond);
    EXPECT_FALSE(onSecond.skip("c"));
}

TEST(PathJoin, PutsOneSlashBetween) {
    const struct {
        const char* head;
        const char* tail;
        const char* expected;
    } rows[] = {
        {"", "", ""},      {"a", "", "a"},       {"", "a", "a"},     {"/", "a", "/a"},
        {"a", "b", "a/b"}, {"a/", "b", "a/b"},   {"a", "/b", "a/b"}, {"a/", "/b", "a/b"},
        {"/", "/", "/"},   {"a//", "b", "a//b"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(path_join(row.head, row.tail), row.expected) << row.head << " + " << row.tail;
}

}  // namespace
