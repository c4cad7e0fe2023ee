"""Handsets that lie: mutated answers to every call, under ASan and UBSan where such a build is there."""
from __future__ import annotations

import ctypes
from typing import Callable, Dict, List

import kral
from torture import calls
from torture.bench import MODES, Bench, connected
from torture.peer.codec import frame
from torture.peer.line import CallerLine, Line
from torture.peer.mutations import mutate
from torture.peer.phone import Phone

NUMBER = 12
TITLE = "Lying handsets do no harm"
SHORT = 12
AT_ONCE = 6
SANITIZER = "asan"
_TIME_OUT_MS = 8
_ROUNDS = 2000
_ROUNDS_SHORT = 60
# Their requests have time-outs of their own, of seconds.
_SLOW = ("list", "make-folder", "write-file", "stream-security")
_SLOW_ROUNDS = 40
_SLOW_ROUNDS_SHORT = 1
# Of the answers of a call, how many are lies: the others let it get on to later ones.
_LIES = 0.6


def _back_up(handle: int) -> calls.Outcome:
    status = ctypes.c_uint32()
    name = f"liar{handle}.pkv".encode()
    result = calls.back_up(handle, (300, 306), name)
    return kral.api().KRAL_PKV_Verify(handle, name, ctypes.byref(status)) and result, None


def _write_many(handle: int) -> calls.Outcome:
    outputs = ctypes.c_uint16(), ctypes.c_uint16(), ctypes.c_uint8()
    kral.api().KRAL_DIAG_NV_WRITE_SetBatchMode(handle, 1)
    for item in range(20):
        calls.write_item(handle, 400 + item, bytes(100))
    return kral.api().KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle, *map(ctypes.byref, outputs)), None


# Beside those of calls.py.
MORE: Dict[str, Callable[[int], calls.Outcome]] = {
    "back-up": _back_up,
    "write-file": calls.write_file,
    "list": calls.list_folder,
    "write-many": _write_many,
    "add-log": calls.plain("KRAL_DIAG_AddExtendedLogCode", 1, 0x1001),
    "clear-logs": calls.plain("KRAL_DIAG_ClearAllLogCodes", 1),
    "set-event": calls.plain("KRAL_DIAG_SetEventMaskBit", 17, 1),
    "mode": calls.plain("KRAL_DIAG_CONTROL_F", 4),
    "stream-hello": calls.plain("KRAL_STREAM_HELLO", 0, None, None),
    "stream-security": calls.plain("KRAL_STREAM_SECURITY_MODE", 1),
    "get-item-file": calls.plain("KRAL_Efs2GetItem", b"liar.item", calls.ITEM_FILE.encode(), 1024),
    "file-system": calls.plain("KRAL_EFS2_DIAG_STATFS", b"/", None, None),
    "device": calls.plain("KRAL_EFS2_DIAG_DEV_INFO", None, None),
    "sync": calls.plain("KRAL_EFS2_SyncWithWait", b"/", 20),
}
_OPERATIONS = {**{name: call.run for name, call in calls.CALLS.items() if name not in ("send", "send-raw")}, **MORE}


def cases(bench: Bench) -> List[str]:
    return [f"{name}/{mode}" for name in _OPERATIONS for mode in MODES]


def _rounds(name: str, short: bool) -> int:
    if name in _SLOW:
        return _SLOW_ROUNDS_SHORT if short else _SLOW_ROUNDS
    return _ROUNDS_SHORT if short else _ROUNDS


def run(bench: Bench, case: str) -> None:
    name, mode = case.split("/")
    numbers = bench.random(case)

    def behaviour(request: bytes, line: Line) -> None:
        answer = line.phone.answer(request) or request
        if numbers.random() < _LIES:
            answer = mutate(answer, numbers)
            bench.count("lies")
        # An event report or a log in front of the answer lies, too.
        if numbers.random() < 0.2:
            line.send(frame(mutate(numbers.choice((b"\x60", b"\x10", b"\x79")) + numbers.randbytes(40), numbers)))
        line.send(frame(answer))

    line = CallerLine(calls.prepare(Phone(calls.SERIAL)), bench.caller_port(), behaviour)
    with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
        kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
        kral.api().KRAL_STREAM_ConfigureHello(handle, 1, 5)
        for _ in range(_rounds(name, bench.short)):
            _OPERATIONS[name](handle)
