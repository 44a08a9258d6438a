#include "src/text/utf8_plain.h"

#if defined(__x86_64__)

#include <immintrin.h>

#define PLR_AVX2 __attribute__((target("avx2,popcnt")))
#define PLR_AVX2_INLINE __attribute__((target("avx2,popcnt"), always_inline)) inline

namespace plr::utf8kernel {
namespace {

using Shuffle = std::array<std::uint8_t, 16>;

constexpr std::uint8_t kNothing = 0x80;  // gives a zero

// By a mask of 8 numbers of 16 bits: those in it, close together.
constexpr std::array<Shuffle, 256> kChosen = [] {
    std::array<Shuffle, 256> shuffles{};
    for (unsigned mask = 0; mask < shuffles.size(); ++mask) {
        Shuffle& shuffle = shuffles[mask];
        shuffle.fill(kNothing);
        std::size_t to = 0;
        for (std::uint8_t number = 0; number < 8; ++number) {
            if ((mask >> number & 1) != 0) {
                shuffle[to++] = static_cast<std::uint8_t>(2 * number);
                shuffle[to++] = static_cast<std::uint8_t>(2 * number + 1);
            }
        }
    }
    return shuffles;
}();

PLR_AVX2_INLINE __m256i set16(int value) {
    return _mm256_set1_epi16(static_cast<short>(value));
}
PLR_AVX2_INLINE __m128i load(const void* from) {
    return _mm_loadu_si128(static_cast<const __m128i*>(from));
}
PLR_AVX2_INLINE __m256i loadWide(const unsigned char* from) {
    return _mm256_cvtepu8_epi16(load(from));
}
PLR_AVX2_INLINE unsigned maskOf(__m128i bytes) {
    return static_cast<unsigned>(_mm_movemask_epi8(bytes));
}

PLR_AVX2_INLINE __m128i lowerOf(__m256i numbers) {
    return _mm256_castsi256_si128(numbers);
}
PLR_AVX2_INLINE __m128i upperOf(__m256i numbers) {
    return _mm256_extracti128_si256(numbers, 1);
}
PLR_AVX2_INLINE __m128i octetsAsUnits(__m128i octets) {
    return _mm_cvtepu8_epi16(octets);
}

PLR_AVX2_INLINE void store(void* to, __m256i numbers) {
    _mm256_storeu_si256(static_cast<__m256i*>(to), numbers);
}
PLR_AVX2_INLINE void storeCodes(std::uint32_t* out, __m128i units) {
    store(out, _mm256_cvtepu16_epi32(units));
}

// Of 8 numbers those in the mask. Room for all is needed.
PLR_AVX2_INLINE std::uint32_t* storeChosen(std::uint32_t* out, __m128i units, unsigned mask) {
    storeCodes(out, _mm_shuffle_epi8(units, load(kChosen[mask].data())));
    return out + __builtin_popcount(mask);
}
PLR_AVX2_INLINE std::uint32_t* storeChosen(std::uint32_t* out, __m128i low, __m128i high,
                                           unsigned mask) {
    const __m128i shuffle = load(kChosen[mask].data());
    const __m256i lows = _mm256_cvtepu16_epi32(_mm_shuffle_epi8(low, shuffle));
    const __m256i highs = _mm256_cvtepu16_epi32(_mm_shuffle_epi8(high, shuffle));
    store(out, _mm256_or_si256(lows, _mm256_slli_epi32(highs, 16)));
    return out + __builtin_popcount(mask);
}

// Octets of a block as leads: of which characters they would be, and whether that is wrong.
struct Candidates {
    __m256i units;  // the low half of a pair's code
    __m256i wrong;
};

PLR_AVX2_INLINE __m256i is(__m256i numbers, int mask, int value) {
    return _mm256_cmpeq_epi16(_mm256_and_si256(numbers, set16(mask)), set16(value));
}
PLR_AVX2_INLINE __m256i join(__m256i high, int shift, __m256i low) {
    return _mm256_or_si256(_mm256_slli_epi16(high, shift), low);
}
PLR_AVX2_INLINE __m256i trailBits(const unsigned char* from) {
    return _mm256_and_si256(loadWide(from), set16(0x3F));
}

// Characters of up to three octets.
PLR_AVX2_INLINE Candidates unitsAt(const unsigned char* in) {
    const __m256i first = loadWide(in);
    const __m256i second = trailBits(in + 1);
    const __m256i of2 = join(_mm256_and_si256(first, set16(0x1F)), 6, second);
    const __m256i of3 = join(first, 12, join(second, 6, trailBits(in + 2)));
    const __m256i is2 = _mm256_cmpgt_epi16(first, set16(0xBF));
    const __m256i is3 = _mm256_cmpgt_epi16(first, set16(0xDF));
    const __m256i wrong3 = _mm256_or_si256(is(of3, 0xF800, 0), is(of3, 0xF800, 0xD800));
    return {_mm256_blendv_epi8(_mm256_blendv_epi8(first, of2, is2), of3, is3),
            _mm256_and_si256(wrong3, is3)};
}

// Characters of four octets, in the places that `is4` tells: the low surrogates take the
// place of units; the high ones are returned.
PLR_AVX2_INLINE __m256i pairsAt(const unsigned char* in, Candidates& low) {
    const __m256i first = loadWide(in);
    const __m256i third = trailBits(in + 2);
    const __m256i is4 = _mm256_cmpgt_epi16(first, set16(0xEF));
    const __m256i bits = join(_mm256_and_si256(first, set16(0xF)), 8,
                              join(trailBits(in + 1), 2, _mm256_srli_epi16(third, 4)));
    const __m256i high = _mm256_add_epi16(bits, set16(0xD7C0));
    const __m256i lowBits = join(_mm256_and_si256(third, set16(0xF)), 6, trailBits(in + 3));
    low.units = _mm256_blendv_epi8(low.units, _mm256_or_si256(lowBits, set16(0xDC00)), is4);
    low.wrong = _mm256_blendv_epi8(low.wrong,
                                   _mm256_xor_si256(is(high, 0xFC00, 0xD800), set16(0xFFFF)), is4);
    return _mm256_and_si256(high, is4);
}

PLR_AVX2_INLINE unsigned atLeast(__m128i octets, char least) {
    const __m128i limit = _mm_set1_epi8(least);
    return maskOf(_mm_cmpeq_epi8(_mm_max_epu8(octets, limit), octets));
}

// A block, of whose characters the last may reach behind it, by up to 3 octets. Every octet
// is taken for a lead, and what it would begin is computed; then the leads are chosen.
// `trails`: the octets in front that belong to a character before, as bits; becomes those for
// the next block. False, with nothing converted, where it is not well-formed.
PLR_AVX2_INLINE bool decodeWide(Decoding& run, unsigned& trails) {
    const __m128i octets = load(run.in);
    const unsigned above = maskOf(octets);  // 0x7F
    if ((above | trails) == 0) {
        storeCodes(run.out, octetsAsUnits(octets));
        storeCodes(run.out + 8, octetsAsUnits(_mm_srli_si128(octets, 8)));
        run.in += kBlock;
        run.out += kBlock;
        return true;
    }
    const unsigned leads = atLeast(octets, '\xC2');
    const unsigned leadsOf4 = atLeast(octets, '\xF0');
    const unsigned areTrails = maskOf(_mm_cmpgt_epi8(_mm_set1_epi8('\xC0'), octets));
    const unsigned expected = trails | leads << 1 | atLeast(octets, '\xE0') << 2 | leadsOf4 << 3;
    if ((expected & 0xFFFF) != areTrails || (leads | areTrails) != above)
        return false;
    Candidates low = unitsAt(run.in);
    __m256i high = _mm256_setzero_si256();
    if (leadsOf4 != 0) {
        if (atLeast(octets, '\xF8') != 0)
            return false;
        high = pairsAt(run.in, low);
    }
    if (_mm256_testz_si256(low.wrong, low.wrong) == 0)
        return false;

    const unsigned chosen = ~areTrails;
    if (leadsOf4 == 0) {
        run.out = storeChosen(run.out, lowerOf(low.units), chosen & 0xFF);
        run.out = storeChosen(run.out, upperOf(low.units), chosen >> 8 & 0xFF);
    } else {
        run.out = storeChosen(run.out, lowerOf(low.units), lowerOf(high), chosen & 0xFF);
        run.out = storeChosen(run.out, upperOf(low.units), upperOf(high), chosen >> 8 & 0xFF);
    }
    run.in += kBlock;
    trails = expected >> 16;
    return true;
}

// Takes the last character back, whose trailing octets were not looked at.
void takeBack(Decoding& run) {
    --run.out;
    do
        --run.in;
    while ((*run.in & 0xC0) == 0x80);
}

// By four lengths, of 1 to 4 octets, less 1: the low bit of each, then the high bit of each.
// The octets of a length stand last in their 32 bits.
struct Lengths {
    Shuffle shuffle;
    std::uint8_t total;
};

constexpr unsigned lengthAt(unsigned index, unsigned number) {
    return 1 + (index >> number & 1) + 2 * (index >> (4 + number) & 1);
}

constexpr std::array<Lengths, 256> kLengths = [] {
    std::array<Lengths, 256> all{};
    for (unsigned index = 0; index < all.size(); ++index) {
        Lengths& lengths = all[index];
        lengths.shuffle.fill(kNothing);
        for (unsigned number = 0; number < 4; ++number)
            for (unsigned octet = 4 - lengthAt(index, number); octet < 4; ++octet)
                lengths.shuffle[lengths.total++] = static_cast<std::uint8_t>(4 * number + octet);
    }
    return all;
}();

PLR_AVX2_INLINE __m256i loadCodes(const std::uint32_t* from) {
    return _mm256_loadu_si256(reinterpret_cast<const __m256i*>(from));
}
PLR_AVX2_INLINE __m256i set32(unsigned value) {
    return _mm256_set1_epi32(static_cast<int>(value));
}
PLR_AVX2_INLINE __m256i masked(__m256i codes, unsigned mask) {
    return _mm256_and_si256(codes, set32(mask));
}
PLR_AVX2_INLINE __m256i isEqual(__m256i codes, unsigned mask, unsigned value) {
    return _mm256_cmpeq_epi32(masked(codes, mask), set32(value));
}
PLR_AVX2_INLINE unsigned signsOf(__m256i numbers) {
    return static_cast<unsigned>(_mm256_movemask_ps(_mm256_castsi256_ps(numbers)));
}

// The octets of 8 characters, in their last places; `is2` to `is4`: so many octets or more.
PLR_AVX2_INLINE __m256i octetsOf(__m256i character, __m256i is2, __m256i is3, __m256i is4) {
    const __m256i last = _mm256_or_si256(masked(_mm256_slli_epi32(character, 24), 0x3F000000),
                                         masked(_mm256_slli_epi32(character, 10), 0x3F0000));
    const __m256i first = _mm256_or_si256(masked(_mm256_srli_epi32(character, 4), 0x3F00),
                                          _mm256_srli_epi32(character, 18));
    const __m256i marks = _mm256_xor_si256(
        _mm256_xor_si256(masked(is2, 0x80C00000), masked(is3, 0x80C00000 ^ 0x8080E000)),
        masked(is4, 0x8080E000 ^ 0x808080F0));
    const __m256i several = _mm256_or_si256(_mm256_or_si256(last, first), marks);
    return _mm256_blendv_epi8(_mm256_slli_epi32(character, 24), several, is2);
}

// Of a surrogate that is a code of its own two of the four octets, the first or the last.
// `before`: the codes in front of these.
PLR_AVX2_INLINE __m256i octetsOfHigh(__m256i codes) {
    const __m256i bits = _mm256_add_epi32(masked(codes, 0x3FF), set32(0x40));
    return _mm256_or_si256(set32(0x80F00000),
                           _mm256_or_si256(masked(_mm256_slli_epi32(bits, 22), 0x3F000000),
                                           masked(_mm256_slli_epi32(bits, 8), 0x70000)));
}
PLR_AVX2_INLINE __m256i octetsOfLow(__m256i codes, __m256i before) {
    return _mm256_or_si256(
        _mm256_or_si256(set32(0x80800000), masked(_mm256_slli_epi32(before, 20), 0x300000)),
        _mm256_or_si256(masked(_mm256_slli_epi32(codes, 10), 0xF0000),
                        masked(_mm256_slli_epi32(codes, 24), 0x3F000000)));
}

// `before` and the first 7 codes.
PLR_AVX2_INLINE __m256i oneOn(__m256i codes, std::uint32_t before) {
    const __m256i moved =
        _mm256_permutevar8x32_epi32(codes, _mm256_setr_epi32(0, 0, 1, 2, 3, 4, 5, 6));
    return _mm256_blend_epi32(moved, set32(before), 1);
}

PLR_AVX2_INLINE char* storeOctets(char* out, __m128i octets, unsigned index) {
    const Lengths& lengths = kLengths[index];
    _mm_storeu_si128(reinterpret_cast<__m128i*>(out),
                     _mm_shuffle_epi8(octets, load(lengths.shuffle.data())));
    return out + lengths.total;
}

// 8 codes. `before`: the one in front if that is a high surrogate, and then the last if that
// is one; otherwise 0. False, with nothing converted, if one is neither a character nor
// part of one.
PLR_AVX2_INLINE bool encode8(Encoding& run, std::uint32_t& before) {
    const __m256i codes = loadCodes(run.in);
    const __m256i isPair = isEqual(codes, 0xFC00FC00, 0xD800DC00);
    const __m256i isSurrogate = isEqual(codes, 0xFFFFF800, 0xD800);
    const __m256i isUnit = isEqual(codes, 0xFFFF0000, 0);
    if (signsOf(_mm256_or_si256(isUnit, isPair)) != 0xFF)
        return false;
    const __m256i ofPair = _mm256_add_epi32(
        _mm256_or_si256(masked(_mm256_srli_epi32(codes, 6), 0xFFC00), masked(codes, 0x3FF)),
        set32(0x10000));
    const __m256i character = _mm256_blendv_epi8(codes, ofPair, isPair);
    const __m256i is2 = _mm256_cmpgt_epi32(character, set32(0x7F));
    __m256i is3 = _mm256_cmpgt_epi32(character, set32(0x7FF));
    __m256i octets = octetsOf(character, is2, is3, isPair);
    const unsigned surrogates = signsOf(isSurrogate);
    if (surrogates != 0 || before != 0) {
        const __m256i isLow = isEqual(codes, 0xFFFFFC00, 0xDC00);
        const unsigned lows = signsOf(isLow);
        const unsigned highs = surrogates & ~lows;
        if (((highs << 1 | (before != 0 ? 1U : 0U)) & 0xFF) != lows)
            return false;
        octets = _mm256_blendv_epi8(octets, octetsOfHigh(codes), isSurrogate);
        octets = _mm256_blendv_epi8(octets, octetsOfLow(codes, oneOn(codes, before)), isLow);
        is3 = _mm256_andnot_si256(isSurrogate, is3);
        before = (highs & 0x80) != 0 ? run.in[7] : 0;
    }
    const unsigned lowBits = signsOf(_mm256_xor_si256(_mm256_xor_si256(is2, is3), isPair));
    const unsigned highBits = signsOf(is3);
    run.out = storeOctets(run.out, lowerOf(octets), (lowBits & 0xF) | (highBits & 0xF) << 4);
    run.out = storeOctets(run.out, upperOf(octets), lowBits >> 4 | (highBits & 0xF0));
    run.in += 8;
    return true;
}

// A block, or half of it.
PLR_AVX2_INLINE bool encodeWide(Encoding& run, std::uint32_t& before) {
    if (!octets::blockFits(run.in, 0x7F))
        return encode8(run, before);
    if (before != 0)
        return false;
    octets::narrowBlock(run.out, run.in);
    run.in += kBlock;
    run.out += kBlock;
    return true;
}

// These work on a copy, which stays in registers.
PLR_AVX2 void decodeBlocks(Decoding& all) {
    Decoding run = all;
    unsigned trails = 0;
    while (hasBlock(run) && run.end - run.in >= std::ptrdiff_t{kBlock + 3} &&
           decodeWide(run, trails)) {
    }
    if (trails != 0)
        takeBack(run);
    all = run;
}

PLR_AVX2 void encodeBlocks(Encoding& all) {
    Encoding run = all;
    std::uint32_t before = 0;
    while (hasBlock(run) && encodeWide(run, before)) {
    }
    if (before != 0) {  // its low one was not looked at
        --run.in;
        run.out -= 2;
    }
    all = run;
}

}  // namespace

void decodeAvx2(Decoding& run) noexcept {
    do
        decodeBlocks(run);
    while (hasBlock(run) && decodeBlock(run));
}

void encodeAvx2(Encoding& run) noexcept {
    do
        encodeBlocks(run);
    while (hasBlock(run) && encodeBlock(run));
}

}  // namespace plr::utf8kernel

#endif
