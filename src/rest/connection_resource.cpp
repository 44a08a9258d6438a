#include "plr/rest/connection_resource.h"

#include <algorithm>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "plr/ipc/array.h"
#include "plr/ipc/values.h"

namespace plr::rest {

// By the connection's address, which its object keeps from being used again.
struct ConnectionRestResource::Connections
    : std::unordered_map<vox_connection_t, std::shared_ptr<RestResourceConnection>> {};

ConnectionRestResource::ConnectionRestResource() : connections_(std::make_unique<Connections>()) {}
ConnectionRestResource::~ConnectionRestResource() = default;

std::shared_ptr<RestResourceConnection> ConnectionRestResource::lookupConnection(
    const vox::connection& connection) const {
    const auto found = connections_->find(connection.get());
    return found == connections_->end() ? nullptr : found->second;
}

bool ConnectionRestResource::handleRestMessage_GET(RestResourceContext& context,
                                                   const PathView& path) {
    if (path && path.current() != "*")
        return false;
    std::vector<std::string_view> names;
    names.reserve(connections_->size());
    for (const auto& entry : *connections_)
        names.emplace_back(entry.second->name());
    std::sort(names.begin(), names.end());
    const vox::array list = vox::array::create();
    for (const std::string_view name : names)
        list.append(vox::string(name));
    context.sendReplyWithValue(list);
    return true;
}

bool ConnectionRestResource::handleRestMessage_PUSH(RestResourceContext& context,
                                                    const PathView& path) {
    const vox::connection connection = context.getRawAuthorConnection();
    const vox::object author = context.getRestAuthor();
    if (path || !connection || author.text().size() > kMaximumNameLength)
        return false;
    if (!connections_->contains(connection.get()))
        connections_->emplace(connection.get(), std::make_shared<VoxRestResourceConnection>(
                                                    connection, std::string(author.text())));
    return true;
}

bool ConnectionRestResource::handleRestMessage_POP(RestResourceContext& context,
                                                   const PathView& path) {
    if (path)
        return false;
    const auto connection = lookupConnection(context.getRawAuthorConnection());
    if (!connection)
        return true;
    // Held for the call, which may replace it.
    if (const auto handler = forgetHandler_)
        handler(connection);
    forget(connection);
    return true;
}

void ConnectionRestResource::handleDroppedConnection(
    RestResourceContext&, const PathView&,
    const std::shared_ptr<RestResourceConnection>& connection) {
    forget(connection);
}

void ConnectionRestResource::setForgetHandler(
    std::function<void(const std::shared_ptr<RestResourceConnection>&)> handler) {
    forgetHandler_ = std::move(handler);
}

// By its key, not by a search: a thousand clients may drop at once.
void ConnectionRestResource::forget(const std::shared_ptr<RestResourceConnection>& connection) {
    const auto* known = dynamic_cast<const VoxRestResourceConnection*>(connection.get());
    if (!known)
        return;
    const auto found = connections_->find(known->connection().get());
    if (found != connections_->end() && found->second == connection)
        connections_->erase(found);
}

}  // namespace plr::rest
