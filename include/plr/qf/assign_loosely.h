#pragma once

#include "plr/base/export.h"

// assign_loosely(out, value): a Qf number, string or boolean read for any of
// the others, as people write settings.
//
//   out     number                  string                        boolean
//   bool    as an int: not 0        yes, true, no, false in any   its value
//                                   case; else returns false
//   int     its 32-bit value;       its integer value: leading    0 or 1
//           returns if it was exact digits, 0 if there are none
//   double  its value; returns if   its double value, the same    0.0 or 1.0
//           it was exact            way
//
// Any other value and null return false. Values are lent. Any thread.
// Deliberate: for int and double a failed call leaves 0 in `out`, and an inexact
// number its nearest value; for bool a failed call leaves `out` as it is.
namespace plr::qf {

// Deliberate: a number counts as the int it is cut to: 0.5 and 2^32 are false.
[[nodiscard]] PLR_EXPORT bool assign_loosely(bool& out, const void* value);
[[nodiscard]] PLR_EXPORT bool assign_loosely(int& out, const void* value);
[[nodiscard]] PLR_EXPORT bool assign_loosely(double& out, const void* value);

}  // namespace plr::qf
