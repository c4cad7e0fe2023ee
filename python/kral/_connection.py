"""A handle of the library, its callbacks, and how both end."""
from __future__ import annotations

import ctypes
import threading
import weakref
from typing import Any, Callable, Dict, Optional, TypeVar

from kral import _api
from kral._api import Api
from kral._library import load
from kral._work import Work
from kral.errors import BadArgument, fail, last_error

T = TypeVar("T")
Callback = Callable[..., Any]


class _Targets:
    """The functions of the library's callbacks, made once for each connection and kept as long as it is.

    The library may still be inside a callback that has been replaced, so none is ever thrown away before the
    disconnect; whom it calls can change at any time.
    """

    def __init__(self) -> None:
        self._targets: Dict[str, Callback] = {}
        self.functions: Dict[str, Any] = {}

    def set(self, name: str, target: Optional[Callback]) -> None:
        if target is None:
            self._targets.pop(name, None)
        else:
            self._targets[name] = target

    def make(self, name: str, kind: Any, silent: Any = None) -> Any:
        """The C function of a callback; `silent` is its result when nobody listens."""
        if name not in self.functions:

            def call(*arguments: Any) -> Any:
                target = self._targets.get(name)
                if target is None:
                    return silent
                # An exception ends here: ctypes reports it, because nothing can be raised through the library.
                result = target(*arguments)
                return silent if result is None else result

            self.functions[name] = kind(call)
        return self.functions[name]


def null(kind: Any) -> Any:
    """The null pointer of a callback's type."""
    return kind()


def _disconnect(handle: int, targets: _Targets) -> None:
    """Ends a connection. The targets are an argument so that they live until here."""
    api = load()
    # Another connect may keep the handle alive, and would call into what ends here.
    if "text_log" in targets.functions:
        api.KRAL_ConfigureLibraryTextLogCallBack(handle, null(_api.KRAL_TEXT_LOG_CALLBACK))
    if "download" in targets.functions:
        api.KRAL_ConfigureDownloadCallBack(handle, null(_api.KRAL_DOWNLOAD_PROGRESS_CALLBACK), 0)
    if "transfer" in targets.functions:
        api.KRAL_ConfigureEfs2CallBacks(handle, null(_api.KRAL_EFS_TRANSFER_CALLBACK),
                                        null(_api.KRAL_EFS_DIRECTORY_CALLBACK))
    if "pkv" in targets.functions:
        api.KRAL_PKV_ConfigureCallBack(handle, null(_api.KRAL_PKV_CALLBACK))
    if "nv" in targets.functions:
        api.KRAL_NV_ConfigureCallBack(handle, null(_api.KRAL_NV_CALLBACK))
    api.KRAL_DisconnectServer(handle)


class Connection:
    """A handle, its library, and checked calls on it. Disconnects when it is closed, collected, or the program ends."""

    def __init__(self, handle: int) -> None:
        self.api: Api = load()
        self.targets = _Targets()
        self._handle = handle
        self._lock = threading.Lock()
        # At the program's end finalizers run while the interpreter still can call back.
        self._end = weakref.finalize(self, _disconnect, handle, self.targets)

    @property
    def handle(self) -> int:
        if not self._end.alive:
            raise BadArgument("the connection has been closed")
        return self._handle

    @property
    def is_open(self) -> bool:
        return self._end.alive

    def close(self) -> None:
        self._end()

    def call(self, name: str, *arguments: Any) -> int:
        """A call with the handle in front."""
        handle = self.handle
        try:
            return int(getattr(self.api, name)(handle, *arguments))
        except ctypes.ArgumentError as error:
            raise BadArgument(f"{name}: {error}") from None

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

    def long(self, call: Callable[[], T], prepare: Optional[Callable[["Work[T]"], Any]] = None,
             progress: Optional[Callable[..., Any]] = None) -> T:
        """Work that may take long: interruptible, with its progress on the caller's thread."""
        handle = self.handle

        def abort() -> None:
            self.api.KRAL_AbortEFS_Operation(handle)
            self.api.KRAL_AbortDownload(handle)

        work = Work(call, abort)
        with self._lock:
            if prepare is not None:
                prepare(work)
            return work.wait(progress)

    def last_error(self) -> Any:
        return last_error(self._handle)
