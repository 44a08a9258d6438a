#pragma once

#include <cstdint>

#include "plr/base/export.h"
#include "plr/text/text_converter.h"

namespace plr {

// A character's code in GSM 7-bit (3GPP TS 23.038, 6.2.1): a septet; 0x1B00 and a septet
// where that goes behind the escape 0x1B, into an extension table; -1 for a character that
// the tables have not. `code`: a UTF-16 unit or a pair, see TextTransform.
// `tables`: see TextConverter::Conversion::kUcs2ToGsm7; every pair of a locking and a single
// shift works, also one without a name. Pure, any thread.
[[nodiscard]] PLR_EXPORT std::int32_t ucs2ToGsm7(std::uint32_t code,
                                                 TextConverter::Ucs2ToGsm7Tables tables) noexcept;

}  // namespace plr
