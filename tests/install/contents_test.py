"""What stands under the prefix after an installation.

usage: contents_test.py PREFIX LAYERS.TXT
"""

import pathlib
import re
import subprocess
import sys
import unittest

PREFIX, LAYERS = map(pathlib.Path, sys.argv[1:3])
del sys.argv[1:]

LIBRARIES = ("libpelorin-platform", "libpelorin")
# What the libraries may offer: names of C functions and data, of C++ after demangling.
OFFERED = re.compile(
    r"(Pelorin|vox_|VOX_|qf_|kQf|trel_|kel_|ob_|serial_)\w*$|__PLAssertTrigger$|"
    r"((typeinfo|typeinfo name|vtable|VTT|(non-)?virtual thunk) (for|to) |guard variable for )?"
    r"((plr|vox|dispatch|qf)::|PelorinAsync)")
# What they may need from the system.
NEEDED = {"libstdc++.so.6", "libm.so.6", "libgcc_s.so.1", "libc.so.6", "libpelorin-platform.so.0",
          "ld-linux-x86-64.so.2", "ld-linux-aarch64.so.1"}


def output(*command):
    return subprocess.run(command, capture_output=True, text=True, check=True).stdout


def library(name):
    return PREFIX / "lib" / f"{name}.so"


class Contents(unittest.TestCase):
    def test_every_public_header_is_there_and_no_other(self):
        listed = {re.sub(r"^(platform/)?include/", "", file)
                  for file in (line.split()[3] for line in LAYERS.read_text().splitlines())
                  if file.startswith(("include/", "platform/include/"))}
        folder = PREFIX / "include" / "pelorin"
        installed = {str(path.relative_to(folder)) for path in folder.rglob("*") if path.is_file()}
        self.assertEqual(installed, listed)

    def test_only_our_names_are_exported(self):
        for name in LIBRARIES:
            lines = output("nm", "-D", "-C", "--defined-only", library(name)).splitlines()
            symbols = [re.sub(r"@.*$", "", line.split(maxsplit=2)[2]) for line in lines
                       if line.split()[1] != "A"]
            with self.subTest(name):
                self.assertTrue(symbols)
                self.assertEqual([s for s in symbols if not OFFERED.match(s)], [])

    def test_dynamic_sections_are_in_order(self):
        for name in LIBRARIES:
            dynamic = output("readelf", "-dW", library(name))
            with self.subTest(name):
                self.assertIn(f"Library soname: [{name}.so.0]", dynamic)
                self.assertLessEqual(set(re.findall(r"NEEDED.*\[(.*)\]", dynamic)), NEEDED)
                self.assertRegex(dynamic, r"FLAGS_1.*NOW")  # with RELRO below: full RELRO
                for unwanted in ("TEXTREL", "RPATH", "RUNPATH"):
                    self.assertNotIn(unwanted, dynamic)

    def test_segments_are_hardened(self):
        for name in LIBRARIES:
            segments = output("readelf", "-lW", library(name))
            undefined = output("nm", "-D", "--undefined-only", library(name))
            with self.subTest(name):
                self.assertIn("GNU_RELRO", segments)
                self.assertRegex(segments, r"GNU_STACK.* RW ")
                self.assertNotIn("RWE", segments)
                self.assertIn("__stack_chk_fail", undefined)


if __name__ == "__main__":
    unittest.main()
