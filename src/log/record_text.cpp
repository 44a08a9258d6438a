#include "src/log/record_text.h"

namespace plr::record_text {
namespace {

// One character of UTF-8 by its first byte: how many bytes follow, and the range
// of the first of these (RFC 3629, section 4).
struct Sequence {
    unsigned follow;
    unsigned char low, high;
};

constexpr Sequence sequenceOf(unsigned char first) noexcept {
    if (first == 0xC2)
        return {1, 0xA0, 0xBF};  // 0x80 to 0x9F are the control characters C1
    if (first >= 0xC3 && first <= 0xDF)
        return {1, 0x80, 0xBF};
    if (first == 0xE0)
        return {2, 0xA0, 0xBF};
    if (first == 0xED)
        return {2, 0x80, 0x9F};
    if (first >= 0xE1 && first <= 0xEF)
        return {2, 0x80, 0xBF};
    if (first == 0xF0)
        return {3, 0x90, 0xBF};
    if (first >= 0xF1 && first <= 0xF3)
        return {3, 0x80, 0xBF};
    if (first == 0xF4)
        return {3, 0x80, 0x8F};
    return {0, 0, 0};
}

// The length of the character at the start of `text`; 0 when it is none that may
// be shown.
std::size_t characterLength(std::string_view text) noexcept {
    const auto byte = [text](std::size_t at) { return static_cast<unsigned char>(text[at]); };
    if (byte(0) < 0x80)
        return (byte(0) >= 0x20 && byte(0) != 0x7F) || byte(0) == '\t' ? 1 : 0;
    const Sequence expected = sequenceOf(byte(0));
    if (expected.follow == 0 || text.size() <= expected.follow || byte(1) < expected.low ||
        byte(1) > expected.high)
        return 0;
    for (std::size_t i = 2; i <= expected.follow; ++i)
        if ((byte(i) & 0xC0) != 0x80)
            return 0;
    return expected.follow + 1;
}

}  // namespace

std::size_t plainPrefix(std::string_view text) noexcept {
    std::size_t length = 0;
    while (length < text.size()) {
        const std::size_t character = characterLength(text.substr(length));
        if (character == 0)
            break;
        length += character;
    }
    return length;
}

}  // namespace plr::record_text
