"""No silent corruption at bit error rates of 1e-6 and 1e-5 in both directions.

What a call says has been read or written must be so; calls may fail, and do. (An NV item that the handset was given
wrong is not a matter of the line: the frame check sequence guards both ways.)
"""
from __future__ import annotations

import contextlib
import ctypes
import os
import pathlib
import random
from typing import Any, Callable, Dict, List

import kral
from kral import _api
from torture import calls
from torture.bench import LINUX, MODES, WINDOWS, Bench, check, connected
from torture.peer.backups import same
from torture.peer.line import Line
from torture.peer.phone import Phone
from torture.peer.programmer import Programmer

NUMBER = 5
TITLE = "No silent corruption at bit error rates 1e-6 and 1e-5"
SHORT = 10
SHORT_WINDOWS = 3
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 4
_TIME_OUT_MS = 150
_RATES = {"1e-6": 1e-6, "1e-5": 1e-5}
# By whether the library is in this process, and whether the run is a short one.
_BYTES = {(True, False): 8 << 20, (True, True): 1 << 19, (False, False): 1 << 20, (False, True): 1 << 17}
_FILE = 200000
_READ_SIZE, _WRITE_SIZE = 4091, 4091
# Blocks whose check covers them whole, and the writes that may be under way.
_BLOCK, _WINDOW = 4096, 9
_ITEMS = range(300, 340)


class Noise:
    """Flips bits of what passes, at random distances."""

    def __init__(self, numbers: random.Random) -> None:
        self.bytes = 0
        self.flipped = 0
        self._rate, self._numbers = 1e-12, numbers
        self._next = self._distance()

    def set_rate(self, rate: float) -> None:
        self._rate = rate
        self._next = self._distance()

    def _distance(self) -> int:
        return int(self._numbers.expovariate(self._rate))

    def __call__(self, data: bytes) -> bytes:
        self.bytes += len(data)
        spoiled = bytearray(data)
        while self._next < 8 * len(data):
            spoiled[self._next // 8] ^= 1 << self._next % 8
            self.flipped += 1
            self._next += 1 + self._distance()
        self._next -= 8 * len(data)
        return bytes(spoiled)


class _Files:
    def __init__(self, line: Line, numbers: random.Random) -> None:
        self._line, self._numbers = line, numbers

    def write(self) -> bool:
        data = self._numbers.randbytes(_FILE)
        result, _ = calls.write_file(self._line.handle, data)
        check(not result or self._line.phone.files.files["/data/new"] == data, "a file was written wrongly")
        return bool(result)

    def read(self) -> bool:
        data = self._numbers.randbytes(_FILE)
        self._line.phone.files.put("/data/new", data)
        result, value = calls.read_file(self._line.handle, "/data/new", _FILE)
        check(not result or value == data, "a file was read wrongly")
        return bool(result)


class _Flash:
    """Images through the stream: packets one way, acknowledgements the other, both over the bad line."""

    def __init__(self, line: Line, numbers: random.Random) -> None:
        self._line, self._numbers = line, numbers

    def write(self) -> bool:
        data, address = self._numbers.randbytes(_FILE), self._numbers.randrange(0, 1 << 24, 4)
        outcome = ctypes.c_uint32()
        result = kral.api().KRAL_STREAM_WriteImageMem(self._line.handle, data, len(data), address, 1, None, 0,
                                                      _api.KRAL_STREAM_MULTI_IMAGE, _BLOCK, _WINDOW,
                                                      ctypes.byref(outcome))
        programmer = self._line.phone
        assert isinstance(programmer, Programmer)
        check(not result or programmer.image(address) == data, "an image is not in flash as it was given")
        return bool(result)


class _Items:
    def __init__(self, line: Line, numbers: random.Random) -> None:
        self._line, self._numbers = line, numbers
        self.reference = b""

    def one(self) -> bool:
        item, data = self._numbers.choice(_ITEMS), self._numbers.randbytes(128)
        result, status = calls.write_item(self._line.handle, item, data)
        good = bool(result) and status == 0
        check(not good or self._line.phone.item(item)[0] == data, f"item {item} was written wrongly")
        held = self._line.phone.item(item)
        result, value = calls.read_item(self._line.handle, item)
        check(not result or value[1] != 0 or value == held, f"item {item} was read wrongly")
        return good

    def back_up(self) -> bool:
        file = pathlib.Path(f"bits{self._line.handle}.pkv")
        result = calls.back_up(self._line.handle, (_ITEMS[0], _ITEMS[-1]), os.fsencode(file))
        if not self.reference:
            check(result == 1, "no backup over a good line")
            self.reference = file.read_bytes()
        check(not result or same(file.read_bytes(), self.reference), "a backup is not what the handset holds")
        return bool(result)


def _operation(what: str, line: Line, numbers: random.Random) -> Callable[[], bool]:
    files, items, flash = _Files(line, numbers), _Items(line, numbers), _Flash(line, numbers)
    operations: Dict[str, Callable[[], bool]] = {"write": files.write, "read": files.read, "items": items.one,
                                                 "back-up": items.back_up, "flash": flash.write}
    return operations[what]


def cases(bench: Bench) -> List[str]:
    return [f"{what}/{rate}/{mode}" for what in ("write", "read", "items", "back-up", "flash") for rate in _RATES
            for mode in MODES]


def _phone() -> Phone:
    """It answers as a handset and as a flash programmer."""
    phone = calls.prepare(Programmer(calls.SERIAL))
    for item in _ITEMS:
        phone.set_item(item, bytes((item + i) & 0xFF for i in range(128)))
    for folder in ("/nv/item_files/rfnv", "/nv/item_files/conf"):
        for i in range(3):
            phone.files.put(f"{folder}/{i:08}", bytes([i]) * 100, item=True)
    return phone


def run(bench: Bench, case: str) -> None:
    what, rate, mode = case.split("/")
    numbers = bench.random(case)
    noise = Noise(numbers)
    with contextlib.ExitStack() as stack:
        line = bench.line(_phone(), stack.enter_context(bench.port()))
        line.spoil = noise
        handle = stack.enter_context(connected(line, MODES[mode], _TIME_OUT_MS))
        kral.api().KRAL_SetEfsReadAndWritePacketSize(handle, _READ_SIZE, _WRITE_SIZE)
        operation: Any = _operation(what, line, numbers)
        operation()  # over a good line: what is compared later
        noise.set_rate(_RATES[rate])
        # Items go in small packets, a millisecond or more each.
        goal = _BYTES[bench.driver is None, bench.short] // (1 if what in ("read", "write", "flash") else 20)
        while noise.bytes < goal:
            bench.count("good" if operation() else "failed")
        bench.count("bytes", noise.bytes)
        bench.count("bits flipped", noise.flipped)
