#include "plr/text/text_transform.h"

#include <array>

#include "src/text/octets.h"
#include "src/text/utf16.h"

namespace plr {

TextTransform::~TextTransform() = default;

void TextTransform::reset() {
    exception = false;
}

std::size_t TextTransform::nextCodes(std::uint32_t* out, std::size_t most) {
    std::size_t done = 0;
    for (std::uint32_t code = 0; done < most && (code = nextCode()) != kEnd; ++done)
        out[done] = code;
    return done;
}

std::size_t TextTransform::nextChars(char* out, std::size_t most) {
    std::array<std::uint32_t, 256> codes;
    std::size_t done = 0;
    while (done < most) {
        const std::size_t wanted = std::min(most - done, codes.size());
        const std::size_t got = nextCodes(codes.data(), wanted);
        octets::narrow(out + done, codes.data(), got);
        done += got;
        if (got < wanted)
            break;
    }
    return done;
}

std::size_t TextTransform::nextUnits(char16_t* out, std::size_t most) {
    const char16_t* const begin = out;
    const char16_t* const end = out + most;
    for (std::uint32_t code = 0; out < end && (code = nextCode()) != kEnd;)
        out = utf16::put(out, code);
    return static_cast<std::size_t>(out - begin);
}

OctetSourceBuffer* TextTransform::asOctetSource() noexcept {
    return nullptr;
}

bool TextTransform::deliversOctets() const noexcept {
    return false;
}

bool TextTransform::deliversUnits() const noexcept {
    return false;
}

bool TextTransform::getExceptionStatus() const noexcept {
    const TextTransform* stage = this;
    while (stage != nullptr && !stage->exception)
        stage = stage->source;
    return stage != nullptr;
}

}  // namespace plr
