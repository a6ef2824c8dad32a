#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0

"""The service does all of its work with the rights that handset/kestmodem.rc gives it.

usage: rights_test.py SOURCE_DIR BUILD_DIR
Plays the demo's scenes; the service is started as init would do it: directories, owners and modes
from kestmodem.rc and the ueventd.rc of the example board, then its user, groups and capabilities.
Needs root and setpriv, and 500 MB in $TMPDIR or /tmp; is skipped otherwise.
"""
import os
import re
import shutil
import subprocess
import sys
import tempfile

SKIPPED = 77
IDS = {"root": 0, "system": 1000, "log": 1007, "sdcard_rw": 1015, "media_rw": 1023, "shell": 2000}
# What the platform's own init makes of the directories above, and its FUSE of the card.
PLATFORM = ["chmod 0755 /", "mkdir /data 0771 system system", "mkdir /data/local 0751 root root",
            "mkdir /data/local/tmp 0771 shell shell", "mkdir /storage/sdcard0 0775 root sdcard_rw"]


def commands_and_options(path):
    """The words of each command of kestmodem.rc, and {name: words} of the service's options."""
    commands, options, in_service = [], {}, False
    for line in open(path, encoding="utf-8"):
        words = line.split("#")[0].split()
        if line[:1].isspace() and words:
            if in_service:
                options[words[0]] = words[1:]
            else:
                commands.append(words)
        elif words:
            in_service = words[0] == "service"
    return commands, options


def device_lines(path):
    for line in open(path, encoding="utf-8"):
        words = line.split("#")[0].split()
        if words:
            yield words[0], words[1], words[2], words[3]


def run_command(root, words):
    path = root + words[1 if words[0] in ("mkdir", "restorecon_recursive") else -1]
    if words[0] == "mkdir":
        os.makedirs(path, exist_ok=True)
        os.chown(path, IDS[words[3]], IDS[words[4]])
        os.chmod(path, int(words[2], 8))
    elif words[0] == "chown":
        os.chown(path, IDS[words[1]], IDS[words[2]])
    elif words[0] == "chmod":
        os.chmod(path, int(words[1], 8))
    elif words[0] != "restorecon_recursive":
        sys.exit(f"kestmodem.rc: unknown command {words[0]}")


def start_as_init(top, root, program):
    commands, options = commands_and_options(top + "/handset/kestmodem.rc")
    for words in [line.split() for line in PLATFORM] + commands:
        run_command(root, words)
    for name in set(os.listdir(root + "/dev")) - {"block"}:
        os.chown(f"{root}/dev/{name}", IDS["root"], IDS["root"])
        os.chmod(f"{root}/dev/{name}", 0o600)
        if name.startswith("."):  # a part of the simulated drivers
            os.chown(f"{root}/dev/{name}", IDS[options["user"][0]], -1)
    prop = dict(line.strip().split("=") for line in open(root + "/default.prop") if "=" in line)
    image = prop["ro.product.partitionpath"] + prop["persist.modem.w.nvp"] + "modem"
    for path, mode, user, group in device_lines(top + "/handset/board/ueventd.rc"):
        # The simulated handset has its WCN and GNSS logs, and the image, under other names.
        path = image if path.endswith("w_modem") else root + re.sub("(wcn|gnss)_diag", r"\1_log", path)
        os.chown(path, IDS[user], IDS[group])
        os.chmod(path, int(mode, 8))
    capabilities = ",".join(["-all"] + ["+" + name.lower() for name in options["capabilities"]])
    sys.stdout.flush()
    os.execvp("setpriv", [
        "setpriv", "--reuid", str(IDS[options["user"][0]]), "--regid", str(IDS[options["group"][0]]),
        "--groups", ",".join(str(IDS[name]) for name in options["group"][1:]),
        "--inh-caps", capabilities, "--ambient-caps", capabilities, "--bounding-set", capabilities,
        program])


def main():
    os.umask(0o022)
    if sys.argv[1] == "--start":
        start_as_init(sys.argv[2], os.environ["KESTMODEM_ROOT"], sys.argv[3])
    top, build = (os.path.abspath(path) for path in sys.argv[1:3])
    drop = ["setpriv", "--reuid", str(IDS["system"]), "--clear-groups", "--bounding-set", "-all", "true"]
    if not shutil.which("setpriv") or subprocess.run(drop, stderr=subprocess.PIPE, check=False).returncode != 0:
        print("skipped: needs setpriv, and root with the right to become another user")
        return SKIPPED
    if shutil.disk_usage(tempfile.gettempdir()).free < 500 << 20:
        print("skipped: needs 500 MB in " + tempfile.gettempdir())
        return SKIPPED
    with tempfile.TemporaryDirectory(prefix="kest_rights") as work:
        os.chmod(work, 0o755)
        program = shutil.copy(build + "/kestmodem", work)  # where every user may run it
        os.chmod(program, 0o755)
        if os.path.exists(build + "/kestmodem.elf"):  # what that runs in an emulator
            os.chmod(shutil.copy(build + "/kestmodem.elf", work), 0o755)
        starter = work + "/start"
        with open(starter, "w", encoding="utf-8") as f:
            f.write(f"#!/bin/sh\nexec python3 '{os.path.abspath(__file__)}' --start '{top}' '{program}'\n")
        os.chmod(starter, 0o755)
        played = subprocess.run([build + "/kestsim", "--fast", "--seconds", "1", "--root", work + "/handset",
                                 "--kestmodem", starter], stdout=subprocess.PIPE, check=False)
        log = open(work + "/handset/kestmodem.log", encoding="utf-8", errors="replace").read()
        faults = [line for line in log.splitlines() if "Permission denied" in line or "not permitted" in line]
        if "start ID=1000/1000" not in log:
            faults.append("the service did not start as the user of kestmodem.rc")
        if played.returncode != 0:
            faults.append(played.stdout.decode(errors="replace"))
    for fault in faults:
        print(fault)
    return 1 if faults else 0


if __name__ == "__main__":
    sys.exit(main())
