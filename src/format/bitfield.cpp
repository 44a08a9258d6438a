#include "plr/format/bitfield.h"

#include <algorithm>
#include <cstddef>

namespace plr::detail {
namespace {

unsigned bitsIn(BitRange range) {
    return static_cast<unsigned>(range.second - range.first) + 1;
}

bool isValid(BitRange range, unsigned width) {
    return range.second >= range.first && bitsIn(range) <= width;
}

}  // namespace

std::uint64_t bitfieldOf(std::uint64_t bits, unsigned width, BitRange range) noexcept {
    if (!isValid(range, width) || range.first >= width)
        return 0;
    return bits >> range.first & ~std::uint64_t{0} >> (64 - bitsIn(range));
}

std::string bitfieldPictureOf(std::uint64_t bits, unsigned width, BitRange range, char fill) {
    if (!isValid(range, width))
        return {};
    std::string picture(width, fill);
    // Deliberate: the mask is 8 bits wide for every type, so higher field bits print as '0'.
    auto field = static_cast<std::uint8_t>(bitfieldOf(bits, width, range));
    for (unsigned bit = range.first; bit <= std::min<unsigned>(range.second, width - 1); ++bit) {
        picture[width - 1 - bit] = (field & 1) != 0 ? '1' : '0';
        field = static_cast<std::uint8_t>(field >> 1);
    }
    return picture;
}

}  // namespace plr::detail
