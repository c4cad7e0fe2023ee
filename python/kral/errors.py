"""What went wrong, as exceptions: a class for each code of the library, with its record."""
from __future__ import annotations

import ctypes
import dataclasses
from typing import Any, Dict, NoReturn, Optional, Type

from kral import _api
from kral._library import load


@dataclasses.dataclass(frozen=True)
class ErrorRecord:
    """What the library keeps of a failed call. None: not known."""

    code: int
    text: str
    function: str
    status_kind: int
    status: int
    system_error: int
    command: Optional[int]
    offset: Optional[int]
    line: Optional[int]


class KralError(Exception):
    """A call failed. `record` says why; it is None when the library has left none."""

    code = 0
    # Of a backup, restore or comparison: what became of its items (PkvResult).
    result: Any = None
    # Of a call of the NV tool: its error code (KRAL_NV_ERROR_...).
    tool_code: Optional[int] = None

    def __init__(self, text: str, record: Optional[ErrorRecord] = None) -> None:
        super().__init__(text)
        self.record = record

    @property
    def status(self) -> Optional[int]:
        """What the handset itself said: a refusal, an error of its file system, an NV status ..."""
        return self.record.status if self.record and self.record.status_kind else None


class InternalError(KralError):
    """A fault of the library, or no memory."""

    code = _api.KRAL_ERROR_INTERNAL


class BadArgument(KralError, ValueError):
    """The library refused an argument, a handle or the state; nothing was sent."""

    code = _api.KRAL_ERROR_ARGUMENT


class NoPort(KralError):
    """There is no such port, or it cannot be opened as one."""

    code = _api.KRAL_ERROR_NO_PORT


class PortBusy(KralError):
    """Another program holds the port, or this user may not open it."""

    code = _api.KRAL_ERROR_PORT_IN_USE


class NoAnswer(KralError):
    """Nothing came in time."""

    code = _api.KRAL_ERROR_NO_ANSWER


class LinkError(KralError):
    """The answer was another one, too short or garbled, or the request could not be written."""

    code = _api.KRAL_ERROR_LINK


class Refused(KralError):
    """The handset said no; `status` is what it said."""

    code = _api.KRAL_ERROR_REFUSED


class FileError(Refused):
    """The handset's file system said no; `status` is its error number (KRAL_EFS_ERROR_...)."""


class Mismatch(KralError):
    """A comparison found a difference."""

    code = _api.KRAL_ERROR_MISMATCH


class Lost(KralError):
    """The handset or its port went away."""

    code = _api.KRAL_ERROR_LOST


class BadFile(KralError):
    """A file of this machine cannot be read, written or understood."""

    code = _api.KRAL_ERROR_BAD_FILE


class SafetyStop(KralError):
    """Stopped before doing harm."""

    code = _api.KRAL_ERROR_SAFETY_STOP


class Aborted(KralError):
    """Ended by the caller."""

    code = _api.KRAL_ERROR_ABORTED


BY_CODE: Dict[int, Type[KralError]] = {kind.code: kind for kind in KralError.__subclasses__()}


def exception(record: ErrorRecord, text: str = "") -> KralError:
    """The exception of a record."""
    kind = BY_CODE.get(record.code, KralError)
    if kind is Refused and record.status_kind == _api.KRAL_ERROR_STATUS_EFS:
        kind = FileError
    return kind(text or record.text, record)


def last_error(handle: int = 0) -> Optional[ErrorRecord]:
    """The record of this thread's last failure on a handle; of a connect or a call without one for handle 0."""
    record = _api.KRAL_ERROR()
    if not load().KRAL_GetLastError(handle, ctypes.byref(record)):
        return None
    return record_of(record)


def record_of(record: Any) -> ErrorRecord:
    """What a KRAL_ERROR says."""
    def known(bit: int, value: int) -> Optional[int]:
        return value if record.present & bit else None

    return ErrorRecord(
        record.code, record.text.decode("utf-8", "replace"), record.function.decode("ascii", "replace"),
        record.status_kind, record.status, record.system_error, known(_api.KRAL_ERROR_HAS_COMMAND, record.command),
        known(_api.KRAL_ERROR_HAS_OFFSET, record.offset), known(_api.KRAL_ERROR_HAS_LINE, record.line))


def fail(handle: int, function: str) -> NoReturn:
    """Raises what a failed call of the library is."""
    record = last_error(handle)
    if record is None or record.function != function:
        # Another failure's: it would tell a wrong reason.
        raise KralError(f"{function} failed", None)
    raise exception(record)


def error_text(code: int) -> str:
    """The short phrase for a code, such as "no answer in time"."""
    text = ctypes.create_string_buffer(64)
    return text.value.decode() if load().KRAL_GetErrorText(code, text, 64) else f"error {code}"
