#pragma once

#include <cstddef>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/process.h"

// What is measured of text, written once for every peer; a peer gives the conversions.
// Every result is compared with one made here in the simplest way, and a wrong one ends
// the run without a figure.
//
//   to_septets TEXT SIZE    UTF-8 to GSM 7-bit, packed
//   from_septets TEXT SIZE  and back
//   to_ucs2 TEXT SIZE       UTF-8 to UTF-16 in octets, big endian
//   from_ucs2 TEXT SIZE     and back
//   from_euc_kr TEXT SIZE   EUC-KR to UTF-16 in octets, big endian
//
// TEXT is what the characters are drawn from, at random so that no processor learns them
// by heart: ascii; european, with an accent of the default alphabet in 8; extension, with
// one of its extension table in 8; korean, syllables and blanks; emoji, one in 8.
// SIZE is "message", for 1,024 messages of 160 characters in turn, or "mebibyte", for a
// text that is 1 MiB of UTF-8.
//
// The figure is ns a character, of the median lap; a lap is about a million characters.
namespace bench::text_cases {

// As if somebody else read and changed what `memory` points to.
inline void touch(const void* memory) noexcept {
    asm volatile("" : : "g"(memory) : "memory");
}

inline void expect(bool right) {
    if (!right)
        fail("a wrong result");
}

// The default alphabet of GSM 7-bit by septets, and its extension table.
extern const std::u32string_view kAlphabet;
extern const std::map<char32_t, char> kExtension;
inline constexpr char kEscape = 0x1B;

// The characters of KS X 1001 by their cells: 94 rows of 94; 0 where there is none.
inline constexpr unsigned kRow = 94;
const std::vector<char32_t>& koreanCells();

// What goes into a conversion, what must come out, and of how many characters.
struct Piece {
    std::string in;
    std::string out;
    std::size_t characters = 0;
};

// What a peer's conversions take and deliver.
struct Form {
    bool packed = true;     // septets; false: an octet each
    bool bigEndian = true;  // UTF-16
};

using Convert = std::function<std::string_view(std::string_view)>;
// The conversion for a text of that name. What it returns lives until its next call.
using Maker = std::function<Convert(std::string_view text)>;

// Runs the case that the command line names.
int run(int argc, char** argv, const std::map<std::string_view, Maker>& makers, Form form = {});

}  // namespace bench::text_cases
