#pragma once

#include <cstdint>
#include <utility>

#include "plr/base/export.h"
#include "plr/rest/access_rules.h"
#include "plr/rest/path_view.h"
#include "plr/rest/resource.h"
#include "plr/rest/resource_context.h"

// Holds a server's access rules against its messages, and tells of what it
// refuses: the sender by the error "access denied", the report hook by one line a
// second at most, with how many there were since the line before.
//
// Owner:   the server.
// Queue:   the server's.
namespace plr::rest {

class PLR_EXPORT AccessGuard {
  public:
    void setRules(AccessRules rules) { rules_ = std::move(rules); }
    // Without rules this costs one compare.
    [[nodiscard]] bool admits(RestResourceContext& context, const RestResourceBase& root,
                              const PathView& path) {
        return rules_.empty() || judge(context, root, path);
    }
    [[nodiscard]] std::uint64_t refusals() const noexcept { return refusals_; }

  private:
    bool judge(RestResourceContext& context, const RestResourceBase& root, const PathView& path);
    void tell(Operation operation, const PathView& path, uid_t user);

    AccessRules rules_;
    std::uint64_t refusals_ = 0;
    std::uint64_t told_ = 0;     // how many of them were reported
    std::int64_t nextLine_ = 0;  // ns on the monotonic clock
};

}  // namespace plr::rest
