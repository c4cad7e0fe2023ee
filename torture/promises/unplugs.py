"""An unplug is reported within 500 ms, and the next request works once the port is back."""
from __future__ import annotations

import ctypes
import os
import threading
import time
from typing import Any, Callable, Dict, List, Optional

import kral
from kral import _api
from torture import calls
from torture.bench import LINUX, MODES, WINDOWS, Bench, Broken, check, connected, last_error
from torture.peer.line import WORKS, Line, PtyLine
from torture.peer.phone import Phone

NUMBER = 2
TITLE = "An unplug is reported within 500 ms; the next request works once the port is back"
SHORT = 112
SHORT_WINDOWS = 42
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 4
_ALLOWED_MS = 500
_TIME_OUT_MS = 5000
_LOST = 9
# The requests that are answered before the handset goes away in the middle of an operation.
_ANSWERED = {"write": 5, "read": 5, "list": 3, "back-up": 20, "sync": 2, "switched": 1}
# What goes on for long behind an answer, with nothing asked: then it goes away behind the last of them.
_BEHIND = "switched"
_BYTES = bytes(range(256)) * 40
_REPLUGS = 50
_OFFLINE = 1
# Another handset, so many seconds after the cable was pulled: before or behind the library's look around.
_STRANGERS = {"stranger": 0.1, "quick-stranger": 0.0}
# The delay that follows the switch.
_OFFLINE_DELAY, _OFFLINE_DELAY_MS = 13, 3000


def _back_up(handle: int) -> calls.Outcome:
    return calls.back_up(handle, (0, 40), f"{threading.get_ident()}.pkv".encode()), None


def _wait_log(handle: int) -> calls.Outcome:
    return int(calls.next_log(handle, _TIME_OUT_MS) is not None), None


def _switch(handle: int) -> calls.Outcome:
    return kral.api().KRAL_DIAG_CONTROL_F(handle, _OFFLINE), None


_OPERATIONS: Dict[str, Callable[[int], calls.Outcome]] = {
    **{name: calls.CALLS[name].run for name in ("get-switches", "version", "serial", "peek", "read-item", "write-item",
                                                "channel", "file-status")},
    "send": calls.send("KRAL_SendSync", b"\x7b12345", _TIME_OUT_MS),
    "write": lambda handle: calls.write_file(handle, _BYTES),
    "read": lambda handle: calls.read_file(handle, "/data/large", 20000),
    "list": lambda handle: calls.list_folder(handle, b"/many"),
    "back-up": _back_up,
    "switch": _switch,
    _BEHIND: _switch,
    "boot-mode": lambda handle: (kral.api().KRAL_ChangeFTM_BootMode(handle, 1, 1), None),
    "sync": lambda handle: (kral.api().KRAL_EFS2_SyncWithWait(handle, b"/", _TIME_OUT_MS), None),
}


def cases(bench: Bench) -> List[str]:
    busy = [f"{name}/{mode}/{where}" for name in _OPERATIONS for mode in MODES
            for where in ("same", "other", *_STRANGERS)]
    return busy + [f"{name}/{mode}/{where}" for name in ("idle", "wait-log") for mode in MODES
                   for where in ("same", "other")] + [f"at-once/{mode}/same" for mode in MODES]


def _state(handle: int) -> int:
    state = ctypes.c_int32(-1)
    kral.api().KRAL_GetPortState(handle, ctypes.byref(state))
    return state.value


def _phone(serial: int = calls.SERIAL) -> Phone:
    phone = calls.prepare(Phone(serial))
    phone.files.put("/data/large", _BYTES)
    for i in range(20):
        phone.files.put(f"/many/{i}", b"x")
    return phone


def _plug_stranger(line: PtyLine, asked: List[bytes], after: float) -> None:
    """Another handset comes on the same port, and notes what it is asked."""
    def behaviour(request: bytes, _: Line) -> None:
        asked.append(request)
        line.reply(request)

    time.sleep(after)
    line.phone = _phone(calls.SERIAL + 1)
    line.phone.answer(bytes((41, _OFFLINE, 0)))  # where the other one was to go
    line.behaviour = behaviour
    line.drop_pieces()
    line.plug()


def _in_flight(bench: Bench, line: PtyLine, name: str, stranger: Optional[float]) -> None:
    """The cable is pulled while a request has no answer yet, or behind an answer."""
    left = [_ANSWERED.get(name, 0)]
    asked = threading.Event()

    def behaviour(request: bytes, _: Line) -> None:
        if left[0] > 0:
            left[0] -= 1
            line.reply(request)
            if left[0] > 0 or name != _BEHIND:
                return
        asked.set()

    line.behaviour = behaviour
    since: List[float] = []
    of_stranger: List[bytes] = []

    def pull() -> None:
        if asked.wait(5):
            time.sleep(0.02)
            since.append(time.monotonic())
            line.unplug()
            if stranger is not None:
                _plug_stranger(line, of_stranger, stranger)

    puller = threading.Thread(target=pull)
    puller.start()
    result, _ = _OPERATIONS[name](line.handle)
    end = time.monotonic()
    code, text = last_error(line.handle)
    took_over = list(of_stranger)
    puller.join()
    check(bool(since), f"{name} ended with {result} before anything was pulled")
    _judge(bench, since[0], end)
    check(result == 0, f"{name} succeeded without a handset")
    check(code == _LOST, f"the failure has code {code} ({text})")
    check(not took_over, f"the handset that came next was asked {[request.hex() for request in took_over]}")


def _judge(bench: Bench, since: float, end: float) -> None:
    took, late = (end - since) * 1000, bench.lateness.between(since, end) * 1000
    bench.note("slowest report, ms", took)
    check(took - late <= _ALLOWED_MS, f"reported after {took:.0f} ms; the machine was {late:.0f} ms late")


def _idle(bench: Bench, line: PtyLine, waits: bool) -> None:
    """Nothing is asked when the cable is pulled; a thread may be waiting for logs."""
    since: List[float] = []
    ended: List[Any] = []
    waiter = threading.Thread(target=lambda: ended.append((_wait_log(line.handle), time.monotonic())))
    if waits:
        waiter.start()
        time.sleep(0.05)
    since.append(time.monotonic())
    line.unplug()
    if waits:
        waiter.join(10)
        check(bool(ended), "the wait for logs goes on")
        _judge(bench, since[0], ended[0][1])
    while _state(line.handle) != _api.KRAL_PORT_GONE:
        if time.monotonic() > since[0] + 5:
            raise Broken(f"the port's state is {_state(line.handle)}")
        time.sleep(0.005)
    _judge(bench, since[0], time.monotonic())


def _at_once(line: PtyLine) -> None:
    """Pulled in the moment after an answer, and plugged in again before anybody has looked at the port."""
    for replugs in range(_REPLUGS):
        result, value = calls.CALLS["serial"].run(line.handle)
        check(result == 1 and value == calls.SERIAL,
              f"after {replugs} times at once: {result}, {last_error(line.handle)}")
        line.unplug()
        line.drop_pieces()
        line.plug()


def run(bench: Bench, case: str) -> None:
    name, mode, where = case.split("/")
    with bench.com_port() as port:
        line = PtyLine(_phone(), bench.ports, port)
        with connected(line, MODES[mode], _TIME_OUT_MS) as handle:
            kral.api().KRAL_DIAG_SetPhoneLoggingState(handle, 1)
            kral.api().KRAL_ConfigureTimeOut(handle, _OFFLINE_DELAY, _OFFLINE_DELAY_MS)
            result, value = calls.CALLS["serial"].run(handle)
            check(result == 1 and value == calls.SERIAL, f"a handset that works gave {result}, {value!r}")
            # Made while the port's own name is still taken, so it gets another.
            pair = os.openpty() if where == "other" else None
            if name == "at-once":
                _at_once(line)
                return
            if name in _OPERATIONS:
                _in_flight(bench, line, name, _STRANGERS.get(where))
            else:
                _idle(bench, line, name == "wait-log")
            line.behaviour = WORKS
            line.drop_pieces()
            if where not in _STRANGERS:
                line.plug(pair)
            result, value = calls.CALLS["serial"].run(handle)
            expected = calls.SERIAL + (where in _STRANGERS)
            check(result == 1 and value == expected, f"after the port came back: {result}, {last_error(handle)}")
