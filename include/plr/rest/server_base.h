#pragma once

#include <algorithm>
#include <cstdint>
#include <exception>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "plr/base/report.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/concurrency/while_alive.h"
#include "plr/ipc/connection.h"
#include "plr/rest/access_guard.h"
#include "plr/rest/auto_reply.h"
#include "plr/rest/connection_resource.h"
#include "plr/rest/context_delegater.h"
#include "plr/rest/description_resource.h"
#include "plr/rest/message.h"
#include "plr/rest/path_view.h"
#include "plr/rest/resource.h"
#include "plr/rest/tree_resource.h"
#include "plr/rest/watcher_cleanup.h"

// What every REST server does whatever its messages come on: it owns the tree
// of resources, routes messages through it and carries the resources' answers.
// Server is the deriving class.
//
// Queue:   everything runs on the server's queue; registerResource() is for any
//          thread.
namespace plr::rest {

template <class Server>
class RestServerBase : public SharedSynchronizable<Server> {
  public:
    // Installs `resource` at `path`, below nodes that are installed already.
    // False when one is missing, or `resource` is null. A ConnectionRestResource that is the first
    // resource at exactly "/connections" becomes the server's own. Any thread:
    // in place on the queue, waiting for it elsewhere.
    bool registerResource(std::string path, std::shared_ptr<RestResourceBase> resource) {
        if (!resource)
            return false;
        return this->perform([this, &path, &resource] {
            this->ownQueue_.assertCurrent();
            return registerResource_sync(path, std::move(resource));
        });
    }
    // The same, and says what there is (description_resource.h).
    bool registerResource(std::string path, std::shared_ptr<RestResourceBase> resource,
                          ResourceDescription description) {
        if (!registerResource(path, std::move(resource)))
            return false;
        describe(std::move(path), std::move(description));
        return true;
    }
    // Says what there is at a path. Any thread, as registerResource().
    void describe(std::string path, ResourceDescription description) {
        this->perform([this, &path, &description] {
            this->ownQueue_.assertCurrent();
            descriptions_->describe(path, std::move(description));
        });
    }
    // What was said, as a resource to register. Its members are for the queue.
    [[nodiscard]] std::shared_ptr<DescriptionRestResource> descriptions() const {
        return descriptions_;
    }

    // Who may do what, from now on (access_rules.h); none at first. Any thread, as
    // registerResource().
    void setAccessRules(AccessRules rules) {
        this->perform([this, &rules] {
            this->ownQueue_.assertCurrent();
            descriptions_->setAccessRules(rules);
            guard_.setRules(std::move(rules));
        });
    }
    // How many messages, redirected ones too, they have refused. Any thread, the same.
    [[nodiscard]] std::uint64_t accessRefusals() const {
        return this->perform([this] {
            this->ownQueue_.assertCurrent();
            return guard_.refusals();
        });
    }

    // Routes one message to the resource that its "r" names. Returns whether it
    // was handled; if not, nobody answers. A service may call it with messages
    // of its own, on the queue, which come on no connection.
    bool handleRestMessage(const vox::connection&, const vox::dict& message) {
        this->ownQueue_.assertCurrent();
        RestResourceContextDelegater<Server> context(message, self());
        // Something that is no string reads as the root. The context's copy of the
        // message keeps the text.
        return route_sync(context, PathView(message.text(key::kResource)));
    }

    // A message of a client; ignored without an "r". No message ends the
    // service: what its handler throws is reported and the message dropped.
    void handleClientMessage(const vox::connection& connection, const vox::dict& message) {
        if (!message.contains(key::kResource))
            return;
        try {
            handleRestMessage(connection, message);
        } catch (const std::exception& failure) {
            report("a REST resource threw on a client's message, which is dropped: %s",
                   failure.what());
        }
    }

    // A client is gone: tells every resource, and soon tidies up (watcher_cleanup.h).
    void handleDroppedConnection(const vox::connection& connection) {
        this->ownQueue_.assertCurrent();
        if (const auto dropped = getAuthorResource(connection))
            tellDropped_sync(dropped);
    }

    // What contexts delegate.
    bool sendReplyWithValue(const vox::dict& message, const vox::object& value) const {
        const vox::dict reply = createReplyWithValue(message, value);
        if (!reply)
            return false;
        const vox::connection remote(
            vox::object::retain(vox_dictionary_get_remote_connection(message.get())));
        remote.send_message(reply);
        return true;
    }
    [[nodiscard]] std::shared_ptr<vox::object> takeAutoReplyValue(const vox::dict& message) const {
        return createAutoReplyValue(message);
    }
    [[nodiscard]] std::shared_ptr<RestResourceConnection> getAuthorResource(
        const vox::connection& connection) const {
        this->ownQueue_.assertCurrent();
        return connections_ ? connections_->lookupConnection(connection) : nullptr;
    }
    bool sendNotify(const RestResourceConnection& to, const vox::object& author,
                    const vox::object& resource, const vox::object& value) const {
        to.send(createNotify(author, resource, value));
        return true;
    }
    bool sendGet(const RestResourceConnection& to, const vox::object& author,
                 const vox::object& resource, const vox::object& value,
                 std::shared_ptr<vox::object> autoReply) const {
        to.sendWithReply(createRestMessage(asObject(Operation::kGet), author, resource, value),
                         this->ownQueue_.queue(),
                         RestResourceConnection::ReplyHandler(
                             [autoReply = std::move(autoReply)](const vox::object& answer) mutable {
                                 // Whoever asked first is answered by letting go.
                                 const std::shared_ptr<vox::object> slot = std::move(autoReply);
                                 if (const vox::dict reply(answer); slot && reply)
                                     *slot = getReplyValue(reply);
                             }));
        return true;
    }
    bool redirect(RestResourceContext& context, const std::string& path) {
        this->ownQueue_.assertCurrent();
        return route_sync(context, PathView(path));
    }

  protected:
    using SharedSynchronizable<Server>::SharedSynchronizable;
    ~RestServerBase() = default;

  private:
    Server& self() { return static_cast<Server&>(*this); }

    bool route_sync(RestResourceContext& context, const PathView& path) PLR_ON(this->ownQueue_)
    { return guard_.admits(context, *root_, path) && root_->handleMessage(context, path); }

    bool registerResource_sync(std::string_view path, std::shared_ptr<RestResourceBase>&& resource)
        PLR_ON(this->ownQueue_)
    {
        // Deliberate: exactly this spelling, and tested before the installation,
        // which may find the place taken.
        if (!connections_ && path == "/connections")
            keepConnections_sync(std::dynamic_pointer_cast<ConnectionRestResource>(resource));
        path.remove_prefix(std::min(path.find_first_not_of('/'), path.size()));
        return root_->installSubResource(PathView(path), std::move(resource));
    }

    void keepConnections_sync(std::shared_ptr<ConnectionRestResource> connections)
        PLR_ON(this->ownQueue_)
    {
        connections_ = std::move(connections);
        if (!connections_)
            return;
        // A client that takes itself off the list is gone for every resource.
        connections_->setForgetHandler(
            whileAlive(this->weak_from_this(),
                       [](Server& server, const std::shared_ptr<RestResourceConnection>& client) {
                           server.ownQueue_.assertCurrent();
                           server.tellDropped_sync(client);
                       }));
    }

    void tellDropped_sync(const std::shared_ptr<RestResourceConnection>& client)
        PLR_ON(this->ownQueue_)
    {
        scheduleCleanup_sync();
        RestResourceContextDelegater<Server> context(nullptr, self());
        root_->handleDroppedConnection(context, PathView("/"), client);
    }

    // One sweep for all who drop meanwhile.
    void scheduleCleanup_sync() PLR_ON(this->ownQueue_)
    {
        if (std::exchange(isCleanupDue_, true))
            return;
        this->ownQueue_.queue().after(
            dispatch::time::after(kCleanupDelay),
            dispatch::block<void()>(whileAlive(this->weak_from_this(), [](Server& server) {
                server.ownQueue_.assertCurrent();
                server.cleanup_sync();
            })));
    }

    void cleanup_sync() PLR_ON(this->ownQueue_)
    {
        isCleanupDue_ = false;
        RestResourceContextDelegater<Server> context(nullptr, self());
        root_->cleanupWatchers(context, PathView("/"));
    }

    const std::shared_ptr<TreeRestResource> root_ PLR_CONFINED_TO(this->ownQueue_)
    = std::make_shared<TreeRestResource>();
    const std::shared_ptr<DescriptionRestResource> descriptions_ =
        std::make_shared<DescriptionRestResource>();
    std::shared_ptr<ConnectionRestResource> connections_ PLR_CONFINED_TO(this->ownQueue_);
    AccessGuard guard_ PLR_CONFINED_TO(this->ownQueue_);
    bool isCleanupDue_ PLR_CONFINED_TO(this->ownQueue_)
    = false;
};

}  // namespace plr::rest
