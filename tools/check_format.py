#!/usr/bin/env python3
"""Refuses C and C++ files that clang-format would change.

usage: check_format.py PROJECT      exit status 1 on any finding
"""

import pathlib
import subprocess
import sys

FOLDERS = ("include", "platform", "src", "tests", "examples", "bench", "fuzz")


def main():
    project = pathlib.Path(sys.argv[1])
    files = sorted(path for folder in FOLDERS for path in (project / folder).rglob("*")
                   if path.suffix in (".h", ".cpp", ".c"))
    files += [path for path in [project / "include" / "Pelorin"] if path.is_file()]
    return subprocess.run(["clang-format", "--dry-run", "-Werror", *files], check=False).returncode


if __name__ == "__main__":
    sys.exit(main())
