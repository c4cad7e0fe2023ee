"""Every split of the bytes gives the same result."""
from __future__ import annotations

from typing import List

from torture import calls
from torture.bench import MODES, Bench, check, connected
from torture.peer.codec import frame
from torture.peer.line import CallerLine, Line
from torture.peer.phone import Phone, log

NUMBER = 3
TITLE = "Every split of the bytes gives the same result"
SHORT = 20
AT_ONCE = 2
_TIME_OUT_MS = 3000
# One of each kind: short, long, with escapes, texts, a subsystem's.
_CALLS = ("get-switches", "build", "read-item", "peek", "file-status")
_WAYS = ("cut", "bytewise", "after-log", "between-logs", "joined")


def cases(bench: Bench) -> List[str]:
    return [f"{call}/{way}/{mode}" for call in _CALLS for way in _WAYS for mode in MODES]


def _phone() -> Phone:
    phone = calls.prepare(Phone(calls.SERIAL))
    phone.switches = 0x7E7D  # both have to be escaped
    phone.memory.update((0x1000 + i, 0x7D + i % 2) for i in range(8))
    return phone


def _pieces(reply: bytes, way: str, at: int) -> List[bytes]:
    note = frame(log(0x1000, b"\x7e\x7dlog"))
    if way == "bytewise":
        return [reply[i:i + 1] for i in range(len(reply))]
    whole = {"cut": reply, "after-log": note + reply, "between-logs": note + reply + note,
             "joined": b"\x7e" + note + b"\x7e\x7e" + note + reply}[way]
    return [whole[:at], whole[at:]]


def run(bench: Bench, case: str) -> None:
    call_name, way, mode = case.split("/")
    call = calls.CALLS[call_name]
    at = [0]
    last = [0]

    def behaviour(request: bytes, line: Line) -> None:
        answer = line.phone.answer(request)
        assert answer is not None
        pieces = _pieces(frame(answer), way, at[0])
        last[0] = 0 if way == "bytewise" else sum(map(len, pieces))
        # Each piece is one read, and a read that finds nothing lies between them.
        for i, piece in enumerate(pieces):
            line.send(piece, i * 0.0005)

    line = CallerLine(_phone(), bench.caller_port())
    with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
        result, expected = call.run(handle)
        check(result == 1, f"a handset that works gave {result}, {expected!r}")
        line.behaviour = behaviour
        while at[0] <= last[0]:
            result, value = call.run(handle)
            check(result == 1 and value == expected, f"cut at {at[0]} of {last[0]}: {result}, {value!r}")
            bench.count("splits")
            at[0] += 1
