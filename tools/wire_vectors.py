"""The examples of docs/wire-protocol.md."""

import re

_HEX = re.compile(r"^((?:[0-9a-f]{2} {1,2})*[0-9a-f]{2})(?:  .*)?$")


def _blocks(text, kind):
    for block in re.findall(rf"^```{kind}\n(.*?)^```$", text, re.M | re.S):
        yield block.splitlines()


def _bytes(line):
    return bytes.fromhex(_HEX.match(line).group(1))


def values(text, kind="vox-values"):
    """Pairs of bytes and description; `kind` may be vox-refused as well."""
    for lines in _blocks(text, kind):
        for line in lines:
            code, description = re.match(r"^([0-9a-f ]+?)  +(.*)$", line).groups()
            yield bytes.fromhex(code), description


def frames(text):
    """Pairs of a frame's bytes and the description of its body."""
    for lines in _blocks(text, "vox-frame"):
        yield b"".join(_bytes(line) for line in lines[:-1]), lines[-1].removeprefix("= ")
