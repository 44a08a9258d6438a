#include "src/text/utf8_plain.h"

namespace plr::utf8kernel {
namespace {

bool isAsciiBlock(const unsigned char* octets) {
    std::array<std::uint64_t, 2> words;
    static_assert(sizeof(words) == kBlock);
    std::memcpy(words.data(), octets, sizeof(words));
    return ((words[0] | words[1]) & 0x8080808080808080) == 0;
}

constexpr bool isTrail(unsigned octet) {
    return (octet & 0xC0) == 0x80;
}

// Reads a character of more than one octet, as a code. False where it is ill-formed.
inline bool decodeLong(const unsigned char*& in, std::uint32_t& out) {
    const std::uint32_t first = in[0];
    const std::uint32_t second = in[1] & 0x3FU;
    if (first < 0xE0) {
        out = (first & 0x1F) << 6 | second;
        in += 2;
        return first >= 0xC2 && isTrail(in[-1]);
    }
    const std::uint32_t third = in[2] & 0x3FU;
    if (first < 0xF0) {
        out = (first & 0xF) << 12 | second << 6 | third;
        in += 3;
        return isTrail(in[-2]) && isTrail(in[-1]) && out >= 0x800 && out >> 11 != 0xD800 >> 11;
    }
    const std::uint32_t character =
        (first & 0xF) << 18 | second << 12 | third << 6 | (in[3] & 0x3FU);
    out = utf16::pairOfCharacter(character);
    in += 4;
    return isTrail(in[-3]) && isTrail(in[-2]) && isTrail(in[-1]) && character - 0x10000 < 0x100000;
}

// Of one to four octets, the first in the lowest bits.
struct Octets {
    std::uint32_t bits;
    std::size_t length;
};

// Without branches: texts mix lengths.
constexpr Octets octetsOf(std::uint32_t character) {
    const std::uint32_t last = 0x80 | (character & 0x3F);
    const std::uint32_t middle = 0x80 | (character >> 6 & 0x3F);
    const std::uint32_t two = 0xC0 | character >> 6 | last << 8;
    const std::uint32_t three = 0xE0 | character >> 12 | middle << 8 | last << 16;
    const std::uint32_t four =
        0xF0 | character >> 18 | (0x80 | (character >> 12 & 0x3F)) << 8 | middle << 16 | last << 24;
    std::uint32_t bits = character < 0x800 ? two : three;
    bits = character < 0x80 ? character : bits;
    bits = character < 0x10000 ? bits : four;
    return {bits, std::size_t{1} + (character >= 0x80 ? 1 : 0) + (character >= 0x800 ? 1 : 0) +
                      (character >= 0x10000 ? 1 : 0)};
}

}  // namespace

bool decodeBlock(Decoding& run) noexcept {
    if (isAsciiBlock(run.in)) {
        for (std::size_t k = 0; k < kBlock; ++k)
            run.out[k] = run.in[k];
        run.in += kBlock;
        run.out += kBlock;
        return true;
    }
    // Until no character of four octets fits any more. A local stays in registers.
    const unsigned char* in = run.in;
    for (const unsigned char* const stop = in + kBlock - 3; in < stop; run.in = in) {
        std::uint32_t code = *in;
        if (code < 0x80)
            ++in;
        else if (!decodeLong(in, code))
            return false;
        run.out = utf16::put(run.out, code);
        run.pairs += code > 0xFFFF ? 1 : 0;
    }
    return true;
}

bool encodeBlock(Encoding& run) noexcept {
    std::uint32_t all = 0;
    for (std::size_t k = 0; k < kBlock; ++k)
        all |= run.in[k];
    if (all < 0x80) {
        for (std::size_t k = 0; k < kBlock; ++k)
            run.out[k] = static_cast<char>(run.in[k]);
        run.in += kBlock;
        run.out += kBlock;
        return true;
    }
    // Until two units, which may be one character, do not fit any more.
    for (const char16_t* const stop = run.in + kBlock - 1; run.in < stop; ++run.in) {
        std::uint32_t code = *run.in;
        if (code >> 11 == 0xD800 >> 11) {
            if (!utf16::isPair(utf16::pairOf(code, run.in[1])))
                return false;
            code = utf16::characterOfPair(utf16::pairOf(code, *++run.in));
        }
        const Octets encoded = octetsOf(code);
        const std::uint32_t bits = octets::firstLowest(encoded.bits);
        std::memcpy(run.out, &bits, sizeof(bits));
        run.out += encoded.length;
    }
    return true;
}

void decodePlain(Decoding& run) noexcept {
    while (hasBlock(run) && decodeBlock(run)) {
    }
}

void encodePlain(Encoding& run) noexcept {
    while (hasBlock(run) && encodeBlock(run)) {
    }
}

}  // namespace plr::utf8kernel
