"""The checkers refuse what they are for: each row is a project with one fault."""

import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

TOOLS = pathlib.Path(__file__).resolve().parents[2] / "tools"

TABLE = """\
0 base platform include/plr/base.h
1 queues platform platform/include/queues.h
1 messages platform platform/linux/messages.h
1 bytes pelorin include/plr/bytes.h
2 tree pelorin include/plr/tree.h
2 tree pelorin src/tree.cpp
1 front pelorin include/plr/log/fmt.h
"""


def run(tool, *arguments):
    return subprocess.run([sys.executable, TOOLS / tool, *arguments], capture_output=True,
                          text=True, check=False)


class Project:
    """A scratch project: files by name, empty unless `contents` says otherwise."""

    def __init__(self, contents, table=TABLE):
        self._folder = tempfile.TemporaryDirectory()
        self.root = pathlib.Path(self._folder.name)
        for file in [line.split()[3] for line in table.splitlines()]:
            self.write(file, "#pragma once\n")
        for file, text in contents.items():
            self.write(file, text)
        self.write("layers.txt", table)

    def write(self, file, text):
        path = self.root / file
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text(text)

    def __enter__(self):
        return self

    def __exit__(self, *error):
        self._folder.cleanup()


class CheckLayers(unittest.TestCase):
    def check(self, contents):
        with Project(contents) as project:
            return run("check_layers.py", project.root, project.root / "layers.txt")

    def test_accepts_lower_levels_own_component_and_services_of_the_platform(self):
        result = self.check({
            "src/tree.cpp": '#include "plr/tree.h"\n#include "plr/bytes.h"\n#include <boost/x.hpp>\n',
            "include/plr/tree.h": '#include "plr/base.h"\n#include <vector>\n#include <sys/types.h>\n',
            "platform/linux/messages.h": '#include "queues.h"\n',
            "include/plr/log/fmt.h": "#include <fmt/format.h>\n",
        })
        self.assertEqual((result.returncode, result.stdout.strip()), (0, ""))

    def test_refuses_each_kind_of_fault(self):
        faults = {
            "a higher level": ("include/plr/bytes.h", '#include "plr/tree.h"\n', "may not use tree"),
            "the same level of another library":
                ("include/plr/bytes.h", '#include "queues.h"\n', "may not use queues"),
            "a private header in an installed one":
                ("include/plr/tree.h", '#include "platform/linux/messages.h"\n', "not installed"),
            "another library in an installed header":
                ("include/plr/tree.h", "# include <boost/container/flat_map.hpp>\n", "another library"),
            "a front for users of another library":
                ("include/plr/tree.h", '#include "plr/log/fmt.h"\n', "users of another library"),
            "a second library in a front":
                ("include/plr/log/fmt.h", "#include <boost/format.hpp>\n", "another library"),
            "a file that is nowhere": ("src/tree.cpp", '#include "plr/trea.h"\n', "is no file"),
            "a header nobody lists": ("src/forgotten.h", "", "in no component"),
        }
        for fault, (file, text, complaint) in faults.items():
            with self.subTest(fault):
                result = self.check({file: text})
                self.assertEqual(result.returncode, 1)
                self.assertIn(complaint, result.stdout)
                self.assertIn(file, result.stdout)


class CheckHeaders(unittest.TestCase):
    def check(self, header, language, compiler):
        with Project({"include/plr/base.h": header}) as project:
            kind = "--c-header" if language == "c" else "--"
            option = "--cc" if language == "c" else "--cxx"
            return run("check_headers.py", project.root, option, compiler, kind,
                       "include/plr/base.h").returncode

    def test_compiles_each_header_by_itself(self):
        cxx, cc = os.environ.get("CXX", "g++"), os.environ.get("CC", "gcc")
        rows = {
            "a whole header": ("c++", "#pragma once\n#include <string>\nstd::string name();\n", 0),
            "a missing include": ("c++", "#pragma once\nstd::string name();\n", 1),
            "a warning": ("c++", "#pragma once\ninline int f(long n) { return n; }\n", 1),
            "C in C": ("c", "#pragma once\ntypedef struct box* box_t;\n", 0),
            "C++ in C": ("c", "#pragma once\nnamespace plr {}\n", 1),
        }
        for name, (language, header, status) in rows.items():
            with self.subTest(name):
                self.assertEqual(self.check(header, language, cc if language == "c" else cxx), status)


if __name__ == "__main__":
    unittest.main()
