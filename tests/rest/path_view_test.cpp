#include "plr/rest/path_view.h"

#include <gtest/gtest.h>

#include <optional>
#include <random>
#include <string>
#include <string_view>
#include <vector>

namespace {

using plr::rest::path_join;
using plr::rest::PathView;

struct Seen {
    std::string current;
    std::string head;
    std::string tail;
    bool hasHead;
    bool hasTail;
    friend bool operator==(const Seen&, const Seen&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Seen& seen) {
        return out << "current '" << seen.current << "' head '" << seen.head << "' tail '"
                   << seen.tail << "' hasHead " << seen.hasHead << " hasTail " << seen.hasTail;
    }
};

Seen look(const PathView& view) {
    EXPECT_EQ(bool(view), !view.current().empty());
    return {std::string(view.current()), std::string(view.head()), std::string(view.tail()),
            view.hasHead(), view.hasTail()};
}

TEST(PathView, ShowsWhatSurroundsTheCurrentSegment) {
    const struct {
        const char* path;
        long steps;
        Seen expected;
    } rows[] = {
        {"", 0, {"", "", "", false, false}},
        {"", 3, {"", "", "", false, false}},
        {"/", 0, {"", "/", "", false, false}},
        {"/", 1, {"", "/", "", false, false}},
        {"//", 0, {"", "/", "", false, false}},
        {"a", 0, {"a", "", "", false, false}},
        {"a", 1, {"", "a", "", true, false}},
        {"a", -1, {"a", "", "", false, false}},
        {"/a", 0, {"a", "/", "", false, false}},
        {"/a", 1, {"", "/a", "", true, false}},
        {"/a/b/", 0, {"a", "/", "b", false, true}},
        {"/a/b/", 1, {"b", "/a", "", true, false}},
        {"/a/b/", 2, {"", "/a/b", "", true, false}},
        {"/a/b/", 9, {"", "/a/b", "", true, false}},
        {"a/b/c", 2, {"c", "a/b", "", true, false}},
        {"a/b/c", 1, {"b", "a", "c", true, true}},
        // Empty segments count, and look like none.
        {"a//b", 1, {"", "a//b", "", true, false}},
        {"a//b", 2, {"b", "a/", "", true, false}},
        {"//a", 0, {"", "//a", "", false, false}},
        {"//a", 1, {"a", "/", "", true, false}},
        {"a//", 0, {"a", "", "", false, false}},  // one '/' is dropped, one stays
        {"a//", 1, {"", "a/", "", true, false}},
    };
    for (const auto& row : rows) {
        PathView view(row.path);
        view.advance(row.steps);
        EXPECT_EQ(look(view), row.expected) << "'" << row.path << "' after " << row.steps;
    }
    EXPECT_EQ(look(PathView()), look(PathView("")));
    EXPECT_EQ(PathView("/a/b/").full(), "/a/b");
}

TEST(PathView, AdvancesBackToTheFirstSegment) {
    const struct {
        const char* path;
        long forth;
        long back;
        const char* expected;
    } rows[] = {
        {"a/b/c", 2, -1, "b"}, {"a/b/c", 2, -5, "a"}, {"a/b/c", 3, -1, "c"}, {"a/b/c", 9, -2, "b"},
        {"/a/b", 2, -1, "b"},  {"/a/b", 2, -2, "a"},  {"/a/b", 1, -9, "a"},  {"a//b", 2, -1, ""},
        {"a//b", 2, -2, "a"},  {"//a", 1, -1, ""},    {"a", 1, -1, "a"},     {"/", 1, -1, ""},
    };
    for (const auto& row : rows) {
        PathView view(row.path);
        view.advance(row.forth);
        view.advance(row.back);
        EXPECT_EQ(view.current(), row.expected) << row.path << " " << row.forth << " " << row.back;
    }
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

// The same view over a list of segments: slow and obvious.
class Model {
  public:
    explicit Model(std::string path) {
        if (path.size() >= 2 && path.back() == '/')
            path.pop_back();
        isEmpty_ = path.empty();
        if (path.starts_with('/')) {
            isRooted_ = true;
            path.erase(0, 1);
        }
        std::size_t begin = 0;
        for (std::size_t slash = 0; (slash = path.find('/', begin)) != std::string::npos;
             begin = slash + 1)
            segments_.push_back(path.substr(begin, slash - begin));
        // Nothing behind the last separator is no segment.
        if (begin < path.size())
            segments_.push_back(path.substr(begin));
    }

    void advance(long steps) {
        if (isEmpty_ || segments_.empty())
            return;
        const long last = static_cast<long>(segments_.size());
        at_ = std::clamp(at_ + std::clamp(steps, -last, last), 0L, last);
    }
    [[nodiscard]] std::string current() const {
        return at() < segments_.size() ? segments_[at()] : "";
    }
    [[nodiscard]] std::string head() const {
        return joined(0, current().empty() ? segments_.size() : at());
    }

    // "a//": nothing follows the last separator, which only full() can show.
    [[nodiscard]] bool isPlain(std::string_view full) const {
        return joined(0, segments_.size()) == full;
    }

  private:
    [[nodiscard]] std::size_t at() const { return static_cast<std::size_t>(at_); }
    [[nodiscard]] std::string joined(std::size_t from, std::size_t to) const {
        std::string text = isRooted_ ? "/" : "";
        for (std::size_t i = from; i < to; ++i)
            text += (i == from ? "" : "/") + segments_[i];
        return text;
    }

    std::vector<std::string> segments_;
    long at_ = 0;
    bool isRooted_ = false;
    bool isEmpty_ = false;
};

TEST(PathView, AgreesWithAListOfSegments) {
    std::mt19937 random(20'240'501);
    const auto pick = [&random](int low, int high) {
        return std::uniform_int_distribution<int>(low, high)(random);
    };
    for (int round = 0; round < 20'000; ++round) {
        std::string path;
        for (int left = pick(0, 12); left > 0; --left)
            path += "//ab_"[pick(0, 4)];
        PathView view(path);
        Model model(path);
        for (int moves = 0; moves < 8; ++moves) {
            EXPECT_EQ(view.current(), model.current()) << path;
            if (model.isPlain(view.full())) {
                EXPECT_EQ(view.head(), model.head()) << path << " at " << view.current();
            }
            const long steps = pick(-3, 3);
            view.advance(steps);
            model.advance(steps);
        }
        if (HasFailure())
            return;
    }
}

}  // namespace
