#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0

"""There is one version: whatever names one names that of the file VERSION.

usage: version_test.py SOURCE_DIR [BUILD_DIR] [--release]
Compares it with Android.bp, the manual pages and CHANGELOG.md; with BUILD_DIR also with what the
programs there print and what a package would get. With --release, CHANGELOG.md must have it with a
date and have nothing that is still unreleased.
"""
import glob
import os
import re
import subprocess
import sys


def read(*parts):
    with open(os.path.join(*parts), encoding="utf-8") as f:
        return f.read()


def found_versions(top, build):
    """Each (where, version)."""
    for version in re.findall(r'KEST_VERSION=\\"([^"\\]*)', read(top, "Android.bp")) or ["none"]:
        yield "Android.bp", version
    for page in sorted(glob.glob(top + "/docs/man/*")):
        header = re.search(r'^\.TH \S+ \d \S+ "kestmodem ([^"]*)"', read(page), re.M)
        yield os.path.relpath(page, top), header.group(1) if header else "none"
    if build:
        package = re.search(r'^set\(CPACK_PACKAGE_VERSION "(.*)"\)', read(build, "CPackConfig.cmake"), re.M)
        yield "the packages", package.group(1) if package else "none"
        for program in ("kestctl", "kestlog"):
            if os.path.exists(f"{build}/{program}"):
                out = subprocess.run([f"{build}/{program}", "--version"], stdout=subprocess.PIPE, check=False)
                yield program + " --version", out.stdout.decode().split()[-1]


def changelog_faults(text, version, release):
    """Newest first: what is unreleased, then versions with their dates. VERSION names the newest, or
    the one that comes next."""
    sections = re.findall(r"^## \[([^\]]*)\](?: - (\S+))?$\n(.*?)(?=^## |\Z)", text, re.M | re.S)
    released = [name for name, _, _ in sections if name != "Unreleased"]
    for name, date, _ in sections:
        if name != "Unreleased" and not re.fullmatch(r"\d{4}-\d\d-\d\d", date):
            yield f"CHANGELOG.md: {name} has no date"
    if version not in released[:1] and (release or version in released or sections[0][0] != "Unreleased"):
        yield f"CHANGELOG.md: {version} is not the newest version"
    if release and sections[0][0] == "Unreleased" and sections[0][2].strip():
        yield "CHANGELOG.md: something is unreleased"


def main():
    args = [arg for arg in sys.argv[1:] if arg != "--release"]
    version = read(args[0], "VERSION").strip()
    faults = [f"{where}: {other} is not {version}"
              for where, other in found_versions(args[0], args[1] if len(args) > 1 else "") if other != version]
    faults += changelog_faults(read(args[0], "CHANGELOG.md"), version, "--release" in sys.argv)
    if not re.fullmatch(r"\d+\.\d+\.\d+", version):
        faults.append(f"VERSION: {version} is not MAJOR.MINOR.PATCH")
    for fault in faults:
        print(fault)
    return 1 if faults else 0


sys.exit(main())
