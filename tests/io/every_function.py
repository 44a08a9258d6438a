#!/usr/bin/env python3
"""Whether a program calls every function that a C header declares.

usage: every_function.py HEADER PROGRAM        exit status 1 with the names it does not
"""

import pathlib
import re
import sys

header, program = (pathlib.Path(name).read_text(encoding="utf-8") for name in sys.argv[1:])
declared = re.findall(r"\b(Pelorin\w+)\(", re.sub(r"//.*", "", header))
sys.exit(" ".join(name for name in declared if f"{name}(" not in program) or (not declared))
