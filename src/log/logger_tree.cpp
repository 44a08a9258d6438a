#include "plr/log/logger_tree.h"

#include <algorithm>
#include <cstdint>
#include <map>

#include "plr/ipc/read.h"
#include "plr/ipc/values.h"
#include "plr/log/tracked_logger.h"

namespace plr {

namespace {

struct Split {
    std::string_view head;
    std::string_view rest;
};

std::string_view withoutLeadingDots(std::string_view path) {
    path.remove_prefix(std::min(path.find_first_not_of('.'), path.size()));
    return path;
}

Split split(std::string_view path) {
    path = withoutLeadingDots(path);
    const std::size_t dot = path.find('.');
    if (dot == std::string_view::npos)
        return {path, {}};
    return {path.substr(0, dot), path.substr(dot + 1)};
}

// The names along a path.
class Names {
  public:
    explicit Names(std::string_view path) : rest_(path) {}

    // Empty at the end.
    std::string_view next() {
        const bool last = ++taken_ == LoggerTree::kMaxComponents;
        const Split parts = last ? Split{withoutLeadingDots(rest_), {}} : split(rest_);
        rest_ = parts.rest;
        return parts.head;
    }

  private:
    std::string_view rest_;
    std::size_t taken_ = 0;
};

vox::object asValue(LogLevel level) {
    return vox::int64(static_cast<std::uint8_t>(level));
}

}  // namespace

std::pair<std::string, std::string> splitPath(const std::string& path) {
    const Split parts = split(path);
    return {std::string(parts.head), std::string(parts.rest)};
}

void LoggerTree::insertAt(const std::string& path, const std::shared_ptr<TrackedLogger>& logger) {
    LoggerTree& node = getOrCreateFromPath(path);
    node.tidyUp();
    node.loggers_.push_back(logger);
    logger->updateTrackedConfig(node.getLogLevel());
}

LoggerTree& LoggerTree::getOrCreateFromPath(const std::string& path) {
    Names names(path);
    LoggerTree* node = this;
    for (std::string_view name = names.next(); !name.empty(); name = names.next())
        node = &node->getOrCreateChild(name);
    return *node;
}

LoggerTree::Children::const_iterator LoggerTree::placeOf(std::string_view name) const {
    return std::ranges::lower_bound(children_, name, {}, &LoggerTree::name_);
}

LoggerTree& LoggerTree::getOrCreateChild(std::string_view name) {
    const auto place = placeOf(name);
    const auto index = static_cast<std::size_t>(place - children_.begin());
    if (place != children_.end() && place->name_ == name)
        return children_[index];
    LoggerTree& child = *children_.emplace(place, std::string(name));
    child.updateParentLogLevel(getLogLevel());
    child.commit();
    return child;
}

const LoggerTree& LoggerTree::getNearestToPath(const std::string& path) const {
    Names names(path);
    const LoggerTree* node = this;
    for (std::string_view name = names.next(); !name.empty(); name = names.next()) {
        const auto place = node->placeOf(name);
        if (place == node->children_.end() || place->name_ != name)
            break;
        node = &*place;
    }
    return *node;
}

void LoggerTree::updateLogLevels(const vox::dict& config) {
    std::map<std::string, LogLevel> levels;
    const char* path = nullptr;
    for (std::size_t i = 0;
         const vox_object_t value = vox_dictionary_get_entry(config.get(), i, &path); ++i) {
        const long long number = vox::dyn_cast_or_default(vox::object::retain(value), 0LL);
        levels[path] = static_cast<LogLevel>(static_cast<std::uint8_t>(number));
    }
    for (const auto& [name, level] : levels)
        getOrCreateFromPath(name).updateLocalLogLevel(level);
}

void LoggerTree::updateLocalLogLevel(LogLevel level) {
    if (getNewLocalLogLevel() == level)
        return;
    createUpdateConfig();
    pending_->local = level;
}

void LoggerTree::updateParentLogLevel(LogLevel level) {
    if (getNewParentLogLevel() == level)
        return;
    createUpdateConfig();
    pending_->parent = level;
}

void LoggerTree::createUpdateConfig() {
    if (!pending_)
        pending_ = committed_;
}

std::shared_ptr<const LoggerTree::LevelList> LoggerTree::commitConfigUpdate() {
    commit();
    auto levels = std::make_shared<LevelList>();
    appendLevels("", *levels);
    std::ranges::sort(*levels, {}, &LevelList::value_type::first);
    return levels;
}

void LoggerTree::commit() {
    if (pending_) {
        const LogLevel level = getNewLogLevel();
        if (level != getLogLevel())
            announce(level);
        committed_ = *pending_;
        pending_.reset();
    }
    for (LoggerTree& child : children_)
        child.commit();
}

void LoggerTree::announce(LogLevel level) {
    for (LoggerTree& child : children_)
        child.updateParentLogLevel(level);
    for (const auto& logger : loggers_) {
        if (const auto alive = logger.lock())
            alive->updateTrackedConfig(level);
    }
}

void LoggerTree::appendLevels(const std::string& prefix, LevelList& out) const {
    const bool isRoot = prefix.empty() && name_.empty();
    const std::string fullName = prefix.empty() ? name_ : prefix + "." + name_;
    const LogLevel level = isRoot ? getLogLevel() : committed_.local;
    if (level != LogLevel::Unset)
        out.emplace_back(fullName, level);
    for (const LoggerTree& child : children_)
        child.appendLevels(fullName, out);
}

void LoggerTree::getSimpleConfig(vox::dict& config) const {
    fillConfig(config, false);
}

void LoggerTree::getFullConfig(vox::dict& config) const {
    fillConfig(config, true);
}

void LoggerTree::fillConfig(vox::dict& config, bool full) const {
    config[config_key::kDomainLogLevels] = vox::dict::create();
    config[config_key::kLoggers] = vox::array::create();
    getConfig("", config, full);
}

void LoggerTree::getConfig(std::string path, vox::dict& config, bool full) const {
    if (full || committed_.local != LogLevel::Unset) {
        const vox::dict levels(config[config_key::kDomainLogLevels]);
        levels[path.c_str()] = asValue(getLogLevel());
    }
    appendLoggers(path, config[config_key::kLoggers], full);
    if (!path.empty())
        path += '.';
    for (const LoggerTree& child : children_)
        child.getConfig(path + child.name_, config, full);
}

void LoggerTree::appendLoggers(const std::string& path, const vox::array& out, bool full) const {
    for (const auto& logger : loggers_) {
        const auto alive = logger.lock();
        if (!alive)
            continue;
        const LogLevel level = alive->getTrackedLogLevel();
        if (!full && level == LogLevel::Unset)
            continue;
        const vox::dict entry = vox::dict::create();
        entry[config_key::kLoggerName] =
            vox::string(std::string_view(alive->getTrackedLoggerName()));
        entry[config_key::kLoggerLevel] = asValue(level);
        entry[config_key::kLoggerDomain] = vox::string(std::string_view(path));
        out.append(entry);
    }
}

void LoggerTree::tidyUp() {
    std::erase_if(loggers_, [](const auto& logger) { return logger.expired(); });
}

bool LoggerTree::isNeeded() const noexcept {
    return !children_.empty() || !loggers_.empty() || committed_.local != LogLevel::Unset ||
           pending_;
}

void LoggerTree::tidyUpAt(const std::string& path) {
    Names names(path);
    std::vector<LoggerTree*> way{this};
    for (std::string_view name = names.next(); !name.empty(); name = names.next()) {
        Children& children = way.back()->children_;
        const auto index = static_cast<std::size_t>(way.back()->placeOf(name) - children.begin());
        if (index == children.size() || children[index].name_ != name)
            break;
        way.push_back(&children[index]);
    }
    for (; !way.empty(); way.pop_back()) {
        LoggerTree& node = *way.back();
        node.tidyUp();
        if (way.size() > 1 && !node.isNeeded()) {
            Children& siblings = way[way.size() - 2]->children_;
            siblings.erase(siblings.begin() + (&node - siblings.data()));
        }
    }
}

}  // namespace plr
