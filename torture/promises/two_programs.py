"""Two programs and one port: the second is told that it is busy, and the first one's transfer does not notice."""
from __future__ import annotations

import ctypes
import subprocess
import sys
from typing import List

import kral
from kral import _api
from torture import calls
from torture.bench import MODES, Bench, check, connected
from torture.peer.line import PtyLine
from torture.peer.phone import Phone

NUMBER = 14
TITLE = "Two programs, one port"
SHORT = 2
AT_ONCE = 1
_TIME_OUT_MS = 5000
_QUERIES = 40
_IN_USE = 4
# More than one queueful of the terminal's driver.
_BYTES = bytes(range(256)) * 80


def cases(bench: Bench) -> List[str]:
    return [f"{mode}" for mode in MODES]


def query(port: int) -> str:
    """What the other program finds: the state of the port, whether a handset answers, why not."""
    handle = kral.api().KRAL_ConnectServer(port)
    state = ctypes.c_int32(-1)
    kral.api().KRAL_GetPortState(handle, ctypes.byref(state))
    answers = kral.api().KRAL_IsPhoneConnected(handle)
    serial = ctypes.c_uint32()
    read = kral.api().KRAL_DIAG_READ_ESN_F(handle, ctypes.byref(serial))
    record = _api.KRAL_ERROR()
    kral.api().KRAL_GetLastError(handle, ctypes.byref(record))
    kral.api().KRAL_DisconnectServer(handle)
    return f"state {state.value}, answers {answers}, read {read}, code {record.code}"


_PROGRAM = """
import sys
from torture.promises.two_programs import query
for _ in range(int(sys.argv[2])):
    print(query(int(sys.argv[1])), flush=True)
"""


def _start(port: int, queries: int) -> "subprocess.Popen[str]":
    command = [sys.executable, "-c", _PROGRAM, str(port), str(queries)]
    return subprocess.Popen(command, stdout=subprocess.PIPE, text=True)


def run(bench: Bench, case: str) -> None:
    with bench.com_port() as port:
        line = PtyLine(calls.prepare(Phone(calls.SERIAL)), bench.ports, port)
        line.phone.files.put("/data/large", _BYTES)
        with connected(line, MODES[case], _TIME_OUT_MS) as handle:
            with _start(port, _QUERIES) as other:
                while other.poll() is None:
                    _transfer(handle)
                    bench.count("transfers meanwhile")
                _transfer(handle)
                told = other.stdout.read().splitlines() if other.stdout else []
            check(len(told) == _QUERIES, f"{len(told)} queries of {_QUERIES}")
            busy = f"state {_api.KRAL_PORT_BUSY}, answers 0, read 0, code {_IN_USE}"
            check(set(told) == {busy}, f"{set(told)}, not {busy}")
            bench.count("queries", len(told))
            kral.api().KRAL_DisconnectServer(handle)
            line.handle = 0
            # The port is free: the other program gets it.
            with _start(port, 1) as other:
                last = other.stdout.read() if other.stdout else ""
            check(last.startswith(f"state {_api.KRAL_PORT_OPEN}, answers 1, read 1"), f"the freed port: {last}")


def _transfer(handle: int) -> None:
    result, data = calls.read_file(handle, "/data/large", 2 * len(_BYTES))
    check(result == 1 and data == _BYTES, f"reading gave {result} and {len(data)} bytes")
    result, _ = calls.write_file(handle, _BYTES)
    check(result == 1, "writing failed")
