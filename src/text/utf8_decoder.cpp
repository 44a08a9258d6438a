#include "src/text/utf8_decoder.h"

#include <array>

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

constexpr std::uint32_t codeOf(std::uint32_t character) {
    return character < 0x10000 ? character : utf16::pairOfCharacter(character);
}

}  // namespace

std::size_t Utf8Decoder::decode(char16_t* out, std::size_t most, bool atEnd) noexcept {
    const char16_t* const begin = out;
    char16_t* const end = out + most;
    while (out < end && next_ != end_) {
        utf8kernel::Decoding run{next_, end_, out, end, pairs_};
        kernel_.decode(run);
        next_ = run.in;
        out = run.out;
        pairs_ = run.pairs;
        if (out == end || next_ == end_ || !decodeOne(out, atEnd))
            break;
    }
    return static_cast<std::size_t>(out - begin);
}

// False, with nothing read, where more octets decide.
bool Utf8Decoder::decodeOne(char16_t*& out, bool atEnd) noexcept {
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
    out = utf16::put(out, wellFormed ? codeOf(character) : utf16::kReplacement);
    pairs_ += wellFormed && character > 0xFFFF ? 1 : 0;
    marked_ |= !wellFormed;
    next_ += i;
    return true;
}

}  // namespace plr
