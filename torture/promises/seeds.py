"""The same seed gives the same run: every fault of the virtual handset, twice with one seed, and once with another.

Here the virtual handset is what is tried; the requests are ours.
"""
from __future__ import annotations

import os
import select
import subprocess
import time
import tty
from typing import List

from torture.bench import Bench, check
from torture.peer.codec import frame

NUMBER = 16
TITLE = "The same seed gives the same run"
SHORT = 6
AT_ONCE = 4
_REQUESTS = 40
_QUIET_S = 0.05
_LONGEST_S = 60.0
# The kinds with what they want. Of those that move answers in time only the bytes are compared.
_FAULTS = {
    "corrupt": "corrupt,chance=0.4", "duplicate": "duplicate,chance=0.4", "ignore": "ignore,chance=0.4",
    "late": "late,chance=0.4", "lose": "lose,chance=0.4", "merge": "merge,chance=0.4", "noise": "noise=9,chance=0.4",
    "refuse": "refuse=21,chance=0.4", "wrong": "wrong=153,chance=0.4", "split": "split=3,chance=0.4",
    "delay": "delay=3,chance=0.4", "lag": "lag=2,chance=0.4", "bit-errors": "",
}
_SAME_BYTES = ("merge", "split", "delay", "lag", "late")


def cases(bench: Bench) -> List[str]:
    return list(_FAULTS)


def _answers(device: str) -> bytes:
    """What the handset says to loopbacks, each sent when the last has been answered or has not."""
    port = os.open(device, os.O_RDWR | os.O_NOCTTY)
    try:
        tty.setraw(port)
        answers = b""
        for number in range(_REQUESTS):
            os.write(port, frame(bytes([123, number]) + b"same seed"))
            while select.select([port], [], [], _QUIET_S)[0]:
                answers += os.read(port, 4096)
        return answers
    finally:
        os.close(port)


def _conversation(fault: str, seed: int) -> bytes:
    words = ["--fault", _FAULTS[fault]] if _FAULTS[fault] else ["--bit-errors", "0.002"]
    with subprocess.Popen([os.environ["KRAL_TOOL"], "sim", "--seed", str(seed), *words], stdin=subprocess.DEVNULL,
                          stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True) as handset:
        try:
            assert handset.stdout is not None
            return _answers(handset.stdout.readline().strip())
        finally:
            handset.terminate()


def run(bench: Bench, case: str) -> None:
    seed = bench.random(case).randrange(1, 1 << 31)
    begin = time.monotonic()
    first, second, other = (_conversation(case, number) for number in (seed, seed, seed + 1))
    check(time.monotonic() - begin < _LONGEST_S, "it takes too long to say anything")
    check(len(first) > 0, "the handset says nothing")
    check(first == second, f"the same seed {seed}, and {first.hex()} is not {second.hex()}")
    check(first != other or case in _SAME_BYTES, f"seeds {seed} and {seed + 1} give the same")
    bench.count("conversations", 3)
