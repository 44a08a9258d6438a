#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/object.h"

// The one lenient way in which message values are read: a value of an
// acceptable type gives its content, any other the default. Any thread.
namespace vox {

// Signed and unsigned integers (the latter's bits as signed) and booleans
// (1 or 0). Deliberate: the narrower types and the unsigned `long` and `int` go
// the same way and are then cut, without a check of range or sign.
[[nodiscard]] PLR_EXPORT long long dyn_cast_or_default(const object& value, long long fallback);
[[nodiscard]] PLR_EXPORT long dyn_cast_or_default(const object& value, long fallback);
[[nodiscard]] PLR_EXPORT unsigned long dyn_cast_or_default(const object& value,
                                                           unsigned long fallback);
[[nodiscard]] PLR_EXPORT int dyn_cast_or_default(const object& value, int fallback);
[[nodiscard]] PLR_EXPORT unsigned int dyn_cast_or_default(const object& value,
                                                          unsigned int fallback);
// Deliberate: the only one that checks the sign, and that takes no booleans.
// Throws std::out_of_range for a negative signed integer.
[[nodiscard]] PLR_EXPORT unsigned long long dyn_cast_or_default(const object& value,
                                                                unsigned long long fallback);
// Booleans; integers that are not zero.
[[nodiscard]] PLR_EXPORT bool dyn_cast_or_default(const object& value, bool fallback);
// Doubles only.
[[nodiscard]] PLR_EXPORT double dyn_cast_or_default(const object& value, double fallback);
// Strings, by their stored length. `fallback` is NUL-terminated, not null.
[[nodiscard]] PLR_EXPORT std::string dyn_cast_or_default(const object& value,
                                                         const std::string& fallback);
[[nodiscard]] PLR_EXPORT std::string dyn_cast_or_default(const object& value, const char* fallback);
// Data.
[[nodiscard]] PLR_EXPORT std::vector<std::uint8_t> dyn_cast_or_default(
    const object& value, const std::vector<std::uint8_t>& fallback);

// The null object, the integer 0, false, and empty data, strings, arrays and
// dictionaries are false. Nothing else is: not the double 0.0, no date.
[[nodiscard]] PLR_EXPORT bool is_logically_false(const object& value);
// Not a dictionary (an array), or an empty one.
[[nodiscard]] PLR_EXPORT bool is_logically_false(const dict& value);
[[nodiscard]] PLR_EXPORT bool is_logically_false(const array& value);

// Follows `path`, keys and indexes separated by ".", down from `root`. An
// index is read by the standard string-to-unsigned conversion, which throws
// std::invalid_argument or std::out_of_range for what is no number; every other
// miss gives the null object. An empty path is one empty component.
[[nodiscard]] PLR_EXPORT object get_subpath(const object& root, const std::string& path);

}  // namespace vox
