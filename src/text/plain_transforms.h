#pragma once

#include "src/text/stage.h"

namespace plr {

// Codes up to `greatest` as they are; `replacement` for others, which are marked.
template <std::uint32_t greatest, std::uint32_t replacement>
class BoundedTransform : public UnitStage<BoundedTransform<greatest, replacement>> {
  public:
    using UnitStage<BoundedTransform>::convert;
    std::size_t convert(std::uint32_t* out, std::size_t most) {
        const std::size_t codes = this->pull(out, most);
        for (std::size_t i = 0; i < codes; ++i) {
            if (out[i] > greatest) {
                out[i] = replacement;
                this->markExceptionOccurred();
            }
        }
        return codes;
    }
};

using Ucs2ToAscii7Transform = BoundedTransform<0x7F, '?'>;
using Ascii7ToUcs2Transform = BoundedTransform<0x7F, 0xFFFD>;
using ISOLatin1ToUcs2Transform = BoundedTransform<0xFF, 0xFFFD>;

}  // namespace plr
