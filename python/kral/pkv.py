"""Backups: PKV files."""
from __future__ import annotations

import ctypes
import dataclasses
from typing import Any, Callable, List, Optional, Tuple

from kral import _api
from kral._connection import Connection, LocalPath, local
from kral._work import Work
from kral.errors import KralError

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


def run(connection: Connection, name: str, path: LocalPath, progress: Optional[Progress],
        extent: Optional[Tuple[int, int, int]] = None) -> PkvResult:
    """Backup, restore or comparison. Raises the exception of its outcome, with a `result`."""
    left: List[PkvItem] = []
    status, counts = ctypes.c_uint32(), _api.KRAL_PKV_COUNTS()

    def moved(work: "Work[Any]", item: Any, file: Optional[bytes], done: int, total: int, _handle: int) -> int:
        raw = item.contents
        told = PkvItem(raw.id, file.decode("utf-8", "surrogateescape") if file else None, raw.index,
                       raw.subscription, raw.status, _RESULTS.get(raw.result, str(raw.result)))
        if raw.result not in (_api.KRAL_PKV_DONE, _api.KRAL_PKV_SKIPPED):
            left.append(told)
        work.report(done, total, told)
        return 1

    def carry_out() -> Optional[KralError]:
        failure = None
        if extent is not None:
            # Here, after the work before it on the handle, which has an extent of its own.
            connection.check("KRAL_PKV_ConfigureBackup", *extent)
        try:
            connection.check(name, local(path), ctypes.byref(status))
        except KralError as error:
            failure = error
        # Here, before the next work on the handle, which has counts of its own.
        connection.check("KRAL_PKV_GetCounts", ctypes.byref(counts))
        return failure

    failure = connection.long(carry_out, progress, "pkv", moved)
    result = PkvResult(counts.total, counts.done, counts.skipped, counts.refused, counts.different,
                       counts.not_read_back, counts.not_reached, left)
    if failure is not None:
        failure.result = result
        raise failure
    return result
