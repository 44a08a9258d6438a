#include "src/text/utf8_decoder.h"

#include <array>

#include "src/text/octets.h"
#include "src/text/utf16.h"

namespace plr {
namespace {

// What may follow a lead octet. The first octet that follows is from `least` to
// `greatest`, others from 0x80 to 0xBF.
struct Sequence {
    std::size_t length;  // octets, with the lead; 0 where it is none
    unsigned least;
    unsigned greatest;
};

constexpr Sequence sequenceOf(unsigned char lead) {
    if (lead < 0x80)
        return {1, 0x80, 0xBF};
    if (lead < 0xC2 || lead > 0xF4)
        return {0, 0, 0};
    if (lead < 0xE0)
        return {2, 0x80, 0xBF};
    if (lead < 0xF0)
        return {3, lead == 0xE0 ? 0xA0U : 0x80U, lead == 0xED ? 0x9FU : 0xBFU};
    return {4, lead == 0xF0 ? 0x90U : 0x80U, lead == 0xF4 ? 0x8FU : 0xBFU};
}

constexpr std::array<Sequence, 256> kSequences = [] {
    std::array<Sequence, 256> sequences{};
    for (unsigned lead = 0; lead < sequences.size(); ++lead)
        sequences[lead] = sequenceOf(static_cast<unsigned char>(lead));
    return sequences;
}();

bool isAsciiBlock(const unsigned char* octets) {
    std::array<std::uint64_t, 2> words;
    static_assert(sizeof(words) == octets::kBlock);
    std::memcpy(words.data(), octets, sizeof(words));
    return ((words[0] | words[1]) & 0x8080808080808080) == 0;
}

constexpr bool isTrail(unsigned char octet) {
    return (octet & 0xC0) == 0x80;
}

constexpr std::uint32_t codeOf(std::uint32_t character) {
    return character < 0x10000 ? character : utf16::pairOfCharacter(character);
}

}  // namespace

std::size_t Utf8Decoder::decode(std::uint32_t* out, std::size_t most, bool atEnd) noexcept {
    const std::uint32_t* const begin = out;
    const std::uint32_t* const end = out + most;
    while (out != end && next_ != end_) {
        out = decodeRun(out, end);
        if (out == end || next_ == end_ || !decodeOne(*out, atEnd))
            break;
        ++out;
    }
    return static_cast<std::size_t>(out - begin);
}

// Characters up to something rare: what is ill-formed, or near the end.
std::uint32_t* Utf8Decoder::decodeRun(std::uint32_t* out, const std::uint32_t* outEnd) noexcept {
    const unsigned char* in = next_;
    // All reads below are within a block.
    while (static_cast<std::size_t>(end_ - in) >= octets::kBlock &&
           static_cast<std::size_t>(outEnd - out) >= octets::kBlock) {
        if (isAsciiBlock(in)) {
            octets::widen(out, in, octets::kBlock);
            in += octets::kBlock;
            out += octets::kBlock;
            continue;
        }
        // Until no character of four octets fits into the block any more.
        for (const unsigned char* const stop = in + octets::kBlock - 3; in < stop;) {
            const std::uint32_t first = *in;
            if (first < 0x80) {
                *out++ = first;
                ++in;
            } else if (first < 0xE0) {
                if (first < 0xC2 || !isTrail(in[1])) {
                    next_ = in;
                    return out;
                }
                *out++ = (first & 0x1F) << 6 | (in[1] & 0x3FU);
                in += 2;
            } else if (first < 0xF0) {
                const std::uint32_t unit =
                    (first & 0xF) << 12 | (in[1] & 0x3FU) << 6 | (in[2] & 0x3FU);
                if (!isTrail(in[1]) || !isTrail(in[2]) || unit < 0x800 || unit >> 11 == 0x1B) {
                    next_ = in;
                    return out;
                }
                *out++ = unit;
                in += 3;
            } else {
                const std::uint32_t character = (first & 0x7) << 18 | (in[1] & 0x3FU) << 12 |
                                                (in[2] & 0x3FU) << 6 | (in[3] & 0x3FU);
                if (first > 0xF4 || !isTrail(in[1]) || !isTrail(in[2]) || !isTrail(in[3]) ||
                    character - 0x10000 >= 0x100000) {
                    next_ = in;
                    return out;
                }
                *out++ = utf16::pairOfCharacter(character);
                in += 4;
            }
        }
    }
    next_ = in;
    return out;
}

// False, with nothing read, where more octets decide.
bool Utf8Decoder::decodeOne(std::uint32_t& out, bool atEnd) noexcept {
    const Sequence& sequence = kSequences[*next_];
    std::uint32_t character = *next_ & (0x7FU >> (sequence.length == 1 ? 0 : sequence.length));
    std::size_t i = 1;
    for (; i < sequence.length && i < left(); ++i) {
        const unsigned least = i == 1 ? sequence.least : 0x80;
        const unsigned greatest = i == 1 ? sequence.greatest : 0xBF;
        if (next_[i] < least || next_[i] > greatest)
            break;
        character = character << 6 | (next_[i] & 0x3FU);
    }
    const bool wellFormed = i == sequence.length;
    if (!wellFormed && i == left() && i < sequence.length && !atEnd)
        return false;
    out = wellFormed ? codeOf(character) : utf16::kReplacement;
    marked_ |= !wellFormed;
    next_ += i;
    return true;
}

}  // namespace plr
