#pragma once

#include <map>
#include <string>
#include <utility>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/object.h"

// What whoever watches a whole map is told (map_resource.h). On the wire a
// dictionary:
//
//   "whole"    boolean: true for the first one, which has every entry
//   "set"      dictionary: the values of keys that are new or were set
//   "removed"  array of strings: keys that are gone
//
//   module.watch<rest::MapChange>("/messages", [&](std::optional<rest::MapChange> change) {
//       if (change)
//           change->applyTo(messages);
//   });
//
// No key is in both, none has a NUL. Any thread.
namespace plr::rest {

struct PLR_EXPORT MapChange {
    bool whole = false;
    std::vector<std::pair<std::string, vox::object>> set = {};
    std::vector<std::string> removed = {};

    // Brings a copy of the map up to date.
    void applyTo(std::map<std::string, vox::object>& copy) const;
};

[[nodiscard]] PLR_EXPORT vox::object write_rest_value(const MapChange& value);
// Lenient: what is missing, or of another type, is false or empty.
PLR_EXPORT void read_rest_value(MapChange& out, const vox::object& value);

}  // namespace plr::rest
