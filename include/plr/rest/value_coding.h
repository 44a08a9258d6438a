#pragma once

#include <string>

#include "plr/base/export.h"
#include "plr/ipc/object.h"

// Encodings of typed values: enumerations as strings that people can read in a
// log, and raw binary blocks. Any thread. Nothing is thrown to the caller.
namespace plr::rest::detail {

// "2:kGranted": the decimal value, a colon, the enumerator's name.
[[nodiscard]] PLR_EXPORT vox::object write_enum_string_value(long long value, const char* name);
[[nodiscard]] PLR_EXPORT vox::object write_enum_string_value(long long value,
                                                             const std::string& name);
[[nodiscard]] PLR_EXPORT vox::object write_enum_string_value(unsigned long long value,
                                                             const char* name);
[[nodiscard]] PLR_EXPORT vox::object write_enum_string_value(unsigned long long value,
                                                             const std::string& name);

// Reads the number that a string starts with and stores it, cut to the type;
// the name behind it is ignored. `out` keeps its value when there is no number,
// it is out of range, or `value` is no string. For every signed and unsigned
// integer type from char to long long; the types up to int are read as int.
template <class T>
PLR_EXPORT void read_enum_string_value(T& out, const vox::object& value);

// Copies the first `size` bytes of data into `buffer` and fills the rest with
// zero bytes; zero bytes only for every other type.
PLR_EXPORT void read_raw_binary_value(void* buffer, unsigned long size, const vox::object& value);

}  // namespace plr::rest::detail
