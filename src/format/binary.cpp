#include "plr/format/binary.h"

#include <algorithm>
#include <bit>
#include <cstddef>

namespace plr::detail {

std::string binaryOf(std::uint64_t bits, unsigned digits) {
    std::string text(std::max<std::size_t>(digits, static_cast<std::size_t>(std::bit_width(bits))),
                     '0');
    for (auto to = text.rbegin(); bits != 0; bits >>= 1, ++to)
        *to = static_cast<char>('0' + (bits & 1));
    return text;
}

}  // namespace plr::detail
