"""The radio service as systemd runs it: its socket is there before it, and after it.

usage: activation_test.py FOLDER-OF-THE-EXAMPLES FOLDER-OF-THE-UNITS
"""

import os
import pathlib
import shutil
import signal
import socket
import subprocess
import sys
import tempfile
import time
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parents[1] / "support"))
from vox_client import HEADER, HELLO, LIMITS, MESSAGE, REPLY, REQUEST, decode, frame  # noqa: E402

UNITS = pathlib.Path(sys.argv.pop(2))
RADIOD = os.path.abspath(os.path.join(sys.argv.pop(1), "radiod"))
SERVICE = "net.example.radio"
FIRST_PASSED = 3  # SD_LISTEN_FDS_START
BOUND = 60
LAYERS = [f"PELORIN_PREFERENCES_{layer}" for layer in ("VENDOR", "SYSTEM", "USER")]


def message(operation, value=None):
    return {"o": operation, "a": "python", "r": "/settings/volume", "v": value}


class Activation(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.place = pathlib.Path(folder.name, SERVICE)
        self.fifo = pathlib.Path(folder.name, "modem")
        os.mkfifo(self.fifo)
        self.notifications = self.bound(socket.SOCK_DGRAM, pathlib.Path(folder.name, "notify"))
        os.environ["VOX_RUNTIME_DIR"] = folder.name
        os.environ.update({name: folder.name + "/nothing" for name in LAYERS})
        os.environ["NOTIFY_SOCKET"] = str(pathlib.Path(folder.name, "notify"))

    def bound(self, kind, place):
        made = socket.socket(socket.AF_UNIX, kind)
        self.addCleanup(made.close)
        made.settimeout(BOUND)
        made.bind(str(place))
        return made

    def service(self, *launcher, **options):
        process = subprocess.Popen([*launcher, RADIOD, "--modem", self.fifo],
                                   stderr=subprocess.DEVNULL, **options)
        self.addCleanup(process.wait, BOUND)
        self.addCleanup(process.kill)
        return process

    def client(self, value):
        """One that says all it has to say without waiting for anybody."""
        connected = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
        self.addCleanup(connected.close)
        connected.settimeout(BOUND)
        end = time.monotonic() + BOUND
        while connected.connect_ex(str(self.place)) != 0:  # nobody listens yet
            self.assertLess(time.monotonic(), end)
            time.sleep(0.01)
        frames = ((HELLO, LIMITS), (MESSAGE, message("set", value)), (REQUEST, message("get"), 1))
        connected.sendall(b"".join(frame(*parts) for parts in frames))
        return connected

    def assert_answered(self, connected, value):
        stream = connected.makefile("rb")
        self.addCleanup(stream.close)
        kind = None
        while kind != REPLY:
            _, kind, _, _, length, _, _ = HEADER.unpack(stream.read(HEADER.size))
            body = decode(stream.read(length))
        self.assertEqual(body["v"], value)

    def assert_told(self, state):
        self.assertEqual(self.notifications.recv(100).decode(), state)

    def end(self, process):
        process.send_signal(signal.SIGTERM)
        self.assert_told("STOPPING=1")
        self.assertEqual(process.wait(BOUND), 0)

    @unittest.skipUnless(shutil.which("systemd-socket-activate"), "systemd is not there")
    def test_the_first_client_starts_the_service_and_loses_nothing(self):
        kept = ("VOX_RUNTIME_DIR", "NOTIFY_SOCKET", "ASAN_OPTIONS", "TSAN_OPTIONS", *LAYERS)
        process = self.service("systemd-socket-activate", "--listen", self.place, f"--fdname={SERVICE}.socket",
                               *(f"--setenv={name}={os.environ.get(name, '')}" for name in kept))
        first = self.client(7)
        self.assert_answered(first, 7)
        self.assert_told("READY=1")
        self.assert_answered(self.client(8), 8)
        self.end(process)
        self.assertTrue(self.place.exists())

    def test_clients_wait_in_the_socket_while_the_service_is_away(self):
        holder = self.bound(socket.SOCK_STREAM, self.place)
        holder.listen()
        os.dup2(holder.fileno(), FIRST_PASSED)

        def start():
            process = self.service("sh", "-c", 'LISTEN_PID=$$ exec "$0" "$@"', pass_fds=[FIRST_PASSED],
                                   env=os.environ | {"LISTEN_FDS": "1", "LISTEN_FDNAMES": SERVICE})
            self.assert_told("READY=1")
            return process

        early = self.client(1)
        killed = start()
        self.assert_answered(early, 1)
        killed.kill()
        killed.wait(BOUND)
        meanwhile = self.client(2)
        ended = start()
        self.assert_answered(meanwhile, 2)
        self.end(ended)
        late = self.client(3)
        ended = start()
        self.assert_answered(late, 3)
        self.end(ended)

    @unittest.skipUnless(shutil.which("systemd-analyze"), "systemd is not there")
    def test_the_units_are_what_systemd_expects(self):
        folder = self.place.parent / "units"
        folder.mkdir()
        for unit in UNITS.iterdir():
            (folder / unit.name).write_text(unit.read_text().replace("/usr/bin/radiod", RADIOD))
        for unit in folder.iterdir():
            with self.subTest(unit=unit.name):
                verified = subprocess.run(["systemd-analyze", "verify", "--man=no", unit], check=False,
                                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True)
                self.assertEqual((verified.returncode, verified.stdout), (0, ""))


# Before anything else has this descriptor.
os.dup2(0, FIRST_PASSED)

if __name__ == "__main__":
    unittest.main()
