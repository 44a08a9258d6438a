#pragma once

#include <cstdint>

// Characters as the stages deliver them: UTF-16 code units, and pairs, which hold the two
// surrogates of a character in one code, see text_transform.h.
namespace plr::utf16 {

inline constexpr std::uint32_t kReplacement = 0xFFFD;  // of what is no character

constexpr bool isHighSurrogate(std::uint32_t code) noexcept {
    return code >> 10 == 0xD800 >> 10;
}
constexpr bool isLowSurrogate(std::uint32_t code) noexcept {
    return code >> 10 == 0xDC00 >> 10;
}
constexpr bool isPair(std::uint32_t code) noexcept {
    return (code & 0xFC00FC00) == 0xD800DC00;
}
constexpr std::uint32_t pairOf(std::uint32_t high, std::uint32_t low) noexcept {
    return high << 16 | low;
}

// Of a character from U+10000 on, its pair; and back.
constexpr std::uint32_t pairOfCharacter(std::uint32_t character) noexcept {
    return pairOf(0xD7C0 + (character >> 10), 0xDC00 + (character & 0x3FF));
}
constexpr std::uint32_t characterOfPair(std::uint32_t pair) noexcept {
    return 0x10000 + ((pair >> 16 & 0x3FF) << 10) + (pair & 0x3FF);
}

// Whether one of 16 units is a surrogate.
constexpr bool hasSurrogates(const char16_t* units) noexcept {
    bool any = false;
    for (int k = 0; k < 16; ++k)
        any |= (units[k] & 0xF800) == 0xD800;
    return any;
}

// Of a unit or pair its units; returns where they end.
constexpr char16_t* put(char16_t* out, std::uint32_t code) noexcept {
    if (code > 0xFFFF)
        *out++ = static_cast<char16_t>(code >> 16);
    *out++ = static_cast<char16_t>(code);
    return out;
}

}  // namespace plr::utf16
