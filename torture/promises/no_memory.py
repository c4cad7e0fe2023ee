"""Out of memory anywhere is a failed call: the k-th allocation of a call fails, for every k.

The allocations of the library's own threads count, too. A call whose allocation failed may still succeed (a line of the
text log was lost); what it then gives must be right. Afterwards the same call works.
"""
from __future__ import annotations

import ctypes
import os
import pathlib
import subprocess
from typing import Any, Dict, List

import kral
from kral import _api
from torture import calls
from torture.bench import LINUX, MODES, WINDOWS, Bench, check, connected
from torture.peer.phone import Phone
from torture.promises.liars import MORE
from torture.windows.driver import Driver, text, word

NUMBER = 10
TITLE = "Out of memory anywhere is a failed call"
SHORT = 10
SHORT_WINDOWS = 3
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 1
_TIME_OUT_MS = 60
# Beside the library itself; `new` allocates in the first.
_WATCHED = ("libstdc++", "libxml2")
_MOST = 2000
_MOST_SHORT = 60


def _connect(handle: int) -> calls.Outcome:
    """A connection of its own, on the null port: nothing is there when it fails."""
    other = kral.api().KRAL_ConnectServer(_api.KRAL_PORT_NULL)
    connected_to = kral.api().KRAL_IsPhoneConnected(other)
    kral.api().KRAL_DisconnectServer(other)
    return int(other != 0 and connected_to == 1), None


def _load_definitions(handle: int) -> calls.Outcome:
    kral.api().KRAL_NV_ClearNVDefinition(handle)
    return int(kral.api().KRAL_NV_LoadNVDefinitionFile(handle, b"definitions.xml") == 0), None


_CALLS: Dict[str, calls.Call] = {
    **{name: call for name, call in calls.CALLS.items() if name != "make-folder"},
    **{name: calls.Call(run) for name, run in MORE.items() if name in ("back-up", "list", "write-many", "add-log",
                                                                       "set-event", "get-item-file", "write-file")},
    "definitions": calls.Call(_load_definitions),
    "connect": calls.Call(_connect),
}
_DEFINITIONS = b"""<NvDefinition><NvItem id="10" name="PREF"><DataType><Member typeid="word16" num_of_element="4"/>
</DataType></NvItem></NvDefinition>"""


def preload(folder: pathlib.Path) -> str:
    """Builds the failing malloc, and gives what is to be preloaded."""
    library = folder / "failing_malloc.so"
    source = pathlib.Path(__file__).resolve().parents[1] / "failing_malloc.c"
    subprocess.run(["gcc", "-shared", "-fPIC", "-O2", "-Wall", "-Werror", "-o", str(library), str(source)], check=True)
    return str(library)


def cases(bench: Bench) -> List[str]:
    return list(_CALLS)


class _OtherProcess:
    """The same in the driver, whose allocations are those of the DLL."""

    _FUNCTIONS = 3

    def __init__(self, driver: Driver) -> None:
        self._driver = driver
        count, _ = driver.call("-!watch_allocations", text("kral.dll"))
        check(count & 0xFF == self._FUNCTIONS, f"{count} functions of the DLL allocate")

    def fail_allocation(self, k: int) -> int:
        return self._driver.call("-!fail_allocation", word(k))[0] & 0xFFFFFFFF


def _failing_malloc(bench: Bench) -> Any:
    if bench.driver is not None:
        return _OtherProcess(bench.driver)
    preloaded = ctypes.CDLL(os.environ["LD_PRELOAD"])
    preloaded.fail_allocation.restype = ctypes.c_long
    preloaded.fail_allocation.argtypes = [ctypes.c_long]
    watched = [os.path.basename(os.environ["KRAL_LIBRARY"]), *_WATCHED]
    for count in (1, len(watched)):
        names = (ctypes.c_char_p * (count + 1))(*(name.encode() for name in watched[:count]), None)
        check(preloaded.watch_libraries(names) >= count, f"{watched[:count]} are not all there")
    return preloaded


def run(bench: Bench, case: str) -> None:
    call = _CALLS[case]
    pathlib.Path("definitions.xml").write_bytes(_DEFINITIONS)
    phone = calls.prepare(Phone(calls.SERIAL))
    with bench.port() as port, connected(bench.line(phone, port), MODES["wake"], _TIME_OUT_MS) as handle:
        # The lines of the text log are made, too.
        kral.api().KRAL_SetLogFlags(handle, 0xFFFFFFFF)
        kral.api().KRAL_StartLogging(handle, f"{case}.log".encode())
        result, expected = call.run(handle)
        check(result == 1, f"a handset that works gave {result}, {expected!r}")
        malloc = _failing_malloc(bench)
        for k in range(1, (_MOST_SHORT if bench.short else _MOST) + 1):
            malloc.fail_allocation(k)
            result, value = call.run(handle)
            # Threads of the library may be behind the call.
            there_were = malloc.fail_allocation(0)
            check(result == 0 or value == expected, f"allocation {k}: {result}, {value!r}")
            check(result == 1 or there_were >= k, f"{case} failed, and no allocation had")
            again, value = call.run(handle)
            check(again == 1 and value == expected, f"after allocation {k} had failed: {again}, {value!r}")
            if there_were < k:
                return
            bench.count("allocations failed")
            bench.count("calls that failed" if result == 0 else "calls that could do without")
        check(bench.short, f"{case} has more than {_MOST} allocations")
