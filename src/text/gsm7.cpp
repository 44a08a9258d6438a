#include "plr/text/gsm7.h"

#include "src/text/gsm7_tables.h"

namespace plr {

std::int32_t ucs2ToGsm7(std::uint32_t code, TextConverter::Ucs2ToGsm7Tables tables) noexcept {
    const std::uint16_t found = gsm7::codeOf(gsm7::codesOf(tables), code);
    return found == gsm7::kUnknown ? -1 : found;
}

}  // namespace plr
