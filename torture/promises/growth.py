"""Nothing grows: memory, descriptors and threads of a process that connects, asks, fails and disconnects for long."""
from __future__ import annotations

import contextlib
import functools
import time
from typing import Callable, Dict, Iterator, List

import kral
from torture import calls
from torture.bench import LINUX, MODES, TIME_OUT_MS, WINDOWS, Bench, check, connected
from torture.peer.codec import frame
from torture.peer.line import WORKS, CallerLine, Line, PtyLine
from torture.peer.misbehaviours import silence
from torture.peer.phone import Phone, log

NUMBER = 9
TITLE = "Nothing grows"
SHORT = 2
SHORT_WINDOWS = 1
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 1
_SECONDS = 75.0
_SECONDS_SHORT = 6.0
# Until then allocators and caches fill up.
_WARM = 0.4
# What the memory of the process may have gained: half of it is the noise of the allocator.
_ALLOWED_KIB = 2048
# A lock of the DLL gets its event when threads first meet at it.
_ALLOWED = {"memory": _ALLOWED_KIB, "handles": 8}
_FAILING_MS = 20
# Good rounds to one of each bad kind, which cost time-outs: what a request leaves behind is seen in many.
_GOOD_ROUNDS = 50


def cases(bench: Bench) -> List[str]:
    return [f"{what}/{mode}" for what in ("connects", "requests") for mode in MODES]


def _unwell(request: bytes, line: Line) -> None:
    """Logs, a wrong check sequence, no answer."""
    line.send(frame(log(0x1000, bytes(200))) * 5)
    line.send(frame(request, spoil=1))


def _requests(bench: Bench, handle: int, line: Line) -> None:
    for behaviour in (_unwell, silence, *[WORKS] * _GOOD_ROUNDS):
        line.behaviour = behaviour
        kral.api().KRAL_ConfigureTimeOut(handle, 0, TIME_OUT_MS if behaviour is WORKS else _FAILING_MS)
        for name in ("serial", "read-item", "read-file", "put-item", "log-ranges", "channel"):
            if behaviour is WORKS or name != "read-file":
                calls.CALLS[name].run(handle)
                bench.count("calls")
    line.requests.clear()


def _lines(bench: Bench, port: int) -> Iterator[Line]:
    """New ones without an end, of both kinds in turn."""
    caller_port = bench.caller_port()
    while True:
        if bench.driver is None:
            yield CallerLine(calls.prepare(Phone(calls.SERIAL)), caller_port)
        yield PtyLine(calls.prepare(Phone(calls.SERIAL)), bench.ports, port)


def _connects(bench: Bench, lines: Iterator[Line], mode: int) -> None:
    line = next(lines)
    with connected(line, mode) as handle:
        kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
        _requests(bench, handle, line)
    bench.count("connects")


def run(bench: Bench, case: str) -> None:
    what, mode = case.split("/")
    with bench.com_port() as port, contextlib.ExitStack() as open_line:
        lines = _lines(bench, port)
        work = functools.partial(_connects, bench, lines, MODES[mode])
        if what == "requests":
            line = next(lines)
            handle = open_line.enter_context(connected(line, MODES[mode]))
            kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
            work = functools.partial(_requests, bench, handle, line)
        _judge(bench, work)


def _judge(bench: Bench, work: Callable[[], None]) -> None:
    begin = time.monotonic()
    seconds = _SECONDS_SHORT if bench.short else _SECONDS
    before: Dict[str, int] = {}
    while time.monotonic() < begin + seconds:
        work()
        if not before and time.monotonic() > begin + seconds * _WARM:
            before = bench.state()
    after = bench.state()
    gained = {name: after[name] - before[name] for name in after}
    bench.note("KiB gained", gained["memory"])
    check(all(count <= _ALLOWED.get(what, 0) for what, count in gained.items()), f"{gained} more after {seconds} s")
