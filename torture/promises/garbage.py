"""One good frame after garbage, and all is well."""
from __future__ import annotations

import random
from typing import Callable, List

import kral
from torture import calls
from torture.bench import MODES, Bench, check, connected
from torture.peer.codec import frame
from torture.peer.line import CallerLine
from torture.peer.phone import Phone, log

NUMBER = 4
TITLE = "One good frame after garbage and all is well"
SHORT = 8
AT_ONCE = 2
_TIME_OUT_MS = 3000
_BLOCKS = 20
_GARBAGES = 50
_LONGEST_FRAME = 4096


def cases(bench: Bench) -> List[str]:
    return [f"{block}/{mode}" for block in range(_BLOCKS) for mode in MODES]


def _reply(numbers: random.Random) -> bytes:
    return frame(numbers.randbytes(numbers.randrange(1, 60)))


def _garbage(numbers: random.Random) -> bytes:
    """Anything; halves of frames, what does not end, escapes and flags in every place."""
    kinds: List[Callable[[], bytes]] = [
        lambda: numbers.randbytes(numbers.randrange(1, 300)),
        lambda: bytes(numbers.choices((0x7E, 0x7D, 0x00, 0x10, 0x26, 0x5E), k=numbers.randrange(1, 100))),
        lambda: numbers.randbytes(numbers.randrange(_LONGEST_FRAME - 4, 3 * _LONGEST_FRAME)).replace(b"\x7e", b""),
        lambda: _reply(numbers)[:-1],
        lambda: _reply(numbers)[:-1] + b"\x7d",
        lambda: frame(log(0x1000, numbers.randbytes(50)))[:numbers.randrange(1, 40)],
        lambda: frame(numbers.randbytes(20), spoil=1 << numbers.randrange(16)),
        lambda: bytes(numbers.randrange(1, 5000)),
        lambda: b"\x7d" * numbers.randrange(1, 10),
        lambda: _reply(numbers),
    ]
    return b"".join(kind() for kind in numbers.choices(kinds, k=numbers.randrange(1, 4)))


def _is_collected(handle: int, packet: bytes) -> bool:
    """Takes logs until this one has come."""
    collected = calls.next_log(handle, _TIME_OUT_MS)
    while collected is not None and collected[:-2] != packet:
        collected = calls.next_log(handle, _TIME_OUT_MS)
    return collected is not None


def run(bench: Bench, case: str) -> None:
    _, mode = case.split("/")
    numbers = bench.random(case)
    line = CallerLine(calls.prepare(Phone(calls.SERIAL)), bench.caller_port())
    with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
        kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
        for number in range(_GARBAGES):
            garbage = _garbage(numbers)
            second = log(0x1001, b"the one behind the good one", number)
            line.send(garbage)
            line.send(frame(log(0x1000, b"good")))
            line.send(frame(second))
            check(_is_collected(handle, second), f"the second good frame after {garbage[-200:].hex()} is lost")
            call = calls.CALLS[numbers.choice(("serial", "read-item", "peek", "build", "get-switches", "read-file"))]
            result, value = call.run(handle)
            check(result == 1 and value == call.expected, f"after {garbage[-200:].hex()}: {result}, {value!r}")
            bench.count("garbages")
