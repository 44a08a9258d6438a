#include "src/format/hex_kernel.h"

#include <array>
#include <cstring>

namespace plr::hexkernel {
namespace {

using DigitPairs = std::array<std::array<char, 2>, 256>;

constexpr DigitPairs digitPairs(const char (&digits)[17]) {
    DigitPairs pairs{};
    for (std::size_t byte = 0; byte < pairs.size(); ++byte) {
        pairs[byte] = {digits[byte >> 4], digits[byte & 15]};
    }
    return pairs;
}

constexpr DigitPairs kLowerPairs = digitPairs("0123456789abcdef");
constexpr DigitPairs kUpperPairs = digitPairs("0123456789ABCDEF");

// Lies above a byte in either nibble's place: a cast to a byte makes it 0, and
// a compare finds it.
constexpr std::uint16_t kNoDigit = 0x100;

constexpr std::array<std::uint16_t, 256> kNibbles = [] {
    std::array<std::uint16_t, 256> nibbles{};
    nibbles.fill(kNoDigit);
    for (std::uint16_t n = 0; n < 16; ++n) {
        nibbles[static_cast<std::uint8_t>(kLowerPairs[n][1])] = n;
        nibbles[static_cast<std::uint8_t>(kUpperPairs[n][1])] = n;
    }
    return nibbles;
}();

unsigned pairValue(const char* pair) {
    return static_cast<unsigned>(kNibbles[static_cast<std::uint8_t>(pair[0])]) << 4 |
           kNibbles[static_cast<std::uint8_t>(pair[1])];
}

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

constexpr std::array kKernels{Kernel{"plain", encodePlain, decodePlain, decodeStrictPlain}};

}  // namespace

void encodeHex(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept {
    encodePlain(out, data, bytes, lowerCase);
}

void decodeHex(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    decodePlain(out, text, pairs);
}

std::size_t decodeHexStrict(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    return decodeStrictPlain(out, text, pairs);
}

std::span<const Kernel> kernels() noexcept {
    return kKernels;
}

}  // namespace plr::hexkernel
