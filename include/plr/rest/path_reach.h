#pragma once

#include <string_view>

#include "plr/base/export.h"
#include "plr/rest/operation.h"
#include "plr/rest/path_view.h"
#include "plr/rest/resource.h"

// What a message reaches in a server's tree, however its path is spelled: access
// rules judge that, and not the spelling. A resource that reads no further than some
// segment of a path, or whose own path shows no values, says so by deriving from
// PathReach too; of any other is assumed what reachedBy() says.
//
// Queue: the server's.
namespace plr::rest {

struct Reached {
    std::string_view path;         // from the root; lent by the message's path
    bool everythingBelow = false;  // and all that is below that path
    bool splitsNames = false;      // what follows an '@' is a part of a value, not of a name
};

class PLR_EXPORT PathReach {
  public:
    // `path` as in RestResourceBase::handleMessage().
    [[nodiscard]] virtual Reached reached(Operation operation, const PathView& path) const = 0;

  protected:
    ~PathReach() = default;
};

// A resource that does not say is taken to read every segment, and to show all that
// is below it, by GET or PUSH, at its own path and at a "*".
[[nodiscard]] PLR_EXPORT Reached reachedBy(const RestResourceBase& resource, Operation operation,
                                           const PathView& path);

}  // namespace plr::rest
