#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/rest/operation.h"

// Who may do what at which path of a server (RestServerExample::setAccessRules).
//
//   server->setAccessRules({
//       {.path = "/settings", .operations = {Operation::kSet}, .users = {1000}},
//       {.path = "/settings/pin", .users = {0}},   // nobody else, not even GET
//   });
//
// For each message the rules with the longest path that is the message's, or leads
// to it, and that name its operation, decide: one of them must allow the sender.
// Without such a rule everybody may. Nobody is above the rules, but the service
// itself: messages that came on no connection. A redirected message needs what
// its sender needs at either path.
//
// Paths are compared by segment, without a leading or trailing '/'; what follows an
// '@' is a part of a value and has its rules. A GET that reaches a "*" (a dump) is
// allowed only to who may GET everything that the rules mention below.
//
// A refused message is not handled; one that asks for a reply gets the error
// "access denied". The kernel says who the sender is (vox/connection.h).
namespace plr::rest {

struct AccessRule {
    std::string path;                        // "/" for everything
    std::vector<Operation> operations = {};  // none: every operation
    std::vector<uid_t> users = {};           // who may: one of these,
    std::vector<gid_t> groups = {};          // a member of one of these, first or supplementary,
    bool everybody = false;                  // or everybody
};

class PLR_EXPORT AccessRules {
  public:
    AccessRules() = default;
    // Throws std::invalid_argument for a rule whose path has an '@' or a "*".
    AccessRules(std::vector<AccessRule> rules);

    [[nodiscard]] bool empty() const noexcept { return rules_.empty(); }
    // `sender`: asked for its groups only when a rule names some.
    [[nodiscard]] bool allows(Operation operation, std::string_view path,
                              const vox::connection& sender) const;

  private:
    std::vector<AccessRule> rules_;
};

}  // namespace plr::rest
