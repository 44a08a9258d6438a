#include "src/format/hex_vector.h"

#if defined(__x86_64__)

#include <immintrin.h>

#define PLR_AVX2 __attribute__((target("avx2")))
#define PLR_AVX2_INLINE __attribute__((target("avx2"), always_inline)) inline

namespace plr::hexkernel {
namespace {

PLR_AVX2_INLINE __m256i load(const void* from) {
    return _mm256_loadu_si256(static_cast<const __m256i*>(from));
}

PLR_AVX2_INLINE __m128i loadHalf(const void* from) {
    return _mm_loadu_si128(static_cast<const __m128i*>(from));
}

// The characters of 16 bytes. A byte widened to 16 bits has its high nibble moved
// to the low byte and its low nibble to the high byte, and each finds its digit.
PLR_AVX2_INLINE void encode16(char* out, const std::uint8_t* data, __m256i table) {
    const __m256i wide = _mm256_cvtepu8_epi16(loadHalf(data));
    const __m256i both = _mm256_or_si256(_mm256_srli_epi16(wide, 4), _mm256_slli_epi16(wide, 8));
    const __m256i nibbles = _mm256_and_si256(both, _mm256_set1_epi8(0x0F));
    _mm256_storeu_si256(reinterpret_cast<__m256i*>(out), _mm256_shuffle_epi8(table, nibbles));
}

PLR_AVX2_INLINE void encode8(char* out, const std::uint8_t* data, __m128i table) {
    const __m128i wide = _mm_cvtepu8_epi16(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(data)));
    const __m128i both = _mm_or_si128(_mm_srli_epi16(wide, 4), _mm_slli_epi16(wide, 8));
    const __m128i nibbles = _mm_and_si128(both, _mm_set1_epi8(0x0F));
    _mm_storeu_si128(reinterpret_cast<__m128i*>(out), _mm_shuffle_epi8(table, nibbles));
}

// 0x70 to 0x7F for the digits of either case, 0x80 and above for the others.
// '0' to '9' become 0 to 9 and all others at least 16, saturating at the end of
// the range; so do 'A' to 'F' 10 to 15; the lesser of the two is the value.
PLR_AVX2_INLINE __m256i values(__m256i text) {
    const __m256i top = _mm256_add_epi8(text, _mm256_set1_epi8('\xFF' - '9'));
    const __m256i number =
        _mm256_sub_epi8(_mm256_subs_epu8(top, _mm256_set1_epi8(6)), _mm256_set1_epi8('\xF0'));
    const __m256i upper = _mm256_and_si256(text, _mm256_set1_epi8('\xDF'));
    const __m256i letter =
        _mm256_adds_epu8(_mm256_sub_epi8(upper, _mm256_set1_epi8('A')), _mm256_set1_epi8(10));
    return _mm256_adds_epu8(_mm256_min_epu8(number, letter), _mm256_set1_epi8(0x70));
}

// Each pair of values as a number of 16 bits, a value from 0x80 counting as 0.
PLR_AVX2_INLINE __m256i joined(__m256i values) {
    const __m256i table = _mm256_broadcastsi128_si256(
        _mm_setr_epi8(0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15));
    const __m256i nibbles = _mm256_shuffle_epi8(table, values);
    return _mm256_maddubs_epi16(nibbles, _mm256_set1_epi16(0x0110));
}

// Bytes of 32 pairs. Returns whether all are digits.
PLR_AVX2_INLINE bool decode32(std::uint8_t* out, const char* text) {
    const __m256i first = values(load(text));
    const __m256i second = values(load(text + 32));
    const __m256i mixed = _mm256_packus_epi16(joined(first), joined(second));
    _mm256_storeu_si256(reinterpret_cast<__m256i*>(out), _mm256_permute4x64_epi64(mixed, 0xD8));
    return _mm256_movemask_epi8(_mm256_or_si256(first, second)) == 0;
}

// Bytes of 8 pairs. Returns whether all are digits.
PLR_AVX2_INLINE bool decode8(std::uint8_t* out, const char* text) {
    const __m256i got = values(_mm256_castsi128_si256(loadHalf(text)));
    const __m128i words = _mm256_castsi256_si128(joined(got));
    _mm_storel_epi64(reinterpret_cast<__m128i*>(out), _mm_packus_epi16(words, words));
    return _mm_movemask_epi8(_mm256_castsi256_si128(got)) == 0;
}

}  // namespace

PLR_AVX2 void encodeVector(char* out, const std::uint8_t* data, std::size_t bytes,
                           bool lowerCase) noexcept {
    if (bytes < 8) {
        return encodePlain(out, data, bytes, lowerCase);
    }
    const __m128i table = loadHalf(digits(lowerCase));
    if (bytes < 16) {
        encode8(out, data, table);
        return encode8(out + 2 * (bytes - 8), data + bytes - 8, table);
    }
    const __m256i tables = _mm256_broadcastsi128_si256(table);
    for (std::size_t i = 0; i < bytes - 16; i += 16) {
        encode16(out + 2 * i, data + i, tables);
    }
    encode16(out + 2 * (bytes - 16), data + bytes - 16, tables);
}

PLR_AVX2 void decodeVector(std::uint8_t* out, const char* text, std::size_t pairs) noexcept {
    if (pairs < 8) {
        return decodePlain(out, text, pairs);
    }
    std::size_t i = 0;
    if (pairs >= 32) {
        for (; i < pairs - 32; i += 32) {
            decode32(out + i, text + 2 * i);
        }
        decode32(out + pairs - 32, text + 2 * (pairs - 32));
        return;
    }
    for (; i < pairs - 8; i += 8) {
        decode8(out + i, text + 2 * i);
    }
    decode8(out + pairs - 8, text + 2 * (pairs - 8));
}

// A block with a character that is no digit is left to the plain kernel, which
// finds it.
PLR_AVX2 std::size_t decodeStrictVector(std::uint8_t* out, const char* text,
                                        std::size_t pairs) noexcept {
    std::size_t i = 0;
    while (i + 32 <= pairs && decode32(out + i, text + 2 * i)) {
        i += 32;
    }
    while (i + 8 <= pairs && decode8(out + i, text + 2 * i)) {
        i += 8;
    }
    if (i + 8 > pairs && pairs >= 8 && decode8(out + pairs - 8, text + 2 * (pairs - 8))) {
        return pairs;
    }
    return i + decodeStrictPlain(out + i, text + 2 * i, pairs - i);
}

}  // namespace plr::hexkernel

#endif
