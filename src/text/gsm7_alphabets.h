#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

// The GSM 7-bit default alphabet with its extension, and the Turkish, Spanish and
// Portuguese tables in place of them (3GPP TS 23.038, 6.2.1 and annex A).
namespace plr::gsm7 {

inline constexpr std::uint8_t kEscape = 0x1B;       // a code of the extension follows
inline constexpr std::uint8_t kReplacement = 0x3F;  // '?', in every alphabet

// Each row is a column of the standard.
using Table = std::u16string_view;  // 128 characters

// 6.2.1
inline constexpr Table kDefaultAlphabet =
    u"@£$¥èéùìòÇ\nØø\rÅå"
    u"Δ_ΦΓΛΩΠΨΣΘΞ\033ÆæßÉ"
    u" !\"#¤%&'()*+,-./"
    u"0123456789:;<=>?"
    u"¡ABCDEFGHIJKLMNO"
    u"PQRSTUVWXYZÄÖÑÜ§"
    u"¿abcdefghijklmno"
    u"pqrstuvwxyzäöñüà";

// A.3.1
inline constexpr Table kTurkishAlphabet =
    u"@£$¥€éùıòÇ\nĞğ\rÅå"
    u"Δ_ΦΓΛΩΠΨΣΘΞ\033ŞşßÉ"
    u" !\"#¤%&'()*+,-./"
    u"0123456789:;<=>?"
    u"İABCDEFGHIJKLMNO"
    u"PQRSTUVWXYZÄÖÑÜ§"
    u"çabcdefghijklmno"
    u"pqrstuvwxyzäöñüà";

// A.3.3
inline constexpr Table kPortugueseAlphabet =
    u"@£$¥êéúíóç\nÔô\rÁá"
    u"Δ_ªÇÀ∞^\\€Ó|\033ÂâÊÉ"
    u" !\"#º%&'()*+,-./"
    u"0123456789:;<=>?"
    u"ÍABCDEFGHIJKLMNO"
    u"PQRSTUVWXYZÃÕÚÜ§"
    u"~abcdefghijklmno"
    u"pqrstuvwxyzãõ`üà";

// 6.2.1.1. In this and in the other extensions a blank is no character.
inline constexpr Table kDefaultExtension =
    u"          \f     "
    u"    ^           "
    u"        {}     \\"
    u"            [~] "
    u"|               "
    u"                "
    u"     €          "
    u"                ";

// A.2.1
inline constexpr Table kTurkishExtension =
    u"          \f     "
    u"    ^           "
    u"        {}     \\"
    u"            [~] "
    u"|      Ğ İ      "
    u"   Ş            "
    u"   ç € ğ ı      "
    u"   ş            ";

// A.2.2
inline constexpr Table kSpanishExtension =
    u"         ç\f     "
    u"    ^           "
    u"        {}     \\"
    u"            [~] "
    u"|Á       Í     Ó"
    u"     Ú          "
    u" á   €   í     ó"
    u"     ú          ";

// A.2.3
inline constexpr Table kPortugueseExtension =
    u"     ê   ç\fÔô Áá"
    u"  ΦΓ^ΩΠΨΣΘ     Ê"
    u"        {}     \\"
    u"            [~] "
    u"|À       Í     Ó"
    u"     Ú     ÃÕ   "
    u" Â   €   í     ó"
    u"     ú     ãõ  â";

// By NationalLanguageId. Spanish has no alphabet of its own.
inline constexpr std::array kAlphabets{kDefaultAlphabet, kTurkishAlphabet, kDefaultAlphabet,
                                       kPortugueseAlphabet};
inline constexpr std::array kExtensions{kDefaultExtension, kTurkishExtension, kSpanishExtension,
                                        kPortugueseExtension};

}  // namespace plr::gsm7
