"""A client in another language talks to the radio service.

usage: radiod_test.py FOLDER-OF-THE-EXAMPLES
"""

import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parents[1] / "support"))
import vox_client  # noqa: E402

EXAMPLES = pathlib.Path(sys.argv.pop(1))
SERVICE = "net.example.radio"


def message(operation, path, value=None, author="python"):
    return {"o": operation, "a": author, "r": path, "v": value}


class Radiod(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.fifo = os.path.join(folder.name, "modem")
        os.mkfifo(self.fifo)
        os.environ["VOX_RUNTIME_DIR"] = os.path.join(folder.name, "run")
        self.radiod = self.start("radiod", "--modem", self.fifo)
        self.client = vox_client.Connection.open(SERVICE)
        self.addCleanup(self.client.close)

    def start(self, program, *arguments):
        process = subprocess.Popen([EXAMPLES / program, *arguments], stdout=subprocess.DEVNULL)
        self.addCleanup(self.end, process)
        return process

    def end(self, process):
        process.terminate()
        self.assertEqual(process.wait(30), 0)

    def modem_says(self, *lines):
        with open(self.fifo, "w", encoding="ascii") as modem:
            modem.write("".join(line + "\r\n" for line in lines))

    def get(self, path):
        return self.client.request(message("get", path))["v"]

    def watch(self, *paths):
        for path in ("/connections", *paths):
            self.client.send(message("push", path))

    def notified(self):
        """The next notification: its path and value."""
        received, request_id = self.client.receive()
        self.assertIsNone(request_id)
        self.assertEqual((received["o"], received["a"]), ("notify", "python"))
        return received["r"], received["v"]

    def test_sets_gets_and_watches_a_property(self):
        self.watch("/settings/volume")
        self.assertEqual(self.notified(), ("/settings/volume", None))
        values = [7, -7, vox_client.Uint64(2**64 - 1), 0.5, True, "loud", b"\x00\xff", None,
                  ["a", {"b": [1]}], vox_client.Date(1_700_000_000_000_000_000)]
        for value in values:
            with self.subTest(value=value):
                self.client.send(message("set", "/settings/volume", value))
                seen = self.notified()
                self.assertEqual(seen, ("/settings/volume", value))
                self.assertIs(type(seen[1]), type(value))
                self.assertEqual(self.get("/settings/volume"), value)

    def test_a_reply_repeats_operation_and_path(self):
        reply = self.client.request(message("get", "/radio"))
        self.assertEqual(reply, {"o": "get", "r": "/radio", "v": []})

    def test_sees_what_the_modem_reports_and_no_other_events(self):
        self.watch("/radio/signal", "/events/ring")
        self.assertEqual(self.notified(), ("/radio/signal", None))
        self.modem_says("+CSQ: 20,99", "+CSQ: 9", "+CMTI: \"SM\",3", "RING", "+CSQ: 99,99")
        self.assertEqual([self.notified() for _ in range(3)],
                         [("/radio/signal", -73), ("/events/ring", "unspecified"), ("/radio/signal", None)])
        self.assertIsNone(self.get("/events/ring"), "events are not kept")

    def test_unwatched_properties_fall_silent(self):
        self.watch("/settings/a", "/settings/b")
        self.assertEqual([self.notified()[0] for _ in range(2)], ["/settings/a", "/settings/b"])
        self.client.send(message("pop", "/settings/a"))
        self.client.send(message("set", "/settings/a", 1))
        self.client.send(message("set", "/settings/b", 2))
        self.assertEqual(self.notified(), ("/settings/b", 2))

    def test_the_tree_tells_everything(self):
        self.watch("/radio/operator")
        self.assertEqual(self.notified(), ("/radio/operator", None))
        self.modem_says("+CSQ: 0,0", '+COPS: 0,0,"Example"')
        self.assertEqual(self.notified(), ("/radio/operator", "Example"))
        self.client.send(message("set", "/settings/x", {"y": [10, 20]}))
        self.assertEqual(self.get("*"), {
            "connections": ["python"], "events": {}, "settings": {"x": {"y": [10, 20]}},
            "radio": {"operator": "Example", "signal": -113}})
        self.assertEqual(self.get("/settings/x@y.1"), 20)
        self.assertEqual(self.get("/radio/operator/_/watchers"), ["python"])

    def test_odd_messages_end_nothing(self):
        for odd in [{}, {"o": 1, "r": 2}, message("get", 7), message("ping", "/radio/signal"),
                    message("set", "*", 1), message("set", "/radio/x@y", 1), message("get", "/nowhere/x"),
                    message("push", "/" * 10000), message("get", "/radio/x@" + "1." * 10000),
                    {"o": "get", "a": ["?"], "r": "/radio", "v": {}}]:
            self.client.send(odd)
        self.assertEqual(self.get("/settings"), [])

    def test_a_second_service_of_the_name_gives_up(self):
        second = subprocess.run([EXAMPLES / "radiod", "--modem", self.fifo], timeout=30, check=False,
                                stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        self.assertEqual(second.returncode, 1)
        self.assertEqual(self.get("/radio"), [], "the first one goes on")


if __name__ == "__main__":
    unittest.main()
