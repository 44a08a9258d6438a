#pragma once

#include <cstddef>
#include <string>
#include <string_view>

// The journal's native protocol. A message is a row of fields:
//
//   field  = name "=" value "\n"                   value without control characters
//          | name "\n" length value "\n"           any value; 64 bits, little-endian
//   name   = 1 to 64 of "A"-"Z", "0"-"9", "_"; begins with a letter
namespace kel {

inline constexpr std::size_t kFieldNameBytes = 64;

// The field that a key of ours becomes; the rule stands in kel/kel.h.
[[nodiscard]] std::string field_name(std::string_view key);

// Appends one field and returns where in `out` its value begins.
std::size_t append_field(std::string& out, std::string_view name, std::string_view value);

}  // namespace kel
