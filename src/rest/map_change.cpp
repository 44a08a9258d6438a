#include "plr/rest/map_change.h"

#include <cstddef>
#include <string_view>

#include "plr/ipc/array.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/read.h"
#include "plr/ipc/values.h"

namespace plr::rest {
namespace {

constexpr const char* kWhole = "whole";
constexpr const char* kSet = "set";
constexpr const char* kRemoved = "removed";

}  // namespace

void MapChange::applyTo(std::map<std::string, vox::object>& copy) const {
    if (whole)
        copy.clear();
    for (const auto& [key, value] : set)
        copy[key] = value;
    for (const std::string& key : removed)
        copy.erase(key);
}

vox::object write_rest_value(const MapChange& value) {
    const vox::dict set = vox::dict::create();
    for (const auto& [key, entry] : value.set)
        set[key.c_str()] = entry;
    const vox::array removed = vox::array::create();
    for (const std::string& key : value.removed)
        removed.append(vox::string(std::string_view(key)));
    const vox::dict change = vox::dict::create();
    change[kWhole] = vox::boolean(value.whole);
    change[kSet] = set;
    change[kRemoved] = removed;
    return change;
}

void read_rest_value(MapChange& out, const vox::object& value) {
    const vox::dict change(value);
    out = {.whole = change && vox::dyn_cast_or_default(change[kWhole], false)};
    const vox::dict set(change[kSet]);
    const char* key = nullptr;
    for (std::size_t i = 0; i < set.count(); i++)
        if (const vox_object_t entry = vox_dictionary_get_entry(set.get(), i, &key))
            out.set.emplace_back(key, vox::object::retain(entry));
    const vox::array removed(change[kRemoved]);
    for (std::size_t i = 0; i < removed.count(); i++)
        if (const vox::object gone = removed[i]; gone.type() == VOX_TYPE_STRING)
            out.removed.emplace_back(gone.text());
}

}  // namespace plr::rest
