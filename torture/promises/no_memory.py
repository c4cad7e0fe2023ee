"""Out of memory anywhere is a failed call: the k-th allocation of a call fails, for every k.

The allocations of the library's own threads count, too. A call whose allocation failed may still succeed (a line of the
text log was lost); what it then gives must be right. Afterwards the same call works.
"""
from __future__ import annotations

import ctypes
import os
import pathlib
import struct
import subprocess
import time
from typing import Any, Callable, Dict, List

import kral
from kral import _api
from torture import calls
from torture.bench import LINUX, MODES, WINDOWS, Bench, check, connected
from torture.peer.codec import frame
from torture.peer.line import Line, PtyLine
from torture.peer.phone import Phone, log
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
_PACKET_BLOCK = 6
_LOGS = 20
_LOGS_S = 2.0


def _connect(handle: int) -> calls.Outcome:
    """A connection of its own, on the null port: nothing is there when it fails."""
    other = kral.api().KRAL_ConnectServer(_api.KRAL_PORT_NULL)
    connected_to = kral.api().KRAL_IsPhoneConnected(other)
    kral.api().KRAL_DisconnectServer(other)
    return int(other != 0 and connected_to == 1), None


def _load_definitions(handle: int) -> calls.Outcome:
    kral.api().KRAL_NV_ClearNVDefinition(handle)
    return int(kral.api().KRAL_NV_LoadNVDefinitionFile(handle, b"definitions.xml") == 0), None


def _ports(handle: int) -> calls.Outcome:
    count, ports = ctypes.c_uint16(256), (ctypes.c_uint16 * 256)()
    result = kral.api().KRAL_GetAllPortList(ctypes.byref(count), ports)
    return result, list(ports[:count.value]) if result else None


def _port_info(handle: int) -> calls.Outcome:
    """Of a port that this process has open."""
    port, info = ctypes.c_uint16(), _api.KRAL_PORT_INFO()
    result = kral.api().KRAL_GetComPortNumber(handle, ctypes.byref(port)) and kral.api().KRAL_GetPortInfo(
        port.value, 0, ctypes.byref(info))
    return result, info.state


def _packets(trace: pathlib.Path) -> int:
    """Blocks of packets in a pcapng file, which is to consist of whole blocks."""
    data, packets = trace.read_bytes(), 0
    while data:
        kind, size = struct.unpack_from("<II", data)
        check(size >= 12 and data[size - 4:size] == struct.pack("<I", size), "a block of a trace is cut")
        packets += kind == _PACKET_BLOCK
        data = data[size:]
    return packets


def _trace(handle: int) -> calls.Outcome:
    file = pathlib.Path("whole.pcapng")
    if not kral.api().KRAL_StartTrace(handle, os.fsencode(file)):
        return 0, None
    asked, _ = calls.CALLS["serial"].run(handle)
    whole = kral.api().KRAL_StopTrace(handle)
    packets = _packets(file)
    result = int(asked == 1 and whole == 1)
    return result, packets > 1 if result else None


def _kept_trace(handle: int) -> calls.Outcome:
    file = pathlib.Path("kept.pcapng")
    if not kral.api().KRAL_KeepTrace(handle, 65536):
        return 0, None
    calls.CALLS["serial"].run(handle)
    result = kral.api().KRAL_SaveTrace(handle, os.fsencode(file))
    kral.api().KRAL_StopTrace(handle)
    # What could not be kept is like what is too old.
    return result, _packets(file) >= 0 if result else None


def _logs(line: Line) -> Callable[[int], calls.Outcome]:
    """Each is read, or counted as dropped."""
    def run(handle: int) -> calls.Outcome:
        api = kral.api()
        api.KRAL_DIAG_SetPhoneLoggingState(handle, 1)
        api.KRAL_DIAG_ClearPhoneLogQueue(handle)
        before = calls.counters(handle)
        for _ in range(_LOGS):
            line.send(frame(log(0x1000, bytes(40))))
        end, now = time.monotonic() + _LOGS_S, before
        while time.monotonic() < end and now.packets_received - before.packets_received < _LOGS or now.waiting:
            time.sleep(0.001)
            now = calls.counters(handle)
        read = 0
        while calls.next_log(handle, 5) is not None:
            read += 1
        dropped = calls.counters(handle).dropped_logs - before.dropped_logs
        check(read + dropped == _LOGS, f"{_LOGS} logs were sent, {read} read and {dropped} counted as dropped")
        return int(read == _LOGS), None
    return run


_CALLS: Dict[str, calls.Call] = {
    **{name: call for name, call in calls.CALLS.items() if name != "make-folder"},
    **{name: calls.Call(run) for name, run in MORE.items() if name in ("back-up", "list", "write-many", "add-log",
                                                                       "set-event", "get-item-file", "write-file")},
    "definitions": calls.Call(_load_definitions),
    "connect": calls.Call(_connect),
    "ports": calls.Call(_ports),
    "port-info": calls.Call(_port_info),
    "trace": calls.Call(_trace),
    "kept-trace": calls.Call(_kept_trace),
}
_ON_A_COM_PORT = "port-info"
_LOG_FLOOD = "logs"
_DEFINITIONS = b"""<NvDefinition><NvItem id="10" name="PREF"><DataType><Member typeid="word16" num_of_element="4"/>
</DataType></NvItem></NvDefinition>"""


def preload(folder: pathlib.Path) -> str:
    """Builds the failing malloc, and gives what is to be preloaded."""
    library = folder / "failing_malloc.so"
    source = pathlib.Path(__file__).resolve().parents[1] / "failing_malloc.c"
    subprocess.run(["gcc", "-shared", "-fPIC", "-O2", "-Wall", "-Werror", "-o", str(library), str(source)], check=True)
    return str(library)


def cases(bench: Bench) -> List[str]:
    return [*_CALLS, _LOG_FLOOD]


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
    pathlib.Path("definitions.xml").write_bytes(_DEFINITIONS)
    phone = calls.prepare(Phone(calls.SERIAL))
    with bench.com_port() if case == _ON_A_COM_PORT else bench.port() as port:
        line = PtyLine(phone, bench.ports, port) if case == _ON_A_COM_PORT else bench.line(phone, port)
        call = calls.Call(_logs(line)) if case == _LOG_FLOOD else _CALLS[case]
        with connected(line, MODES["wake"], _TIME_OUT_MS) as handle:
            _try(bench, case, call, handle)


def _try(bench: Bench, case: str, call: calls.Call, handle: int) -> None:
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
