"""An abort ends what is under way on a handset within 250 ms, whatever the handset does meanwhile."""
from __future__ import annotations

import threading
import time
from typing import Callable, Dict, List, Tuple

import kral
from torture import calls
from torture.bench import LINUX, MODES, WINDOWS, Bench, check, connected, last_error, set_time_outs
from torture.peer.codec import frame
from torture.peer.line import WORKS, Behaviour, Line, PtyLine
from torture.peer.misbehaviours import again, begin, misbehaviours, silence
from torture.peer.phone import Phone

NUMBER = 18
TITLE = "An abort is back within 250 ms"
SHORT = 36
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 6
_ALLOWED_MS = 250
_TIME_OUT_MS = 4000
_BEHIND_MS = 500
_MOST_ANSWERED = 2
_TALKS_S = 0.1
# Files and folders are opened in vain, in three tries: the abort comes in the third.
_OPENINGS = (b"\x4b\x13\x02\0", b"\x4b\x13\x0b\0")
_THIRD = "third-try"
_THIRD_MS = 300
_THIRD_S = 0.75
_HANGS_S = 30.0
_ALL = 0xFFFFFFFF
_LARGE = bytes(range(256)) * 400


def _abort_files(handle: int) -> None:
    kral.api().KRAL_AbortEFS_Operation(handle)


class _Job:
    """That asks the handset who it is."""

    def __init__(self) -> None:
        self._number = 0
        self._started = threading.Event()

    def run(self, handle: int) -> None:
        api = kral.api()
        self._number = api.KRAL_VENTRIMS_Create()
        check(bool(api.KRAL_VENTRIMS_AddIdentity(self._number) and
                   api.KRAL_VENTRIMS_AddHandle(self._number, handle, None) and
                   api.KRAL_VENTRIMS_Start(self._number)), f"no job: {last_error(0)}")
        self._started.set()
        api.KRAL_VENTRIMS_Wait(self._number, int(_HANGS_S * 1000))
        api.KRAL_VENTRIMS_Free(self._number)

    def abort(self, handle: int) -> None:
        self._started.wait()
        kral.api().KRAL_VENTRIMS_Abort(self._number, _ALL)


_OPERATIONS: Dict[str, Callable[[int], object]] = {
    "write": lambda handle: calls.write_file(handle, _LARGE),
    "read": lambda handle: calls.read_file(handle, "/data/large", len(_LARGE)),
    "list": calls.list_folder,
    "sync": lambda handle: kral.api().KRAL_EFS2_SyncWithWait(handle, b"/", _TIME_OUT_MS),
    "back-up": lambda handle: calls.back_up(handle, (1, 900), f"aborted{handle}.pkv".encode()),
}
_JOB = "job"
_OPENING = ("write", "read")
# What these operations may be ended by, before they are aborted.
_ENDING = ("other-code", "other-answer", "same-head", "logs")


def _talkers(bench: Bench, case: str) -> Dict[str, Behaviour]:
    numbers = bench.random(case)

    def same_head(request: bytes, line: Line) -> None:
        again(line, lambda: frame(request[:4] + numbers.randbytes(30)))

    def other_files(request: bytes, line: Line) -> None:
        again(line, lambda: frame(b"\x4b\x13\x63\0" + bytes(8)))
    # A refusal, or a frame without its end, ends most of these by itself; other answers and other codes end some.
    known = {name: behaviour for name, behaviour in misbehaviours(numbers, _HANGS_S).items()
             if name not in ("refusal", "blocked", "head")}
    return {**known, "same-head": same_head, "other-files": other_files}


def cases(bench: Bench) -> List[str]:
    all_of_them = [f"{operation}/{name}/{mode}" for operation in [*_OPERATIONS, _JOB] for name in _talkers(bench, "")
                   for mode in MODES]
    return all_of_them + [f"{operation}/{_THIRD}/{mode}" for operation in _OPENING for mode in MODES]


class _Answers:
    """To the first requests; what comes behind them and begins so meets the misbehaviour."""

    def __init__(self, count: int, behaviour: Behaviour, met_by: Tuple[bytes, ...] = (b"",)) -> None:
        self._left, self._behaviour, self._met_by = count, behaviour, met_by
        self.began = threading.Event()

    def __call__(self, request: bytes, line: Line) -> None:
        if self._left > 0 or not request.startswith(self._met_by):
            self._left -= 1
            line.reply(request)
            return
        self._behaviour(request, line)
        self.began.set()


class _Deed(threading.Thread):
    def __init__(self, work: Callable[[int], object], handle: int) -> None:
        super().__init__(daemon=True)
        self._work, self._handle = work, handle
        self.ended = 0.0
        self.error = ""

    def run(self) -> None:
        try:
            self._work(self._handle)
        except Exception as error:  # pylint: disable=broad-except
            self.error = str(error)
        self.ended = time.monotonic()


def run(bench: Bench, case: str) -> None:
    operation, name, mode = case.split("/")
    job = _Job()
    work: Callable[[int], object] = job.run if operation == _JOB else _OPERATIONS[operation]
    abort = job.abort if operation == _JOB else _abort_files
    phone = calls.prepare(Phone(calls.SERIAL))
    phone.files.put("/data/large", _LARGE)
    with bench.com_port() as port:
        line = PtyLine(phone, bench.ports, port)
        with connected(line, MODES[mode], _THIRD_MS if name == _THIRD else _TIME_OUT_MS) as handle:
            count = bench.random(case).randrange(_MOST_ANSWERED + 1)
            answers = (_Answers(0, silence, _OPENINGS) if name == _THIRD
                       else _Answers(count, _talkers(bench, case)[name]))
            begin(name, answers, line)
            deed = _Deed(work, handle)
            deed.start()
            check(answers.began.wait(_HANGS_S), f"nothing is asked of the handset: {deed.error}")
            time.sleep(_THIRD_S if name == _THIRD else _TALKS_S)
            if deed.is_alive():
                _abort(bench, deed, lambda: abort(handle))
            else:
                check(name in _ENDING, "it ended before it was aborted")
                bench.count("ended before")
            check(not deed.error, deed.error)
            line.behaviour = WORKS
            line.drop_pieces()
            set_time_outs(handle, _BEHIND_MS)
            # What has begun to come may take the first answer with it.
            behind = [calls.CALLS["serial"].run(handle) for _ in range(2)]
            check((1, calls.SERIAL) in behind, f"behind it: {behind}, {last_error(handle)}")


def _abort(bench: Bench, deed: _Deed, abort: Callable[[], None]) -> None:
    start = time.monotonic()
    abort()
    deed.join(_HANGS_S)
    check(not deed.is_alive(), "it hangs")
    took = (deed.ended - start) * 1000
    late = bench.lateness.between(start, deed.ended) * 1000
    bench.count("aborts")
    bench.note("longest, ms", took - late)
    check(took - late <= _ALLOWED_MS, f"back after {took:.0f} ms; the machine was {late:.0f} ms late")
