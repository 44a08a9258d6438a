#include "plr/rest/tree_resource.h"

#include <string>
#include <utility>

#include "plr/ipc/array.h"
#include "plr/ipc/values.h"
#include "plr/rest/operation.h"
#include "plr/rest/reply_dict_context.h"

namespace plr::rest {
namespace {

PathView behind(PathView path) {
    path.advance(1);
    return path;
}

}  // namespace

TreeRestResource::TreeRestResource() = default;
TreeRestResource::~TreeRestResource() = default;

bool TreeRestResource::handleMessage(RestResourceContext& context, const PathView& path) {
    if (!path)
        return RestResource::handleMessage(context, path);
    if (const auto* found = children_.find(path.current())) {
        // A handler may install a child, which moves the others.
        const std::shared_ptr<RestResourceBase> child = *found;
        return child->handleMessage(context, behind(path));
    }
    // After the look-up, so that a child of that name goes first.
    return path.current() == "*" && handleMessage_DumpState(context, path);
}

bool TreeRestResource::installSubResource(const PathView& path,
                                          std::shared_ptr<RestResourceBase>&& resource) {
    if (!path)
        return false;
    if (!path.hasTail()) {
        children_.insert(path.current(), std::move(resource));
        return true;
    }
    const auto* found = children_.find(path.current());
    return found && (*found)->installSubResource(behind(path), std::move(resource));
}

void TreeRestResource::handleDroppedConnection(
    RestResourceContext& context, const PathView& path,
    const std::shared_ptr<RestResourceConnection>& connection) {
    const auto children = children_;
    for (const auto& [name, child] : children) {
        const std::string childPath = path_join(path.full(), name);
        child->handleDroppedConnection(context, PathView(childPath), connection);
    }
}

bool TreeRestResource::handleRestMessage_GET(RestResourceContext& context, const PathView&) {
    const vox::array names = vox::array::create();
    for (const auto& child : children_)
        names.append(vox::string(std::string_view(child.first)));
    context.sendReplyWithValue(names);
    return true;
}

bool TreeRestResource::handleMessage_DumpState(RestResourceContext& context, PathView path) {
    // Deliberate: other operations on "*" count as handled, and nobody answers.
    if (asOperation(context.getRestOperation()) != Operation::kGet)
        return true;
    ReplyDictRestResourceContextDecorator answers(context);
    const auto children = children_;
    for (const auto& [name, child] : children) {
        answers.pushScope(name);
        const std::string childPath = path_join(path_join(path.head(), name), "*");
        PathView childView(childPath);
        childView.skip(path.head());
        child->handleMessage(answers, behind(childView));
    }
    return true;
}

void TreeRestResource::cleanupWatchers(RestResourceContext& context, const PathView& path) {
    const auto children = children_;
    for (const auto& [name, child] : children) {
        if (auto* const resource = dynamic_cast<WatcherCleanup*>(child.get())) {
            const std::string childPath = path_join(path.full(), name);
            resource->cleanupWatchers(context, PathView(childPath));
        }
    }
}

// The same look-ups as in handleMessage().
Reached TreeRestResource::reached(Operation operation, const PathView& path) const {
    if (!path)
        return {path.full()};
    if (const auto* child = children_.find(path.current()))
        return reachedBy(**child, operation, behind(path));
    if (path.current() == "*")
        return {path.head(), operation == Operation::kGet};
    return {path.full()};
}

}  // namespace plr::rest
