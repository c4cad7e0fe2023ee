"""The ways in which a handset can fail to answer, and to answer rightly."""
from __future__ import annotations

import random
from typing import Callable, Dict

from torture.peer.codec import escape, frame
from torture.peer.line import Behaviour, Line, PtyLine
from torture.peer.phone import log

_REFUSALS = (19, 20, 21, 24)
_GARBAGE = 400
_EVERY = 0.02
_LASTS = 3.0


def again(line: Line, make: Callable[[], bytes]) -> None:
    """The same for longer than any time-out."""
    for i in range(int(_LASTS / _EVERY)):
        line.send(make(), i * _EVERY)


def _answer(request: bytes, line: Line) -> bytes:
    return line.phone.answer(request) or request


def silence(request: bytes, line: Line) -> None:
    """Nothing comes."""


def misbehaviours(numbers: random.Random, late_by: float) -> Dict[str, Behaviour]:
    """By name. `late_by` is when a late answer comes, in seconds after its request."""

    def noise(request: bytes, line: Line) -> None:
        again(line, lambda: numbers.randbytes(_GARBAGE).replace(b"\x7e", b"\x7f"))

    def noise_with_flags(request: bytes, line: Line) -> None:
        again(line, lambda: b"\x7e".join(numbers.randbytes(20) for _ in range(_GARBAGE // 20)))

    def other_code(request: bytes, line: Line) -> None:
        again(line, lambda: frame(b"\x99" + request[1:]))

    def other_answer(request: bytes, line: Line) -> None:
        """The right code, and all else is wrong."""
        again(line, lambda: frame(request[:1] + numbers.randbytes(len(_answer(request, line)))))

    def bad_check(request: bytes, line: Line) -> None:
        again(line, lambda: frame(_answer(request, line), spoil=0x1234))

    def logs(request: bytes, line: Line) -> None:
        line.source = lambda: frame(log(0x1000, bytes(100))) * 8

    def half(request: bytes, line: Line) -> None:
        whole = frame(_answer(request, line))
        line.send(whole[:len(whole) // 2])

    def trickle(request: bytes, line: Line) -> None:
        for i, byte in enumerate(frame(_answer(request, line))):
            line.send(bytes([byte]), float(i))

    def head(request: bytes, line: Line) -> None:
        """A frame with the right code and nothing else, then one without its end."""
        line.send(frame(request[:1]))
        line.send(escape(_answer(request, line)))

    def refusal(request: bytes, line: Line) -> None:
        line.send(frame(bytes([numbers.choice(_REFUSALS)]) + request))

    def late(request: bytes, line: Line) -> None:
        line.reply(request, late_by)

    return {
        "silence": silence, "noise": noise, "noise-with-flags": noise_with_flags, "other-code": other_code,
        "other-answer": other_answer, "bad-check": bad_check, "logs": logs, "half": half, "trickle": trickle,
        "head": head, "refusal": refusal, "blocked": silence, "late": late,
    }


def begin(name: str, behaviour: Behaviour, line: Line) -> None:
    """From now on. A blocked line takes nothing of what is written, either."""
    line.behaviour = behaviour
    if name == "blocked" and isinstance(line, PtyLine):
        line.block()
