"""The same work for many handsets at once.

    job = kral.Job(enter_loader=True, reset=True)
    job.programmer("programmer.hex")
    job.image("modem.bin")
    job.restore("golden.pkv")
    job.verify("golden.pkv")
    for verdict in job.run([7, 8, 9, 10]):
        print(verdict.port, verdict.serial, verdict.error or "passed")
"""
from __future__ import annotations

import ctypes
import dataclasses
import os
import pathlib
from typing import Any, Callable, Dict, Iterable, Iterator, List, Optional, Tuple, Union

from kral import _api
from kral._connection import LocalPath, call, fitting, integer, local, milliseconds
from kral._library import load
from kral.errors import KralError, exception, fail, record_of
from kral.modes import Mode
from kral.phone import Phone

_LOOK_MS = 100  # between two looks, in which Ctrl-C is seen
_ENDED = (_api.KRAL_VENTRIMS_PASSED, _api.KRAL_VENTRIMS_FAILED, _api.KRAL_VENTRIMS_ABORTED)


@dataclasses.dataclass(frozen=True)
class JobProgress:
    """How far a handset has come."""

    port: int
    step: str
    step_done: int
    step_total: int  # 0: the step does not count
    bytes_done: int
    bytes_total: int
    attempts: int
    seconds: float
    model: str
    software: str
    serial: str  # eight hexadecimal digits; empty while it is not known
    returning: bool  # it was lost, and is awaited


@dataclasses.dataclass(frozen=True)
class Verdict:
    """What became of a handset: `error` is why it did not pass, `progress.step` where."""

    passed: bool
    error: Optional[KralError]
    progress: JobProgress

    @property
    def port(self) -> int:
        return self.progress.port

    @property
    def serial(self) -> str:
        return self.progress.serial


def _progress(record: Any) -> JobProgress:
    def text(field: bytes) -> str:
        return field.decode("utf-8", "replace")

    return JobProgress(record.port, text(record.step_name), record.step_done, record.step_total, record.bytes_done,
                       record.bytes_total, record.attempts, record.elapsed_ms / 1000, text(record.model),
                       text(record.revision), text(record.serial), record.state == _api.KRAL_VENTRIMS_RETURNING)


class Job:
    """Steps, carried out in the order of their calls on every handset that `run` is given. It may run again."""

    def __init__(self, *, enter_loader: bool = False, reset: bool = False, at_once: int = 0, retries: int = 2,
                 return_time: float = 30, start_time: float = 60) -> None:
        """enter_loader: handsets are in diagnostics before a download; reset: and are restarted after it."""
        self._flags = (bool(enter_loader) * _api.KRAL_VENTRIMS_ENTER_LOADER) | (bool(reset) * _api.KRAL_VENTRIMS_RESET)
        self._limits = at_once, retries, milliseconds(return_time), milliseconds(start_time)
        self._steps: List[Tuple[str, Tuple[Any, ...]]] = []

    def _step(self, name: str, *arguments: Any) -> None:
        self._steps.append((f"KRAL_VENTRIMS_{name}", arguments))

    def programmer(self, file: LocalPath, boot: Optional[bool] = None) -> None:
        """Loads a flash programmer: with the boot transfer, or, as a file with the ending .hex, by the loader."""
        is_hex = pathlib.PurePath(os.fsdecode(file)).suffix.lower() == ".hex" if boot is None else not boot
        kind = _api.KRAL_VENTRIMS_PROGRAMMER_HEX if is_hex else _api.KRAL_VENTRIMS_PROGRAMMER_BOOT
        self._step("AddProgrammer", local(file), kind)

    def partition_table(self, file: LocalPath, override: bool = False) -> None:
        self._step("AddPartitionTable", local(file), int(override))

    def image(self, file: LocalPath, image_type: int = 0, header: Optional[LocalPath] = None) -> None:
        """Writes an image; the type is that of the handset."""
        self._step("AddImage", local(file), _api.KRAL_IMAGE_FORMAT_BY_CONTENT, image_type,
                   None if header is None else local(header), _api.KRAL_STREAM_MULTI_IMAGE)

    def identity(self) -> None:
        """Asks who it is; a job that begins in diagnostics does so in any case."""
        self._step("AddIdentity")

    def mode(self, mode: Mode) -> None:
        self._step("AddMode", integer(mode))

    def restore(self, file: LocalPath) -> None:
        self._step("AddRestore", local(file))

    def verify(self, file: LocalPath) -> None:
        self._step("AddVerify", local(file))

    def run(self, handsets: Iterable[Union[int, Phone]],
            progress: Optional[Callable[[JobProgress], Any]] = None) -> Iterator[Verdict]:
        """Does it on all handsets, COM numbers or connections, at once, and gives the verdicts as they come.

        All files and ports are looked at before the first byte is sent; what is wrong with them is raised here. Ctrl-C,
        or leaving the loop early, aborts the rest.
        """
        # A generator would begin with the first verdict only.
        running = _Run(self._flags, self._limits, self._steps, list(handsets))
        return running.verdicts(progress)


class _Run:
    """A job of the library while it runs."""

    _job = 0

    def __init__(self, flags: int, limits: Tuple[int, ...], steps: List[Tuple[str, Tuple[Any, ...]]],
                 handsets: List[Union[int, Phone]]) -> None:
        self._api = load()
        self._handsets = handsets  # whose connections must live as long
        self._job = self._api.KRAL_VENTRIMS_Create()
        if not self._job:
            fail(0, "KRAL_VENTRIMS_Create")
        try:
            options = _api.KRAL_VENTRIMS_OPTIONS(size=ctypes.sizeof(_api.KRAL_VENTRIMS_OPTIONS))
            self._check("KRAL_VENTRIMS_GetOptions", ctypes.byref(options))
            options.flags = flags
            options.at_once, options.retries, options.return_ms, options.start_ms = (
                fitting(ctypes.c_uint32, limit) for limit in limits)
            self._check("KRAL_VENTRIMS_SetOptions", ctypes.byref(options))
            for name, arguments in steps:
                self._check(name, *arguments)
            for handset in handsets:
                if isinstance(handset, Phone):
                    self._check("KRAL_VENTRIMS_AddHandle", handset.handle, None)
                else:
                    self._check("KRAL_VENTRIMS_AddPort", handset, None)
            self._check("KRAL_VENTRIMS_Start")
        except BaseException:
            self._free()
            raise

    def __del__(self) -> None:
        self._free()

    def _free(self) -> None:
        job, self._job = self._job, 0
        if job:
            self._api.KRAL_VENTRIMS_Free(job)

    def _check(self, name: str, *arguments: Any) -> None:
        if not call(name, self._job, *arguments):
            fail(self._job, name)

    def _verdict(self, handset: int) -> Verdict:
        result = _api.KRAL_VENTRIMS_RESULT(size=ctypes.sizeof(_api.KRAL_VENTRIMS_RESULT))
        self._check("KRAL_VENTRIMS_GetResult", handset, ctypes.byref(result))
        error = None
        if not result.passed:
            error = exception(record_of(result.error))
        return Verdict(bool(result.passed), error, _progress(result.progress))

    def verdicts(self, progress: Optional[Callable[[JobProgress], Any]]) -> Iterator[Verdict]:
        waiting = list(range(len(self._handsets)))
        told: Dict[int, JobProgress] = {}
        try:
            while waiting:
                self._api.KRAL_VENTRIMS_Wait(self._job, _LOOK_MS)
                for handset in list(waiting):
                    record = _api.KRAL_VENTRIMS_PROGRESS(size=ctypes.sizeof(_api.KRAL_VENTRIMS_PROGRESS))
                    self._check("KRAL_VENTRIMS_GetProgress", handset, ctypes.byref(record))
                    now = _progress(record)
                    if progress is not None and dataclasses.replace(now, seconds=0) != told.get(handset):
                        told[handset] = dataclasses.replace(now, seconds=0)
                        progress(now)
                    if record.state in _ENDED:
                        waiting.remove(handset)
                        yield self._verdict(handset)
        finally:
            self._free()
