#pragma once

#include <sys/types.h>

#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/rest/operation.h"
#include "plr/rest/path_reach.h"

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
// What counts is where a message arrives, not how its path is spelled
// (path_reach.h): a '/' more or less, an empty segment, which ends a path, segments
// behind a property's name, which mean the property, a part of its value ("@…").
// Where an '@' may also belong to a name, both must be allowed: what is named before
// it, and what the name is below.
// What shows everything below a path (a "*", a map's own path) is allowed only to who
// may do the same at each path below that the rules mention.
//
// Mind when writing rules:
// - a PUSH tells values as a GET does;
// - names are not secret: a tree and a property resource list them to who may GET
//   there, and say who watches what;
// - who watches already goes on, whatever rules are set later.
//
// A refused message is not handled; one that asks for a reply gets the error
// "access denied". The kernel says who the sender is (vox/connection.h).
//
// Threads: plain data that does not change; copies share it.
// Cost:    a step for each segment of the path, without allocation; a rule that
//          names groups asks the kernel for the sender's when nothing else has
//          allowed it.
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
    // Throws std::invalid_argument for a rule whose path no message has: with an '@',
    // a segment "*" or an empty one.
    explicit AccessRules(const std::vector<AccessRule>& rules);
    AccessRules(std::initializer_list<AccessRule> rules)
        : AccessRules(std::vector<AccessRule>(rules)) {}

    [[nodiscard]] bool empty() const noexcept { return !root_; }
    [[nodiscard]] bool allows(Operation operation, const Reached& reached,
                              const vox::connection& sender) const;

  private:
    struct Node;
    std::shared_ptr<const Node> root_;  // null without rules
};

}  // namespace plr::rest
