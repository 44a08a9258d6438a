#include "plr/log/logger_tree.h"

#include <gmock/gmock.h>

#include <random>

#include "plr/ipc/values.h"
#include "support/fake_tracked_logger.h"

namespace {

using namespace plr;
using namespace plr::test;
using enum LogLevel;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;
using Levels = std::vector<LogLevel>;

vox::object number(LogLevel level) {
    return vox::int64(static_cast<int>(level));
}

vox::dict asDict(const std::vector<std::pair<std::string, vox::object>>& levels) {
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
        EXPECT_EQ(splitPath(path), parts) << path;
}

TEST(LoggerTree, TakesOddConfigurationsLeniently) {
    const struct {
        const char* name;
        vox::object config;
        LogLevel level;  // of "a", which was at Debug
    } rows[] = {
        {"no dictionary", vox::string("a"), Debug},
        {"behind a dot", asDict({{".a", number(Warn)}}), Warn},
        {"the last key of a node's wins", asDict({{"a", number(Warn)}, {".a", number(Trace)}}),
         Warn},
        {"text counts as Unset", asDict({{"a", vox::string("80")}}), Info},
        {"cut to 8 bits", asDict({{"a", vox::int64(256 + 10)}}), Trace},
        {"a level without a name", asDict({{"a", vox::uint64(30)}}), LogLevel{30}},
    };
    for (const auto& row : rows) {
        LoggerTree root = infoRoot();
        root.updateLogLevels(asDict({{"a", number(Debug)}}));
        root.updateLogLevels(row.config);
        root.commitConfigUpdate();
        EXPECT_EQ(root.getLogLevelAt("a"), row.level) << row.name;
    }
}

TEST(LoggerTree, ListsWhatIsConfiguredOrEverythingThatLives) {
    LoggerTree root = infoRoot();
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
    vox::dict config = vox::dict::create();
    root.getSimpleConfig(config);
    EXPECT_EQ(config["kDomainLogLevels"], asDict({{"a", number(Warn)}}));
    const vox::array loggers = vox::array::create();
    loggers.append(logger("own", Trace));
    EXPECT_EQ(config["kLoggers"], loggers);

    root.getFullConfig(config);
    EXPECT_EQ(config["kDomainLogLevels"],
              asDict({{"", number(Info)}, {"a", number(Warn)}, {"a.b", number(Warn)}}));
    EXPECT_EQ(vox::array(config["kLoggers"]).count(), 2u);
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

TEST(LoggerTree, ForgetsDomainsThatNobodyNeeds) {
    LoggerTree root = infoRoot();
    root.updateLogLevels(asDict({{"kept.level", number(Warn)}}));
    root.commitConfigUpdate();
    const auto living = insertNew(root, "kept.logger");
    for (const char* path : {"kept.logger.x", "kept.level.x", "gone.x.y", "kept.x", "..dots", ""})
        insertNew(root, path);  // gone
    for (const char* path : {"kept.logger.x", "kept.level.x", "gone.x.y.z", "kept.x", "dots", ""})
        root.tidyUpAt(path);
    vox::dict config = vox::dict::create();
    root.getFullConfig(config);
    EXPECT_EQ(config["kDomainLogLevels"], asDict({{"", number(Info)},
                                                  {"kept", number(Info)},
                                                  {"kept.level", number(Warn)},
                                                  {"kept.logger", number(Info)}}));
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
    const LoggerTree copy = root;
    copy.getFullConfig(config);
    EXPECT_EQ(vox::dict(config["kDomainLogLevels"]).count(), LoggerTree::kMaxComponents + 1);
}

// Random changes beside a model: every node's level and whoever was told.
class Model {
  public:
    LogLevel effective(const std::string& path) const {
        LogLevel level = combine(Info, local(""));
        for (std::size_t end = 0; !path.empty() && end != std::string::npos;) {
            end = path.find('.', end + 1);
            level = combine(level, local(path.substr(0, end)));
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

    // A commit tells the loggers whose level changed, once; nothing else does.
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
            ASSERT_EQ(logger->takeTold(), Levels(now == before[domain] ? 0 : 1, now)) << domain;
        }
    }
}

}  // namespace
