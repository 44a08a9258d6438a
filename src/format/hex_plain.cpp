#include <array>
#include <cstring>

#include "src/format/hex_vector.h"

namespace plr::hexkernel {
namespace {

using DigitPairs = std::array<std::array<char, 2>, 256>;

constexpr DigitPairs digitPairs(bool lowerCase) {
    DigitPairs pairs{};
    for (std::size_t byte = 0; byte < pairs.size(); ++byte) {
        pairs[byte] = {digits(lowerCase)[byte >> 4], digits(lowerCase)[byte & 15]};
    }
    return pairs;
}

constexpr DigitPairs kLowerPairs = digitPairs(true);
constexpr DigitPairs kUpperPairs = digitPairs(false);

// Above a byte in either nibble's place: a cast to a byte drops it, and a
// compare finds it.
constexpr std::uint16_t kNoDigit = 0x100;

constexpr std::array<std::uint16_t, 256> kNibbles = [] {
    std::array<std::uint16_t, 256> nibbles{};
    nibbles.fill(kNoDigit);
    for (std::uint16_t n = 0; n < 16; ++n) {
        nibbles[static_cast<std::uint8_t>(digits(true)[n])] = n;
        nibbles[static_cast<std::uint8_t>(digits(false)[n])] = n;
    }
    return nibbles;
}();

unsigned pairValue(const char* pair) noexcept {
    return static_cast<unsigned>(kNibbles[static_cast<std::uint8_t>(pair[0])]) << 4 |
           kNibbles[static_cast<std::uint8_t>(pair[1])];
}

}  // namespace

void encodePlain(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept {
    const DigitPairs& pairs = lowerCase ? kLowerPairs : kUpperPairs;
    for (std::size_t i = 0; i < bytes; ++i) {
        std::memcpy(out + 2 * i, pairs[data[i]].data(), 2);
    }
}

void decodePlain(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    for (std::size_t i = 0; i < pairs; ++i) {
        out[i] = static_cast<std::uint8_t>(pairValue(text + 2 * i));
    }
}

std::size_t decodeStrictPlain(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    for (std::size_t i = 0; i < pairs; ++i) {
        const unsigned value = pairValue(text + 2 * i);
        if (value > 0xFF) {
            return i;
        }
        out[i] = static_cast<std::uint8_t>(value);
    }
    return pairs;
}

}  // namespace plr::hexkernel
