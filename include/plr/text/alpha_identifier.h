#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "plr/base/export.h"

// Names in the phone book of a SIM (3GPP TS 31.102, annex A; TS 11.11, annex B), in one
// of four codings:
//
//   septets                      an octet each; 0xFF: unused
//   0x80 units                   UCS-2, two octets each; 0xFFFF: unused
//   0x81 length base octets      below 0x80 septets, else base * 0x80 + 7 bits
//   0x82 length base base octets the same, with a base of 16 bits
//
// Threads: any; values.
namespace plr {

// The name, in UTF-8; nothing where the length goes beyond the octets. `octets`: from outside.
// What cannot be converted is replaced, see TextConverter::Conversion; U+FFFF ends a name.
[[nodiscard]] PLR_EXPORT std::optional<std::string> decodeAlphaIdentifier(
    std::span<const std::uint8_t> octets);

// A record of `capacity` octets with the UTF-8 text in the coding that takes the fewest, and
// 0xFF behind it; of equal ones the first above. A base is that of the lowest character that
// septets have not. Nothing if it has no room.
[[nodiscard]] PLR_EXPORT std::optional<std::vector<std::uint8_t>> encodeAlphaIdentifier(
    std::string_view text, std::size_t capacity);

}  // namespace plr
