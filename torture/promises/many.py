"""Fifty handsets in one process, a thread for each: connects, requests, disconnects, every answer of the right one."""
from __future__ import annotations

import struct
from typing import Any, Dict, List

import kral
from torture import calls
from torture.bench import CONTEXTS, MODES, Bench, check, connected
from torture.peer.line import CallerLine
from torture.peer.phone import Phone

NUMBER = 8
TITLE = "50 handsets in one process"
SHORT = CONTEXTS
AT_ONCE = CONTEXTS
_TIME_OUT_MS = 20000
_ROUNDS = 40
_ROUNDS_SHORT = 3
_REQUESTS = 60
_FIRST_SERIAL = 0x80000100


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


def run(bench: Bench, case: str) -> None:
    serial = _FIRST_SERIAL + int(case)
    numbers = bench.random(case)
    expected = _expected(serial)
    port = bench.caller_port()
    for _ in range(_ROUNDS_SHORT if bench.short else _ROUNDS):
        mode = numbers.choice(list(MODES.values()))
        line = CallerLine(_phone(serial), port)
        with connected(line, mode, _TIME_OUT_MS) as handle:
            for _ in range(_REQUESTS):
                name = numbers.choice(list(expected))
                result, value = calls.CALLS[name].run(handle)
                check(result == 1 and value == expected[name], f"handset {serial:X}, {name}: {result}, {value!r}")
            if numbers.random() < 0.5:  # a second connect of the port counts, and keeps the first one's handle
                again = kral.api().KRAL_ConnectServer_UserDefinedTransport(port, 1, 2, *line.functions)
                check(again == handle, f"a second connect to the port gave {again:X}, not {handle:X}")
                kral.api().KRAL_DisconnectServer(again)
            bench.count("requests", len(line.requests))
        bench.count("connects")
