#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "plr/base/export.h"
#include "plr/text/text_converter.h"

// How a text goes into short messages: its encoding, how many it takes, and where it is cut.
//
//   const auto encoding = plr::chooseSmsEncoding(text, {kTurkish});
//   const auto size = plr::measureSms(text, encoding);
//   show(size.unitsLeft, size.parts);  // as one types
//
// Texts are UTF-8. What is ill-formed counts as U+FFFD, see TextConverter::Conversion.
//
// Threads: any; values.
// Failure: none but for want of memory.
namespace plr {

// Plain data. 7-bit with no tables is the default alphabet with its extension. Headers name the
// tables (3GPP TS 23.040, 9.2.3.24.15 and .16), three octets each.
struct SmsEncoding {
    TextConverter::MessageEncoding encoding = TextConverter::MessageEncoding::kGSM7;  // or kUCS2
    TextConverter::NationalLanguageId locking = TextConverter::NationalLanguageId::kNone;
    TextConverter::NationalLanguageId single = TextConverter::NationalLanguageId::kNone;

    bool operator==(const SmsEncoding&) const = default;
    // For ucs2ToGsm7() and the like.
    [[nodiscard]] PLR_EXPORT TextConverter::Ucs2ToGsm7Tables tables() const noexcept;
};

// What ties the parts of a text together: their headers hold a number of the message
// (3GPP TS 23.040, 9.2.3.24.1 and .8); kNone: nothing, they are messages of their own.
// A text that is not cut has no such header.
enum class SmsReference { kNone, k8Bit, k16Bit };

// The encoding that takes the fewest parts: 7-bit if it has every character of the text, else
// UCS-2. Of equal ones the default tables; then a single shift table, a locking one, both;
// then what takes the fewest septets; then by the order of `languages`, which are those
// that the receiver knows, or by law must.
[[nodiscard]] PLR_EXPORT SmsEncoding chooseSmsEncoding(
    std::string_view text, const std::vector<TextConverter::NationalLanguageId>& languages = {},
    SmsReference reference = SmsReference::k8Bit);

// Units: septets, of which an escaped character takes two; UTF-16 code units in UCS-2.
struct SmsSize {
    std::size_t parts = 1;       // also of no text; any number, though messages have 255 at most
    std::size_t units = 0;       // of the text, without headers
    std::size_t unitsAPart = 0;  // that there is room for behind the header
    std::size_t unitsLeft = 0;   // in the last part
};

// With 7-bit, a character that the tables have not counts as the '?' that it becomes.
[[nodiscard]] PLR_EXPORT SmsSize measureSms(std::string_view text, const SmsEncoding& encoding,
                                            SmsReference reference = SmsReference::k8Bit);

// The text of each part; together they are the text. No cut is inside of a character,
// nor of what one sees as one, as far as these rules of grapheme clusters go (Unicode,
// UAX #29): CR LF; marks, joiners, selectors and modifiers behind what they change (GB9,
// GB9a; all of category M), also what a ZWJ joins (GB11, without a look at its kind); vowels
// and finals of Korean syllables (GB7, GB8); pairs of regional indicators (GB12, GB13).
// A sequence that no part has room for is cut between its characters.
[[nodiscard]] PLR_EXPORT std::vector<std::string> splitSms(
    std::string_view text, const SmsEncoding& encoding,
    SmsReference reference = SmsReference::k8Bit);

}  // namespace plr
