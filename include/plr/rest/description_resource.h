#pragma once

#include <string>
#include <string_view>
#include <utility>

#include "plr/base/export.h"
#include "plr/rest/access_rules.h"
#include "plr/rest/path_map.h"
#include "plr/rest/resource.h"

// What there is at a server's paths, for people and tools: a type and a text for
// each path that was described. Every server has one; it is shown to clients
// where it is registered:
//
//   server->registerResource("/radio", radio, {"properties", "What the radio reports."});
//   server->describe("/radio/signal", {"int64", "Signal strength in dBm."});
//   server->registerResource("/descriptions", server->descriptions());
//
//   (nothing), *   GET: everything, a dictionary by path, in ascending order, of
//                  dictionaries with "type" and "doc"
//   PATH           GET: the same of PATH and what is below it
//
// A client is shown the paths that the server's access rules let it GET.
//
// Types are free words; those of the library's own resources and values are
// "tree", "properties", "events", "assertions", "requests", "map", and Vox's type
// names for properties.
//
// Owner: its server, which calls describe() and setAccessRules() for its users.
// Queue: the server's.
namespace plr::rest {

struct ResourceDescription {
    std::string type;
    std::string doc;
};

class PLR_EXPORT DescriptionRestResource : public RestResource {
  public:
    DescriptionRestResource();
    ~DescriptionRestResource() override;

    // Describes a path, instead of what was said of it before. The leading '/' may
    // be left out, and is shown.
    void describe(std::string_view path, ResourceDescription description);
    void setAccessRules(AccessRules rules) { rules_ = std::move(rules); }

    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;

  private:
    PathMap<ResourceDescription> descriptions_;  // by path
    AccessRules rules_;
};

}  // namespace plr::rest
