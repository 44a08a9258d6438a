#pragma once

#include <cstddef>
#include <limits>
#include <memory>
#include <string_view>

#include "plr/base/export.h"
#include "plr/ipc/array.h"
#include "plr/ipc/object.h"
#include "plr/rest/path_map.h"
#include "plr/rest/path_reach.h"
#include "plr/rest/resource.h"
#include "plr/rest/watchable.h"
#include "plr/rest/watcher_cleanup.h"

// A PropertyRestResource holds named properties at one place of a server's
// tree. Clients SET a property, GET it whole or in part, and watch it by PUSH
// until they POP: every SET goes to the property's watchers, changed or not.
//
//   NAME                    the property; NAME@SUB.PATH a part of its value, to GET
//   (the resource itself)   the list of names; may be watched
//   *                       all values, a dictionary by name
//   _/watched               the properties that are watched; may be watched
//   _, _/watchers, _/watched/_/watchers, NAME/_, NAME/_/watchers
//                           what there is to ask, and who watches what
//
// A property exists from its first SET or PUSH for the resource's life; a GET
// makes none; limitNames() says how many clients can make. Without kept values it
// only passes SETs on: GETs answer null, and a new watcher is told nothing.
//
// Owner:   the tree. Watchers are held weakly: one whose client went is told
//          nothing and listed nowhere any more. Its entry goes with the next PUSH on
//          the property or soon after the drop (watcher_cleanup.h); when
//          that was the last one, who watches _/watched is told then.
// Queue:   the server's.
// Order:   each watcher is notified of SETs in their order.
namespace plr::rest {

class PLR_EXPORT PropertyRestResource : public RestResource,
                                        public WatcherCleanup,
                                        public PathReach {
  public:
    explicit PropertyRestResource(bool keepValues);
    ~PropertyRestResource() override;

    // From `limit` properties on, a client's SET or PUSH of a further name is not
    // handled; the service's own messages, on no connection, are. No limit at first.
    // On the queue, or before the resource is registered.
    void limitNames(std::size_t limit) noexcept { limit_ = limit; }

    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_SET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_POP(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_NOTIFY(RestResourceContext& context, const PathView& path) override;
    void cleanupWatchers(RestResourceContext& context, const PathView& path) override;
    // Its own path shows names only.
    [[nodiscard]] Reached reached(Operation operation, const PathView& path) const override;

  private:
    struct Entry;  // a property

    // The handlers by operation and kind of path. Paths stand on the property's
    // own segment, so that path.head() is the resource's path.
    void handleMessage_Root_GET(RestResourceContext& context);
    void handleMessage_Meta_GET(RestResourceContext& context);
    void handleMessage_Meta_Watchers_GET(RestResourceContext& context);
    void handleMessage_Meta_Watched_GET(RestResourceContext& context);
    void handleMessage_Meta_Watched_Meta_Watchers_GET(RestResourceContext& context);
    void handleMessage_DumpState_GET(RestResourceContext& context);
    void handleMessage_Resource_GET(RestResourceContext& context, std::string_view name,
                                    std::string_view subpath);
    void handleMessage_Resource_Meta_GET(RestResourceContext& context);
    void handleMessage_Resource_Watchers_GET(RestResourceContext& context, std::string_view name);
    bool handleMessage_Resource_SET(RestResourceContext& context, const PathView& path,
                                    std::string_view name, std::string_view subpath);
    void handleMessage_Root_PUSH(RestResourceContext& context, const PathView& path);
    void handleMessage_Meta_Watched_PUSH(RestResourceContext& context, const PathView& path);
    void handleMessage_Resource_PUSH(RestResourceContext& context, const PathView& path,
                                     std::string_view name);
    void handleMessage_Root_POP(RestResourceContext& context);
    void handleMessage_Meta_Watched_POP(RestResourceContext& context);
    void handleMessage_Resource_POP(RestResourceContext& context, const PathView& path,
                                    std::string_view name);

    [[nodiscard]] vox::array getResourceArray() const;
    [[nodiscard]] vox::array getWatchedResourceArray() const;
    [[nodiscard]] Entry* find(std::string_view name);
    [[nodiscard]] bool isOneTooMany(RestResourceContext& context, std::string_view name);
    // Stores the entry in `entry`; true when it was made now.
    bool createIfNotPresent(std::string_view name, Entry*& entry);
    void sendResourcesNotification(RestResourceContext& context, const PathView& path) const;
    void sendWatchedResourcesNotification(RestResourceContext& context, const PathView& path) const;

    const bool keepValues_;
    std::size_t limit_ = std::numeric_limits<std::size_t>::max();  // names
    PathMap<std::unique_ptr<Entry>> properties_;                   // by name
    WatchableRestResourceHelper rootWatchers_;                     // of the list of names
    WatchableRestResourceHelper watchedWatchers_;  // of the list of watched properties
};

}  // namespace plr::rest
