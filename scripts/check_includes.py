#!/usr/bin/env python3
"""Holds the order of the folders: a file includes only from its own folder and from those below it.

Prints each include that points upwards, and exits with 1 where there is one. What a lower folder needs of a higher one is
declared in a header of the lower one, which the higher one implements.
"""

import pathlib
import re
import sys

# Folder -> the folders that it may include from, besides itself. A folder not named here (tests, bench) may include anything.
BELOW = {
    "frame/services": [],
    "services": ["frame/services"],
    "frame": ["frame/services"],
    "tree": ["frame"],
    "overrides": ["frame", "tree", "keystore"],
    "keystore": ["frame", "tree", "overrides"],
    "curves": ["keystore"],
    "identity": ["curves"],
    "persist": ["curves"],
    "host": ["identity", "persist"],
    "cli": ["host"],
}

# The library knows nothing of how its services are made, but for speed in one header, and at the start, where it looks
# whether they are its own.
EXCEPTIONS = {
    ("keystore/shortcuts_private.h", "services/curvekernel/solve_private.h"),
    ("keystore/shortcuts_private.h", "services/sequence/list_private.h"),
    ("keystore/shortcuts_private.h", "services/utility/context_private.h"),
    ("tree/birth.cpp", "services/stamp_private.h"),
}

INCLUDE = re.compile(r'^\s*#\s*include\s+"([^"]+)"', re.MULTILINE)


def reachable(folder):
    found, todo = {folder}, list(BELOW[folder])
    while todo:
        if (lower := todo.pop()) not in found:
            found.add(lower)
            todo += BELOW[lower]
    return found


def folder_of(path):
    """The row of BELOW that a path belongs to: the longest that it begins with."""
    return max((row for row in BELOW if path.startswith(row + "/")), key=len, default=None)


def main():
    root = pathlib.Path(__file__).resolve().parent.parent
    below = {folder: reachable(folder) for folder in BELOW}
    bad, files = [], 0
    for top in sorted({row.split("/")[0] for row in BELOW}):
        for file in sorted(p for p in (root / top).rglob("*") if p.suffix in (".h", ".cpp")):
            name = file.relative_to(root).as_posix()
            files += 1
            for include in INCLUDE.findall(file.read_text(encoding="utf-8")):
                target = folder_of(include)
                if target is None or target in below[folder_of(name)] or (name, include) in EXCEPTIONS:
                    continue
                bad.append(f"{name}: includes {include}, which is above {folder_of(name)}/")
    for line in bad:
        print(line)
    print(f"{files} files, {len(bad)} includes against the order of the folders")
    return 1 if bad else 0


if __name__ == "__main__":
    sys.exit(main())
