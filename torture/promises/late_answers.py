"""A late or doubled answer never satisfies another request, where the protocol lets the library know.

Answers that repeat their request are compared with it. Those that repeat nothing can only be told apart by a loopback
in front of the next request (KRAL_SetResynchronise), which follows a request without an answer: a doubled answer that
repeats nothing cannot be told at all, and is not tried here.
"""
from __future__ import annotations

import ctypes
import dataclasses
import struct
from typing import Any, Callable, Dict, List, Tuple

import kral
from torture import calls
from torture.bench import MODES, Bench, check, connected
from torture.peer.codec import frame
from torture.peer.line import WORKS, CallerLine, Line
from torture.peer.phone import Phone

NUMBER = 6
TITLE = "A late or doubled answer never satisfies another request, where the protocol lets us know"
SHORT = 40
AT_ONCE = 8
_TIME_OUT_MS = 120
_ROUNDS = 4
_LOOPBACK = 123
_ITEMS = range(100, 140)
_FILES = 30


@dataclasses.dataclass(frozen=True)
class Family:
    """`ask` gets a key of `keys`; answers to two different keys differ."""

    ask: Callable[[int, int], calls.Outcome]
    keys: range
    # What the answer must be. None: that there was one says it all.
    expected: Callable[[int], Any]
    repeats: bool


def _value(item: int, context: int = 0) -> bytes:
    return bytes((item * 3 + context * 5 + i) & 0xFF for i in range(128))


def _poke(handle: int, key: int) -> calls.Outcome:
    status = ctypes.c_uint8(0xA5)
    result = kral.api().KRAL_DIAG_MEMORY_POKE_F(handle, 0x9000 + key, 2, b"ab", ctypes.byref(status))
    return result, status.value


def _raw(key: int) -> bytes:
    """A peek, whose answer begins with the request; here the library does not know what repeats what."""
    return struct.pack("<BIH", 2, 0x1000 + key, 8)


def _send(handle: int, key: int) -> calls.Outcome:
    return calls.send("KRAL_SendSync", _raw(key), _TIME_OUT_MS)(handle)


FAMILIES: Dict[str, Family] = {
    "item": Family(calls.read_item, range(100, 140), lambda key: (_value(key), 0), True),
    "item-of": Family(lambda handle, key: calls.read_item_of(handle, 100, key), range(1, 5),
                      lambda key: (_value(100, key), 0), True),
    "element": Family(lambda handle, key: calls.read_element(handle, 100, key), range(0, 60),
                      lambda key: (_value(100)[key:key + 8], 0), True),
    "write-item": Family(calls.write_item, range(200, 240), lambda key: 0, True),
    "serial": Family(lambda handle, key: calls.read_item(handle, 100 + key) if key else
                     calls.CALLS["serial"].run(handle), range(0, 2),
                     lambda key: (_value(100 + key), 0) if key else calls.SERIAL, True),
    "peek": Family(calls.peek, range(0x1000, 0x1100),
                   lambda key: bytes((key + i) * 7 & 0xFF for i in range(8)), True),
    "poke": Family(_poke, range(0, 100), lambda key: 0, True),
    "test-mode": Family(lambda handle, key: calls.CALLS[("channel", "transmit")[key]].run(handle), range(0, 2),
                        lambda key: None, True),
    "file-status": Family(lambda handle, key: calls.status_of(handle, f"/data/{key}"), range(1, _FILES),
                          lambda key: (0, key), False),
    "read-file": Family(lambda handle, key: calls.read_file(handle, f"/data/{key}"), range(1, _FILES),
                        lambda key: bytes([key]) * key, False),
    "send": Family(_send, range(0, 250), _raw, False),
}


def cases(bench: Bench) -> List[str]:
    # Behind a doubled answer no loopback goes out: nothing told that something was wrong.
    late = [f"{name}/{what}/{mode}/{resynchronise}" for name, family in FAMILIES.items()
            for what in ("late", "late-alone") for mode in MODES
            for resynchronise in (("off", "on") if family.repeats else ("on",))]
    return late + [f"{name}/doubled/{mode}/off" for name, family in FAMILIES.items() if family.repeats
                   for mode in MODES]


def _phone() -> Phone:
    phone = calls.prepare(Phone(calls.SERIAL))
    for item in _ITEMS:
        for context in range(5):
            phone.set_item(item, _value(item, context), context)
    for key in range(1, _FILES):
        phone.files.put(f"/data/{key}", bytes([key]) * key)
    return phone


class _Trick:
    """Answers in order; the first answer is held back, or comes again, when the next request is there."""

    def __init__(self, doubled: bool, alone: bool) -> None:
        self._doubled, self._alone = doubled, alone
        self._held: List[bytes] = []
        self._armed = True
        # Whether a request behind the first one has got its own answer.
        self.answered = False

    def __call__(self, request: bytes, line: Line) -> None:
        answer = line.phone.answer(request)
        assert answer is not None
        if self._armed:
            self._armed = False
            self._held.append(frame(answer))
            if self._doubled:
                line.send(frame(answer))
            return
        for late in self._held:
            line.send(late)
        self._held.clear()
        if not self._alone or request[0] == _LOOPBACK:
            line.send(frame(answer))
            self.answered = self.answered or request[0] != _LOOPBACK


def _two(bench: Bench, case: str, family: Family) -> List[Tuple[int, int]]:
    numbers = bench.random(case)
    return [(pair[0], pair[1]) for pair in (numbers.sample(family.keys, 2) for _ in range(_ROUNDS))]


def _try(line: Line, family: Family, keys: Tuple[int, int], trick: _Trick, alone: bool) -> None:
    first, second = keys
    line.behaviour = trick
    family.ask(line.handle, first)
    result, value = family.ask(line.handle, second)
    line.behaviour = WORKS
    text = f"asked for {first}, then for {second}: {result}, {value!r}"
    if result == 0:
        # The line is as it was before: what was late has been passed over, or goes with the failed request.
        check(alone, text)
        return
    check(value == family.expected(second), text)
    # A transfer tries again, and the second try has its own answer.
    check(not alone or trick.answered, f"{text}, and the handset had not answered")


def run(bench: Bench, case: str) -> None:
    name, what, mode, resynchronise = case.split("/")
    family = FAMILIES[name]
    alone = what == "late-alone"
    line = CallerLine(_phone(), bench.caller_port())
    with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
        kral.api().KRAL_SetResynchronise(handle, resynchronise == "on")
        for keys in _two(bench, case, family):
            _try(line, family, keys, _Trick(what == "doubled", alone), alone)
            bench.count("late or doubled answers")
            # A try without an answer leaves the next one to begin with a loopback: it ends here.
            family.ask(handle, keys[0])
