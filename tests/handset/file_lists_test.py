#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0

"""The handset build and the CMake build compile the same files.

usage: file_lists_test.py SOURCE_DIR
Compares Android.bp with the CMakeLists.txt of each folder, and both with what is there.
"""
import glob
import os
import re
import sys

# Built by CMake only: on a handset the platform's own libraries do this.
HOST_ONLY = "src/platform/"
# A program for workstations, which uses libraries that a handset does not have, and its parts.
WORKSTATION_ONLY = ("kestlog", "libkestlog_program")


def bp_modules(text):
    """{module name: set of its srcs} of an Android.bp."""
    modules = {}
    for body in re.findall(r"^\w+ \{\n(.*?)^\}", text, re.S | re.M):
        name = re.search(r'name: "([^"]+)"', body).group(1)
        srcs = re.search(r"srcs: \[(.*?)\]", body, re.S)
        modules[name] = set(re.findall(r'"([^"]+)"', srcs.group(1))) if srcs else set()
    return modules


def cmake_library(top):
    """Sources that the folders' CMakeLists.txt add to the service's library."""
    files = set()
    for path in glob.glob(os.path.join(top, "src/*/CMakeLists.txt")):
        folder = os.path.relpath(os.path.dirname(path), top)
        with open(path) as f:
            files |= {folder + "/" + name for name in re.findall(r"(\w+\.cpp)", f.read())}
    return files


def cmake_tools(top):
    """{module name: set of its sources} of tools/CMakeLists.txt."""
    with open(os.path.join(top, "tools/CMakeLists.txt")) as f:
        found = re.findall(r"add_(\w+)\((\w+)(?: STATIC)?\s+(.*?)\)", f.read(), re.S)
    return {("lib" if kind == "library" else "") + name: {"tools/" + src for src in srcs.split()}
            for kind, name, srcs in found}


def programs(text):
    """Names of the programs of an Android.bp."""
    return set(re.findall(r'^cc_binary \{\n\s+name: "([^"]+)"', text, re.M))


def differ(what, bp, cmake):
    for name in sorted(bp - cmake):
        print(f"{what}: {name} is in Android.bp only")
    for name in sorted(cmake - bp):
        print(f"{what}: {name} is missing from Android.bp")
    return bp != cmake


def main():
    top = sys.argv[1]
    with open(os.path.join(top, "Android.bp")) as f:
        text = f.read()
    modules = bp_modules(text)
    library = cmake_library(top)
    there = {os.path.relpath(p, top) for p in glob.glob(os.path.join(top, "src/*/*.cpp"))}
    bad = differ("libkest", modules["libkest"], {f for f in library if not f.startswith(HOST_ONLY)})
    bad |= differ("src", library | {"src/core/main.cpp"}, there)
    bad |= differ("kestmodem", modules["kestmodem"], {"src/core/main.cpp"})
    bad |= differ("programs", programs(text), {"kestmodem", "kestctl"})
    for name, srcs in cmake_tools(top).items():
        bad |= differ(name, modules.get(name, set()), set() if name in WORKSTATION_ONLY else srcs)
    return 1 if bad else 0


sys.exit(main())
