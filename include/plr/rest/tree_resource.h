#pragma once

#include <memory>

#include "plr/base/export.h"
#include "plr/rest/path_map.h"
#include "plr/rest/path_reach.h"
#include "plr/rest/resource.h"
#include "plr/rest/watcher_cleanup.h"

// A TreeRestResource is an inner node of a server's tree: it hands messages to
// the child that the next segment of the path names.
//
//   GET of the node itself    the children's names, an array in ascending order
//   GET of its "*"            a dictionary of the children's own "*" by name
//   everything else           for a child, or unhandled
//
// Names match exactly, byte for byte.
namespace plr::rest {

class PLR_EXPORT TreeRestResource : public RestResource, public WatcherCleanup, public PathReach {
  public:
    TreeRestResource();
    ~TreeRestResource() override;

    bool handleMessage(RestResourceContext& context, const PathView& path) override;
    // Inner nodes are never made: each is installed before what goes below it.
    // Deliberate: a name that is taken stays as it is, and that is no failure.
    bool installSubResource(const PathView& path,
                            std::shared_ptr<RestResourceBase>&& resource) override;
    // Tells every resource below.
    void handleDroppedConnection(
        RestResourceContext& context, const PathView& path,
        const std::shared_ptr<RestResourceConnection>& connection) override;
    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;

    // `path` stands on the "*".
    virtual bool handleMessage_DumpState(RestResourceContext& context, PathView path);

    // Passes it on to every resource below that has it.
    void cleanupWatchers(RestResourceContext& context, const PathView& path) override;
    // What the child reaches, or itself; everything below at a "*".
    [[nodiscard]] Reached reached(Operation operation, const PathView& path) const override;

  private:
    PathMap<std::shared_ptr<RestResourceBase>> children_;  // by name
};

}  // namespace plr::rest
