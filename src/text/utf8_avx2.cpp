#include "src/text/utf8_plain.h"

#if defined(__x86_64__)

#include <immintrin.h>

#define PLR_AVX2 __attribute__((target("avx2,popcnt")))
#define PLR_AVX2_INLINE __attribute__((target("avx2,popcnt"), always_inline)) inline

// Both ways a shuffle from a table closes the gaps: what every place of a block would make
// is computed side by side, and then what is wanted of it is moved together.
namespace plr::utf8kernel {
namespace {

using Shuffle = std::array<std::uint8_t, 16>;

constexpr std::uint8_t kNothing = 0x80;  // gives a zero
constexpr std::ptrdiff_t kOctets = 32;   // decoded at once
constexpr std::ptrdiff_t kUnits = 16;    // encoded at once
constexpr std::ptrdiff_t kAhead = 2;     // octets that are read behind those
constexpr std::ptrdiff_t kFew = 8;       // octets or units that are better left to the caller

PLR_AVX2_INLINE __m256i load(const void* from) {
    return _mm256_loadu_si256(static_cast<const __m256i*>(from));
}
PLR_AVX2_INLINE __m128i loadHalf(const void* from) {
    return _mm_loadu_si128(static_cast<const __m128i*>(from));
}
PLR_AVX2_INLINE __m256i loadTwice(const Shuffle& shuffle) {
    return _mm256_broadcastsi128_si256(loadHalf(shuffle.data()));
}
PLR_AVX2_INLINE void store(void* to, __m256i numbers) {
    _mm256_storeu_si256(static_cast<__m256i*>(to), numbers);
}
PLR_AVX2_INLINE void storeHalf(void* to, __m128i numbers) {
    _mm_storeu_si128(static_cast<__m128i*>(to), numbers);
}

PLR_AVX2_INLINE __m256i set8(int value) {
    return _mm256_set1_epi8(static_cast<char>(value));
}
PLR_AVX2_INLINE __m256i set16(int value) {
    return _mm256_set1_epi16(static_cast<short>(value));
}
PLR_AVX2_INLINE __m256i masked(__m256i units, int mask) {
    return _mm256_and_si256(units, set16(mask));
}
PLR_AVX2_INLINE __m256i is(__m256i units, int mask, int value) {
    return _mm256_cmpeq_epi16(masked(units, mask), set16(value));
}
PLR_AVX2_INLINE bool isZero(__m256i numbers) {
    return _mm256_testz_si256(numbers, numbers) != 0;
}
PLR_AVX2_INLINE unsigned signsOf(__m256i octets) {
    return static_cast<unsigned>(_mm256_movemask_epi8(octets));
}
PLR_AVX2_INLINE __m128i lowerOf(__m256i numbers) {
    return _mm256_castsi256_si128(numbers);
}
PLR_AVX2_INLINE __m128i upperOf(__m256i numbers) {
    return _mm256_extracti128_si256(numbers, 1);
}
// The octets so many places in front of each.
template <int places>
PLR_AVX2_INLINE __m256i before(__m256i octets, __m256i previous) {
    return _mm256_alignr_epi8(octets, _mm256_permute2x128_si256(previous, octets, 0x21),
                              16 - places);
}

// ---- From UTF-8 ------------------------------------------------------------------------------

PLR_AVX2_INLINE __m256i atLeast(__m256i octets, int least) {
    return _mm256_cmpeq_epi8(_mm256_max_epu8(octets, set8(least)), octets);
}

// What two octets, one after the other, show to be wrong, by the halves of the first and the
// upper half of the second: for each the values it may have, as bits.
struct Fault {
    unsigned firstHigh, firstLow, secondHigh;
};
constexpr Fault kFaults[8] = {
    {0xF000, 0xFFFF, 0xF0FF},  // a lead, and no trail behind it
    {0x00FF, 0xFFFF, 0x0F00},  // ASCII, and a trail behind it
    {0x1000, 0x0003, 0x0F00},  // could be one octet
    {0x4000, 0x0001, 0x0300},  // could be two
    {0x8000, 0xFFE1, 0x0100},  // could be three; or is above U+10FFFF, with the next
    {0x8000, 0xFFF0, 0x0E00}, {0x4000, 0x2000, 0x0C00},  // a surrogate
    {0x0F00, 0xFFFF, 0x0F00},  // two trails, wrong unless a lead in front wants both
};
constexpr int kTwoTrails = 0x80;

constexpr Shuffle faultsBy(unsigned Fault::*half) {
    Shuffle faults{};
    for (unsigned fault = 0; fault < 8; ++fault)
        for (unsigned value = 0; value < faults.size(); ++value)
            if ((kFaults[fault].*half >> value & 1) != 0)
                faults[value] = static_cast<std::uint8_t>(faults[value] | 1U << fault);
    return faults;
}
constexpr Shuffle kByFirstHigh = faultsBy(&Fault::firstHigh);
constexpr Shuffle kByFirstLow = faultsBy(&Fault::firstLow);
constexpr Shuffle kBySecondHigh = faultsBy(&Fault::secondHigh);

PLR_AVX2_INLINE __m256i highHalves(__m256i octets) {
    return _mm256_and_si256(_mm256_srli_epi16(octets, 4), set8(0x0F));
}

// Whether the octets may stand behind those in front. A sequence that goes on behind them
// is not looked at there.
PLR_AVX2_INLINE bool isWellFormed(__m256i octets, __m256i previous, __m256i oneBefore) {
    const __m256i byHigh = _mm256_shuffle_epi8(loadTwice(kByFirstHigh), highHalves(oneBefore));
    const __m256i byLow =
        _mm256_shuffle_epi8(loadTwice(kByFirstLow), _mm256_and_si256(oneBefore, set8(0x0F)));
    const __m256i bySecond = _mm256_shuffle_epi8(loadTwice(kBySecondHigh), highHalves(octets));
    const __m256i faults = _mm256_and_si256(_mm256_and_si256(byHigh, byLow), bySecond);
    // The highest bit is set from 0xE0 on, and from 0xF0 on.
    const __m256i third = _mm256_subs_epu8(before<2>(octets, previous), set8(0xE0 - 0x80));
    const __m256i fourth = _mm256_subs_epu8(before<3>(octets, previous), set8(0xF0 - 0x80));
    const __m256i wanted = _mm256_and_si256(_mm256_or_si256(third, fourth), set8(kTwoTrails));
    return isZero(_mm256_xor_si256(faults, wanted));
}

// By a mask of 8 units: those in it, close together.
constexpr std::array<Shuffle, 256> kChosen = [] {
    std::array<Shuffle, 256> shuffles{};
    for (unsigned mask = 0; mask < shuffles.size(); ++mask) {
        Shuffle& shuffle = shuffles[mask];
        shuffle.fill(kNothing);
        std::size_t to = 0;
        for (std::uint8_t unit = 0; unit < 8; ++unit) {
            if ((mask >> unit & 1) != 0) {
                shuffle[to++] = static_cast<std::uint8_t>(2 * unit);
                shuffle[to++] = static_cast<std::uint8_t>(2 * unit + 1);
            }
        }
    }
    return shuffles;
}();

PLR_AVX2_INLINE char16_t* storeChosen(char16_t* out, __m128i units, unsigned mask) {
    storeHalf(out, _mm_shuffle_epi8(units, loadHalf(kChosen[mask].data())));
    return out + __builtin_popcount(mask);
}

PLR_AVX2_INLINE __m256i widened(__m128i octets) {
    return _mm256_cvtepu8_epi16(octets);
}
PLR_AVX2_INLINE __m256i trailBits(const unsigned char* from) {
    return masked(widened(loadHalf(from)), 0x3F);
}
PLR_AVX2_INLINE __m256i join(__m256i high, int shift, __m256i low) {
    return _mm256_or_si256(_mm256_slli_epi16(high, shift), low);
}

// 16 octets as leads: of each the unit that it and those behind it would be. If `hasPairs`,
// of a lead of four octets that is the high surrogate, and the low one has the next place,
// as told by `isLow`.
PLR_AVX2_INLINE __m256i unitsAt(const unsigned char* in, bool hasPairs, __m128i isLow) {
    const __m256i first = widened(loadHalf(in));
    const __m256i second = trailBits(in + 1);
    const __m256i third = trailBits(in + 2);
    const __m256i bothTrails = join(second, 6, third);
    const __m256i of2 = masked(join(first, 6, second), 0x7FF);
    const __m256i of3 = join(first, 12, bothTrails);
    const __m256i units =
        _mm256_blendv_epi8(_mm256_blendv_epi8(first, of2, _mm256_cmpgt_epi16(first, set16(0xBF))),
                           of3, _mm256_cmpgt_epi16(first, set16(0xDF)));
    if (!hasPairs)
        return units;
    const __m256i bits = join(first, 8, join(second, 2, _mm256_srli_epi16(third, 4)));
    const __m256i high = _mm256_add_epi16(masked(bits, 0x7FF), set16(0xD7C0));
    const __m256i low = _mm256_or_si256(masked(bothTrails, 0x3FF), set16(0xDC00));
    const __m256i withHigh =
        _mm256_blendv_epi8(units, high, _mm256_cmpgt_epi16(first, set16(0xEF)));
    return _mm256_blendv_epi8(withHigh, low, _mm256_cvtepi8_epi16(isLow));
}

// A block, of whose characters the last may reach behind it, by up to 3 octets. `previous`:
// the block in front, or zeros. False, with nothing converted, where it is not well-formed.
PLR_AVX2_INLINE bool decodeWide(Decoding& run, __m256i& previous) {
    const __m256i octets = load(run.in);
    if (signsOf(_mm256_or_si256(octets, previous)) == 0) {
        store(run.out, widened(lowerOf(octets)));
        store(run.out + 16, widened(upperOf(octets)));
        run.in += kOctets;
        run.out += kOctets;
        return true;
    }
    const __m256i oneBefore = before<1>(octets, previous);
    if (!isWellFormed(octets, previous, oneBefore))
        return false;
    const __m256i isLow = atLeast(oneBefore, 0xF0);
    const bool hasPairs = !isZero(_mm256_or_si256(isLow, atLeast(octets, 0xF0)));
    if (hasPairs)
        run.pairs += static_cast<std::size_t>(__builtin_popcount(signsOf(isLow)));
    const unsigned chosen = signsOf(_mm256_or_si256(_mm256_cmpgt_epi8(octets, set8(0xBF)), isLow));
    const __m256i lower = unitsAt(run.in, hasPairs, lowerOf(isLow));
    const __m256i upper = unitsAt(run.in + 16, hasPairs, upperOf(isLow));
    run.out = storeChosen(run.out, lowerOf(lower), chosen & 0xFF);
    run.out = storeChosen(run.out, upperOf(lower), chosen >> 8 & 0xFF);
    run.out = storeChosen(run.out, lowerOf(upper), chosen >> 16 & 0xFF);
    run.out = storeChosen(run.out, upperOf(upper), chosen >> 24);
    run.in += kOctets;
    previous = octets;
    return true;
}

// How many octets at the end of these begin a character that ends behind them.
std::ptrdiff_t cutOctets(const unsigned char* end) {
    for (const std::ptrdiff_t octets : {1, 2, 3}) {
        const unsigned lead = end[-octets];
        if (lead >= 0xC0 || lead < 0x80) {
            const std::ptrdiff_t length = lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : 4;
            return lead < 0x80 || length <= octets ? 0 : octets;
        }
    }
    return 0;
}

// Takes the last character back if octets of it were not looked at.
void takeBackCut(Decoding& run) {
    const std::ptrdiff_t octets = cutOctets(run.in);
    const bool isPair = octets > 1 && run.in[-octets] >= 0xF0;
    run.in -= octets;
    run.out -= octets == 0 ? 0 : isPair ? 2 : 1;
    run.pairs -= isPair ? 1 : 0;
}

// Works on a copy, which stays in registers.
PLR_AVX2 void decodeBlocks(Decoding& all) {
    Decoding run = all;
    __m256i previous = _mm256_setzero_si256();
    while (run.end - run.in >= kOctets + kAhead && run.outEnd - run.out >= kOctets &&
           decodeWide(run, previous)) {
    }
    if (run.in != all.in)
        takeBackCut(run);
    all = run;
}

// Whole characters near an end, with zeros behind them. False where they are too few, or not
// well-formed.
PLR_AVX2 bool decodeFew(Decoding& run) {
    std::ptrdiff_t length = std::min({run.end - run.in, run.outEnd - run.out, kOctets});
    if (length < kFew)
        return false;
    length -= cutOctets(run.in + length);
    std::array<unsigned char, kOctets + kAhead> octets{};
    std::array<char16_t, kOctets> units;
    std::copy_n(run.in, length, octets.data());
    Decoding few{octets.data(), nullptr, units.data(), nullptr, run.pairs};
    __m256i previous = _mm256_setzero_si256();
    if (!decodeWide(few, previous))
        return false;
    run.out = std::copy(units.data(), few.out - (kOctets - length), run.out);
    run.in += length;
    run.pairs = few.pairs;
    return true;
}

// ---- To UTF-8 --------------------------------------------------------------------------------

// By four lengths, of 1 to 3 octets, two bits each: 0, 1 and 3. The octets of a length
// stand in 32 bits: of one the last of four, of two those in the middle, of three the first.
constexpr std::array<Shuffle, 256> kLengths = [] {
    constexpr std::uint8_t kFrom[] = {3, 1, 1, 0};
    constexpr std::uint8_t kTo[] = {4, 3, 3, 3};
    std::array<Shuffle, 256> shuffles{};
    for (unsigned index = 0; index < shuffles.size(); ++index) {
        shuffles[index].fill(kNothing);
        std::size_t to = 0;
        for (unsigned unit = 0; unit < 4; ++unit) {
            const unsigned length = index >> 2 * unit & 3;
            for (unsigned octet = kFrom[length]; octet < kTo[length]; ++octet)
                shuffles[index][to++] = static_cast<std::uint8_t>(4 * unit + octet);
        }
    }
    return shuffles;
}();

PLR_AVX2_INLINE char* storeOctets(char* out, __m128i octets, unsigned index) {
    storeHalf(out, _mm_shuffle_epi8(octets, loadHalf(kLengths[index].data())));
    return out + 4 + __builtin_popcount(index);
}

// The octets of 16 units, 32 bits each in the order of kLengths, as their halves.
struct UnitOctets {
    __m256i first, last;
};

PLR_AVX2_INLINE UnitOctets octetsOf(__m256i units, __m256i is3) {
    const __m256i above6 = _mm256_srli_epi16(units, 6);
    const __m256i middle =
        _mm256_blendv_epi8(_mm256_or_si256(above6, set16(0xC0)),
                           _mm256_or_si256(masked(above6, 0x3F), set16(0x80)), is3);
    const __m256i lead = _mm256_or_si256(_mm256_srli_epi16(units, 12), set16(0xE0));
    return {join(middle, 8, lead),
            join(units, 8, _mm256_or_si256(masked(units, 0x3F), set16(0x80)))};
}

// A surrogate has two of the four octets of its character.
PLR_AVX2_INLINE void putSurrogates(UnitOctets& octets, __m256i units, __m256i oneBefore,
                                   __m256i isHigh, __m256i isLow) {
    const __m256i bits = _mm256_add_epi16(masked(units, 0x3FF), set16(0x40));
    const __m256i first = _mm256_or_si256(_mm256_srli_epi16(bits, 8), set16(0xF0));
    const __m256i second = _mm256_or_si256(masked(_mm256_srli_epi16(bits, 2), 0x3F), set16(0x80));
    const __m256i third = _mm256_or_si256(masked(_mm256_srli_epi16(units, 6), 0xF),
                                          join(masked(oneBefore, 3), 4, set16(0x80)));
    const __m256i middle = _mm256_blendv_epi8(first, third, isLow);
    octets.first = _mm256_blendv_epi8(octets.first, _mm256_slli_epi16(middle, 8),
                                      _mm256_or_si256(isHigh, isLow));
    octets.last = _mm256_blendv_epi8(octets.last, second, isHigh);
}

// 16 units. `previous`: those in front, or zeros. False, with nothing converted, where
// surrogates are not in pairs. The last may be a high one.
PLR_AVX2_INLINE bool encodeWide(Encoding& run, __m256i& previous) {
    const __m256i units = load(run.in);
    if (isZero(masked(_mm256_or_si256(units, previous), 0xFF80))) {
        const __m256i octets = _mm256_packus_epi16(units, units);
        storeHalf(run.out, lowerOf(_mm256_permute4x64_epi64(octets, 0x08)));
        run.in += kUnits;
        run.out += kUnits;
        return true;
    }
    const __m256i isOne = is(units, 0xFF80, 0);
    __m256i isShort = is(units, 0xF800, 0);
    const __m256i ones = set16(0xFFFF);
    UnitOctets octets = octetsOf(units, _mm256_xor_si256(isShort, ones));
    const __m256i isSurrogate = is(units, 0xF800, 0xD800);
    if (!isZero(_mm256_or_si256(isSurrogate, is(previous, 0xFC00, 0xD800)))) {
        const __m256i oneBefore = before<2>(units, previous);
        const __m256i isHigh = is(units, 0xFC00, 0xD800);
        const __m256i isLow = is(units, 0xFC00, 0xDC00);
        if (!isZero(_mm256_xor_si256(isLow, is(oneBefore, 0xFC00, 0xD800))))
            return false;
        putSurrogates(octets, units, oneBefore, isHigh, isLow);
        isShort = _mm256_or_si256(isShort, isSurrogate);
    }
    const unsigned lengths = ~signsOf(_mm256_blendv_epi8(isOne, isShort, set16(0xFF00)));
    const __m256i even = _mm256_unpacklo_epi16(octets.first, octets.last);
    const __m256i odd = _mm256_unpackhi_epi16(octets.first, octets.last);
    run.out = storeOctets(run.out, lowerOf(even), lengths & 0xFF);
    run.out = storeOctets(run.out, lowerOf(odd), lengths >> 8 & 0xFF);
    run.out = storeOctets(run.out, upperOf(even), lengths >> 16 & 0xFF);
    run.out = storeOctets(run.out, upperOf(odd), lengths >> 24);
    run.in += kUnits;
    previous = units;
    return true;
}

PLR_AVX2 void encodeBlocks(Encoding& all) {
    Encoding run = all;
    __m256i previous = _mm256_setzero_si256();
    while (hasBlock(run) && encodeWide(run, previous)) {
    }
    if (run.in != all.in && utf16::isHighSurrogate(run.in[-1])) {  // its low one is not judged
        --run.in;
        run.out -= 2;
    }
    all = run;
}

PLR_AVX2 bool encodeFew(Encoding& run) {
    std::ptrdiff_t length = std::min({run.end - run.in, (run.outEnd - run.out) / 3, kUnits});
    if (length < kFew)
        return false;
    length -= utf16::isHighSurrogate(run.in[length - 1]) ? 1 : 0;
    std::array<char16_t, kUnits> units{};
    std::array<char, 4 * kUnits> octets;
    std::copy_n(run.in, length, units.data());
    Encoding few{units.data(), nullptr, octets.data(), nullptr};
    __m256i previous = _mm256_setzero_si256();
    if (!encodeWide(few, previous))
        return false;
    run.out = std::copy(octets.data(), few.out - (kUnits - length), run.out);
    run.in += length;
    return true;
}

}  // namespace

void decodeAvx2(Decoding& run) noexcept {
    do
        decodeBlocks(run);
    while (decodeFew(run) || (hasBlock(run) && decodeBlock(run)));
}

void encodeAvx2(Encoding& run) noexcept {
    do
        encodeBlocks(run);
    while (encodeFew(run) || (hasBlock(run) && encodeBlock(run)));
}

}  // namespace plr::utf8kernel

#endif
