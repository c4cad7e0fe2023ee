"""Calls that take long, on a thread of their own, so that Ctrl-C and progress reach the caller meanwhile.

A call of the library gives the interpreter free, but the interpreter handles Ctrl-C on its main thread only, between
two of its own instructions: a main thread that is inside the library would see it minutes later. So the work runs
elsewhere, and the caller's thread waits, hands on the progress, and aborts the work when it is interrupted.
"""
from __future__ import annotations

import queue
import threading
from typing import Any, Callable, Generic, Optional, TypeVar

T = TypeVar("T")

# On Windows a wait without an end is not interrupted by Ctrl-C.
_LOOK = 0.1
_AGAIN = 0.05


class Work(Generic[T]):
    """One call. What its callbacks report goes through `report` to the caller's thread."""

    def __init__(self, call: Callable[[], T], abort: Callable[[], Any]) -> None:
        self._call = call
        self._abort = abort
        self._events: "queue.SimpleQueue[Any]" = queue.SimpleQueue()
        self._done = threading.Event()
        self._result: Optional[T] = None
        self._failure: Optional[BaseException] = None

    def report(self, *what: Any) -> None:
        self._events.put(what)

    def _run(self) -> None:
        try:
            self._result = self._call()
        except BaseException as failure:  # pylint: disable=broad-except
            self._failure = failure
        finally:
            self._done.set()
            self._events.put(None)

    def wait(self, progress: Optional[Callable[..., Any]] = None) -> T:
        """The result of the call. An exception in `progress`, or Ctrl-C, ends the work before it goes on."""
        thread = threading.Thread(target=self._run, name="kral work", daemon=True)
        thread.start()
        try:
            while True:
                try:
                    event = self._events.get(timeout=_LOOK)
                except queue.Empty:
                    continue
                if event is None:
                    break
                if progress is not None:
                    progress(*event)
        except BaseException:
            # What begins in that moment forgets an abort, so it is repeated.
            while not self._done.is_set():
                self._abort()
                self._done.wait(_AGAIN)
            raise
        thread.join()
        if self._failure is not None:
            raise self._failure
        return self._result  # type: ignore[return-value]
