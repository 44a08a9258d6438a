#!/usr/bin/env python3
"""Kel and KelLogWriter with the system's own journal daemon.

usage: kel_journald_test.py KEL_WRITER

Runs itself again in a private mount namespace, with an empty /run: nobody else
sees the daemon, its sockets or its files. It holds the daemon's sockets as an
init system does, so that the daemon can be frozen, killed and restarted.
Status 77 with the reason where the machine does not allow that.
"""

import os
import pathlib
import re
import signal
import socket
import subprocess
import sys
import tempfile
import time
import unittest

WRITER = sys.argv[1]
DAEMON = "/lib/systemd/systemd-journald"
SOCKETS = pathlib.Path("/run/systemd/journal")
FROZEN = 10  # seconds
SETTINGS = """[Journal]
Storage=volatile
ForwardToSyslog=no
ReadKMsg=no
Audit=no
RateLimitIntervalSec=0
"""


def skip(reason):
    print(f"Skipped: {reason}")
    sys.exit(77)


def enter_namespace():
    for needed in (DAEMON, "/usr/bin/journalctl", "/etc/machine-id"):
        if not os.path.exists(needed):
            skip(f"{needed} is missing")
    if not re.fullmatch(r"[0-9a-f]{32}\n?", pathlib.Path("/etc/machine-id").read_text()):
        skip("/etc/machine-id is not valid")
    unshare = ["unshare", "-m" if os.geteuid() == 0 else "-Urm", "--propagation", "private", "sh", "-c",
               'mount -t tmpfs -o mode=0755 tmpfs /run && exec "$@"', "sh"]
    trial = subprocess.run([*unshare, "true"], capture_output=True, text=True, check=False)
    if trial.returncode != 0:
        skip(f"no private mount namespace: {trial.stderr.strip()}")
    os.execvp("unshare", [*unshare, sys.executable, "-B", __file__, WRITER, "--inside"])


class Daemon:
    """The journal daemon and the sockets that it is given."""

    def __init__(self):
        SOCKETS.mkdir(parents=True)
        pathlib.Path("/run/log/journal").mkdir(parents=True)
        settings = pathlib.Path("/run/systemd/journald.conf.d/test.conf")
        settings.parent.mkdir()
        settings.write_text(SETTINGS)
        self.sockets = [self.listen("stdout", socket.SOCK_STREAM), self.listen("socket", socket.SOCK_DGRAM),
                        self.listen("dev-log", socket.SOCK_DGRAM)]
        self.start()

    @staticmethod
    def listen(name, kind):
        made = socket.socket(socket.AF_UNIX, kind)
        made.bind(str(SOCKETS / name))
        made.setsockopt(socket.SOL_SOCKET, socket.SO_PASSCRED, 1)
        if kind == socket.SOCK_STREAM:
            made.listen(128)
        return made

    def start(self):
        self.pid = os.fork()
        if self.pid != 0:
            return
        try:
            high = [os.dup2(each.fileno(), 100 + i) for i, each in enumerate(self.sockets)]
            for i, each in enumerate(high):
                os.dup2(each, 3 + i)
            os.environ.update(LISTEN_PID=str(os.getpid()), LISTEN_FDS="3")
            os.execv(DAEMON, [DAEMON])
        finally:
            os._exit(127)

    def kill(self, how):
        os.kill(self.pid, how)
        if how in (signal.SIGKILL, signal.SIGTERM):
            os.waitpid(self.pid, 0)


def entries(identifier):
    """What the journal has of one identifier: a list of dictionaries, bytes to bytes."""
    subprocess.run(["journalctl", "--sync"], check=True)
    text = subprocess.run(["journalctl", "--no-pager", "--all", "-o", "export", f"SYSLOG_IDENTIFIER={identifier}"],
                          capture_output=True, check=True).stdout
    found, at = [{}], 0
    while at < len(text):
        end = text.index(b"\n", at)
        line = text[at:end]
        at = end + 1
        if not line:
            found.append({})
        elif b"=" in line:
            name, value = line.split(b"=", 1)
            found[-1][name] = value
        else:
            length = int.from_bytes(text[at:at + 8], "little")
            found[-1][line] = text[at + 8:at + 8 + length]
            at += 8 + length + 1
    return [each for each in found if each]


def start_writer(identifier, count, pause, backlog):
    return subprocess.Popen([WRITER, "count", identifier, str(count), str(pause), str(backlog)],
                            stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)


class Journald(unittest.TestCase):
    def wait_for(self, writer, word):
        self.assertEqual(writer.stdout.readline().strip(), word)

    def finish(self, writer):
        """The numbers of messages sent and dropped."""
        writer.stdin.close()
        sent, dropped = map(int, writer.stdout.readline().split())
        self.assertEqual(writer.wait(), 0)
        writer.stdout.close()
        return sent, dropped

    def check_sequence(self, identifier, count):
        """Every message or, in its place, the report that it was dropped. Returns the number dropped."""
        expected = dropped = 0
        for each in entries(identifier):
            if b"KEL_DROPPED" in each:
                gap = int(each[b"KEL_DROPPED"])
                self.assertEqual(each[b"MESSAGE"], b"%d messages dropped" % gap)
                dropped += gap
                expected += gap
            else:
                self.assertEqual(each[b"MESSAGE"], b"seq %d" % expected)
                expected += 1
        self.assertEqual(expected, count)
        return dropped

    def test_fields_are_read_back_byte_by_byte(self):
        texts = [b"plain", b"", b"two\nlines\n", b"\x1b[31mred\x1b[0m", b"a\0b", b"\xff\xfe no UTF-8 \xc3", b"A=b",
                 "Gr\u00fc\u00dfe".encode(), b"x" * (1 << 20) + b"\nend"]
        with tempfile.TemporaryDirectory() as folder:
            files = [pathlib.Path(folder) / str(i) for i in range(len(texts))]
            for file, text in zip(files, texts):
                file.write_bytes(text)
            subprocess.run([WRITER, "text", "fields", *files], check=True)
        found = entries("fields")
        self.assertEqual([each.get(b"MESSAGE") for each in found], texts)
        for each in found:
            self.assertEqual({name: each.get(name) for name in (
                b"PRIORITY", b"FACILITY", b"ZTSTARTTIME", b"ANY_BYTES", b"_TRANSPORT")}, {
                    b"PRIORITY": b"4", b"FACILITY": b"radio.sms", b"ZTSTARTTIME": b"     1.500000",
                    b"ANY_BYTES": b"a\n\0\xff", b"_TRANSPORT": b"journal"})

    def test_a_frozen_daemon_makes_nobody_wait_and_every_loss_is_reported(self):
        count = 50_000
        daemon.kill(signal.SIGSTOP)
        thaw = time.monotonic() + FROZEN
        try:
            writer = start_writer("frozen", count, 0, 20_000)
            self.wait_for(writer, "halfway")
            self.wait_for(writer, "written")  # while the daemon is frozen
            time.sleep(max(0.0, thaw - time.monotonic()))
        finally:
            daemon.kill(signal.SIGCONT)
        sent, dropped = self.finish(writer)
        self.assertGreater(dropped, 0)
        self.assertEqual(sent + dropped, count)
        self.assertEqual(self.check_sequence("frozen", count), dropped)

    def test_a_killed_daemon_loses_nothing_when_it_comes_back(self):
        count = 20_000
        writer = start_writer("killed", count, 50, 1_000_000)
        self.wait_for(writer, "halfway")
        daemon.kill(signal.SIGKILL)
        self.wait_for(writer, "written")  # without a daemon
        daemon.start()
        self.assertEqual(self.finish(writer), (count, 0))
        self.assertEqual(self.check_sequence("killed", count), 0)


if __name__ == "__main__":
    if "--inside" not in sys.argv:
        enter_namespace()
    daemon = Daemon()
    try:
        result = unittest.main(argv=sys.argv[:1], verbosity=2, exit=False).result
    finally:
        daemon.kill(signal.SIGTERM)
    sys.exit(0 if result.wasSuccessful() else 1)
