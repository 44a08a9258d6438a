#include "src/text/gsm7_stages.h"

#include <array>
#include <cstring>
#include <utility>

#include "src/text/octet_pull.h"

namespace plr {
namespace {

constexpr std::uint32_t kReplacementUnit = 0xFFFD;
constexpr std::size_t kBlock = 8;  // codes that are converted at once

// Writes a code, behind its escape if it has one, to `out`, which has room for two; returns
// how many. Without a branch: what follows overwrites the second.
std::size_t put(char* out, std::uint32_t code) {
    const bool escaped = (code & gsm7::kEscaped) != 0;
    out[0] = static_cast<char>(escaped ? gsm7::kEscape : code);
    out[1] = static_cast<char>(code);
    return escaped ? 2 : 1;
}

// Writes a block as if no code had an escape; returns all bits of the codes.
template <class CodeOf>
std::uint32_t putBlock(char* out, const std::uint32_t* characters, CodeOf codeOf) {
    std::uint32_t all = 0;
    for (std::size_t k = 0; k < kBlock; ++k) {
        const std::uint32_t code = codeOf(characters[k]);
        all |= code;
        out[k] = static_cast<char>(code);
    }
    return all;
}

bool isLatin(const std::uint32_t* characters) {
    std::uint32_t all = 0;
    for (std::size_t k = 0; k < kBlock; ++k)
        all |= characters[k];
    return all <= 0xFF;
}

// Whether a block of octets is septets, and no escapes.
bool isPlain(const unsigned char* octets) {
    constexpr std::uint64_t kEach = 0x0101010101010101;
    std::uint64_t word = 0;
    static_assert(sizeof word == kBlock);
    std::memcpy(&word, octets, kBlock);
    const std::uint64_t unlike = word ^ gsm7::kEscape * kEach;  // 0 where there is an escape
    return ((word | (unlike - kEach)) & 0x80 * kEach) == 0;
}

}  // namespace

// A character makes up to two codes, so for runs half as many are pulled as there is room
// for codes.
template <class Lookup>
std::size_t Gsm7Encoder<Lookup>::convert(char* out, std::size_t most) {
    std::array<std::uint32_t, 512> characters;
    std::size_t made = 0;
    if (held_ != kNone)
        out[made++] = static_cast<char>(std::exchange(held_, kNone));
    while (most - made > 1) {
        const std::size_t wanted = std::min((most - made) / 2, characters.size());
        const std::size_t got = this->pull(characters.data(), wanted);
        made += encode(out + made, {characters.data(), got});
        if (got < wanted)
            return made;
    }
    return most == made ? made : made + encodeOne(out + made);
}

template <class Lookup>
void Gsm7Encoder<Lookup>::reset() {
    TextTransform::reset();
    held_ = kNone;
}

// `out` has room for two codes a character.
template <class Lookup>
std::size_t Gsm7Encoder<Lookup>::encode(char* out, std::span<const std::uint32_t> characters) {
    const Lookup lookup = lookup_;  // which `out` cannot alias
    const auto codeOf = [lookup](std::uint32_t character) { return lookup.codeOf(character); };
    const auto latinCodeOf = [lookup](std::uint32_t unit) { return lookup.latinCodeOf(unit); };
    std::size_t made = 0;
    std::size_t i = 0;
    std::uint32_t all = 0;
    for (; characters.size() - i >= kBlock; i += kBlock) {
        const std::uint32_t* const block = characters.data() + i;
        const std::uint32_t some = isLatin(block) ? putBlock(out + made, block, latinCodeOf)
                                                  : putBlock(out + made, block, codeOf);
        all |= some;
        if (some <= 0xFF) {
            made += kBlock;
            continue;
        }
        for (std::size_t k = 0; k < kBlock; ++k)
            made += put(out + made, codeOf(block[k]));
    }
    for (const std::uint32_t character : characters.subspan(i)) {
        const std::uint32_t code = codeOf(character);
        all |= code;
        made += put(out + made, code);
    }
    if ((all & gsm7::kUnknownBit) != 0)
        this->markExceptionOccurred();
    return made;
}

// Where there is room for one code.
template <class Lookup>
std::size_t Gsm7Encoder<Lookup>::encodeOne(char* out) {
    std::uint32_t character = 0;
    char codes[2] = {};
    if (this->pull(&character, 1) == 0)
        return 0;
    if (encode(codes, {&character, 1}) == 2)
        held_ = static_cast<unsigned char>(codes[1]);
    *out = codes[0];
    return 1;
}

template class Gsm7Encoder<gsm7::AlphabetCodes>;
template class Gsm7Encoder<gsm7::Adn8Codes>;

template <class Lookup>
std::size_t Gsm7Decoder<Lookup>::convert(std::uint32_t* out, std::size_t most) {
    std::size_t made = 0;
    std::uint32_t shift = 0;
    for (bool more = this->source != nullptr; more && made < most;)
        made += decodeSome(out + made, most - made, more, shift);
    if (shift != 0)
        this->markExceptionOccurred();
    return made;
}

// A character takes one code at the least. Clears `more` at the end.
template <class Lookup>
std::size_t Gsm7Decoder<Lookup>::decodeSome(std::uint32_t* out, std::size_t most, bool& more,
                                            std::uint32_t& shift) {
    if (!this->source->deliversOctets()) {
        const std::size_t got = this->pull(out, most);
        more = got == most;
        return decode<std::uint32_t>(out, {out, got}, shift);
    }
    OctetBuffer buffer;
    const std::size_t wanted = std::min(most, buffer.size());
    const auto octets = pullOctets(*this->source, wanted, buffer);
    more = octets.size() == wanted;
    return decode(out, octets, shift);
}

// `shift`: 128 behind an escape, otherwise 0. `out` may be where `codes` are.
template <class Lookup>
template <class Code>
std::size_t Gsm7Decoder<Lookup>::decode(std::uint32_t* out, std::span<const Code> codes,
                                        std::uint32_t& shift) {
    const gsm7::Characters& characters = lookup_.characters();
    std::size_t made = 0;
    bool twice = false;
    for (std::size_t i = 0; i < codes.size();) {
        if constexpr (sizeof(Code) == 1) {
            if (shift == 0 && codes.size() - i >= kBlock && isPlain(codes.data() + i)) {
                for (std::size_t k = 0; k < kBlock; ++k)
                    out[made + k] = characters[codes[i + k]];
                made += kBlock;
                i += kBlock;
                continue;
            }
        }
        const std::uint32_t code = codes[i++];
        if (code > 0x7F) {
            out[made++] = characterAbove7F(code);
            shift = 0;
            continue;
        }
        const std::uint32_t shifted = shift + code;
        const bool escapes = shifted == gsm7::kEscape;
        twice |= shifted == 0x80 + gsm7::kEscape;
        out[made] = characters[shifted];
        made += escapes ? 0 : 1;
        shift = escapes ? 0x80 : 0;
    }
    if (twice)
        this->markExceptionOccurred();
    return made;
}

template <class Lookup>
std::uint32_t Gsm7Decoder<Lookup>::characterAbove7F(std::uint32_t code) {
    const std::uint32_t character = lookup_.characterAbove7F(code);
    if (character != gsm7::kNone)
        return character;
    this->markExceptionOccurred();
    return kReplacementUnit;
}

template class Gsm7Decoder<gsm7::AlphabetCharacters>;
template class Gsm7Decoder<gsm7::Adn8Characters>;

// One by one: what is behind the end must not be read.
std::size_t OctetToGsm7Transform::convert(std::uint32_t* out, std::size_t most) {
    std::size_t made = 0;
    for (; made < most && !ended_; ++made) {
        if (pull(out + made, 1) == 0)
            break;
        ended_ = out[made] == 0xFF;
        if (ended_)
            break;
        if (out[made] > 0x7F) {
            markExceptionOccurred();
            out[made] = gsm7::kReplacement;
        }
    }
    return made;
}

void OctetToGsm7Transform::reset() {
    TextTransform::reset();
    ended_ = false;
}

}  // namespace plr
