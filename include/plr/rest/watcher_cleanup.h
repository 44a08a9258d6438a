#pragma once

#include <chrono>

#include "plr/base/export.h"
#include "plr/rest/path_view.h"
#include "plr/rest/resource_context.h"

// A resource that remembers clients weakly, and tidies up when it is told that
// some have gone. Sets of watchers keep an entry of a client that went until
// somebody cleans up: the server calls cleanupWatchers() of every resource that
// has it, once for all clients that dropped meanwhile.
//
// Queue: the server's.
// Order: after each of these clients was told to every resource
//        (RestResourceBase::handleDroppedConnection), at most kCleanupDelay later
//        when the queue is free.
// Cost:  a mass disconnect costs a few passes over the watchers, not one for
//        each client; without a drop there is none.
namespace plr::rest {

inline constexpr std::chrono::milliseconds kCleanupDelay{100};

class PLR_EXPORT WatcherCleanup {
  public:
    // Forgets clients that have gone, and tells whom that concerns.
    // `path.full()` is the resource's own path.
    virtual void cleanupWatchers(RestResourceContext& context, const PathView& path) = 0;

  protected:
    ~WatcherCleanup() = default;
};

}  // namespace plr::rest
