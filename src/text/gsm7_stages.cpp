#include "src/text/gsm7_stages.h"

#include <utility>

namespace plr {

// A character makes up to two codes, so for runs half as many are pulled as there is room
// for codes. They stand in the last half of it: the codes do not reach those to be read.
template <class Derived>
std::size_t Gsm7Encoder<Derived>::convert(std::uint32_t* out, std::size_t most) {
    std::size_t made = 0;
    if (held_ != this->kEnd)
        out[made++] = std::exchange(held_, this->kEnd);
    while (most - made > 1) {
        const std::size_t wanted = (most - made) / 2;
        std::uint32_t* const characters = out + most - wanted;
        const std::size_t got = this->pull(characters, wanted);
        made += encode(out + made, characters, got);
        if (got < wanted)
            return made;
    }
    return most == made ? made : made + encodeOne(out + made);
}

template <class Derived>
void Gsm7Encoder<Derived>::reset() {
    TextTransform::reset();
    held_ = this->kEnd;
}

// Without a branch: where nothing is escaped, the next code overwrites the second.
template <class Derived>
std::size_t Gsm7Encoder<Derived>::encode(std::uint32_t* out, const std::uint32_t* characters,
                                         std::size_t length) {
    std::size_t made = 0;
    std::uint32_t all = 0;
    for (std::size_t i = 0; i < length; ++i) {
        const std::uint32_t code = static_cast<Derived*>(this)->codeOf(characters[i]);
        const bool escaped = (code & gsm7::kEscaped) != 0;
        all |= code;
        out[made] = escaped ? gsm7::kEscape : code & 0xFF;
        out[made + 1] = code & 0xFF;
        made += escaped ? 2 : 1;
    }
    if ((all & gsm7::kUnknown & 0xFF00) != 0)
        this->markExceptionOccurred();
    return made;
}

// Where there is room for one code.
template <class Derived>
std::size_t Gsm7Encoder<Derived>::encodeOne(std::uint32_t* out) {
    std::uint32_t character = 0;
    std::uint32_t codes[2];
    if (this->pull(&character, 1) == 0)
        return 0;
    if (encode(codes, &character, 1) == 2)
        held_ = codes[1];
    *out = codes[0];
    return 1;
}

template class Gsm7Encoder<Ucs2ToGsm7Transform>;
template class Gsm7Encoder<Ucs2ToAdn8Transform>;

// The shortest there is: a septet of the alphabet, from the base on, behind the escape.
std::uint32_t Ucs2ToAdn8Transform::codeOf(std::uint32_t character) const noexcept {
    const std::uint32_t code = gsm7::codeOf(gsm7::codesOf({}), character);
    const auto distance = static_cast<std::uint16_t>(character - base_);
    const bool isNear = character <= 0xFFFF && distance < 0x80;
    return code > 0x7F && isNear ? 0x80U | distance : code;
}

// Codes are turned into characters where these go.
template <class Derived>
std::size_t Gsm7Decoder<Derived>::convert(std::uint32_t* out, std::size_t most) {
    std::size_t made = 0;
    std::uint32_t shift = 0;
    while (made < most) {
        const std::size_t wanted = most - made;
        const std::size_t got = this->pull(out + made, wanted);
        made += decode(out + made, got, shift);
        if (got < wanted) {
            if (shift != 0)
                this->markExceptionOccurred();
            break;
        }
    }
    return made;
}

// `shift`: 128 behind an escape, otherwise 0.
template <class Derived>
std::size_t Gsm7Decoder<Derived>::decode(std::uint32_t* codes, std::size_t length,
                                         std::uint32_t& shift) {
    std::size_t made = 0;
    bool twice = false;
    for (std::size_t i = 0; i < length; ++i) {
        const std::uint32_t code = codes[i];
        if (code > 0x7F) {
            codes[made++] = static_cast<Derived*>(this)->characterAbove7F(code);
            shift = 0;
            continue;
        }
        const std::uint32_t shifted = shift + code;
        codes[made] = characters_[shifted];
        twice |= shifted == 0x80 + gsm7::kEscape;
        const bool escapes = shifted == gsm7::kEscape;
        made += escapes ? 0 : 1;
        shift = escapes ? 0x80 : 0;
    }
    if (twice)
        this->markExceptionOccurred();
    return made;
}

template <class Derived>
std::uint32_t Gsm7Decoder<Derived>::replacement() {
    this->markExceptionOccurred();
    return 0xFFFD;
}

template class Gsm7Decoder<Gsm7ToUcs2Transform>;
template class Gsm7Decoder<Adn8ToUcs2Transform>;

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
