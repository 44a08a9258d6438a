#include "src/text/ucs2_to_utf8_transform.h"

#include <array>
#include <utility>

#include "src/text/utf16.h"
#include "src/text/utf8_kernel.h"

namespace plr {
namespace {

constexpr std::size_t kCodes = 256;  // at a time

constexpr octets::Few kReplacement{0xEFBFBD00, 3};

octets::Few encodeUnit(std::uint32_t unit) {
    if (unit < 0x80)
        return {unit << 24, 1};
    const std::uint32_t last = 0x80 | (unit & 0x3F);
    if (unit < 0x800)
        return {(0xC0 | unit >> 6) << 24 | last << 16, 2};
    return {(0xE0 | unit >> 12) << 24 | (0x80 | (unit >> 6 & 0x3F)) << 16 | last << 8, 3};
}

octets::Few encodePair(std::uint32_t pair) {
    const std::uint32_t character = utf16::characterOfPair(pair);
    return {(0xF0 | character >> 18) << 24 | (0x80 | (character >> 12 & 0x3F)) << 16 |
                (0x80 | (character >> 6 & 0x3F)) << 8 | (0x80 | (character & 0x3F)),
            4};
}

}  // namespace

void Ucs2ToUtf8Transform::reset() {
    TextTransform::reset();
    rest_ = {};
    held_ = kEnd;
}

std::size_t Ucs2ToUtf8Transform::convert(char* out, std::size_t most) {
    std::array<std::uint32_t, kCodes> codes;
    std::size_t done = rest_.take(out, most);
    for (bool more = true; done < most && (more || held_ != kEnd);) {
        if (held_ != kEnd) {
            convertHeld();
            done += rest_.take(out + done, most - done);
            continue;
        }
        const std::size_t wanted = std::min((most - done + 3) / 4, kCodes);
        const std::size_t got = pull(codes.data(), wanted);
        done += convertCodes(codes.data(), got, out + done, most - done);
        more = got == wanted;
    }
    return done;
}

std::size_t Ucs2ToUtf8Transform::convertCodes(const std::uint32_t* codes, std::size_t length,
                                              char* out, std::size_t most) {
    std::size_t done = 0;
    for (std::size_t i = 0; i < length;) {
        utf8kernel::Encoding run{codes + i, codes + length, out + done, out + most};
        utf8kernel::kernel().encode(run);
        i = static_cast<std::size_t>(run.in - codes);
        done = static_cast<std::size_t>(run.out - out);
        if (i == length)
            break;
        std::uint32_t code = codes[i++];
        if (utf16::isHighSurrogate(code)) {
            if (i == length) {
                held_ = code;
                break;
            }
            if (utf16::isLowSurrogate(codes[i]))
                code = utf16::pairOf(code, codes[i++]);
        }
        rest_ = encode(code);
        done += rest_.take(out + done, most - done);
    }
    return done;
}

void Ucs2ToUtf8Transform::convertHeld() {
    std::uint32_t code = std::exchange(held_, kEnd);
    if (utf16::isHighSurrogate(code) && pull(&held_, 1) != 0 && utf16::isLowSurrogate(held_))
        code = utf16::pairOf(code, std::exchange(held_, kEnd));
    rest_ = encode(code);
}

octets::Few Ucs2ToUtf8Transform::encode(std::uint32_t code) {
    if (code < 0xD800 || code - 0xE000 < 0x2000)
        return encodeUnit(code);
    if (utf16::isPair(code))
        return encodePair(code);
    markExceptionOccurred();
    return kReplacement;
}

}  // namespace plr
