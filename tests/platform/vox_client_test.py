"""The Python client reads the bytes of docs/wire-protocol.md, and writes them again."""

import pathlib
import sys
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[2]
sys.path.insert(0, str(ROOT / "tests" / "support"))

import vox_client  # noqa: E402
import wire_vectors  # noqa: E402

PAGE = (ROOT / "docs" / "wire-protocol.md").read_text(encoding="utf-8")


class WireProtocolPage(unittest.TestCase):
    def check(self, data, description):
        descriptors = list(range(100, 100 + description.count("<fd>") +
                                 description.count("<endpoint>")))
        value = vox_client.decode(data, descriptors)
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
