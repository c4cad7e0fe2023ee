"""What a promise's program is given: its ports, its random numbers, its clock, and a place for what it found."""
from __future__ import annotations

import collections
import ctypes
import hashlib
import os
import pathlib
import random
import shutil
import tempfile
import threading
import time
from typing import Any, Callable, Counter, Deque, Dict, Iterator, Optional, Tuple

import contextlib

import kral
from kral import _api
from torture import process
from torture.peer.line import CallerLine, Line, Ports, PtyLine
from torture.peer.phone import Phone
from torture.windows import driver

# Milliseconds that the calls under trial are given, where nothing else is said.
TIME_OUT_MS = 200
# Connects need a context for each port; one process has 50.
CONTEXTS = 50
MODES = {"poll": _api.KRAL_RECEIVE_MODE_POLL, "wake": _api.KRAL_RECEIVE_MODE_WAKE}
_CALLER_PORTS = 1000
# COM ports whose numbers are no serial port's of the machine: with its link gone, a low number would be one.
_FIRST_COM_PORT = 200


LINUX, WINDOWS = "linux", "windows-x86"


def platform() -> str:
    """That of the library under trial."""
    return WINDOWS if os.environ.get("KRAL_LIBRARY", "").endswith(".dll") else LINUX


class Broken(Exception):
    """A promise was not kept."""


class Lateness:
    """How late this machine is to wake a thread up: what a time limit is allowed beside itself.

    A thread that only sleeps notes by how much each sleep was too long. A call that waits while the machine is busy
    loses no more than it.
    """

    _SLEEP = 0.004
    # More than the longest time that is asked for, and no more: it would look as if the library grew.
    _KEPT = 10000

    def __init__(self, sleep: Callable[[float], Any] = time.sleep, slack: float = 0.001) -> None:
        """`slack` is what a sleep is always late by: the timer's own."""
        self._sleep, self._slack = sleep, slack
        self._late: Deque[Tuple[float, float]] = collections.deque(maxlen=self._KEPT)
        self._stop = False
        self._thread = threading.Thread(target=self._run, daemon=True)
        self._thread.start()

    def _run(self) -> None:
        while not self._stop:
            begin = time.monotonic()
            self._sleep(self._SLEEP)
            end = time.monotonic()
            self._late.append((end, end - begin - self._SLEEP))

    def between(self, begin: float, end: float) -> float:
        """Seconds by which the machine was late in that time, all in all."""
        while self._late and self._late[-1][0] < end:  # the sleep that was under way at the end counts, too
            time.sleep(self._SLEEP)
        sleeps = [late for when, late in list(self._late) if when >= begin and when - late <= end + self._SLEEP]
        return sum(max(0.0, late - self._slack) for late in sleeps)

    def stop(self) -> None:
        self._stop = True
        self._thread.join()


class Bench:
    """One for a run of a promise; the cases of the run share it, some of them at the same time."""

    def __init__(self, promise: int, seed: int, folder: pathlib.Path, short: bool) -> None:
        self.promise = promise
        self.seed = seed
        self.short = short
        self.folder = folder
        self.ports = Ports(pathlib.Path(tempfile.mkdtemp(prefix="ports", dir=folder)))
        self.figures: Counter[str] = collections.Counter()
        self.worst: Counter[str] = collections.Counter()
        self._lock = threading.Lock()
        self._next_port = _CALLER_PORTS
        self._free = list(range(_FIRST_COM_PORT, _FIRST_COM_PORT + CONTEXTS))
        self.driver: Optional[driver.Driver] = None
        if platform() != LINUX:
            self.driver = self._start_driver()
        self.lateness = Lateness() if self.driver is None else Lateness(self.driver.sleep, driver.SLACK)

    def _start_driver(self) -> driver.Driver:
        """The library in a process of the other system, where its ports have the same numbers."""
        shutil.copy(os.environ["KRAL_LIBRARY"], self.folder)
        started = driver.Driver(self.folder, {port: str(self.ports.path(port)) for port in self._free})
        remote = driver.RemoteApi(started)
        setattr(kral, "api", lambda: remote)
        return started

    def random(self, case: str) -> random.Random:
        """The same numbers for the same case and seed, whatever else runs."""
        text = f"{self.seed}/{self.promise}/{case}".encode()
        return random.Random(int.from_bytes(hashlib.sha256(text).digest()[:8], "little"))

    def count(self, what: str, number: int = 1) -> None:
        with self._lock:
            self.figures[what] += number

    def note(self, what: str, value: float) -> None:
        """The largest value is shown."""
        with self._lock:
            self.worst[what] = max(self.worst.get(what, round(value)), round(value))

    def caller_port(self) -> int:
        with self._lock:
            self._next_port += 1
            return self._next_port

    @contextlib.contextmanager
    def com_port(self) -> Iterator[int]:
        """A number that a COM port may have, for as long as it is used."""
        with self._lock:
            number = self._free.pop(0)
        try:
            yield number
        finally:
            with self._lock:
                self._free.append(number)

    @contextlib.contextmanager
    def port(self) -> Iterator[int]:
        """A number for lines, one after the other: a caller's transports where the library can be given them."""
        if self.driver is None:
            yield self.caller_port()
            return
        with self.com_port() as port:
            yield port

    def line(self, phone: Phone, port: int) -> Line:
        """`port` is one of port()."""
        return CallerLine(phone, port) if self.driver is None else PtyLine(phone, self.ports, port)

    def state(self) -> Dict[str, int]:
        """What the process of the library has of the system."""
        return process.state() if self.driver is None else self.driver.state()

    def close(self) -> None:
        self.lateness.stop()
        if self.driver is not None:
            self.driver.close()


def check(good: bool, text: str) -> None:
    if not good:
        raise Broken(text)


def set_time_outs(handle: int, command: int = TIME_OUT_MS) -> None:
    """Short ones: those for answers and for writing as given, the delays after a switch as good as none."""
    for number in range(20):
        delay = number in (11, 12, 13, 14, 15)
        kral.api().KRAL_ConfigureTimeOut(handle, number, 1 if delay else command)


def timed(call: Callable[[], Any]) -> Tuple[Any, float, float]:
    begin = time.monotonic()
    result = call()
    return result, begin, time.monotonic()


def last_error(handle: int) -> Tuple[int, str]:
    record = _api.KRAL_ERROR()
    if not kral.api().KRAL_GetLastError(handle, ctypes.byref(record)):
        return 0, ""
    return record.code, record.text.decode()


def wait_until(condition: Callable[[], bool], seconds: float, text: str) -> None:
    end = time.monotonic() + seconds
    while not condition():
        if time.monotonic() > end:
            raise Broken(text)
        time.sleep(0.001)


@contextlib.contextmanager
def connected(line: Line, mode: int, command: int = TIME_OUT_MS) -> Iterator[int]:
    """A handle on a line, with short time-outs."""
    handle = line.connect(mode)
    check(handle != 0, "no handle")
    set_time_outs(handle, command)
    try:
        yield handle
    finally:
        line.close()
