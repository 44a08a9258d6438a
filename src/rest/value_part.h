#pragma once

#include <stdexcept>
#include <string>
#include <string_view>

#include "plr/ipc/object.h"
#include "plr/ipc/read.h"

namespace plr::rest {

// The part of `value` that a client asked for, all of it by an empty path; null
// when its path cannot be followed, whatever is wrong with it. Any thread.
inline vox::object partOf(const vox::object& value, std::string_view subpath) {
    if (subpath.empty())
        return value;
    try {
        return vox::get_subpath(value, std::string(subpath));
    } catch (const std::logic_error&) {
        return {};
    }
}

}  // namespace plr::rest
