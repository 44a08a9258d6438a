#include "src/text/hex_transforms.h"

#include <array>
#include <utility>

namespace plr {
namespace {

constexpr std::size_t kBlock = 256;  // octets at a time

constexpr char digit(std::uint32_t value) {
    return "0123456789abcdef"[value & 15];
}

}  // namespace

void BinaryToHexTransform::reset() {
    TextTransform::reset();
    low_ = 0;
}

std::size_t BinaryToHexTransform::convert(char* out, std::size_t most) {
    std::array<std::uint32_t, kBlock> codes;
    std::size_t done = 0;
    if (low_ != 0)
        out[done++] = std::exchange(low_, '\0');
    while (done < most) {
        const std::size_t wanted = std::min((most - done + 1) / 2, kBlock);
        const std::size_t got = pull(codes.data(), wanted);
        for (std::size_t i = 0; i < got; ++i) {
            out[done++] = digit(codes[i] >> 4);
            if (done == most)
                low_ = digit(codes[i]);
            else
                out[done++] = digit(codes[i]);
        }
        if (got < wanted)
            break;
    }
    return done;
}

std::size_t HexToBinaryTransform::convert(char* out, std::size_t most) {
    std::array<std::uint32_t, 2 * kBlock> digits;
    std::size_t done = 0;
    while (done < most) {
        const std::size_t wanted = 2 * std::min(most - done, kBlock);
        const std::size_t got = pull(digits.data(), wanted);
        for (std::size_t i = 0; i + 1 < got; i += 2)
            out[done++] =
                static_cast<char>(hexDigitValue(digits[i]) << 4 | hexDigitValue(digits[i + 1]));
        if (got < wanted)
            break;
    }
    return done;
}

}  // namespace plr
