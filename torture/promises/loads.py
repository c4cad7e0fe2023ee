"""The DLL is loaded and freed as often as one likes, with connections closed or left open.

Freed with a connection open it stays, and goes on; once that is closed, it goes.
"""
from __future__ import annotations

from typing import Callable, Dict, List

import kral
from torture import calls
from torture.bench import MODES, WINDOWS, Bench, check, wait_until
from torture.peer.line import Line
from torture.peer.phone import Phone
from torture.windows.driver import Driver

NUMBER = 17
TITLE = "The DLL can be loaded and freed without an end"
SHORT = 2
AT_ONCE = 1
PLATFORMS = (WINDOWS,)
_ROUNDS = 200
_ROUNDS_SHORT = 10
# Rounds until caches of the system are full.
_WARM = 3
_TIME_OUT_MS = 2000
_GONE_S = 5.0
# What the library keeps until the process ends is not given back; the thread library in it keeps two handles for the
# thread that frees it, and up to three for a lock of its own.
_HANDLES_A_ROUND = 5
# What the DLL needs of the system stays loaded: loaded and freed itself, it keeps keys of the registry open under Wine.
_SYSTEM = ("advapi32", "ole32", "oleaut32", "setupapi", "user32", "winmm")
_ALLOWED_KIB_A_ROUND = 32


def cases(bench: Bench) -> List[str]:
    return ["closed", "open"]


def _ask(handle: int) -> None:
    result, value = calls.CALLS["serial"].run(handle)
    check(result == 1 and value == calls.SERIAL, f"a handset that works gave {result}, {value!r}")


def _closed(driver: Driver, line: Line) -> None:
    module = driver.load()
    handle = line.connect(MODES["wake"])
    _ask(handle)
    kral.api().KRAL_DisconnectServer(handle)
    driver.free(module)


def _open(driver: Driver, line: Line) -> None:
    module = driver.load()
    handle = line.connect(MODES["wake"])
    kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
    driver.free(module)
    check(driver.is_loaded(), "it has gone with a connection open")
    check(driver.load() == module, "loaded again it is another one")
    _ask(handle)
    kral.api().KRAL_DisconnectServer(handle)
    driver.free(module)


_WAYS: Dict[str, Callable[[Driver, Line], None]] = {"closed": _closed, "open": _open}


def run(bench: Bench, case: str) -> None:
    assert bench.driver is not None
    driver: Driver = bench.driver
    for name in _SYSTEM:
        check(driver.load(name) != 0, f"{name} cannot be loaded")
    while driver.is_loaded():  # once for what this loads to have its number, once for what was loaded before
        module = driver.load()
        driver.free(module)
        driver.free(module)
    rounds = _ROUNDS_SHORT if bench.short else _ROUNDS
    before: Dict[str, int] = {}
    with bench.port() as port:
        line = bench.line(calls.prepare(Phone(calls.SERIAL)), port)
        for number in range(_WARM + rounds):
            if number == _WARM:
                before = driver.state()
            _WAYS[case](driver, line)
            wait_until(lambda: not driver.is_loaded(), _GONE_S, "it stays loaded")
            bench.count("rounds")
        after = driver.state()
        line.handle = 0
        line.close()
    gained = {name: after[name] - before[name] for name in after}
    bench.note("KiB gained", gained["memory"])
    bench.note("handles gained", gained["handles"])
    check(gained["handles"] <= _HANDLES_A_ROUND * rounds, f"{gained} more after {rounds} rounds")
    check(gained["threads"] <= 0 and gained["descriptors"] <= 0, f"{gained} more after {rounds} rounds")
    check(gained["memory"] <= _ALLOWED_KIB_A_ROUND * rounds, f"{gained} more after {rounds} rounds")
