#include "src/format/hex_vector.h"

#if defined(__aarch64__)

#include <arm_neon.h>

namespace plr::hexkernel {
namespace {

constexpr std::size_t kBlock = 16;

void encode16(char* out, const std::uint8_t* data, uint8x16_t table) {
    const uint8x16_t bytes = vld1q_u8(data);
    const uint8x16x2_t text{{vqtbl1q_u8(table, vshrq_n_u8(bytes, 4)),
                             vqtbl1q_u8(table, vandq_u8(bytes, vdupq_n_u8(0x0F)))}};
    vst2q_u8(reinterpret_cast<std::uint8_t*>(out), text);
}

// The values of digits; 0, and 0 in `allDigits`, for other characters.
uint8x16_t values(uint8x16_t text, uint8x16_t& allDigits) {
    const uint8x16_t number = vsubq_u8(text, vdupq_n_u8('0'));
    const uint8x16_t isNumber = vcltq_u8(number, vdupq_n_u8(10));
    const uint8x16_t letter = vsubq_u8(vandq_u8(text, vdupq_n_u8(0xDF)), vdupq_n_u8('A'));
    const uint8x16_t isLetter = vcltq_u8(letter, vdupq_n_u8(6));
    allDigits = vandq_u8(allDigits, vorrq_u8(isNumber, isLetter));
    return vorrq_u8(vandq_u8(number, isNumber),
                    vandq_u8(vaddq_u8(letter, vdupq_n_u8(10)), isLetter));
}

// Bytes of 16 pairs. Returns whether all are digits.
bool decode16(std::uint8_t* out, const char* text) {
    const uint8x16x2_t characters = vld2q_u8(reinterpret_cast<const std::uint8_t*>(text));
    uint8x16_t allDigits = vdupq_n_u8(0xFF);
    const uint8x16_t high = values(characters.val[0], allDigits);
    const uint8x16_t low = values(characters.val[1], allDigits);
    vst1q_u8(out, vsliq_n_u8(low, high, 4));
    return vminvq_u8(allDigits) != 0;
}

}  // namespace

void encodeVector(char* out, const std::uint8_t* data, std::size_t bytes, bool lowerCase) noexcept {
    if (bytes < kBlock) {
        return encodePlain(out, data, bytes, lowerCase);
    }
    const uint8x16_t table = vld1q_u8(reinterpret_cast<const std::uint8_t*>(digits(lowerCase)));
    const std::size_t last = bytes - kBlock;
    for (std::size_t i = 0; i < last; i += kBlock) {
        encode16(out + 2 * i, data + i, table);
    }
    encode16(out + 2 * last, data + last, table);
}

void decodeVector(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    if (pairs < kBlock) {
        return decodePlain(out, text, pairs);
    }
    const std::size_t last = pairs - kBlock;
    for (std::size_t i = 0; i < last; i += kBlock) {
        decode16(out + i, text + 2 * i);
    }
    decode16(out + last, text + 2 * last);
}

// A block with a character that is no digit is left to the plain kernel, which
// finds it.
std::size_t decodeStrictVector(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    std::size_t i = 0;
    while (i + kBlock <= pairs && decode16(out + i, text + 2 * i)) {
        i += kBlock;
    }
    return i + decodeStrictPlain(out + i, text + 2 * i, pairs - i);
}

}  // namespace plr::hexkernel

#endif
