#include "plr/log/logger_tree.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "plr/ipc/values.h"

// A tree of log domains configured with any paths and levels, beside a map of
// names to levels. The input is lines: one byte of level, then the path; an
// empty line commits.
namespace {

using plr::LoggerTree;
using plr::LogLevel;
using Names = std::vector<std::string>;

void check(bool holds) {
    if (!holds)
        std::abort();
}

Names namesOf(const std::string& path) {
    Names names;
    std::pair<std::string, std::string> parts = plr::splitPath(path);
    for (; !parts.first.empty(); parts = plr::splitPath(parts.second)) {
        names.push_back(parts.first);
        if (names.size() == LoggerTree::kMaxComponents - 1) {
            names.push_back(parts.second.substr(
                std::min(parts.second.find_first_not_of('.'), parts.second.size())));
            if (names.back().empty())
                names.pop_back();
            break;
        }
    }
    return names;
}

class Model {
  public:
    void stage(const Names& names, LogLevel level) { staged_[names] = level; }
    void commit() { committed_ = staged_; }
    LogLevel levelOf(const Names& names) const {
        LogLevel level = plr::combine(LogLevel::Info, local({}));
        for (std::size_t i = 1; i <= names.size(); ++i)
            level = plr::combine(
                level, local(Names(names.begin(), names.begin() + static_cast<std::ptrdiff_t>(i))));
        return level;
    }

  private:
    LogLevel local(const Names& names) const {
        const auto found = committed_.find(names);
        return found == committed_.end() ? LogLevel::Unset : found->second;
    }
    std::map<Names, LogLevel> staged_, committed_;
};

void configure(LoggerTree& tree, const std::string& path, std::uint8_t level) {
    const vox::dict levels = vox::dict::create();
    levels[path.c_str()] = vox::int64(level);
    tree.updateLogLevels(levels);
}

void commit(LoggerTree& tree, Model& model) {
    model.commit();
    const auto list = tree.commitConfigUpdate();
    const auto notLess = [](const auto& left, const auto& right) {
        return left.first >= right.first;
    };
    check(std::adjacent_find(list->begin(), list->end(), notLess) == list->end());
    for (const auto& [name, level] : *list)
        check(tree.getLogLevelAt(name) == model.levelOf(namesOf(name)));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    LoggerTree tree("");
    tree.updateParentLogLevel(LogLevel::Info);
    tree.commitConfigUpdate();
    Model model;
    std::vector<std::string> paths;
    std::istringstream input(std::string(reinterpret_cast<const char*>(data), size));
    for (std::string line; std::getline(input, line);) {
        if (line.empty()) {
            commit(tree, model);
            continue;
        }
        const auto level = static_cast<std::uint8_t>(line[0]);
        // As a key of a dictionary: up to the first NUL.
        const std::string& path = paths.emplace_back(line.c_str() + 1);
        configure(tree, path, level);
        model.stage(namesOf(path), static_cast<LogLevel>(level));
    }
    commit(tree, model);
    for (const std::string& path : paths)
        check(tree.getLogLevelAt(path) == model.levelOf(namesOf(path)));
    vox::dict config = vox::dict::create();
    tree.getFullConfig(config);
    return 0;
}
