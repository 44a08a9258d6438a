#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

// Base64, RFC 4648 section 4, with padding.
namespace qf::preferences {

[[nodiscard]] std::string encode_base64(std::span<const std::uint8_t> bytes);
// Nothing when the text is not exactly what encode_base64() makes of some bytes,
// but for white space, which may stand anywhere.
[[nodiscard]] std::optional<std::vector<std::uint8_t>> decode_base64(std::string_view text);

}  // namespace qf::preferences
