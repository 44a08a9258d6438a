#pragma once

#include "plr/base/export.h"
#include "plr/rest/path_view.h"
#include "plr/rest/resource_context.h"

// A resource that remembers clients weakly, and tidies up when it is told that
// some have gone. Sets of watchers keep an entry of a client that went until
// somebody cleans up; the server sees to that within kCleanupDelay of a drop,
// once for all clients that dropped meanwhile.
//
// Queue: the server's.
namespace plr::rest {

class PLR_EXPORT WatcherCleanup {
  public:
    // Forgets clients that have gone, and tells whom that concerns. `path` is the
    // resource's own.
    virtual void cleanupWatchers(RestResourceContext& context, const PathView& path) = 0;

  protected:
    ~WatcherCleanup() = default;
};

}  // namespace plr::rest
