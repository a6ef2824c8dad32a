#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0

"""Files of src include only what stands below them.

usage: includes_test.py SOURCE_DIR
The order of the folders and the exceptions, with their reasons, stand in docs/architecture.md.
"""
import glob
import os
import re
import sys


def read(path):
    with open(path) as f:
        return f.read()


def folder_of(path):
    return path.split("/")[0]


def rules(text):
    """The level of each folder, and the exceptions as (includer, included)."""
    line = re.search(r"^    (platform < .*)$", text, re.M).group(1)
    levels = [[name.strip() for name in level.split(",")] for level in line.split("<")]
    rows = re.findall(r"^\| `([\w/.]+)` \| `([\w/.]+)` \| *\S.*\|$", text, re.M)
    return {name: i for i, names in enumerate(levels) for name in names}, rows


def arrows(src):
    """Each (includer, included) between two folders, as paths below src."""
    for path in glob.glob(src + "/**/*.*", recursive=True):
        if not path.endswith((".h", ".cpp")):
            continue
        includer = os.path.relpath(path, src)
        for name in re.findall(r'^\s*#\s*include\s*[<"]([^">]+)', read(path), re.M):
            for place in (src, os.path.dirname(path)):
                included = os.path.relpath(os.path.join(place, name), src)
                if os.path.isfile(os.path.join(src, included)) and folder_of(included) != folder_of(includer):
                    yield includer, included


def main():
    src = os.path.join(sys.argv[1], "src")
    levels, exceptions = rules(read(os.path.join(sys.argv[1], "docs/architecture.md")))
    faults = [f"{name} has no place in the order of the folders" for name in sorted(os.listdir(src))
              if os.path.isdir(os.path.join(src, name)) and name not in levels]
    needed = set()
    for includer, included in sorted(arrows(src)):
        if levels.get(folder_of(included), 0) < levels.get(folder_of(includer), 0):
            continue
        allowed = [row for row in exceptions
                   if row[0] in (folder_of(includer), includer) and row[1] == included]
        if not allowed:
            faults.append(f"src/{includer} must not include {included}")
        needed.update(allowed)
    faults += [f"{includer} includes {included}: the exception is not needed"
               for includer, included in exceptions if (includer, included) not in needed]
    print("\n".join(faults))
    return 1 if faults else 0


sys.exit(main())
