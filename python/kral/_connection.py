"""A handle of the library, checked calls on it, and how it ends."""
from __future__ import annotations

import ctypes
import functools
import operator
import os
import threading
import weakref
from typing import Any, Callable, Dict, Iterable, Optional, TypeVar, Union

from kral import _api, _callbacks
from kral._api import Api
from kral._library import load
from kral._work import Work
from kral.errors import BadArgument, fail, last_error

T = TypeVar("T")
_TOLD = "a progress function must not use the phone that it is told about"
Data = Union[bytes, bytearray, memoryview, "ctypes.Array[Any]"]
LocalPath = Union[str, "os.PathLike[str]"]


def fitting(kind: Any, value: Any) -> Any:
    """A number as it stands in an array or record: ctypes itself would cut one that does not fit."""
    try:
        return _api.Number(kind).from_param(value).value
    except (OverflowError, TypeError) as error:
        raise BadArgument(str(error)) from None


def integer(value: Any) -> int:
    """A number that nothing is cut of."""
    try:
        return operator.index(value)
    except TypeError as error:
        raise BadArgument(str(error)) from None


def milliseconds(seconds: float) -> int:
    """A time as the library takes it."""
    try:
        return int(seconds * 1000)
    except (OverflowError, TypeError, ValueError):
        raise BadArgument(f"{seconds!r} is no time in seconds") from None


def octets(data: Data) -> bytes:
    """The bytes of what holds some, all of them: the length of an array or view may count wider elements."""
    try:
        return bytes(memoryview(data))
    except TypeError as error:
        raise BadArgument(str(error)) from None


def local(path: LocalPath) -> bytes:
    """A path of this machine. What follows a zero would be left out: another file."""
    encoded = os.fsencode(path)
    if b"\0" in encoded:
        raise BadArgument(f"a path with a null byte: {os.fspath(path)!r}")
    return encoded


def array(kind: Any, values: Iterable[Any]) -> Any:
    """Numbers as an array of the library."""
    numbers = [fitting(kind, value) for value in values]
    return (kind * len(numbers))(*numbers)


def call(name: str, *arguments: Any) -> Any:
    """A call of the library, whose result the caller judges."""
    try:
        return getattr(load(), name)(*arguments)
    except ctypes.ArgumentError as error:
        raise BadArgument(f"{name}: {error}") from None


def _disconnect(handle: int, owner: object) -> None:
    for _ in range(_callbacks.leave(handle, owner)):
        load().KRAL_DisconnectServer(handle)


def open_connection(function: str, port: int) -> "Connection":
    """Connects; the handset need not answer."""
    if _callbacks.is_told(port):
        raise BadArgument(_TOLD)
    handle = call(function, port)
    if not handle:
        fail(0, function)
    return Connection(handle, port)


class Connection:
    """A handle, its library, and checked calls on it. Disconnects when it is closed, collected, or the program ends."""

    def __init__(self, handle: int, port: int) -> None:
        self.api: Api = load()
        self._handle = handle
        self._owner = object()  # of this connection's targets; the connection itself must be free to be collected
        self._tells = False  # its own progress
        self._targets: Dict[str, Callable[..., Any]] = {}
        self.shared = _callbacks.join(handle, port)
        # At the program's end finalizers run while the interpreter still can call back.
        self._end = weakref.finalize(self, _disconnect, handle, self._owner)

    @property
    def handle(self) -> int:
        if not self._end.alive:
            raise BadArgument("the connection has been closed")
        return self._handle

    @property
    def is_open(self) -> bool:
        return self._end.alive

    def close(self) -> None:
        if self._tells:
            self._not_while_told()
        self._end()

    def _not_while_told(self) -> None:
        # The work under way has the handset until its end, and the caller's thread waits for that only afterwards.
        if self.shared.told == threading.get_ident():
            raise BadArgument(_TOLD)

    def call(self, name: str, *arguments: Any) -> int:
        """A call with the handle in front."""
        handle = self.handle
        self._not_while_told()
        return int(call(name, handle, *arguments))

    def check(self, name: str, *arguments: Any) -> None:
        """A call whose 0 is a failure; the handle is put in front."""
        if not self.call(name, *arguments):
            fail(self.handle, name)

    def ask(self, name: str, *arguments: Any) -> bool:
        """A call whose 0 is an answer."""
        return bool(self.call(name, *arguments))

    def number(self, name: str, kind: Any, *arguments: Any) -> int:
        """A call with one number as its last output."""
        value = kind()
        self.check(name, *arguments, ctypes.byref(value))
        return int(value.value)

    def listen(self, name: str, target: Optional[Callable[..., Any]]) -> None:
        """Whom one of the library's callbacks tells on behalf of this connection; None for nobody."""
        if target is None:
            _callbacks.unlisten(name, self._handle, self._owner)
            self._targets.pop(name, None)
        else:
            self._targets[name] = target
            _callbacks.listen(name, self.handle, self._owner, target)

    def long(self, call: Callable[[], T], progress: Optional[Callable[..., Any]] = None, callback: str = "",
             report: Optional[Callable[..., Any]] = None) -> T:
        """Work that may take long: interruptible, with its progress on the caller's thread.

        Each call of the library's `callback` goes to report(work, ...), on the thread of the work.
        """
        handle = self.handle
        self._not_while_told()

        def abort() -> None:
            self.api.KRAL_AbortEFS_Operation(handle)
            self.api.KRAL_AbortDownload(handle)

        def tell(*what: Any) -> None:
            self.shared.told, self._tells = threading.get_ident(), True
            try:
                progress(*what)  # type: ignore[misc]
            finally:
                self.shared.told, self._tells = None, False

        work = Work(call, abort)
        with self.shared.long:
            if report is not None:
                self.listen(callback, functools.partial(report, work))
            try:
                return work.wait(tell if progress is not None else None)
            finally:
                if report is not None:
                    self.listen(callback, None)

    def log_to(self, file: Optional[bytes], flags: int, line: Optional[Callable[[int, int, int], Any]]) -> None:
        """Where the text log goes on behalf of this connection."""
        handle, flags = self.handle, fitting(ctypes.c_uint32, flags)
        if file is not None:
            if not _callbacks.take_log_file(handle, self._owner):
                raise BadArgument("the text log of the port goes to the file of another phone")
            self.check("KRAL_StartLogging", file)
        else:
            _callbacks.end_log_file(handle, self._owner)
        self.listen("text_log", line)
        if file is None and line is None:
            _callbacks.end_log(handle, self._owner)
        else:
            _callbacks.begin_log(handle, self._owner, flags)

    def last_error(self) -> Any:
        return last_error(self._handle)
