#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/array.h"
#include "plr/ipc/dict.h"
#include "plr/log/log_level.h"

// A LoggerTree is one node of the tree of log domains, with everything below
// it: which level is configured where, and which loggers live there. A node's
// effective level is its own if that is set, else its parent's; Never above
// cannot be overridden.
//
// Owner:   a value. A log server has the root, whose name is empty.
// Threads: one at a time: the server calls everything on its own queue. Loggers
//          are told their levels on that thread.
// Paths:   names joined by "."; dots in front of a name are skipped, so ".a" and
//          "a" are one node. The empty path is the node itself. Paths come from
//          outside: one with more than kMaxComponents names ends in a node that
//          is named by all that is left of it. So one walk never makes the tree
//          deeper than that, however long the path.
// Changes: update operations stage new levels in their nodes, and nobody sees
//          them before commitConfigUpdate().
// Cost:    finding a node is a binary search per name. References to nodes end
//          with the next node made.
namespace plr {

class TrackedLogger;

// The keys of a server's configuration.
namespace config_key {
inline constexpr const char* kDomainLogLevels = "kDomainLogLevels";  // dictionary: level by domain
inline constexpr const char* kLoggers = "kLoggers";                  // array of dictionaries with
inline constexpr const char* kLoggerName = "kLoggerName";            //   string
inline constexpr const char* kLoggerLevel = "kLoggerLevel";          //   integer, the logger's own
inline constexpr const char* kLoggerDomain = "kLoggerDomain";        //   string
inline constexpr const char* kLogWriters = "kLogWriters";            // array of dictionaries
}  // namespace config_key

// First name of a path, and the rest, without the dot between them: "a.b.c"
// gives "a" and "b.c", "..a" gives "a" and nothing, "a..b" gives "a" and ".b".
[[nodiscard]] PLR_EXPORT std::pair<std::string, std::string> splitPath(const std::string& path);

class PLR_EXPORT LoggerTree {
  public:
    static constexpr std::size_t kMaxComponents = 64;
    // Full names and levels.
    using LevelList = std::vector<std::pair<std::string, LogLevel>>;

    // A node alone, levels Unset.
    explicit LoggerTree(std::string name) : name_(std::move(name)) {}
    void swap(LoggerTree& other) noexcept { std::swap(*this, other); }

    // Tracks `logger` (weakly, not null) at `path` and tells it that node's level.
    void insertAt(const std::string& path, const std::shared_ptr<TrackedLogger>& logger);

    // New nodes start with their parent's level as it is now.
    [[nodiscard]] LoggerTree& getOrCreateFromPath(const std::string& path);
    // The deepest node that exists along the path.
    [[nodiscard]] const LoggerTree& getNearestToPath(const std::string& path) const;

    [[nodiscard]] LogLevel getLogLevel() const noexcept { return committed_.effective(); }
    // The level that applies at `path`, whether there is a node or not.
    [[nodiscard]] LogLevel getLogLevelAt(const std::string& path) const {
        return getNearestToPath(path).getLogLevel();
    }

    // Stages the local levels of a dictionary with levels by path, in the order
    // of its keys' bytes; makes the nodes. A value that is no integer counts as
    // Unset, a number is cut to 8 bits. No dictionary changes nothing.
    void updateLogLevels(const vox::dict& config);

    // Staging on this node, and what its levels will be.
    void updateLocalLogLevel(LogLevel level);
    void updateParentLogLevel(LogLevel level);
    void createUpdateConfig();
    [[nodiscard]] LogLevel getNewLogLevel() const noexcept { return upcoming().effective(); }
    [[nodiscard]] LogLevel getNewParentLogLevel() const noexcept { return upcoming().parent; }
    [[nodiscard]] LogLevel getNewLocalLogLevel() const noexcept { return upcoming().local; }

    // Makes staged levels of this node and below effective and tells the loggers
    // whose node's effective level changed. Returns the configured levels, as
    // appendLevels() lists them, sorted by the bytes of the full names. (The
    // order of the tree is another: "a.b" comes before "a-b" there.)
    std::shared_ptr<const LevelList> commitConfigUpdate();

    // Appends the nodes with a local level, and their full names below `prefix`,
    // each in front of its children; of a root (no prefix, no name) the effective
    // level.
    void appendLevels(const std::string& prefix, LevelList& out) const;

    // What is configured, as two new entries of `config`: kDomainLogLevels and
    // kLoggers. The simple form has the nodes and loggers with a level of their
    // own, the full one has all.
    void getSimpleConfig(vox::dict& config) const;
    void getFullConfig(vox::dict& config) const;
    // Adds this node and those below to the two entries; `path` is its full name.
    void getConfig(std::string path, vox::dict& config, bool full) const;

    // Forgets this node's loggers that are gone.
    void tidyUp();
    // The same at `path` and on the way there; nodes that nobody needs go too:
    // without a level of their own, loggers, and nodes below.
    void tidyUpAt(const std::string& path);

  private:
    struct Levels {
        LogLevel local = LogLevel::Unset;
        LogLevel parent = LogLevel::Unset;  // the parent's effective one
        [[nodiscard]] LogLevel effective() const noexcept { return combine(parent, local); }
    };

    [[nodiscard]] const Levels& upcoming() const noexcept {
        return pending_ ? *pending_ : committed_;
    }
    using Children = std::vector<LoggerTree>;
    // The first child whose name is not less.
    [[nodiscard]] Children::const_iterator placeOf(std::string_view name) const;
    [[nodiscard]] LoggerTree& getOrCreateChild(std::string_view name);
    [[nodiscard]] bool isNeeded() const noexcept;
    void commit();
    void announce(LogLevel level);
    void fillConfig(vox::dict& config, bool full) const;
    void appendLoggers(const std::string& path, const vox::array& out, bool full) const;

    Children children_;  // sorted by the bytes of their names
    std::vector<std::weak_ptr<TrackedLogger>> loggers_;
    std::string name_;  // this node's alone
    Levels committed_;
    std::optional<Levels> pending_;  // staged and not committed
};

}  // namespace plr
