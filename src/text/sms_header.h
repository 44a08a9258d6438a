#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "plr/text/sms_user_data.h"

namespace plr {

// `elements`: a header without its length. Nothing if they do not fill it.
[[nodiscard]] std::optional<SmsHeader> readSmsHeader(std::span<const std::uint8_t> elements);

// With its length in front; empty if there is nothing to tell. `concatenation`: one of a
// text in several parts only.
[[nodiscard]] std::vector<std::uint8_t> writeSmsHeader(const SmsEncoding& encoding,
                                                       SmsReference reference,
                                                       const SmsConcatenation& concatenation);

}  // namespace plr
