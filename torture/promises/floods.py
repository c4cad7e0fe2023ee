"""A flood of logs never starves commands, and what is dropped is counted exactly."""
from __future__ import annotations

import ctypes
import struct
import threading
import time
from typing import List

import kral
from torture import calls
from torture.bench import MODES, Bench, check, connected, wait_until
from torture.peer.codec import FLAG, escape
from torture.peer.line import CallerLine, Line, PtyLine
from torture.peer.phone import Phone, log

NUMBER = 7
TITLE = "A flood of logs never starves commands, and what is dropped is counted exactly"
SHORT = 8
AT_ONCE = 1
_TIME_OUT_MS = 4000
_LOGS = 70000
_LOGS_SHORT = 12000
_AT_A_TIME = 50
_COMMANDS = ("serial", "read-item", "peek", "file-status", "channel")


def cases(bench: Bench) -> List[str]:
    return [f"{line}/{reader}/{mode}" for line in ("pty", "caller") for reader in ("reader", "no-reader")
            for mode in MODES]


class _Flood:
    """Numbered logs, as fast as they are taken. Their check sequence is not looked at, and is none."""

    def __init__(self, total: int) -> None:
        self._total = total
        self.sent = 0

    def __call__(self) -> bytes:
        some = range(self.sent, min(self._total, self.sent + _AT_A_TIME))
        self.sent += len(some)
        return b"".join(escape(log(0x1000, b"flood", number) + b"\0\0") + bytes([FLAG]) for number in some)


class _Reader:
    """Takes the logs out of the queue; each must have a larger number than the one before."""

    def __init__(self, handle: int) -> None:
        self._handle = handle
        self.read = 0
        self.last = -1
        self.disorder = ""
        self._stop = False
        self._thread = threading.Thread(target=self._run)

    def start(self) -> None:
        self._thread.start()

    def stop(self) -> None:
        self._stop = True
        if self._thread.ident is not None:
            self._thread.join()

    def take(self) -> bool:
        size, area = ctypes.c_uint16(), ctypes.create_string_buffer(4096)
        buffer = ctypes.cast(area, ctypes.c_void_p)
        if not kral.api().KRAL_DIAG_GetNextPhoneLog(self._handle, ctypes.byref(size), buffer):
            return False
        number, = struct.unpack_from("<Q", area.raw, 8)
        if number <= self.last:
            self.disorder = f"log {number} behind log {self.last}"
        self.last = number
        self.read += 1
        return True

    def _run(self) -> None:
        while not self._stop:
            if not self.take():
                time.sleep(0.001)


def _command(bench: Bench, handle: int, number: int) -> None:
    name = _COMMANDS[number % len(_COMMANDS)]
    begin = time.monotonic()
    result, value = calls.CALLS[name].run(handle)
    bench.note("slowest command, ms", (time.monotonic() - begin) * 1000)
    check(result == 1 and value == calls.CALLS[name].expected, f"{name} in the flood: {result}, {value!r}")
    bench.count("commands")


def run(bench: Bench, case: str) -> None:
    kind, reads, mode = case.split("/")
    total = _LOGS_SHORT if bench.short else _LOGS
    phone = calls.prepare(Phone(calls.SERIAL))
    with bench.com_port() as port:
        line: Line = PtyLine(phone, bench.ports, port) if kind == "pty" else CallerLine(phone, bench.caller_port())
        with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
            kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
            reader = _Reader(handle)
            if reads == "reader":
                reader.start()
            flood = _Flood(total)
            line.source = flood
            try:
                _flood(bench, handle, flood, total)
            finally:
                reader.stop()
            while reader.take():
                pass
            _judge(handle, reader, total)
            bench.count("logs", total)


def _flood(bench: Bench, handle: int, flood: _Flood, total: int) -> None:
    number = 0
    while flood.sent < total or number == 0:
        _command(bench, handle, number)
        number += 1
    wait_until(lambda: int(calls.counters(handle).collected) >= total, 30, "the logs do not come")


def _judge(handle: int, reader: _Reader, total: int) -> None:
    counters = calls.counters(handle)
    check(counters.collected == total, f"{counters.collected} collected of {total} logs")
    check(reader.disorder == "", reader.disorder)
    check(reader.read + counters.dropped_logs == total,
          f"{reader.read} read and {counters.dropped_logs} dropped of {total} logs")
    check(reader.last == total - 1, f"the last log read is {reader.last} of {total}: a full queue drops the oldest")
    check(counters.bad_fcs == 0 and counters.oversized == 0, f"{counters.bad_fcs} and {counters.oversized} are bad")
