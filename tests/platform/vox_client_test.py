"""Holds the Python client's values and frames against docs/wire-protocol.md."""

import math
import pathlib
import sys
import unittest
import uuid

ROOT = pathlib.Path(__file__).resolve().parents[2]
sys.path.insert(0, str(ROOT / "tests" / "support"))

import vox_client  # noqa: E402
import wire_vectors  # noqa: E402
from vox_client import Date, Endpoint, Error, Fd, Uint64  # noqa: E402

PAGE = (ROOT / "docs" / "wire-protocol.md").read_text(encoding="utf-8")


def quoted(text):
    return '"' + "".join(f"\\x{ord(c):02x}" if ord(c) < 32 else c for c in text) + '"'


def date(nanoseconds):
    """Written without the datetime module, which knows no nanoseconds."""
    import time
    seconds, part = divmod(nanoseconds, 10**9)
    return time.strftime("%Y-%m-%dT%H:%M:%S", time.gmtime(seconds)) + f".{part:09}Z"


def describe(value):
    """The description our logs give, from the client's own types."""
    match value:
        case None | bool():
            return {None: "null", True: "true", False: "false"}[value]
        case Uint64():
            return f"{int(value)}u"
        case int():
            return str(value)
        case float():
            return f"{value:.17g}"
        case Date():
            return date(value.nanoseconds)
        case bytes():
            return f"<{len(value)} bytes{''.join(f' {b:02x}' for b in value)}>"
        case str():
            return quoted(value)
        case uuid.UUID():
            return str(value)
        case Error():
            text = "" if value.description is None else ": " + quoted(value.description)
            return f"<error {value.code}{text}>"
        case Fd():
            return "<fd>"
        case Endpoint():
            return "<endpoint>"
        case list():
            return "[" + ", ".join(map(describe, value)) + "]"
        case dict():
            return "{" + ", ".join(f"{quoted(k)}: {describe(v)}" for k, v in value.items()) + "}"
    raise TypeError(value)


class WireProtocolPage(unittest.TestCase):
    def check(self, data, description):
        descriptors = list(range(100, 100 + description.count("<fd>") +
                                 description.count("<endpoint>")))
        value = vox_client.decode(data, descriptors)
        self.assertEqual(describe(value), description)
        self.assertEqual(vox_client.encode(value), (data, descriptors))

    def test_values(self):
        vectors = list(wire_vectors.values(PAGE))
        self.assertGreater(len(vectors), 40)
        for data, description in vectors:
            with self.subTest(description):
                self.check(data, description)

    def test_frames(self):
        frames = list(wire_vectors.frames(PAGE))
        self.assertGreater(len(frames), 7)
        for data, description in frames:
            with self.subTest(description):
                header, body = data[:24], data[24:]
                _, kind, flags, _, length, _, request_id = vox_client.HEADER.unpack(header)
                self.assertEqual(length, len(body))
                self.check(body, description)
                value = vox_client.decode(body, [100])
                again, _ = vox_client.frame(kind, value, request_id, flags)
                self.assertEqual(again.hex(), data.hex())

    def test_what_has_no_encoding(self):
        for value, error in ((1 << 63, ValueError), (Uint64(-1), ValueError),
                             (Uint64(1 << 64), ValueError), (object(), TypeError)):
            with self.subTest(value=value), self.assertRaises(error):
                vox_client.encode([value])

    def test_doubles_keep_their_kind(self):
        for value in (0.0, 1.0, math.inf, -math.inf, 1e308):
            self.assertIsInstance(vox_client.decode(vox_client.encode(value)[0]), float)


if __name__ == "__main__":
    unittest.main()
