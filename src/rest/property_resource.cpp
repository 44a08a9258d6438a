#include "plr/rest/property_resource.h"

#include <string>
#include <utility>

#include "plr/ipc/values.h"
#include "plr/rest/reply_dict_context.h"
#include "src/rest/notify.h"
#include "src/rest/property_path.h"
#include "src/rest/value_part.h"

namespace plr::rest {
namespace {

using Kind = PropertyPathKind;

std::string watchedPath(const PathView& path) {
    return path_join(path.head(), "_/watched");
}

}  // namespace

struct PropertyRestResource::Entry {
    WatchableRestResourceHelper watchers;
    vox::object value;  // null until set
};

PropertyRestResource::PropertyRestResource(bool keepValues) : keepValues_(keepValues) {}

PropertyRestResource::~PropertyRestResource() = default;

bool PropertyRestResource::handleRestMessage_GET(RestResourceContext& context,
                                                 const PathView& path) {
    const PropertyPath parsed = parsePropertyPath(path);
    switch (parsed.kind) {
        case Kind::Root:
            handleMessage_Root_GET(context);
            break;
        case Kind::Meta:
            handleMessage_Meta_GET(context);
            break;
        case Kind::MetaWatchers:
            handleMessage_Meta_Watchers_GET(context);
            break;
        case Kind::MetaWatched:
            handleMessage_Meta_Watched_GET(context);
            break;
        case Kind::MetaWatchedMetaWatchers:
            handleMessage_Meta_Watched_Meta_Watchers_GET(context);
            break;
        case Kind::DumpState:
            handleMessage_DumpState_GET(context);
            break;
        case Kind::Resource:
            handleMessage_Resource_GET(context, parsed.name, parsed.subpath);
            break;
        case Kind::ResourceMeta:
            handleMessage_Resource_Meta_GET(context);
            break;
        case Kind::ResourceWatchers:
            handleMessage_Resource_Watchers_GET(context, parsed.name);
            break;
        case Kind::Unknown:
            context.sendReplyWithValue(nullptr);
            break;
    }
    return true;
}

// Deliberate: a SET of what cannot be set is accepted and does nothing, an
// unknown path included; only "*" and a part of a value are refused.
bool PropertyRestResource::handleRestMessage_SET(RestResourceContext& context,
                                                 const PathView& path) {
    const PropertyPath parsed = parsePropertyPath(path);
    if (parsed.kind == Kind::Resource)
        return handleMessage_Resource_SET(context, path, parsed.name, parsed.subpath);
    return parsed.kind != Kind::DumpState;
}

// Deliberate: unlike SET, PUSH and POP refuse an unknown path.
bool PropertyRestResource::handleRestMessage_PUSH(RestResourceContext& context,
                                                  const PathView& path) {
    const PropertyPath parsed = parsePropertyPath(path);
    if (parsed.kind == Kind::Resource && isOneTooMany(context, parsed.name))
        return false;
    if (parsed.kind == Kind::Root)
        handleMessage_Root_PUSH(context, path);
    else if (parsed.kind == Kind::MetaWatched)
        handleMessage_Meta_Watched_PUSH(context, path);
    else if (parsed.kind == Kind::Resource)
        handleMessage_Resource_PUSH(context, path, parsed.name);
    return parsed.kind != Kind::DumpState && parsed.kind != Kind::Unknown;
}

bool PropertyRestResource::handleRestMessage_POP(RestResourceContext& context,
                                                 const PathView& path) {
    const PropertyPath parsed = parsePropertyPath(path);
    if (parsed.kind == Kind::Root)
        handleMessage_Root_POP(context);
    else if (parsed.kind == Kind::MetaWatched)
        handleMessage_Meta_Watched_POP(context);
    else if (parsed.kind == Kind::Resource)
        handleMessage_Resource_POP(context, path, parsed.name);
    return parsed.kind != Kind::DumpState && parsed.kind != Kind::Unknown;
}

bool PropertyRestResource::handleRestMessage_NOTIFY(RestResourceContext&, const PathView&) {
    return false;
}

// ---- GET -----------------------------------------------------------------------

void PropertyRestResource::handleMessage_Root_GET(RestResourceContext& context) {
    context.sendReplyWithValue(getResourceArray());
}

void PropertyRestResource::handleMessage_Meta_GET(RestResourceContext& context) {
    context.sendReplyWithValue(vox::array_creator()("watchers")("watched"));
}

void PropertyRestResource::handleMessage_Meta_Watchers_GET(RestResourceContext& context) {
    context.sendReplyWithValue(rootWatchers_.getWatcherNames());
}

void PropertyRestResource::handleMessage_Meta_Watched_GET(RestResourceContext& context) {
    context.sendReplyWithValue(getWatchedResourceArray());
}

void PropertyRestResource::handleMessage_Meta_Watched_Meta_Watchers_GET(
    RestResourceContext& context) {
    context.sendReplyWithValue(watchedWatchers_.getWatcherNames());
}

void PropertyRestResource::handleMessage_DumpState_GET(RestResourceContext& context) {
    ReplyDictRestResourceContextDecorator answers(context);
    for (const auto& [name, entry] : properties_) {
        answers.pushScope(name);
        answers.sendReplyWithValue(entry->value);
    }
}

void PropertyRestResource::handleMessage_Resource_GET(RestResourceContext& context,
                                                      std::string_view name,
                                                      std::string_view subpath) {
    const Entry* entry = keepValues_ ? find(name) : nullptr;
    if (!entry)
        context.sendReplyWithValue(nullptr);
    else
        context.sendReplyWithValue(partOf(entry->value, subpath));
}

void PropertyRestResource::handleMessage_Resource_Meta_GET(RestResourceContext& context) {
    context.sendReplyWithValue(vox::array_creator()("watchers"));
}

void PropertyRestResource::handleMessage_Resource_Watchers_GET(RestResourceContext& context,
                                                               std::string_view name) {
    const Entry* entry = find(name);
    context.sendReplyWithValue(entry ? entry->watchers.getWatcherNames() : vox::array::create());
}

// ---- SET -----------------------------------------------------------------------

bool PropertyRestResource::handleMessage_Resource_SET(RestResourceContext& context,
                                                      const PathView& path, std::string_view name,
                                                      std::string_view subpath) {
    if (!subpath.empty() || isOneTooMany(context, name))
        return false;
    const vox::object value = context.getRestValue();
    Entry* entry = nullptr;
    if (createIfNotPresent(name, entry))
        sendResourcesNotification(context, path);
    if (keepValues_)
        entry->value = value;
    // Hot path: the path's text is made once for all watchers;
    // bench/fanout_pelorin.cpp.
    if (entry->watchers.hasWatchers())
        notifyWatchers(context, entry->watchers, asText(path_join(path.head(), name)), value);
    return true;
}

// ---- PUSH and POP --------------------------------------------------------------

void PropertyRestResource::handleMessage_Root_PUSH(RestResourceContext& context,
                                                   const PathView& path) {
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    if (!author)
        return;
    rootWatchers_.cleanupExpired();
    rootWatchers_.addWatcher(author);
    notifyWatcher(context, *author, vox::string(path.head()), getResourceArray());
}

void PropertyRestResource::handleMessage_Meta_Watched_PUSH(RestResourceContext& context,
                                                           const PathView& path) {
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    if (!author)
        return;
    watchedWatchers_.cleanupExpired();
    watchedWatchers_.addWatcher(author);
    notifyWatcher(context, *author, asText(watchedPath(path)), getWatchedResourceArray());
}

void PropertyRestResource::handleMessage_Resource_PUSH(RestResourceContext& context,
                                                       const PathView& path,
                                                       std::string_view name) {
    Entry* entry = nullptr;
    if (createIfNotPresent(name, entry))
        sendResourcesNotification(context, path);
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    if (!author)
        return;
    // Deliberate: expired watchers count here, so that a property whose watchers
    // have all gone is not announced again.
    const bool hadWatchers = entry->watchers.hasWatchers();
    entry->watchers.cleanupExpired();
    entry->watchers.addWatcher(author);
    if (!hadWatchers)
        sendWatchedResourcesNotification(context, path);
    if (keepValues_)
        notifyWatcher(context, *author, asText(path_join(path.head(), name)), entry->value);
}

void PropertyRestResource::handleMessage_Root_POP(RestResourceContext& context) {
    rootWatchers_.removeWatcher(context.getAuthorResource());
}

void PropertyRestResource::handleMessage_Meta_Watched_POP(RestResourceContext& context) {
    watchedWatchers_.removeWatcher(context.getAuthorResource());
}

void PropertyRestResource::handleMessage_Resource_POP(RestResourceContext& context,
                                                      const PathView& path, std::string_view name) {
    Entry* entry = find(name);
    if (entry && entry->watchers.removeWatcher(context.getAuthorResource()) &&
        !entry->watchers.hasWatchers())
        sendWatchedResourcesNotification(context, path);
}

// One pass over all watchers. Properties without any cost one compare each.
void PropertyRestResource::cleanupWatchers(RestResourceContext& context, const PathView& path) {
    rootWatchers_.cleanupExpired();
    watchedWatchers_.cleanupExpired();
    bool lostLastWatcher = false;
    for (const auto& property : properties_) {
        WatchableRestResourceHelper& watchers = property.second->watchers;
        if (!watchers.hasWatchers())
            continue;
        watchers.cleanupExpired();
        lostLastWatcher |= !watchers.hasWatchers();
    }
    if (!lostLastWatcher)
        return;
    PathView behind = path;
    while (behind)
        behind.advance(1);
    sendWatchedResourcesNotification(context, behind);
}

Reached PropertyRestResource::reached(Operation operation, const PathView& path) const {
    const Kind kind = parsePropertyPath(path).kind;
    PathView behind = path;
    behind.advance(segmentsOf(kind));
    return {.path = behind.head(),
            .everythingBelow = kind == Kind::DumpState && operation == Operation::kGet,
            .splitsNames = true};
}

// ---- Lists ---------------------------------------------------------------------

vox::array PropertyRestResource::getResourceArray() const {
    const vox::array names = vox::array::create();
    for (const auto& property : properties_)
        names.append(asText(property.first));
    return names;
}

vox::array PropertyRestResource::getWatchedResourceArray() const {
    const vox::array names = vox::array::create();
    for (const auto& [name, entry] : properties_)
        if (entry->watchers.hasActiveWatchers())
            names.append(asText(name));
    return names;
}

PropertyRestResource::Entry* PropertyRestResource::find(std::string_view name) {
    const auto* found = properties_.find(name);
    return found ? found->get() : nullptr;
}

bool PropertyRestResource::isOneTooMany(RestResourceContext& context, std::string_view name) {
    return properties_.size() >= limit_ && context.getRawAuthorConnection() && !find(name);
}

bool PropertyRestResource::createIfNotPresent(std::string_view name, Entry*& entry) {
    entry = find(name);
    if (entry)
        return false;
    entry = properties_.insert(name, std::make_unique<Entry>()).first->get();
    return true;
}

void PropertyRestResource::sendResourcesNotification(RestResourceContext& context,
                                                     const PathView& path) const {
    if (rootWatchers_.hasWatchers())
        notifyWatchers(context, rootWatchers_, vox::string(path.head()), getResourceArray());
}

void PropertyRestResource::sendWatchedResourcesNotification(RestResourceContext& context,
                                                            const PathView& path) const {
    if (watchedWatchers_.hasWatchers())
        notifyWatchers(context, watchedWatchers_, asText(watchedPath(path)),
                       getWatchedResourceArray());
}

}  // namespace plr::rest
