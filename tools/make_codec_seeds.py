#!/usr/bin/env python3
"""Writes the seed corpus of fuzz/codec_fuzz.cpp from docs/wire-protocol.md.

One file for every example on the page, accepted or refused, and a few large
ones; the first byte of a file is the number of descriptors that come with the rest.
Run it again after the page changed. Files it does not make (findings that were
mended) stay.
"""

import pathlib
import sys

import wire_vectors

sys.dont_write_bytecode = True

ROOT = pathlib.Path(__file__).resolve().parents[1]


def array(items):
    return bytes([0x98, len(items)]) + b"".join(items)


def seeds(page):
    values = list(wire_vectors.values(page))
    for number, (data, description) in enumerate(values):
        yield f"value_{number:02}", data, description.count("<fd>") + description.count("<endpoint>")
    for number, (data, _) in enumerate(wire_vectors.values(page, "vox-refused")):
        yield f"refused_{number:02}", data, 0
    for number, (data, description) in enumerate(wire_vectors.frames(page)):
        yield f"body_{number:02}", data[24:], description.count("<fd>")
    yield "all_values", array([d for d, text in values if "<fd>" not in text]), 0
    yield "many_keys", b"\xb8\x20" + b"".join(b"\x62%02d\xf6" % i for i in range(32)), 0
    yield "deep", b"\x81" * 63 + b"\x80", 0
    yield "too_deep", b"\x81" * 65 + b"\xf6", 0


def main():
    page = (ROOT / "docs" / "wire-protocol.md").read_text(encoding="utf-8")
    folder = ROOT / "fuzz" / "corpus" / "codec"
    folder.mkdir(parents=True, exist_ok=True)
    for name, data, descriptors in seeds(page):
        (folder / name).write_bytes(bytes([descriptors]) + data)


if __name__ == "__main__":
    main()
