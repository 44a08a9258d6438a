#pragma once

#include <cstddef>
#include <functional>
#include <memory>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/rest/resource.h"

// The clients of a server. Registered at "/connections" it is where the server
// looks up who sent a message; without it no resource sees an author.
//
//   PUSH  registers the client under its author name ("a"; "" when that is no
//         string). A name of more than kMaximumNameLength bytes is refused
//         (unhandled). Registering again changes nothing: a client keeps the
//         name, and the subscriptions, of its first PUSH.
//   POP   forgets the client as if it had dropped: its subscriptions end, and
//         every resource is told.
//   GET   the names, an array in ascending order; of "*" too.
//
// A client that drops is forgotten. Several clients may have one name.
//
// Owner:   the tree. It is the only owner of the connection objects.
namespace plr::rest {

class PLR_EXPORT ConnectionRestResource : public RestResource {
  public:
    static constexpr std::size_t kMaximumNameLength = 256;  // bytes

    ConnectionRestResource();
    ~ConnectionRestResource() override;

    // Who is behind a connection; empty when it is not registered.
    [[nodiscard]] std::shared_ptr<RestResourceConnection> lookupConnection(
        const vox::connection& connection) const;

    // What to call for each client that a POP is about to forget: its server tells
    // every resource, this one too. Replaces the one before.
    void setForgetHandler(
        std::function<void(const std::shared_ptr<RestResourceConnection>&)> handler);

    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_POP(RestResourceContext& context, const PathView& path) override;
    void handleDroppedConnection(
        RestResourceContext& context, const PathView& path,
        const std::shared_ptr<RestResourceConnection>& connection) override;

  private:
    struct Connections;
    void forget(const std::shared_ptr<RestResourceConnection>& connection);

    const std::unique_ptr<Connections> connections_;
    std::function<void(const std::shared_ptr<RestResourceConnection>&)> forgetHandler_;
};

}  // namespace plr::rest
