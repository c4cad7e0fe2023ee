"""A mixed station for long: 8 handsets, each with a thread of its own that transfers files, backs up, asks in floods of
logs, and has its cable pulled, all at random. What a call gives must be right; nothing may grow.
"""
from __future__ import annotations

import dataclasses
import os
import pathlib
import threading
import time
from typing import Callable, Dict, List

import kral
from torture import calls, process
from torture.bench import MODES, Bench, Broken, check, last_error, set_time_outs
from torture.peer.codec import frame
from torture.peer.line import PtyLine
from torture.peer.phone import Phone, log

NUMBER = 0
_HANDSETS = 8
_FIRST_SERIAL = 0x80000200
_TIME_OUT_MS = 8000
_FILE = 60000
_LOGS = 2000
_COMMANDS = ("serial", "read-item", "peek", "file-status", "channel", "read-file", "put-item", "log-ranges")
# The least of these shares of the time is compared: what is under way at one moment is not in it. The first fills
# caches.
_BEFORE, _AFTER = (0.2, 0.4), (0.8, 1.0)
_ALLOWED_KIB = 2048
# The allocator keeps free memory for each of its arenas, and takes more of it as more coincides.
_ALLOWED_OF_PROCESS_KIB = 16384
_WATCH_S = 5.0
_LONGEST_DEED_S = 120.0


class _Station:
    """One handset, its cable, and what is done with it."""

    def __init__(self, bench: Bench, number: int, port: int, mode: int) -> None:
        self._bench, self._port, self._mode = bench, port, mode
        self._numbers = bench.random(f"handset {number}")
        self._serial = _FIRST_SERIAL + number
        self._phone = calls.prepare(Phone(self._serial))
        for item in range(40):
            self._phone.set_item(item + 300, bytes([item, number]) * 64)
        self._line = PtyLine(self._phone, bench.ports, port)
        self._backup = b""
        self.began = 0.0
        self.wrong: List[str] = []
        self._connect()

    def _connect(self) -> None:
        check(self._line.connect(self._mode) != 0, "no handle")
        set_time_outs(self._line.handle, _TIME_OUT_MS)
        kral.api().KRAL_DIAG_SetPhoneLoggingState(self._line.handle, 1)

    def _write(self) -> None:
        data = self._numbers.randbytes(self._numbers.randrange(_FILE))
        result, _ = calls.write_file(self._line.handle, data)
        self._must(result, "write")
        check(self._phone.files.files["/data/new"] == data, "a file was written wrongly")

    def _read(self) -> None:
        data = self._numbers.randbytes(self._numbers.randrange(1, _FILE))
        self._phone.files.put("/data/large", data)
        result, value = calls.read_file(self._line.handle, "/data/large", _FILE)
        self._must(result, "read")
        check(value == data, "a file was read wrongly")

    def _back_up(self) -> None:
        file = pathlib.Path(f"soak{self._port}.pkv")
        self._must(calls.back_up(self._line.handle, (300, 340), os.fsencode(file)), "back up")
        self._backup = self._backup or file.read_bytes()
        check(file.read_bytes() == self._backup, "a backup is another one")

    def _flood(self) -> None:
        sent = [0]

        def source() -> bytes:
            if sent[0] >= _LOGS:
                return b""
            sent[0] += 20
            return frame(log(0x1000, bytes(60))) * 20
        self._line.source = source
        while sent[0] < _LOGS:
            self._commands()
        self._line.source = None
        self._bench.count("logs", sent[0])

    def _commands(self) -> None:
        for _ in range(5):
            name = self._numbers.choice(_COMMANDS)
            expected = self._serial if name == "serial" else calls.CALLS[name].expected
            result, value = calls.CALLS[name].run(self._line.handle)
            self._must(result, name)
            check(value == expected, f"{name} gave {value!r}")

    def _unplug(self) -> None:
        """In the middle of something, which may be done before; what comes back is the same handset."""
        pull = threading.Timer(self._numbers.uniform(0, 0.05), self._line.unplug)
        pull.start()
        calls.write_file(self._line.handle, bytes(_FILE))
        calls.read_item(self._line.handle)
        pull.join()
        self._line.drop_pieces()
        self._phone.files.start_anew()
        self._line.plug()
        result, value = calls.CALLS["serial"].run(self._line.handle)
        self._must(result, "the first request of a port that is back")
        check(value == self._serial, f"another handset answers: {value:X}")

    def _reconnect(self) -> None:
        kral.api().KRAL_DisconnectServer(self._line.handle)
        self._connect()

    def _must(self, result: int, what: str) -> None:
        if not result:
            raise Broken(f"{what} failed: {last_error(self._line.handle)}")

    def deed(self) -> None:
        deeds: Dict[Callable[[], None], int] = {self._commands: 6, self._write: 3, self._read: 3, self._back_up: 2,
                                                self._flood: 2, self._unplug: 1, self._reconnect: 1}
        deed = self._numbers.choices(list(deeds), list(deeds.values()))[0]
        self.began = time.monotonic()
        try:
            deed()
        except Exception as error:  # pylint: disable=broad-except
            self.wrong.append(f"handset {self._serial:X}, {deed.__name__.strip('_')}: {error}")
        self._bench.count(deed.__name__.strip("_"))
        self._line.requests.clear()

    def close(self) -> None:
        self._line.close()


@dataclasses.dataclass(frozen=True)
class _Sample:
    share: float
    allocated: int
    of_process: int


def _gained(samples: List[_Sample], what: str) -> int:
    before, after = ([int(getattr(sample, what)) for sample in samples if begin <= sample.share <= end]
                     for begin, end in (_BEFORE, _AFTER))
    check(bool(before and after), "too short to tell what grew")
    return min(after) - min(before)


def _watch(bench: Bench, stations: List[_Station], threads: List[threading.Thread], end: float) -> List[str]:
    """What grew, or hung."""
    begin = time.monotonic()
    samples: List[_Sample] = []
    while any(thread.is_alive() for thread in threads):
        time.sleep(_WATCH_S)
        now, at = bench.state(), time.monotonic()
        samples.append(_Sample((at - begin) / (end - begin), process.allocated(), now["memory"]))
        bench.note("most memory, KiB", now["memory"])
        bench.note("most descriptors", now["descriptors"])
        bench.note("most threads", now["threads"])
        hung = [station for station in stations if not station.wrong and at - station.began > _LONGEST_DEED_S]
        if hung and at < end + _LONGEST_DEED_S:
            return [f"{len(hung)} handsets hang"]
        if at > end:
            break
    gained, of_process = (_gained(samples, what) for what in ("allocated", "of_process"))
    bench.note("KiB in use gained", gained)
    bench.note("KiB of the process gained", of_process)
    grown = gained > _ALLOWED_KIB or of_process > _ALLOWED_OF_PROCESS_KIB
    return [f"{gained} KiB more in use, {of_process} KiB in the process"] if grown else []


def run(bench: Bench, minutes: float) -> List[str]:
    """What was wrong."""
    end = time.monotonic() + minutes * 60
    first = bench.state()
    ports = [bench.com_port() for _ in range(_HANDSETS)]
    modes = list(MODES.values())
    stations = [_Station(bench, number, port.__enter__(), modes[number % len(modes)])
                for number, port in enumerate(ports)]

    def work(station: _Station) -> None:
        while time.monotonic() < end and not station.wrong:
            station.deed()
    threads = [threading.Thread(target=work, args=(station,), daemon=True) for station in stations]
    for thread in threads:
        thread.start()
    wrong = _watch(bench, stations, threads, end)
    for thread in threads:
        thread.join(_LONGEST_DEED_S)
    for station in stations:
        wrong += station.wrong
        station.close()
    last = bench.state()
    for what in ("descriptors", "threads"):
        if last[what] > first[what]:
            wrong.append(f"{last[what] - first[what]} {what} are left")
    return wrong
