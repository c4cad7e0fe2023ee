"""Threads, aborts and disconnects on one handle: no call gives another's answer, none hangs, nothing dies.

Races that leave no trace are seen by the thread sanitizer, where a library built with it is at hand.
"""
from __future__ import annotations

import random
import threading
import time
from typing import Callable, List

import kral
from torture import calls
from torture.bench import LINUX, MODES, WINDOWS, Bench, check, connected
from torture.peer.line import CallerLine, Line, PtyLine
from torture.peer.phone import Phone

NUMBER = 15
TITLE = "Threads, aborts, disconnects on one handle"
SHORT = 4
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 1
SANITIZER = "tsan"
_TIME_OUT_MS = 1000
_SECONDS = 30.0
_SECONDS_SHORT = 1.5
_ASKING = 6
_DISTURBING = 3
_LONGEST_S = 20.0
_NAMES = ("serial", "read-item", "peek", "get-switches", "file-status", "read-file", "build", "channel")


def cases(bench: Bench) -> List[str]:
    kinds = ("pty", "caller") if bench.driver is None else ("pty",)
    return [f"{kind}/{mode}" for kind in kinds for mode in MODES]


class _Crowd:
    """Threads that ask, abort, look and count, and one that connects and disconnects."""

    def __init__(self, bench: Bench, line: Line, mode: int, case: str) -> None:
        self._bench, self._line, self._mode, self._case = bench, line, mode, case
        self._end = time.monotonic() + (_SECONDS_SHORT if bench.short else _SECONDS)
        self._handle = line.handle
        self.wrong: List[str] = []

    def _ask(self, numbers: random.Random) -> None:
        name = numbers.choice(_NAMES)
        result, value = calls.CALLS[name].run(self._handle)
        # Disconnected or aborted meanwhile, it fails; it never gives anything else.
        if result and value != calls.CALLS[name].expected:
            self.wrong.append(f"{name}: {value!r}")
        self._bench.count("calls")
        self._bench.count("of them failed", int(not result))

    def _disturb(self, numbers: random.Random) -> None:
        api, handle = kral.api(), self._handle
        deeds: List[Callable[[], int]] = [
            lambda: api.KRAL_AbortEFS_Operation(handle), lambda: api.KRAL_AbortDownload(handle),
            lambda: api.KRAL_FlushRxBuffer(handle), lambda: api.KRAL_DIAG_ClearPhoneLogQueue(handle),
            lambda: api.KRAL_ConfigureTimeOut(handle, 0, _TIME_OUT_MS),
            lambda: api.KRAL_SetReceiveMode(handle, numbers.randrange(2)),
            lambda: api.KRAL_SetResynchronise(handle, numbers.randrange(2)),
        ]
        numbers.choice(deeds)()
        time.sleep(0.002)
        self._bench.count("aborts and settings")

    def _reconnect(self, numbers: random.Random) -> None:
        time.sleep(numbers.uniform(0, 0.1))
        former = self._handle
        if numbers.random() < 0.5:  # counted: the handle stays
            self._line.connect(self._mode)
        kral.api().KRAL_DisconnectServer(former)
        self._handle = self._line.connect(self._mode)
        self._bench.count("disconnects")

    def _repeat(self, what: Callable[[random.Random], None], number: int) -> None:
        numbers = self._bench.random(f"{self._case}/{number}")
        while time.monotonic() < self._end and not self.wrong:
            what(numbers)

    def run(self) -> None:
        roles = [self._ask] * _ASKING + [self._disturb] * _DISTURBING + [self._reconnect]
        threads = [threading.Thread(target=self._repeat, args=(role, number), daemon=True)
                   for number, role in enumerate(roles)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join(max(0.0, self._end + _LONGEST_S - time.monotonic()))
        check(not any(thread.is_alive() for thread in threads), "a call has not come back")
        check(not self.wrong, "; ".join(self.wrong))


def run(bench: Bench, case: str) -> None:
    kind, mode = case.split("/")
    phone = calls.prepare(Phone(calls.SERIAL))
    with bench.com_port() as port:
        line: Line = PtyLine(phone, bench.ports, port) if kind == "pty" else CallerLine(phone, bench.caller_port())
        with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
            result, value = calls.CALLS["serial"].run(handle)
            check(result == 1 and value == calls.SERIAL, f"a handset that works gave {result}, {value!r}")
            try:
                _Crowd(bench, line, MODES[mode], case).run()
            finally:
                kral.api().KRAL_DisconnectAllServers()
