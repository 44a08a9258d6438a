#!/usr/bin/env python3
"""Compiles every header alone, with every compiler given.

A C++ header must be a whole translation unit for g++ and clang++ with the
project's warnings; one that C programs may include must be one for C11 too.

usage: check_headers.py PROJECT [--cxx COMPILER]... [--cc COMPILER]...
                        [--include FOLDER]... [--c-header FILE]... HEADER...
HEADER and --c-header are paths inside PROJECT; --include adds a folder of another
library. Exit status 1 on any finding.
"""

import argparse
import concurrent.futures
import os
import subprocess
import sys

WARNINGS = ["-Wall", "-Wextra", "-Wpedantic", "-Wshadow", "-Wconversion", "-Werror"]
FOLDERS = ["include", "platform/include", "."]


def command(compiler, language, header, libraries):
    standard = {"c": ["-std=c11"], "c++": ["-std=c++20", "-Wold-style-cast"]}[language]
    # The header comes in by -include, so that "#pragma once" stands in no main file.
    return [compiler, *standard, *WARNINGS, "-fsyntax-only", *(f"-I{f}" for f in FOLDERS),
            *(part for folder in libraries for part in ("-isystem", folder)), "-x", language, "-include", header, os.devnull]


def compile_alone(project, arguments):
    run = subprocess.run(arguments, cwd=project, capture_output=True, text=True, check=False)
    return "" if run.returncode == 0 else f"{' '.join(arguments)}\n{run.stderr}"


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("project")
    parser.add_argument("--cxx", action="append", default=[])
    parser.add_argument("--cc", action="append", default=[])
    parser.add_argument("--c-header", action="append", default=[])
    parser.add_argument("--include", action="append", default=[])
    parser.add_argument("headers", nargs="*")
    options = parser.parse_intermixed_args()

    commands = [command(cxx, "c++", h, options.include) for h in options.headers for cxx in options.cxx]
    commands += [command(cc, "c", h, []) for h in options.c_header for cc in options.cc]
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        failures = [f for f in pool.map(lambda c: compile_alone(options.project, c), commands) if f]
    print(*failures, f"{len(commands) - len(failures)} of {len(commands)} compile alone", sep="\n")
    return 1 if failures or not commands else 0


if __name__ == "__main__":
    sys.exit(main())
