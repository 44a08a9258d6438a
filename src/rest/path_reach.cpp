#include "plr/rest/path_reach.h"

namespace plr::rest {

Reached reachedBy(const RestResourceBase& resource, Operation operation, const PathView& path) {
    if (const auto* knowing = dynamic_cast<const PathReach*>(&resource))
        return knowing->reached(operation, path);
    const bool shows = operation == Operation::kGet || operation == Operation::kPush;
    if (!path)
        return {path.full(), shows};
    PathView star = path;
    while (star && star.current() != "*")
        star.advance(1);
    if (!star)
        return {path.full()};
    return {star.head(), shows};
}

}  // namespace plr::rest
