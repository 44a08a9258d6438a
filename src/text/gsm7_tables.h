#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>

#include "plr/text/text_converter.h"
#include "src/text/gsm7_alphabets.h"

// The alphabets of GSM 7-bit as look-ups, both ways, made of gsm7_alphabets.h by the
// compiler.
//
// Threads: constants, any thread.
// Cost:    one load a septet, two a character; no branch.
namespace plr::gsm7 {

// What receivers show: the character of a septet and, 128 further on, of a septet behind
// the escape. There the extension comes first, then the alphabet; a second escape is a
// space.
using Characters = std::array<char16_t, 256>;

// By NationalLanguageId; another number is kNone.
[[nodiscard]] const Characters& charactersOf(int locking, int single) noexcept;

// What senders write: the code of a UTF-16 unit, with kEscaped if it goes behind the
// escape; kUnknown is that of a unit without one. Units with a code stand in
// few pages of 64, which all tables number alike; page 0 has none, and the next four are
// those of Latin-1.
inline constexpr std::uint16_t kEscaped = kEscape << 8;
inline constexpr std::uint16_t kUnknownBit = 0x8000;
inline constexpr std::uint16_t kUnknown = kUnknownBit | kReplacement;

struct PageNumbers {
    std::array<std::uint8_t, 0x10000 / 64> of{1, 2, 3, 4};  // by unit / 64
    std::uint8_t count = 5;

    constexpr PageNumbers() {
        for (const auto& tables : {kAlphabets, kExtensions})
            for (const Table table : tables)
                for (const char16_t unit : table)
                    if (std::uint8_t& page = of[unit / 64]; page == 0)
                        page = count++;
    }
};
inline constexpr PageNumbers kPages;
static_assert(kPages.of[0xFFFF / 64] == 0);

using Codes = std::array<std::uint16_t, kPages.count * std::size_t{64}>;

[[nodiscard]] const Codes& codesOf(TextConverter::Ucs2ToGsm7Tables tables) noexcept;

// `character`: a unit; anything above 0xFFFF has no code.
[[nodiscard]] inline std::uint16_t codeOf(const Codes& codes, std::uint32_t character) noexcept {
    const std::uint32_t unit = std::min<std::uint32_t>(character, 0xFFFF);
    return codes[kPages.of[unit / 64] * std::size_t{64} + unit % 64];
}

// The same for a character below 0x100.
[[nodiscard]] inline std::uint16_t latinCodeOf(const Codes& codes, std::uint32_t unit) noexcept {
    return codes[kPages.of[0] * std::size_t{64} + unit];
}

}  // namespace plr::gsm7
