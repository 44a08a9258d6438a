#include "plr/log/logger_tree.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <random>

#include "plr/ipc/values.h"
#include "support/fake_tracked_logger.h"

namespace {

using enum plr::LogLevel;
using plr::LoggerTree;
using plr::LogLevel;
using plr::test::FakeTrackedLogger;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;
using Told = std::vector<LogLevel>;
using Levels = std::vector<std::pair<std::string, vox::object>>;

vox::object number(LogLevel level) {
    return vox::int64(static_cast<int>(level));
}

vox::dict asDict(const Levels& levels) {
    const vox::dict dict = vox::dict::create();
    for (const auto& [path, level] : levels)
        dict[path.c_str()] = level;
    return dict;
}

// A root whose level is Info, as a started server's.
LoggerTree infoRoot() {
    LoggerTree root("");
    root.updateParentLogLevel(Info);
    root.commitConfigUpdate();
    return root;
}

std::shared_ptr<FakeTrackedLogger> insertNew(LoggerTree& root, const std::string& path) {
    auto logger = std::make_shared<FakeTrackedLogger>(path);
    root.insertAt(path, logger);
    return logger;
}

TEST(LoggerTree, SplitsThePath) {
    const std::map<std::string, std::pair<std::string, std::string>> rows{
        {"a.b.c", {"a", "b.c"}}, {"..a", {"a", ""}}, {"", {"", ""}},
        {"a..b", {"a", ".b"}},   {"a.", {"a", ""}},  {"...", {"", ""}}};
    for (const auto& [path, parts] : rows)
        EXPECT_EQ(plr::splitPath(path), parts) << path;
}

TEST(LoggerTree, InsertingMakesNodesAndTellsTheLevelOnce) {
    LoggerTree root = infoRoot();
    const auto logger = insertNew(root, "a.b");
    EXPECT_THAT(logger->takeTold(), ElementsAre(Info));

    vox::dict config = vox::dict::create();
    root.getFullConfig(config);
    EXPECT_EQ(vox::dict(config["kDomainLogLevels"]),
              asDict({{"", number(Info)}, {"a", number(Info)}, {"a.b", number(Info)}}));
}

struct Change {
    const char* name;
    std::vector<Levels> configs;  // what the last one sends is looked at
    Told root, a, ab, b;
};

TEST(LoggerTree, ACommitTellsTheLoggersWhoseLevelChanged) {
    const Change rows[] = {
        {"nothing", {{}}, {}, {}, {}, {}},
        {"below, but not beside", {{{"a", number(Debug)}}}, {}, {Debug}, {Debug}, {}},
        {"the same again", {{{"a", number(Debug)}}, {{"a", number(Debug)}}}, {}, {}, {}, {}},
        {"what it had already", {{{"a", number(Info)}}}, {}, {}, {}, {}},
        {"at the root", {{{"", number(Warn)}}}, {Warn}, {Warn}, {Warn}, {Warn}},
        {"behind a dot", {{{".a", number(Debug)}}}, {}, {Debug}, {Debug}, {}},
        {"the last key of a node's wins",
         {{{"a", number(Warn)}, {".a", number(Debug)}}},
         {},
         {Warn},
         {Warn},
         {}},
        {"shielded by its own level",
         {{{"a.b", number(Warn)}}, {{"a", number(Debug)}}},
         {},
         {Debug},
         {},
         {}},
        {"Never cannot be overridden",
         {{{"a.b", number(Trace)}}, {{"a", number(Never)}}},
         {},
         {Never},
         {Never},
         {}},
        {"taken back", {{{"a", number(Debug)}}, {{"a", number(Unset)}}}, {}, {Info}, {Info}, {}},
        {"text counts as Unset",
         {{{"a", number(Debug)}}, {{"a", vox::string("80")}}},
         {},
         {Info},
         {Info},
         {}},
        {"cut to 8 bits", {{{"b", vox::int64(256 + 20)}}}, {}, {}, {}, {Debug}},
        {"a level without a name", {{{"b", vox::uint64(30)}}}, {}, {}, {}, {LogLevel{30}}},
    };
    for (const Change& row : rows) {
        SCOPED_TRACE(row.name);
        LoggerTree root = infoRoot();
        const std::shared_ptr<FakeTrackedLogger> loggers[] = {
            insertNew(root, ""), insertNew(root, "a"), insertNew(root, "a.b"),
            insertNew(root, "b")};
        for (const Levels& config : row.configs) {
            for (const auto& logger : loggers)
                logger->takeTold();
            root.updateLogLevels(asDict(config));
            EXPECT_THAT(loggers[1]->takeTold(), IsEmpty()) << "told before the commit";
            root.commitConfigUpdate();
        }
        EXPECT_EQ(loggers[0]->takeTold(), row.root);
        EXPECT_EQ(loggers[1]->takeTold(), row.a);
        EXPECT_EQ(loggers[2]->takeTold(), row.ab);
        EXPECT_EQ(loggers[3]->takeTold(), row.b);
    }
}

TEST(LoggerTree, AConfigurationThatIsNoDictionaryChangesNothing) {
    LoggerTree root = infoRoot();
    root.updateLogLevels(vox::string("a"));
    EXPECT_THAT(*root.commitConfigUpdate(), ElementsAre(Pair("", Info)));
}

TEST(LoggerTree, CommittedLevelsAreSortedByBytesAndTheTreesOwnAreNot) {
    LoggerTree root = infoRoot();
    root.updateLogLevels(asDict({{"a", number(Warn)},
                                 {"a-b", number(Warn)},
                                 {"a.b", number(Warn)},
                                 {"\xC3\xA4", number(Warn)},
                                 {"unset", number(Unset)}}));
    EXPECT_THAT(*root.commitConfigUpdate(),
                ElementsAre(Pair("", Info), Pair("a", Warn), Pair("a-b", Warn), Pair("a.b", Warn),
                            Pair("\xC3\xA4", Warn)));
    LoggerTree::LevelList own;
    root.getOrCreateFromPath("a").appendLevels("x", own);
    root.getOrCreateFromPath("a-b").appendLevels("x", own);
    EXPECT_THAT(own, ElementsAre(Pair("x.a", Warn), Pair("x.a.b", Warn), Pair("x.a-b", Warn)));
}

TEST(LoggerTree, StagedLevelsWaitForTheCommitEvenInACopy) {
    LoggerTree root = infoRoot();
    root.updateLogLevels(asDict({{"a", number(Debug)}}));
    EXPECT_EQ(root.getLogLevelAt("a"), Info);
    EXPECT_EQ(root.getOrCreateFromPath("a").getNewLogLevel(), Debug);
    EXPECT_EQ(root.getOrCreateFromPath("a.new").getLogLevel(), Info);

    LoggerTree copy = root;
    copy.commitConfigUpdate();
    EXPECT_EQ(copy.getLogLevelAt("a.new.deeper"), Debug);
    EXPECT_EQ(root.getLogLevelAt("a.new"), Info);
    root.swap(copy);
    EXPECT_EQ(root.getLogLevelAt("a.new"), Debug);
}

TEST(LoggerTree, ListsWhatIsConfiguredOrEverythingThatLives) {
    LoggerTree root = infoRoot();
    vox::dict config = vox::dict::create();
    root.getSimpleConfig(config);
    EXPECT_EQ(config.to_string(), asDict({{"kDomainLogLevels", vox::dict::create()},
                                          {"kLoggers", vox::array::create()}})
                                      .to_string());

    const auto own = std::make_shared<FakeTrackedLogger>("own", Trace);
    const auto plain = std::make_shared<FakeTrackedLogger>("plain");
    root.insertAt("a.b", plain);
    root.insertAt("a.b", own);
    insertNew(root, "a");  // gone
    root.updateLogLevels(asDict({{"a", number(Warn)}}));
    root.commitConfigUpdate();
    const auto logger = [](const char* name, LogLevel level) {
        return asDict({{"kLoggerName", vox::string(std::string_view(name))},
                       {"kLoggerLevel", number(level)},
                       {"kLoggerDomain", vox::string("a.b")}});
    };
    const vox::array simple = vox::array::create();
    simple.append(logger("own", Trace));
    const vox::array full = vox::array::create();
    full.append(logger("plain", Unset));
    full.append(logger("own", Trace));

    root.getSimpleConfig(config);
    EXPECT_EQ(config,
              asDict({{"kDomainLogLevels", asDict({{"a", number(Warn)}})}, {"kLoggers", simple}}));
    root.getFullConfig(config);
    EXPECT_EQ(config,
              asDict({{"kDomainLogLevels",
                       asDict({{"", number(Info)}, {"a", number(Warn)}, {"a.b", number(Warn)}})},
                      {"kLoggers", full}}));
}

TEST(LoggerTree, ForgetsLoggersThatAreGoneWhenAnotherComes) {
    LoggerTree root = infoRoot();
    // Lives as long as anything refers to the logger, also weakly.
    auto token = std::make_shared<int>();
    const std::weak_ptr<int> remembered = token;
    root.insertAt("a", std::shared_ptr<FakeTrackedLogger>(
                           new FakeTrackedLogger,
                           [token](const FakeTrackedLogger* logger) { delete logger; }));
    token.reset();
    EXPECT_FALSE(remembered.expired());
    insertNew(root, "a");
    EXPECT_TRUE(remembered.expired());
}

// A configuration comes from outside: no path of it may exhaust the stack, or
// memory out of proportion.
TEST(LoggerTree, APathOfAHundredThousandNamesIsOneLikeOthers) {
    std::string path;
    for (int i = 0; i < 100'000; ++i)
        path += ".x";
    LoggerTree root = infoRoot();
    const auto logger = insertNew(root, path);
    root.updateLogLevels(asDict({{path, number(Debug)}}));
    const auto levels = root.commitConfigUpdate();

    EXPECT_THAT(logger->takeTold(), ElementsAre(Info, Debug));
    EXPECT_EQ(root.getLogLevelAt(path), Debug);
    EXPECT_EQ(root.getLogLevelAt(path + ".x"), Info);
    EXPECT_THAT(*levels, ElementsAre(Pair("", Info), Pair(path.substr(1), Debug)));
    vox::dict config = vox::dict::create();
    root.getFullConfig(config);
    EXPECT_EQ(vox::dict(config["kDomainLogLevels"]).count(), LoggerTree::kMaxComponents + 1);
    const LoggerTree copy = root;
    EXPECT_EQ(copy.getLogLevelAt(path), Debug);
}

// Random changes beside a model: every node's level and whoever was told.
class Model {
  public:
    LogLevel effective(const std::string& path) const {
        LogLevel level = plr::combine(Info, local(""));
        for (std::size_t end = 0; !path.empty() && end != std::string::npos;) {
            end = path.find('.', end + 1);
            level = plr::combine(level, local(path.substr(0, end)));
        }
        return level;
    }
    void stage(const std::string& path, LogLevel level) { staged_[path] = level; }
    void commit() { committed_ = staged_; }
    LoggerTree::LevelList list() const {
        LoggerTree::LevelList list{{"", effective("")}};
        for (const auto& [path, level] : committed_) {
            if (level != Unset && !path.empty())
                list.emplace_back(path, level);
        }
        return list;
    }

  private:
    LogLevel local(const std::string& path) const {
        const auto found = committed_.find(path);
        return found == committed_.end() ? Unset : found->second;
    }
    std::map<std::string, LogLevel> staged_, committed_;
};

TEST(LoggerTree, FollowsTheModel) {
    std::mt19937 random(2026);
    const auto below = [&random](std::size_t bound) { return random() % bound; };
    const auto anyPath = [&below] {
        static const char* const kNames[] = {"a", "b", "a-b", "aa"};
        std::string path;
        for (std::size_t i = below(5); i > 0; --i)
            path += (path.empty() ? "" : ".") + std::string(kNames[below(std::size(kNames))]);
        return path;
    };
    const LogLevel levels[] = {Unset, Unset, Trace, Debug, Info, LogLevel{33}, Error, Never};

    LoggerTree root = infoRoot();
    Model model;
    std::map<std::shared_ptr<FakeTrackedLogger>, std::string> loggers;
    for (int step = 0; step < 1500; ++step) {
        if (below(4) == 0) {
            const std::string path = anyPath();
            const auto logger = insertNew(root, path);
            ASSERT_THAT(logger->takeTold(), ElementsAre(model.effective(path))) << path;
            loggers.emplace(logger, path);
        }
        if (loggers.size() > 40)
            loggers.erase(std::next(loggers.begin(), static_cast<std::ptrdiff_t>(below(40))));
        const std::string path = anyPath();
        const LogLevel level = levels[below(std::size(levels))];
        root.updateLogLevels(asDict({{path, number(level)}}));
        model.stage(path, level);
        const std::string looked = anyPath();
        ASSERT_EQ(root.getLogLevelAt(looked), model.effective(looked)) << looked;
        if (below(3) != 0)
            continue;

        std::map<std::string, LogLevel> before;
        for (const auto& entry : loggers)
            before[entry.second] = model.effective(entry.second);
        model.commit();
        ASSERT_EQ(*root.commitConfigUpdate(), model.list());
        for (const auto& [logger, domain] : loggers) {
            const LogLevel now = model.effective(domain);
            ASSERT_EQ(logger->takeTold(), now == before[domain] ? Told() : Told{now}) << domain;
        }
    }
}

}  // namespace
