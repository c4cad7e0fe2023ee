"""Backups: PKV files."""
from __future__ import annotations

import ctypes
import dataclasses
import os
from typing import Any, Callable, List, Optional

from kral import _api
from kral._connection import Connection
from kral._work import Work
from kral.errors import KralError
from kral.files import LocalPath

_RESULTS = {_api.KRAL_PKV_DONE: "done", _api.KRAL_PKV_SKIPPED: "skipped", _api.KRAL_PKV_REFUSED: "refused",
            _api.KRAL_PKV_DIFFERENT: "different", _api.KRAL_PKV_NOT_READ_BACK: "not read back",
            _api.KRAL_PKV_NOT_REACHED: "not reached"}


@dataclasses.dataclass(frozen=True)
class PkvItem:
    """An NV item or a file, and what became of it."""

    id: int
    path: Optional[str]  # of a file; None for an NV item
    index: int
    subscription: int
    status: int
    result: str  # "done", "skipped", "refused", "different", "not read back", "not reached"


@dataclasses.dataclass(frozen=True)
class PkvResult:
    """How a backup, restore or comparison ended. `items` are those that are neither done nor skipped."""

    total: int
    done: int
    skipped: int
    refused: int
    different: int
    not_read_back: int
    not_reached: int
    items: List[PkvItem]


Progress = Callable[[int, int, PkvItem], Any]


def run(connection: Connection, name: str, path: LocalPath, progress: Optional[Progress]) -> PkvResult:
    """Backup, restore or comparison. Raises the exception of its outcome, with a `result`."""
    left: List[PkvItem] = []

    def prepare(work: "Work[None]") -> None:
        def moved(item: Any, file: Optional[bytes], done: int, total: int, _handle: int) -> int:
            raw = item.contents
            told = PkvItem(raw.id, file.decode("utf-8", "surrogateescape") if file else None, raw.index,
                           raw.subscription, raw.status, _RESULTS.get(raw.result, str(raw.result)))
            if raw.result not in (_api.KRAL_PKV_DONE, _api.KRAL_PKV_SKIPPED):
                left.append(told)
            work.report(done, total, told)
            return 1

        connection.targets.set("pkv", moved)
        connection.check("KRAL_PKV_ConfigureCallBack", connection.targets.make("pkv", _api.KRAL_PKV_CALLBACK, 1))

    status = ctypes.c_uint32()
    failure: Optional[KralError] = None
    try:
        connection.long(lambda: connection.check(name, os.fsencode(path), ctypes.byref(status)), prepare, progress)
    except KralError as error:
        failure = error
    finally:
        connection.targets.set("pkv", None)
    counts = _api.KRAL_PKV_COUNTS()
    connection.check("KRAL_PKV_GetCounts", ctypes.byref(counts))
    result = PkvResult(counts.total, counts.done, counts.skipped, counts.refused, counts.different,
                       counts.not_read_back, counts.not_reached, left)
    if failure is not None:
        failure.result = result
        raise failure
    return result
