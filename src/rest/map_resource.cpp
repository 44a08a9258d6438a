#include "plr/rest/map_resource.h"

#include <utility>

#include "plr/ipc/array.h"
#include "plr/ipc/dict.h"
#include "src/rest/notify.h"
#include "src/rest/property_path.h"
#include "src/rest/value_part.h"

namespace plr::rest {
namespace {

using Kind = PropertyPathKind;

// Paths are those of properties, but stricter.
PropertyPath parse(const PathView& path) noexcept {
    PropertyPath parsed = parsePropertyPath(path);
    const bool namesKey = parsed.kind == Kind::Resource || parsed.kind == Kind::ResourceWatchers;
    if (!namesKey)
        return parsed;
    const bool isKey = !parsed.name.empty() && parsed.name.find('\0') == std::string_view::npos;
    if (!isKey || (parsed.kind == Kind::Resource && path.hasTail()))
        parsed.kind = Kind::Unknown;
    return parsed;
}

bool isWholeKey(const PropertyPath& parsed) noexcept {
    return parsed.kind == Kind::Resource && parsed.subpath.empty();
}

// The map's own path, however a message spelled it.
std::string mapPath(const PathView& path) {
    return path_join("/", path.head());
}

vox::dict dictOf(const MapChange& whole) {
    const vox::dict values = vox::dict::create();
    for (const auto& [key, value] : whole.set)
        values[key.c_str()] = value;
    return values;
}

}  // namespace

MapRestResource::MapRestResource(bool areOwned, std::size_t limit)
    : areOwned_(areOwned), limit_(limit) {}
MapRestResource::MapRestResource(std::size_t limit) : MapRestResource(false, limit) {}
MapRestResource::MapRestResource(owned_entries_tag, std::size_t limit)
    : MapRestResource(true, limit) {}
MapRestResource::~MapRestResource() = default;

// ---- GET -----------------------------------------------------------------------

bool MapRestResource::handleRestMessage_GET(RestResourceContext& context, const PathView& path) {
    const PropertyPath parsed = parse(path);
    switch (parsed.kind) {
        case Kind::Root:
        case Kind::DumpState:
            context.sendReplyWithValue(dictOf(wholeMap()));
            return true;
        case Kind::MetaWatchers:
            context.sendReplyWithValue(watchers_.getWatcherNames());
            return true;
        case Kind::Resource:
            context.sendReplyWithValue(valueOf(parsed.name, parsed.subpath));
            return true;
        case Kind::ResourceWatchers:
            context.sendReplyWithValue(watchersOf(parsed.name));
            return true;
        default:
            return false;
    }
}

vox::object MapRestResource::valueOf(std::string_view key, std::string_view subpath) const {
    const auto found = entries_.find(key);
    return found == entries_.end() ? vox::object() : partOf(found->second.value, subpath);
}

vox::object MapRestResource::watchersOf(std::string_view key) const {
    const auto found = entries_.find(key);
    return found == entries_.end() ? vox::array::create()
                                   : found->second.watchers.getWatcherNames();
}

MapChange MapRestResource::wholeMap() const {
    MapChange change{.whole = true};
    change.set.reserve(present_);
    for (const auto& [key, entry] : entries_)
        if (entry.value)
            change.set.emplace_back(key, entry.value);
    return change;
}

// ---- SET -----------------------------------------------------------------------

bool MapRestResource::handleRestMessage_SET(RestResourceContext& context, const PathView& path) {
    const PropertyPath parsed = parse(path);
    if (!isWholeKey(parsed))
        return false;
    const Client author = context.getAuthorResource();
    const auto found = entries_.find(parsed.name);
    const bool exists = found != entries_.end() && found->second.value;
    if (!mayChange(context, author, exists ? &found->second : nullptr))
        return false;
    if (context.getRestValue())
        return set(context, mapPath(path), parsed.name, found, author);
    if (exists)
        remove(context, mapPath(path), found);
    return true;
}

bool MapRestResource::mayChange(RestResourceContext& context, const Client& author,
                                const Entry* entry) const {
    if (!areOwned_)
        return true;
    if (!author)  // the service itself, or somebody unknown
        return !context.getRawAuthorConnection();
    return !entry || entry->owner.lock() == author;
}

bool MapRestResource::set(RestResourceContext& context, const std::string& map,
                          std::string_view key, Entries::iterator found, const Client& author) {
    const bool isNew = found == entries_.end() || !found->second.value;
    if (isNew && present_ >= limit_)
        return false;
    const auto place =
        found != entries_.end() ? found : entries_.try_emplace(std::string(key)).first;
    if (isNew)
        ++present_;
    if (isNew && areOwned_ && author) {
        place->second.owner = author;
        owned_[author].insert(place->first);
    }
    place->second.value = context.getRestValue();
    tellKey(context, map, *place);
    if (watchers_.hasWatchers())
        tellMap(context, map, {.set = {{place->first, place->second.value}}});
    return true;
}

void MapRestResource::remove(RestResourceContext& context, const std::string& map,
                             Entries::iterator place) {
    clear(place);
    tellKey(context, map, *place);
    if (watchers_.hasWatchers())
        tellMap(context, map, {.removed = {place->first}});
    eraseUnused(place);
}

void MapRestResource::clear(Entries::iterator place) {
    auto& [key, entry] = *place;
    entry.value = nullptr;
    --present_;
    const auto keys = owned_.find(std::exchange(entry.owner, {}));
    if (keys == owned_.end())
        return;
    keys->second.erase(key);
    if (keys->second.empty())
        owned_.erase(keys);
}

void MapRestResource::tellKey(RestResourceContext& context, const std::string& map,
                              const Entries::value_type& entry) const {
    if (entry.second.watchers.hasWatchers())
        notifyWatchers(context, entry.second.watchers, asText(path_join(map, entry.first)),
                       entry.second.value);
}

void MapRestResource::tellMap(RestResourceContext& context, const std::string& map,
                              const MapChange& change) const {
    notifyWatchers(context, watchers_, asText(map), write_rest_value(change));
}

// ---- PUSH and POP --------------------------------------------------------------

bool MapRestResource::handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) {
    const PropertyPath parsed = parse(path);
    if (parsed.kind == Kind::Root)
        return pushMap(context, mapPath(path));
    return isWholeKey(parsed) && pushKey(context, mapPath(path), parsed.name);
}

bool MapRestResource::pushMap(RestResourceContext& context, const std::string& map) {
    const Client author = context.getAuthorResource();
    if (!author)
        return false;
    watchers_.addWatcher(author);
    notifyWatcher(context, *author, asText(map), write_rest_value(wholeMap()));
    return true;
}

bool MapRestResource::pushKey(RestResourceContext& context, const std::string& map,
                              std::string_view key) {
    const Client author = context.getAuthorResource();
    const auto found = entries_.find(key);
    const bool isWatched = found != entries_.end() && found->second.watchers.hasWatchers();
    if (!author || (!isWatched && watched_ >= limit_))
        return false;
    const auto place =
        found != entries_.end() ? found : entries_.try_emplace(std::string(key)).first;
    watched_ += isWatched ? 0 : 1;
    place->second.watchers.addWatcher(author);
    notifyWatcher(context, *author, asText(path_join(map, key)), place->second.value);
    return true;
}

bool MapRestResource::handleRestMessage_POP(RestResourceContext& context, const PathView& path) {
    const PropertyPath parsed = parse(path);
    const Client author = context.getAuthorResource();
    if (!author || (parsed.kind != Kind::Root && !isWholeKey(parsed)))
        return false;
    if (parsed.kind == Kind::Root) {
        watchers_.removeWatcher(author);
    } else if (const auto found = entries_.find(parsed.name); found != entries_.end()) {
        stopWatching(found->second, author);
        eraseUnused(found);
    }
    return true;
}

void MapRestResource::stopWatching(Entry& entry, const Client& client) {
    if (entry.watchers.removeWatcher(client) && !entry.watchers.hasWatchers())
        --watched_;
}

void MapRestResource::eraseUnused(Entries::iterator place) {
    if (!place->second.value && !place->second.watchers.hasWatchers())
        entries_.erase(place);
}

// ---- Drops ---------------------------------------------------------------------

void MapRestResource::handleDroppedConnection(
    RestResourceContext& context, const PathView& path,
    const std::shared_ptr<RestResourceConnection>& connection) {
    const auto found = owned_.find(connection);
    if (found == owned_.end())
        return;
    const std::string map = path_join("/", path.full());
    MapChange change{.removed = {found->second.begin(), found->second.end()}};
    watchers_.removeWatcher(connection);  // who went is told nothing
    for (const std::string& key : change.removed) {
        const auto place = entries_.find(key);
        stopWatching(place->second, connection);
        clear(place);
        tellKey(context, map, *place);
        eraseUnused(place);
    }
    if (watchers_.hasWatchers())
        tellMap(context, map, change);
}

void MapRestResource::cleanupWatchers(RestResourceContext&, const PathView&) {
    watchers_.cleanupExpired();
    watched_ = 0;
    for (auto& entry : entries_) {
        entry.second.watchers.cleanupExpired();
        watched_ += entry.second.watchers.hasWatchers() ? 1 : 0;
    }
    std::erase_if(entries_, [](const auto& entry) {
        return !entry.second.value && !entry.second.watchers.hasWatchers();
    });
}

}  // namespace plr::rest
