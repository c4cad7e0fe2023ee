#!/usr/bin/env python3
"""A download from cold with the tool, on any platform: the handset on COM7 starts in its boot loader and ends with the
software that was written.

usage: with-sim 7 flash_from_cold.py COMMAND..., where COMMAND runs the tool. The last line tells what runs.
"""
import json
import os
import struct
import subprocess
import sys
import tempfile

PATIENCE = 240  # seconds; starting Wine takes most of what is needed


def run(*words):
    done = subprocess.run([*sys.argv[1:], "-p", "7", "--json", *words], stdin=subprocess.DEVNULL,
                          stdout=subprocess.PIPE, timeout=PATIENCE, check=False)
    answer = json.loads(done.stdout)
    if done.returncode != 0:
        sys.exit(f"{' '.join(words)}: {answer}")
    return answer


# Below the current folder, which is the only one that a program under Wine sees besides its own.
with tempfile.TemporaryDirectory(dir=".") as folder:
    programmer = os.path.join(folder, "programmer.bin")
    software = os.path.join(folder, "software.bin")
    with open(programmer, "wb") as file:
        file.write(b"VHFP" + struct.pack("<I", 30000) + os.urandom(29992))
    with open(software, "wb") as file:
        file.write(b"VHSW" + b"VHS-2.0.1\0" + os.urandom(20000))
    written = run("flash", "all", programmer, software, "--reset")
    if written["bytes"] != 20014:
        sys.exit(f"not written: {written}")
print("runs", run("info")["build"]["software_revision"])
