"""A client in another language talks to the radio service.

usage: radiod_test.py FOLDER-OF-THE-EXAMPLES
"""

import fcntl
import os
import pathlib
import struct
import subprocess
import sys
import tempfile
import time
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parents[1] / "support"))
import vox_client  # noqa: E402

EXAMPLES = pathlib.Path(sys.argv.pop(1))
SCRIPTS = pathlib.Path(__file__).resolve().parents[2] / "examples" / "data"
SERVICE = "net.example.radio"
TCGETS2 = 0x802C542A


def message(operation, path, value=None, author="python"):
    return {"o": operation, "a": author, "r": path, "v": value}


class Radiod(unittest.TestCase):
    """What the tests below stand on."""

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.fifo = os.path.join(folder.name, "modem")
        self.terminal = os.path.join(folder.name, "terminal")
        os.mkfifo(self.fifo)
        self.log = pathlib.Path(folder.name, "log")
        os.environ["VOX_RUNTIME_DIR"] = os.path.join(folder.name, "run")
        self.folder = folder.name
        for layer in ("VENDOR", "SYSTEM", "USER"):
            os.environ["PELORIN_PREFERENCES_" + layer] = os.path.join(self.folder, layer)
        os.mkdir(os.path.join(self.folder, "SYSTEM"))

    def settings(self, **settings):
        """What an administrator writes, all at once."""
        lines = "".join(f"{key} = {value!r}\n" for key, value in settings.items())
        new = pathlib.Path(self.folder, "new")
        new.write_text(lines)
        new.rename(new.with_name("SYSTEM") / "radiod.toml")

    def serve(self, *options, service=SERVICE):
        self.radiod = self.start("radiod", *options, "--log", self.log)
        self.client = vox_client.Connection.open(service)
        self.addCleanup(self.client.close)

    def start(self, program, *arguments):
        process = subprocess.Popen([EXAMPLES / program, *arguments], stdout=subprocess.DEVNULL)
        self.addCleanup(self.end, process)
        return process

    def start_modem(self, script):
        return self.start("modem", "--script", SCRIPTS / script, "--link", self.terminal, "--lines", self.fifo)

    def end(self, process):
        if process.poll() is None:
            process.terminate()
            self.assertEqual(process.wait(30), 0)

    def modem_says(self, *lines):
        with open(self.fifo, "w", encoding="ascii") as modem:
            modem.write("".join(line + "\r\n" for line in lines))

    def ask(self, name, value=None):
        """The answer of who provides that request, who may still be on the way."""
        reply, end = {"e": "no provider"}, time.monotonic() + 30
        while reply.get("e") == "no provider" and time.monotonic() < end:
            reply = self.client.request(message("get", "/requests/" + name, value))
        return reply["v"]

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

    def notified_until(self, path, value):
        while self.notified() != (path, value):
            pass


class Recorded(Radiod):
    """The modem is a FIFO, which is only read."""

    def setUp(self):
        super().setUp()
        self.settings(modem="/nowhere")  # options win
        self.serve("--modem", self.fifo)

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

    def test_sees_what_the_modem_reports_and_no_other_events(self):
        self.watch("/radio/signal", "/events/ring")
        self.assertEqual(self.notified(), ("/radio/signal", None))
        self.modem_says("+CSQ: 20,99", "+CSQ: 9", "+CMTI: \"SM\",3")
        self.modem_says("RING", "+CSQ: 99,99")  # another writer of the FIFO
        self.assertEqual([self.notified() for _ in range(3)],
                         [("/radio/signal", -73), ("/events/ring", "unspecified"), ("/radio/signal", None)])
        tree = self.get("*")
        self.assertIn("python", tree["connections"])
        self.assertEqual({name: tree[name] for name in ("events", "log", "messages", "radio", "settings")}, {
            "events": {"ring": None, "sms": None}, "log": {}, "messages": {"SM-3": {"memory": "SM", "index": 3}},
            "radio": {"signal": None}, "settings": {}})
        self.client.send(message("set", "/messages/SM-3", None))
        self.assertEqual(self.get("/messages"), {})

    def test_the_radio_is_on_while_somebody_needs_it(self):
        path = "/assertions/keep_radio_on"
        self.watch("/radio/power")
        self.assertEqual(self.notified(), ("/radio/power", None))
        for generation in (1, 2):
            self.client.send(message("push", path))
            self.assertEqual(self.notified(), ("/radio/power", True))
            self.assertEqual(self.notified(), (path, {"generation": generation, "state": "2:kGranted"}))
            self.client.send(message("set", path + "/revoked", generation))  # for the provider alone
            self.client.send(message("pop", path))
            self.assertEqual(self.notified(), ("/radio/power", False))

    def test_requests_that_nobody_can_carry_out_are_answered(self):
        self.assertEqual(self.ask("reset_modem"), "not reset")
        self.assertEqual(self.ask("enter_pin", "1234"), "no answer")
        refused = self.client.request(message("get", "/requests/fly"))
        self.assertEqual((refused.get("v"), refused["e"]), (None, "no provider"))

    def test_levels_are_set_told_and_taken_back(self):
        self.watch("/radio/signal")
        self.assertEqual(self.notified(), ("/radio/signal", None))
        levels = [(None, {}), ("Debug", {"radio.modem": 20}), ("Loud", {"radio.modem": 20}), (None, {})]
        for number, (level, configured) in enumerate(levels):
            self.client.send(message("set", "/log/radio.modem", level))
            self.assertEqual(self.get("/log"), {"kDomainLogLevels": configured, "kLoggers": [], "kLogWriters": [
                {"kLogWriterType": "file", "kLogWriterPath": str(self.log)}]})
            self.modem_says(f"+CSQ: {number},0")
            self.assertEqual(self.notified(), ("/radio/signal", 2 * number - 113))
        self.end(self.radiod)
        records = [line.split(" ", 2)[2] for line in self.log.read_text().splitlines()]
        self.assertEqual([record for record in records if record.startswith(("D", "W"))], [
            "D radio.modem: line 2: +CSQ: 1,0", 'W radio.rest: no level for radio.modem: "Loud"',
            "D radio.modem: line 3: +CSQ: 2,0"])
        self.assertEqual(records[-1], "N radio: ending", "nothing is lost at the end")

    def test_a_second_service_of_the_name_gives_up(self):
        second = subprocess.run([EXAMPLES / "radiod", "--modem", self.fifo], timeout=30, check=False,
                                stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        self.assertEqual(second.returncode, 1)
        self.assertEqual(self.get("/radio"), [], "the first one goes on")


class Terminal(Radiod):
    """The modem is a process behind a terminal, which comes and goes."""

    def setUp(self):
        super().setUp()
        self.serve("--modem", self.terminal)  # before it is there

    def test_asks_a_modem_as_often_as_it_comes(self):
        self.watch("/radio/signal", "/radio/sim", "/radio/operator")
        for _ in range(2):
            modem = self.start_modem("modem_script.txt")
            self.notified_until("/radio/signal", -59)
            modem.kill()
            modem.wait(30)
            os.remove(self.terminal)
            self.assertEqual({self.notified() for _ in range(3)}, {
                ("/radio/signal", None), ("/radio/sim", None), ("/radio/operator", None)})

    def test_receives_and_sends_messages_which_no_log_tells(self):
        self.watch("/radio/sms/1")
        self.assertEqual(self.notified(), ("/radio/sms/1", None))
        self.start_modem("modem_script.txt")
        self.assertEqual(self.notified(), ("/radio/sms/1", {
            "from": "+919812345678", "time": "2026-11-21T18:00:00+05:30", "encoding": "kUCS2", "parts": 1,
            "text": "नमस्ते"}))
        pdu = "0001000581214305000178"
        answers = [(None, "no PDU"), (["zz"], "no PDU"), ([pdu, "05"], "no PDU"), ([pdu, pdu], "OK")]
        for pdus, answer in answers:
            self.assertEqual(self.ask("send_sms", pdus), answer)
        self.end(self.radiod)
        self.assertIn("/radio/sms/1 = a message", self.log.read_text())
        self.assertNotIn("नमस्ते", self.log.read_text())

    def test_carries_out_what_clients_ask_and_keeps_the_pin_out_of_the_log(self):
        self.client.send(message("set", "/log/radio.modem", "Trace"))
        self.watch("/radio/sim", "/radio/signal")
        self.start_modem("locked_modem_script.txt")
        self.notified_until("/radio/sim", "SIM PIN")
        answers = {"12": "no PIN", '1234"\rATH\r': "no PIN", "9876": "+CME ERROR: 16", "1234": "OK"}
        for pin, answer in answers.items():
            with self.subTest(pin=pin):
                self.assertEqual(self.ask("enter_pin", pin), answer)
        self.notified_until("/radio/sim", "READY")
        self.assertEqual(self.ask("refresh"), "OK")
        self.assertEqual([self.ask("reset_modem"), self.ask("reset_modem")], [1, 2])
        self.modem_says("+CSQ: 1,0")
        self.notified_until("/radio/signal", -111)
        self.end(self.radiod)
        log = self.log.read_text()
        self.assertIn('AT+CPIN="****"', log)
        for secret in ('"1234', "31 32 33 34", '"9876', "39 38 37 36"):
            self.assertNotIn(secret, log)


class Settings(Radiod):
    """Radiod without options for its modem."""

    def test_it_follows_what_an_administrator_edits(self):
        name = "org.example.radio"
        self.start_modem("modem_script.txt")
        self.settings(service=name, modem="/nowhere")
        self.serve(service=name)
        self.watch("/radio/signal")
        self.assertEqual(self.notified(), ("/radio/signal", None))
        for setting, speed in ((9600, 9600), ("12345", 12345), ("fast", 115200)):
            with self.subTest(setting=setting):
                self.settings(service=name, modem=self.terminal, baud=setting)
                self.notified_until("/radio/signal", -59)
                with open(self.terminal, "rb") as terminal:
                    attributes = fcntl.ioctl(terminal, TCGETS2, bytes(44))
                self.assertEqual(struct.unpack_from("=I", attributes, 40), (speed,))
        self.settings(service="com.example.radio", modem="/nowhere")
        self.notified_until("/radio/signal", None)
        self.end(self.radiod)
        self.assertIn("com.example.radio will be served from the next start on", self.log.read_text())


if __name__ == "__main__":
    unittest.main()
