#!/usr/bin/env python3
"""Prints src/text/combining_marks.h: the characters of general category M, by the Unicode
data of this Python. Ranges go over code points that are not assigned."""
import sys
import unicodedata

ranges, start, end = [], None, None
for code in range(sys.maxunicode + 2):
    category = unicodedata.category(chr(code)) if code <= sys.maxunicode else "end"
    if category[0] == "M":
        start, end = (code if start is None else start), code
    elif category != "Cn" and start is not None:
        ranges.append((start, end))
        start = None

print(f"""#pragma once

#include <array>

// Characters of general category M in Unicode {unicodedata.unidata_version}, first and last of each range.
// Made by tools/make_combining_table.py.
namespace plr {{

struct CharacterRange {{
    char32_t first;
    char32_t last;
}};

// clang-format off
inline constexpr std::array<CharacterRange, {len(ranges)}> kCombiningMarks = {{{{""")
for i in range(0, len(ranges), 5):
    print("    " + " ".join(f"{{0x{a:X}, 0x{b:X}}}," for a, b in ranges[i : i + 5]))
print("""}};
// clang-format on

}  // namespace plr""")
