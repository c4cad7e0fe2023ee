#!/usr/bin/env python3
"""The station example on any platform: the handset on COM7 is flashed, restarted, restored and compared.

usage: with-sim 7 station_example.py COMMAND..., where COMMAND runs the example. Its output and exit code are passed on.
"""
import os
import subprocess
import sys
import tempfile

PATIENCE = 240  # seconds; starting Wine takes most of what is needed

PROGRAMMER = """\
:020000040002F8
:10000000000102030405060708090A0B0C0D0E0F78
:0400000500020000F5
:00000001FF
"""

# Below the current folder, which is the only one that a program under Wine sees besides its own.
with tempfile.TemporaryDirectory(dir=".") as folder:
    programmer, software, backup = (os.path.join(folder, name) for name in ("load.hex", "software.bin", "golden.pkv"))
    with open(programmer, "w", encoding="ascii") as file:
        file.write(PROGRAMMER)
    with open(software, "wb") as file:
        file.write(b"VHSW" + b"VHS-2.0.1\0" + os.urandom(20000))
    subprocess.run([os.environ["KRAL_NATIVE_TOOL"], "-p", "7", "nv", "backup", "--items", "0-99", backup],
                   stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, timeout=PATIENCE, check=True)
    done = subprocess.run([*sys.argv[1:], programmer, software, backup, "7"], stdin=subprocess.DEVNULL,
                          timeout=PATIENCE, check=False)
sys.exit(done.returncode)
