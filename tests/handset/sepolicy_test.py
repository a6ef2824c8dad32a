#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0

"""The SELinux policy of the handset is sound and allows what the service does, and no more.

usage: sepolicy_test.py SOURCE_DIR
Builds handset/sepolicy on a stub of a platform's policy with m4 and checkpolicy. Every path,
property and socket that src names has to have a label of its own, and the service the right to use
it as it does; no rule may be about types that stand for "everything else". The files of the example
board and kestmodem.rc are compared with that. Exit status 77 where the tools are missing.
"""
import glob
import os
import re
import shutil
import subprocess
import sys
import tempfile

CATCH_ALL = set("""device block_device system_file system_data_file shell_data_file rootfs unlabeled
    default_prop system_prop proc debugfs domain file_type data_file_type core_data_file_type dev_type
    fs_type proc_type debugfs_type property_type exec_type system_file_type""".split())
# All that a catch-all type may be used for: on the way to what has a label.
ON_THE_WAY = {("dir", "search"), ("lnk_file", "read")}
READ = {"open", "read", "getattr"}
WRITE = READ | {"write", "create", "unlink"}
# How the service uses each path of src/core/system_paths.h.
USES = [
    (r"PATH_CONFIG_FILE", "file", WRITE),
    (r"PATH_(DEFAULT|FOREIGN)_CONFIG_FILE", "file", READ),
    (r"LOG_ROOT(_KEST)?", "dir", READ | {"write", "create", "rmdir", "add_name", "remove_name"}),
    (r"LOG_ROOT(_KEST)?", "file", WRITE | {"rename"}),
    (r"PATH_(CP\w+|DIPX_\w+)", "file", READ),
    (r"PATH_AGDSP_LOG|CP_DEVICE", "chr_file", {"open", "read", "write"}),
    (r"PATH_AGDSP_PCM", "chr_file", {"open", "read"}),
    (r"PATH_AGDSP_MEM", "chr_file", {"open", "read", "ioctl"}),
    (r"PATH_IQ_MEM", "chr_file", {"open", "read", "ioctl", "map"}),
    (r"IMAGE", "blk_file", READ),
]
FAULTS = []


def expect(good, fault):
    if not good:
        FAULTS.append(fault)


def read(*parts):
    with open(os.path.join(*parts), encoding="utf-8") as f:
        return f.read()


def defines(text, kind):
    return dict(re.findall(rf'^#define ({kind}\w+) "(.*)"', text, re.M))


def build(top, stub, variant):
    """The policy as CIL, in which macros are expanded and sets are resolved."""
    policy = os.path.join(top, "handset/sepolicy")
    files = [stub + "/head.m4", policy + "/attributes", *sorted(glob.glob(policy + "/*.te")),
             stub + "/tail.m4", policy + "/genfs_contexts"]
    with tempfile.NamedTemporaryFile() as conf, tempfile.NamedTemporaryFile() as cil:
        subprocess.run(["m4", "-D", "target_build_variant=" + variant, *files], stdout=conf, check=True)
        # To a policy, which is where the neverallow rules are looked at, and to text.
        for options in (["-E"], ["-C", "-E"]):
            done = subprocess.run(["checkpolicy", "-M", *options, "-o", cil.name, conf.name],
                                  stderr=subprocess.PIPE, check=False)
            if done.returncode != 0:
                sys.exit(f"checkpolicy ({variant}): {done.stderr.decode()}")
        return read(cil.name)


def rules(cil):
    """Each (source, target, class, set of permissions) that is allowed."""
    return [(source, target, cls, set(perms.split())) for source, target, cls, perms in
            re.findall(r"^\(allow (\S+) (\S+) \((\S+) \(([^)]*)\)\)\)$", cil, re.M)]


def contexts(*files):
    return [line.split()[::len(line.split()) - 1] for file in files for line in read(file).splitlines()
            if line and not line.startswith("#")]


def type_of(context):
    return context.split(":")[2]


def file_type(patterns, path):
    """The last line that fits; one without special characters goes before all others."""
    fits = [(not re.search(r"[.*+?()\[\]]", pattern.replace("\\.", "")), i) for i, (pattern, _) in enumerate(patterns)
            if re.fullmatch(pattern, path)]
    return type_of(patterns[max(fits)[1]][1]) if fits else "unlabeled"


def property_type(patterns, name):
    fits = [pattern for pattern in patterns
            if name == pattern[0] or pattern[0].endswith(".") and name.startswith(pattern[0])]
    return type_of(max(fits, key=lambda pattern: len(pattern[0]))[1]) if fits else "default_prop"


def genfs_type(text, path):
    for prefix, fs in (("/proc", "proc"), ("/d", "debugfs")):
        if path.startswith(prefix + "/"):
            found = re.search(rf"^genfscon {fs} {re.escape(path[len(prefix):])}\s+(\S+)$", text, re.M)
            return type_of(found.group(1)) if found else fs
    return None


def check_rules(allowed, used):
    for source, target, cls, perms in allowed:
        expect(target not in CATCH_ALL or {(cls, p) for p in perms} <= ON_THE_WAY,
               f"{source} may {sorted(perms)} what is of the catch-all type {target}")
    for source, target, _, _ in allowed:
        own = target.startswith("kest") and not target.startswith(("kestmodem_socket_", "kestmodem_exec"))
        expect(source != "kestmodem" or not own or target in used, f"no label gives the type {target}")


def check_paths(top, allowed, label):
    """Labels and rights of the paths; kestmodem.rc hands the kernel's files over."""
    paths = defines(read(top, "src/core/system_paths.h"), "(?:PATH|DIR)_")
    data, kest, logs = (paths.pop(n) for n in ("PATH_DATA_PARTITION", "DIR_KEST", "DIR_MODEM_LOG"))
    paths.update(LOG_ROOT=data + logs, LOG_ROOT_KEST=data + kest + logs)
    prop = dict(re.findall(r"^([^#=\s]+)=(.*)$", read(top, "handset/board/system.prop"), re.M))
    board = {"IMAGE": prop["ro.product.partitionpath"] + prop["persist.modem.w.nvp"] + "modem"}
    devices = [value for name, value in prop.items() if re.fullmatch(r"ro\.modem\.\w+\.(log|diag)", name)]
    rc = read(top, "handset/kestmodem.rc")
    ueventd = re.findall(r"^(/\S+)", read(top, "handset/board/ueventd.rc"), re.M)
    for name, path in [*paths.items(), *board.items(), *(("CP_DEVICE", path) for path in devices)]:
        uses = [(cls, perms) for pattern, cls, perms in USES if re.fullmatch(pattern, name)]
        expect(uses, f"it is not known here what the service does with {name}")
        for cls, perms in uses:
            have = set().union(*(p for s, t, c, p in allowed if (s, t, c) == ("kestmodem", label(path), cls)))
            expect(label(path) not in CATCH_ALL, f"{path} has no label of its own")
            expect(perms <= have, f"{path} ({label(path)}): the service may not {sorted(perms - have)}")
            expect("write" in perms or "write" not in have, f"{path} is only read, but may be written")
        if path.startswith("/dev/"):
            expect(path in ueventd, f"{path} is missing from handset/board/ueventd.rc")
        if path.startswith(("/proc/", "/d/")):
            expect(all(re.search(rf"^    {command} .* {path}$", rc, re.M) for command in ("chown", "chmod")),
                   f"kestmodem.rc does not hand over {path}")
    for path in (os.path.dirname(paths["PATH_CONFIG_FILE"]), paths["LOG_ROOT"]):
        expect(re.search(rf"^    mkdir {path} 0..0 system", rc, re.M), f"kestmodem.rc does not make {path} for it alone")


def check_properties(top, allowed, patterns):
    props = defines(read(top, "src/config/property_names.h"), "PROP_")
    prefix = props.pop("PROP_MODEM_PREFIX")
    guide = read(top, "docs/handset.md")
    for name, prop in props.items():
        prop = prefix + prop if name.startswith("PROP_SUFFIX_") else prop
        label = property_type(patterns, prop)
        expect(label not in CATCH_ALL, f"property {prop} has no label of its own")
        expect(any((s, t) == ("kestmodem", label) and READ <= p for s, t, _, p in allowed),
               f"the service may not read {prop} ({label})")
        expect(f"`{prop}`" in guide, f"docs/handset.md does not tell of {prop}")


def check_sockets(top, allowed):
    connect = {(s, t) for s, t, cls, perms in allowed if cls == "unix_stream_socket" and "connectto" in perms}
    sockets = set(defines(read(top, "src/core/system_paths.h"), "SOCKET_").values())
    expect(connect == {("kestmodem_client", "kestmodem")} |
           {("kestmodem", "kestmodem_socket_" + name) for name in sockets - {"kestmodem"}},
           f"the sockets of src are {sorted(sockets)}, of the policy {sorted(connect)}")


def main():
    top = sys.argv[1]
    if not shutil.which("m4") or not shutil.which("checkpolicy"):
        print("skipped: needs m4 and checkpolicy")
        return 77
    stub = os.path.join(top, "tests/handset/platform_stub")
    folders = [stub, os.path.join(top, "handset/sepolicy"), os.path.join(top, "handset/board/sepolicy")]
    files = contexts(*(folder + "/file_contexts" for folder in folders))
    props = contexts(*(folder + "/property_contexts" for folder in folders[:2]))
    genfs = read(top, "handset/sepolicy/genfs_contexts")
    used = {type_of(context) for _, context in files + props}
    used |= {type_of(context) for context in re.findall(r"^genfscon \S+ \S+\s+(\S+)$", genfs, re.M)}

    developers = build(top, stub, "userdebug")
    for name in sorted(used):
        expect(f"(type {name})" in developers, f"a label names {name}, which is no type")
    check_rules(rules(developers), used)
    allowed = rules(build(top, stub, "user"))
    check_rules(allowed, used)
    expect(not any(source == "shell" for source, _, _, _ in allowed), "adb's shell has rights in a release build")
    check_paths(top, allowed, lambda path: genfs_type(genfs, path) or file_type(files, path))
    check_properties(top, allowed, props)
    check_sockets(top, allowed)
    for fault in sorted(set(FAULTS)):
        print(fault)
    return 1 if FAULTS else 0


sys.exit(main())
