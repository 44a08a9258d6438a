#pragma once

#include <memory>

#include "plr/base/export.h"
#include "plr/rest/path_view.h"
#include "plr/rest/resource_connection.h"
#include "plr/rest/resource_context.h"

// A resource answers the messages that are addressed to its place in a
// server's tree, and below.
//
// Owner:   the tree, by std::shared_ptr.
// Queue:   everything is called on the server's queue; resources need no locks.
// Errors:  a handler returns whether it handled the message. An unhandled one
//          gets no answer at all. An exception that leaves a handler is
//          reported, and the message counts as unhandled.
namespace plr::rest {

class PLR_EXPORT RestResourceBase {
  public:
    RestResourceBase() = default;
    RestResourceBase(const RestResourceBase&) = delete;
    RestResourceBase& operator=(const RestResourceBase&) = delete;
    virtual ~RestResourceBase();

    // `path` stands behind the resource's own segment.
    virtual bool handleMessage(RestResourceContext& context, const PathView& path) = 0;
    // Installs `resource` below this one; false when there is no place for it.
    virtual bool installSubResource(const PathView& path,
                                    std::shared_ptr<RestResourceBase>&& resource);
    // The client behind `connection` is gone. `path` is the resource's own.
    virtual void handleDroppedConnection(RestResourceContext& context, const PathView& path,
                                         const std::shared_ptr<RestResourceConnection>& connection);
};

// A resource with one handler an operation; each returns false until it is
// overridden.
class PLR_EXPORT RestResource : public RestResourceBase {
  public:
    ~RestResource() override;

    // Calls the handler of the message's operation; false for a ping and for
    // what is no operation.
    bool handleMessage(RestResourceContext& context, const PathView& path) override;

    virtual bool handleRestMessage_GET(RestResourceContext& context, const PathView& path);
    virtual bool handleRestMessage_SET(RestResourceContext& context, const PathView& path);
    virtual bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path);
    virtual bool handleRestMessage_POP(RestResourceContext& context, const PathView& path);
    virtual bool handleRestMessage_NOTIFY(RestResourceContext& context, const PathView& path);
};

}  // namespace plr::rest
