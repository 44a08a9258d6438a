#!/usr/bin/env python3
"""Writes src/text/euc_kr_table.h, the characters of KS X 1001 in the order of EUC-KR.

They come from Python's own codec, and two that it lacks.

usage: make_euc_kr_table.py             writes the file
       make_euc_kr_table.py --check     exit status 1 if it is not what would be written
"""

import pathlib
import sys

TABLE = pathlib.Path(__file__).resolve().parents[1] / "src" / "text" / "euc_kr_table.h"
OCTETS = range(0xA1, 0xFF)
HOLE = "\N{REPLACEMENT CHARACTER}"
BEYOND_THE_CODEC = {
    b"\xA2\xE8": "\u327E",  # the postal code sign, of the edition of 2002
    b"\xA4\xD4": "\u3164",  # the Hangul filler: the codec takes it for the start of a composition
}
INVISIBLE = "\u00AD\u3000\u3164"

HEADER = """\
#pragma once

// Made by tools/make_euc_kr_table.py; change that, not this.

namespace plr {

// KS X 1001, a row of 94 characters for each lead octet from 0xA1 to 0xFE, by
// trail octet from 0xA1 to 0xFE. U+FFFD stands where there is no character.
// clang-format off
inline constexpr char16_t kEucKrTable[] =
"""

FOOTER = """\
// clang-format on

}  // namespace plr
"""


def character(lead, trail):
    octets = bytes([lead, trail])
    return BEYOND_THE_CODEC.get(octets) or octets.decode("euc_kr", errors="ignore") or HOLE


def literal(character):
    return f"\\u{ord(character):04X}" if character in INVISIBLE else character


def rows():
    for lead in OCTETS:
        characters = [character(lead, trail) for trail in OCTETS]
        assert all(len(each) == 1 and each <= "\uFFFF" for each in characters)
        end = ";" if lead == OCTETS[-1] else ""
        yield f'    u"{"".join(map(literal, characters))}"{end}  // 0x{lead:02X}\n'


def main():
    text = HEADER + "".join(rows()) + FOOTER
    if sys.argv[1:] == ["--check"]:
        return TABLE.read_text(encoding="utf-8") != text
    TABLE.write_text(text, encoding="utf-8")
    return 0


if __name__ == "__main__":
    sys.exit(main())
