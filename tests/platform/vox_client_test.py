"""Holds the Python client's values and frames against docs/wire-protocol.md."""

import pathlib
import sys
import time
import unittest
import uuid

ROOT = pathlib.Path(__file__).resolve().parents[2]
sys.path.insert(0, str(ROOT / "tests" / "support"))

import vox_client  # noqa: E402
import wire_vectors  # noqa: E402
from vox_client import Date, Endpoint, Error, Fd, Uint64  # noqa: E402

PAGE = (ROOT / "docs" / "wire-protocol.md").read_text(encoding="utf-8")


def quoted(text):
    return '"' + text.replace("\x00", "\\x00") + '"'


def date(nanoseconds):
    """Written without the datetime module, which knows no nanoseconds."""
    seconds, part = divmod(nanoseconds, 10**9)
    return time.strftime("%Y-%m-%dT%H:%M:%S", time.gmtime(seconds)) + f".{part:09}Z"


def error(value):
    return f"<error {value.code}{': ' + quoted(value.description) if value.description else ''}>"


# By type, the description that our logs give.
DESCRIBE = {
    type(None): lambda _: "null",
    bool: lambda value: str(value).lower(),
    Uint64: lambda value: f"{int(value)}u",
    int: str,
    float: lambda value: f"{value:.17g}",
    Date: lambda value: date(value.nanoseconds),
    bytes: lambda value: f"<{len(value)} bytes{''.join(f' {b:02x}' for b in value)}>",
    str: quoted,
    uuid.UUID: str,
    Error: error,
    Fd: lambda _: "<fd>",
    Endpoint: lambda _: "<endpoint>",
    list: lambda value: "[" + ", ".join(map(describe, value)) + "]",
    dict: lambda value:
        "{" + ", ".join(f"{quoted(k)}: {describe(v)}" for k, v in value.items()) + "}",
}


def describe(value):
    return DESCRIBE[type(value)](value)


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


if __name__ == "__main__":
    unittest.main()
