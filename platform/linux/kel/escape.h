#pragma once

#include <cstddef>
#include <string>
#include <string_view>

// Text for logs that are read by the line and on terminals: control characters,
// DEL, and the backslash that introduces the escapes become \n, \t, \\ or \xHH.
// UTF-8 stays readable, except for its control characters U+0080 to U+009F.
namespace kel {

inline constexpr std::size_t kEscapedBytes = 4;  // of one byte, at most

// Writes `byte`, which comes after `previous`, into `out`, which has room for
// kEscapedBytes; returns the length. Async-signal-safe.
std::size_t escape(char previous, char byte, char* out) noexcept;

void append_escaped(std::string& out, std::string_view text);

}  // namespace kel
