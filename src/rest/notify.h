#pragma once

#include <string>
#include <string_view>

#include "plr/ipc/object.h"
#include "plr/ipc/values.h"
#include "plr/rest/resource_connection.h"
#include "plr/rest/resource_context.h"
#include "plr/rest/watchable.h"

// How resources tell their watchers. Queue: the server's.
namespace plr::rest {

inline vox::object asText(const std::string& text) {
    return vox::string(std::string_view(text));
}

// Tells one watcher. Deliberate: the author is the watcher's own name, not the
// name of whoever set the value.
inline void notifyWatcher(RestResourceContext& context, const RestResourceConnection& watcher,
                          const vox::object& resource, const vox::object& value) {
    context.sendNotify(watcher, watcher.nameValue(), resource, value);
}

// Tells all of them, with one `resource` and one `value` for all.
inline void notifyWatchers(RestResourceContext& context,
                           const WatchableRestResourceHelper& watchers, const vox::object& resource,
                           const vox::object& value) {
    watchers.map([&](const RestResourceConnection& watcher) {
        notifyWatcher(context, watcher, resource, value);
    });
}

}  // namespace plr::rest
