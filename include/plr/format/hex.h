#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/format/integer.h"

// Hex text, in lower case and without a prefix, of integers and of bytes; and bytes
// of hex text.
//
// Threads: pure functions.
// Failure: bad text gives no bytes. Nothing throws but for want of memory.
// Cost:    runs of bytes and of digits by vector instructions where the machine has
//          them; bench/bytes_pelorin.cpp.
namespace plr {

namespace detail {
// At least `digits` digits, 1 to 16.
[[nodiscard]] PLR_EXPORT std::string hexOf(std::uint64_t bits, unsigned digits);
}  // namespace detail

// Without leading zeros; "0" for zero. A negative number shows its two's complement
// in the width of its type: "ff" for a signed char of -1.
template <FormattedInteger T>
[[nodiscard]] std::string hex(T value) {
    return detail::hexOf(detail::bitsOf(value), 1);
}

// All digits of the type: "00ab" for an unsigned short of 0xab.
template <FormattedInteger T>
[[nodiscard]] std::string hex0(T value) {
    return detail::hexOf(detail::bitsOf(value), 2 * sizeof(T));
}

// Two digits a byte: "01a2ff".
[[nodiscard]] PLR_EXPORT std::string hex(const void* data, unsigned long length);
[[nodiscard]] PLR_EXPORT std::string hex(const std::vector<unsigned char>& bytes);

// The same with a blank between bytes: "01 a2 ff".
[[nodiscard]] PLR_EXPORT std::string hex_sp(const void* data, unsigned long length);
[[nodiscard]] PLR_EXPORT std::string hex_sp(const std::vector<unsigned char>& bytes);

// Where parse_hex() takes blanks. Never between the two digits of a byte.
enum HexWhitespaceOption : std::int32_t {
    kHexWhitespaceSkip = 0,         // any whitespace around the bytes
    kHexWhitespaceSingleSpace = 1,  // one space between two bytes, none elsewhere
    kHexWhitespaceNone = 2,         // nowhere
};

// The bytes of a text of two digits each, of either case. Empty when any of it is
// something else, and with any other option. Whitespace is space, tab, line feed,
// vertical tab, form feed and carriage return, in every locale.
[[nodiscard]] PLR_EXPORT std::vector<unsigned char> parse_hex(const std::string& text,
                                                              HexWhitespaceOption option);
[[nodiscard]] PLR_EXPORT std::vector<unsigned char> parse_hex(const char* text,
                                                              unsigned long length,
                                                              HexWhitespaceOption option);

// Reads hex text into at most `capacity` bytes, the way of PelorinHexToBin(): a text of
// odd length begins with a lone low digit, a character that is no digit counts as
// 0, a NUL ends the text. Returns how many bytes there are.
PLR_EXPORT unsigned int assign(unsigned char* out, const std::string& hexText,
                               unsigned long capacity);

}  // namespace plr
