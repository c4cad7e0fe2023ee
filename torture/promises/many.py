"""Fifty handsets in one process, a thread for each: connects, requests, disconnects, every answer of the right one."""
from __future__ import annotations

import contextlib
import random
import struct
import threading
from typing import Any, Dict, List

import kral
from torture import calls
from torture.bench import CONTEXTS, LINUX, MODES, WINDOWS, Bench, check, connected
from torture.peer.phone import Phone

NUMBER = 8
TITLE = "50 handsets in one process"
SHORT = CONTEXTS
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = CONTEXTS
_TIME_OUT_MS = 20000
_ROUNDS = 40
_ROUNDS_SHORT = 2
_REQUESTS = 60
_REQUESTS_SHORT = 20
_FIRST_SERIAL = 0x80000100
# All begin a round at the same moment, with short connects. One that runs alone waits for no longer.
_IN_STEP = threading.Barrier(CONTEXTS)
_LONGEST_STEP_S = 30.0
_SHORT_CONNECTS = 10


def cases(bench: Bench) -> List[str]:
    return [f"{number}" for number in range(CONTEXTS)]


def _phone(serial: int) -> Phone:
    """Everything that it says is its own."""
    phone = Phone(serial)
    phone.switches = serial & 0xFFFF
    phone.set_item(906, struct.pack("<I", serial) * 32)
    phone.files.put(calls.FILE, struct.pack("<I", serial) * (serial % 300 + 1))
    for i in range(16):
        phone.memory[0x1000 + i] = serial + i & 0xFF
    return phone


def _expected(serial: int) -> Dict[str, Any]:
    data = struct.pack("<I", serial)
    return {
        "serial": serial,
        "get-switches": serial & 0xFFFF,
        "read-item": (data * 32, 0),
        "peek": bytes(serial + i & 0xFF for i in range(8)),
        "file-status": (0, 4 * (serial % 300 + 1)),
        "read-file": data * (serial % 300 + 1),
    }


def _connect_shortly(bench: Bench, port: int, serial: int, mode: int) -> None:
    phone = _phone(serial)
    with contextlib.suppress(threading.BrokenBarrierError):
        _IN_STEP.wait(_LONGEST_STEP_S)
    for _ in range(_SHORT_CONNECTS):
        with connected(bench.line(phone, port), mode, _TIME_OUT_MS) as handle:
            result, value = calls.CALLS["serial"].run(handle)
            check(result == 1 and value == serial, f"handset {serial:X}, a short connect: {result}, {value!r}")
        bench.count("connects")


def _round(bench: Bench, port: int, serial: int, numbers: random.Random) -> None:
    expected = _expected(serial)
    mode = numbers.choice(list(MODES.values()))
    _connect_shortly(bench, port, serial, mode)
    line = bench.line(_phone(serial), port)
    with connected(line, mode, _TIME_OUT_MS) as handle:
        for _ in range(_REQUESTS_SHORT if bench.short else _REQUESTS):
            name = numbers.choice(list(expected))
            result, value = calls.CALLS[name].run(handle)
            check(result == 1 and value == expected[name], f"handset {serial:X}, {name}: {result}, {value!r}")
        if numbers.random() < 0.5:  # a second connect of the port counts, and keeps the first one's handle
            again = line.connect(mode)
            check(again == handle, f"a second connect to the port gave {again:X}, not {handle:X}")
            kral.api().KRAL_DisconnectServer(again)
        bench.count("requests", len(line.requests))
    bench.count("connects")


def run(bench: Bench, case: str) -> None:
    serial = _FIRST_SERIAL + int(case)
    numbers = bench.random(case)
    with bench.port() as port:
        try:
            for _ in range(_ROUNDS_SHORT if bench.short else _ROUNDS):
                _round(bench, port, serial, numbers)
        except BaseException:
            _IN_STEP.abort()
            raise
