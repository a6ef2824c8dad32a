#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0

"""kestsim --replay gives back what is on a card, byte for byte, and survives a bad card.

usage: replay_test.py KESTSIM KESTSIM_PLAY RECORDINGS
Cards are made of what the service wrote while KESTSIM_PLAY played some of the RECORDINGS. What
it writes when such a card is played again is read here once more, without the simulator's code.
"""
import collections
import glob
import itertools
import os
import re
import shlex
import shutil
import struct
import subprocess
import sys
import tempfile
import time

KESTSIM, PLAY, RECORDINGS = sys.argv[1:]
RECORD = b"xV4\x12"
KINDS = {0x40: "agdsp log", 0x43: "agdsp PCM", 0x42: "agdsp dump"}


def record(script, log_root):
    """Adds the set that the service wrote on the internal medium during the script."""
    os.makedirs(log_root, exist_ok=True)
    played = subprocess.run([PLAY, "--keep", f"{RECORDINGS}/{script}.in"], check=True,
                            capture_output=True, text=True)
    root = re.search("root is (.*)", played.stderr).group(1)
    [name] = [e.name for e in os.scandir(f"{root}/data/modem_log") if e.is_dir()]
    moved = f"{log_root}/2016-03-0{len(os.listdir(log_root)) + 1}-09-15-00"
    shutil.copytree(f"{root}/data/modem_log/{name}", moved)
    shutil.rmtree(root)
    return moved


def streams(log_root):
    """{what it is: its bytes}, the oldest first, of a log root without damage."""
    found = collections.defaultdict(bytes)
    for set_name in sorted(os.listdir(log_root)):
        for cp in os.listdir(f"{log_root}/{set_name}"):
            numbers = {int(name.split("-")[0]): name
                       for name in os.listdir(f"{log_root}/{set_name}/{cp}") if name[0].isdigit()}
            for _, name in sorted(numbers.items(), reverse=True):
                with open(f"{log_root}/{set_name}/{cp}/{name}", "rb") as f:
                    data = f.read()
                while cp == "agdsp" and data:
                    end = 12 + int.from_bytes(data[16:18], "little")
                    found[KINDS[data[19]]] += data[20:end]
                    data = data[end:]
                found[cp] += data[16:] if data.startswith(RECORD) else data
    return {what: data for what, data in found.items() if data}


def replay(card, out, status, *options):
    """Plays the card; the service's log root and what was said."""
    ran = subprocess.run([KESTSIM, "--replay", card, "--root", out, *options],
                         capture_output=True, text=True)
    print(ran.stdout + ran.stderr)
    assert ran.returncode == status, ran.returncode
    return f"{out}/data/modem_log", ran.stdout + ran.stderr


def shown(said):
    """{what it is: bytes} that were said to be fed and written and equal."""
    lines = re.findall(r"^ +(\S.*?) +(\d+) bytes fed, +(\d+) written: equal$", said, re.M)
    assert all(fed == written for _, fed, written in lines)
    return {what: int(fed) for what, fed, _ in lines}


def test_all_comes_back(temp):
    card = temp + "/card"
    for script in ("lte_file_change", "wcn_file_change", "audio_dsp", "wcn_file_change"):
        record(script, card + "/modem_log")
    original = streams(card + "/modem_log")
    assert set(original) == {"cp_4mode", "cp_wcn", *KINDS.values()}, original.keys()
    assert len(original["cp_wcn"]) > 2 << 20
    log_root, said = replay(card, temp + "/out", 0, "--speed", "max")
    assert streams(log_root) == original
    assert shown(said) == {what: len(data) for what, data in original.items()}


def test_bad_card(temp):
    card = temp + "/card"
    cut = record("audio_dsp", card)
    original = streams(card)
    headless = record("audio_dsp", card)
    gnss = record("wcn_file_change", card) + "/cp_gnss"
    shutil.rmtree(os.path.dirname(gnss) + "/cp_wcn")
    # The medium was full twice: the last data of the first set has lost 6 bytes, and behind the
    # second set's there is a part of a header.
    [name] = os.listdir(cut + "/agdsp")
    os.truncate(f"{cut}/agdsp/{name}", os.path.getsize(f"{cut}/agdsp/{name}") - 6)
    [name] = os.listdir(headless + "/agdsp")
    with open(f"{headless}/agdsp/{name}", "r+b") as f:
        head = f.read(15)
        f.seek(0, os.SEEK_END)
        f.write(head)
    os.mkdir(gnss)
    log = gnss + "/%d-cp_gnss-2016-03-03_09-15-00.log"
    with open(log % 1, "wb") as f:
        f.write(RECORD + b"of a CP that has crashed")
    os.mkfifo(log % 0)
    os.symlink(log % 1, log % 2)
    os.symlink(cut, card + "/2016-03-01-09-16-00")
    os.mkdir(cut + "/\x1b[31m<script>")
    log_root, said = replay(card, temp + "/out", 3, "--speed", "max")
    for problem in (card + "/2016-03-01-09-16-00: a link, not followed",
                    cut + "/\\x1b[31m<script>: not the name of a co-processor",
                    log % 0 + ": no regular file",
                    log % 2 + ": a link, not followed",
                    "agdsp: 1 chunks are cut off, 6 bytes of them are missing",
                    "agdsp: 15 bytes belong to no chunk"):
        assert f"kestsim: {problem}\n" in said, problem
    expected = {what: 2 * data for what, data in original.items()}
    expected["agdsp log"] = original["agdsp log"][:-6] + original["agdsp log"]
    expected["cp_gnss"] = b" has crashed"
    assert streams(log_root) == expected
    replay(cut + "/agdsp", temp + "/none", 1)
    assert log % 1 + ": not a directory" in replay(log % 1, temp + "/none", 1)[1]


def test_recorded_speed(temp):
    card = temp + "/card"
    for set_name, seconds in ("2016-03-01-09-15-00", (0, 3)), ("2016-03-05-09-15-00", (0,)):
        os.makedirs(f"{card}/{set_name}/cp_gnss")
        for i, second in enumerate(seconds):
            with open(f"{card}/{set_name}/cp_gnss/{len(seconds) - 1 - i}-cp_gnss-"
                      f"{set_name[:10]}_09-15-0{second}.log", "wb") as f:
                f.write(b"%d" % second * 1000)
    started = time.monotonic()
    log_root, said = replay(card, temp + "/out", 0, "--speed", "2")
    assert time.monotonic() - started >= 1.5
    assert re.search("Nothing was logged from 2016-03-01 09:15:0. to 2016-03-05 09:15:00", said)
    assert streams(log_root) == streams(card)


def test_served_for_clients(temp):
    root = temp + "/a b'c"
    served = subprocess.Popen([KESTSIM, "--serve", "--root", root], stdout=subprocess.PIPE, text=True)
    try:
        said = list(itertools.takewhile("Ctrl-C ends it.\n".__ne__, served.stdout))
        kestctl = os.path.join(os.path.dirname(os.path.realpath(KESTSIM)), "kestctl")
        assert shlex.split(said[2]) == ["KESTMODEM_ROOT=" + root, kestctl, "status"], said
        for _ in range(2):
            subprocess.run(["sh", "-c", next(line for line in said if "kill" in line)], check=True)
            assert any("is alive" in line for line in served.stdout)
    finally:
        served.terminate()
        served.communicate()
    logs = glob.escape(root) + "/data/modem_log/*/"
    assert len(glob.glob(logs + "cp_wcdma/*.dmp")) == 2
    # What the co-processors log can be tried on whatever reads frames.
    with open(max(glob.glob(logs + "cp_gnss/*.log"), key=os.path.getsize), "rb") as f:
        frames = [re.sub(b"}(.)", lambda m: bytes([m[1][0] ^ 0x20]), body, flags=re.S)
                  for body in re.findall(b"~([^~]+)~", f.read())]
    first = int.from_bytes(frames[0][:4], "little")
    for number, frame in enumerate(frames, first):
        assert frame[:6] == struct.pack("<IH", number, len(frame)), frame
    assert len(frames) > 1000 and len({frame[6] for frame in frames}) > 1


def test_interrupted_script(temp):
    ran = subprocess.Popen([PLAY, f"{RECORDINGS}/iq_save.in"], env={**os.environ, "TMPDIR": temp})
    while not os.listdir(temp) and ran.poll() is None:
        time.sleep(0.001)
    ran.terminate()
    assert ran.wait() == 1
    assert not os.listdir(temp)


def test_fast_keeps_what_is_given(temp):
    ran = subprocess.run([KESTSIM, "--kestmodem", "/bin/true", "--root", temp + "/root", "--seconds",
                          "30", "--rate", "100", "--fast"], capture_output=True, text=True)
    assert "; 100 KB/s from" in ran.stdout and " for 30 s;" in ran.stdout, ran.stdout


for test in [value for name, value in list(globals().items()) if name.startswith("test_")]:
    with tempfile.TemporaryDirectory(prefix="kest-replay-") as directory:
        print("==", test.__name__)
        test(directory)
