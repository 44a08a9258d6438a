#pragma once

#include <optional>

#include "plr/ipc/object.h"

// A value as the type that a program wants: the strict companion of the lenient
// readers of plr/ipc/read.h. Any thread.
//
//   bool                        a boolean
//   every integer type          an integer, signed or unsigned, that is in range
//   double                      a double, or an integer
//   std::string                 a string
//   std::vector<std::uint8_t>   data
//   vox::object                 everything but null
//   every other T               what read_rest_value(T&, const vox::object&), found
//                               by its arguments, reads from everything but null
//
// Nothing for the null object, and for everything else.
namespace plr::rest {

template <class T>
[[nodiscard]] std::optional<T> valueAs(const vox::object& value);

}  // namespace plr::rest
