#!/usr/bin/env python3
"""Holds every #include "..." against the table of components.

The table is layers.txt in a build folder, one line per file that a component
lists: LEVEL COMPONENT LIBRARY FILE. A file may include
  - files of its own component and of components on lower levels; the services
    of the platform library, which all stand on one level, each other too;
  - when it is an installed header: installed headers only, and of other
    libraries nothing but the C++ and C ones; a front for another library, which
    FRONTS lists, that one too, and no other header may include the front.
Every source and header under include/, src/ and platform/ must be listed.

usage: check_layers.py PROJECT LAYERS.TXT        exit status 1 on any finding
"""

import pathlib
import re
import sys
from typing import NamedTuple

INCLUDE = re.compile(r'^\s*#\s*include\s*(?:"([^"]+)"|<([^>]+)>)')
PUBLIC_FOLDERS = ("include/", "platform/include/")
SEARCHED_FOLDERS = (*PUBLIC_FOLDERS, "")
LISTED_FOLDERS = ("include", "src", "platform")
# Folders of the system's own headers; any other name with a slash is a library.
SYSTEM_FOLDERS = ("sys/", "linux/", "arpa/", "net/", "netinet/", "bits/")

# Optional headers for users of another library, and how the names of its headers start.
FRONTS = {"include/plr/log/fmt.h": "fmt/",
          "platform/include/dispatch/glib.h": "glib",
          "platform/include/dispatch/sd_event.h": "systemd/"}


class Entry(NamedTuple):
    level: int
    component: str
    library: str


def read_table(path):
    table = {}
    for line in path.read_text().splitlines():
        level, component, library, file = line.split(maxsplit=3)
        table[file] = Entry(int(level), component, library)
    return table


def includes(path):
    """Yields (line number, quoted name or None, angled name or None)."""
    for number, line in enumerate(path.read_text().splitlines(), start=1):
        if match := INCLUDE.match(line):
            yield number, match[1], match[2]


def resolve(project, file, name):
    """The project's file that `name` means when `file` includes it, or None."""
    beside = pathlib.Path(file).parent / name
    for candidate in (beside, *(pathlib.Path(folder) / name for folder in SEARCHED_FOLDERS)):
        if (project / candidate).is_file():
            return candidate.as_posix()
    return None


def may_use(user, used):
    if used.component == user.component or used.level < user.level:
        return True
    return used.level == user.level and user.library == used.library == "platform"


def findings_of_file(project, table, file):
    public = file.startswith(PUBLIC_FOLDERS)
    for number, quoted, angled in includes(project / file):
        where = f"{file}:{number}"
        if angled:
            allowed = (*SYSTEM_FOLDERS, *filter(None, [FRONTS.get(file)]))
            if public and "/" in angled and not angled.startswith(allowed):
                yield f"{where}: an installed header includes <{angled}> of another library"
            continue
        target = resolve(project, file, quoted)
        if target is None:
            yield f'{where}: "{quoted}" is no file of the project'
        elif target not in table:
            yield f"{where}: {target} is in no component"
        elif target in FRONTS:
            yield f"{where}: {target} is for users of another library only"
        elif public and not target.startswith(PUBLIC_FOLDERS):
            yield f"{where}: an installed header includes {target}, which is not installed"
        elif not may_use(table[file], table[target]):
            user, used = table[file], table[target]
            yield (f"{where}: {user.component} (level {user.level}) may not use "
                   f"{used.component} (level {used.level})")


def findings(project, table):
    for folder in LISTED_FOLDERS:
        for path in sorted((project / folder).rglob("*")):
            file = path.relative_to(project).as_posix()
            if path.is_file() and path.suffix in ("", ".h", ".cpp", ".c") and file not in table:
                yield f"{file}: in no component of cmake/components.cmake"
    for file in table:
        if (project / file).is_file():
            yield from findings_of_file(project, table, file)
        else:
            yield f"{file}: listed, but there is no such file"


def main():
    project, layers = map(pathlib.Path, sys.argv[1:3])
    found = list(findings(project, read_table(layers)))
    print("\n".join(found))
    return 1 if found else 0


if __name__ == "__main__":
    sys.exit(main())
