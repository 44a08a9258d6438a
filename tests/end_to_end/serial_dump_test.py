"""The example of the flat interface in C shows what a port says, until it hangs up.

usage: serial_dump_test.py FOLDER-OF-THE-EXAMPLES
"""

import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

EXAMPLES = pathlib.Path(sys.argv.pop(1))
SCRIPT = pathlib.Path(__file__).resolve().parents[2] / "examples" / "data" / "modem_script.txt"


class SerialDump(unittest.TestCase):
    def start(self, program, *arguments):
        process = subprocess.Popen([EXAMPLES / program, *arguments], stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                                   text=True)
        self.addCleanup(process.communicate)
        self.addCleanup(process.kill)
        return process

    def test_shows_what_a_port_says_until_it_hangs_up(self):
        with tempfile.TemporaryDirectory() as folder:
            port = os.path.join(folder, "port")
            modem = self.start("modem", "--script", SCRIPT, "--link", port)
            self.assertIn("the modem is at", modem.stdout.readline())
            dump = self.start("serial_dump", port, "9600")
            modem.stdin.write("RING\n")
            modem.stdin.flush()
            shown = b""
            while len(shown) < 8:
                shown += bytes.fromhex(dump.stdout.readline()[:48])
            self.assertEqual(shown, b"\r\nRING\r\n")
            modem.kill()
            self.assertEqual(dump.wait(30), 0)


if __name__ == "__main__":
    unittest.main()
