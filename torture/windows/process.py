"""A program started beside the DLL's, under the same Wine: what the promises need of subprocess.Popen."""
from __future__ import annotations

import pathlib
import signal
import struct
import subprocess
from typing import Dict, List, Optional, Tuple

from torture.windows.driver import Driver, Fault, text, word

_NO_WINDOW = 0x08000000
_USE_HANDLES = 0x100
_STARTUP_INFO = struct.Struct("<I40xI8x3I")  # size, flags, handles of input, output and errors
_INHERITED = struct.pack("<III", 12, 0, 1).hex()  # security attributes: size, nothing special, for children too
# Access, share and creation, as CreateFile takes them.
_READ, _WRITE, _SHARED, _ANEW, _THERE = 0x80000000, 0x40000000, 3, 2, 3
_EXIT_CODE = 137


def windows_path(path: pathlib.Path) -> str:
    return "Z:" + str(path).replace("/", "\\")


class Process:
    """It can be waited for and killed. What it prints goes to files beside its folder: without any, Wine would give it
    a console that nobody sees, and that takes a minute for what is printed of a large capture."""

    def __init__(self, driver: Driver, command: List[str], folder: pathlib.Path, environment: Dict[str, str], *,
                 stdout: int) -> None:
        self._driver = driver
        self.returncode: Optional[int] = None
        self._told = folder.with_name(folder.name + ".out") if stdout == subprocess.PIPE else None
        self._said = folder.with_name(folder.name + ".err")
        for name, value in environment.items():
            driver.call("kernel32!SetEnvironmentVariableA", text(name), text(value))
        line = " ".join(f'"{one}"' for one in command)
        files = [self._open("NUL", _READ, _THERE), self._open_output(self._told), self._open_output(self._said)]
        startup = _STARTUP_INFO.pack(_STARTUP_INFO.size, _USE_HANDLES, *files)
        made, (info,) = driver.call("kernel32!CreateProcessA", word(0), text(line), word(0), word(0), word(1),
                                    word(_NO_WINDOW), word(0), text(windows_path(folder)), "s" + startup.hex(),
                                    "b" + bytes(16).hex())
        if not made & 0xFFFFFFFF:
            raise Fault(f"{command[0]} cannot be started")
        self._handle, thread = struct.unpack_from("<II", info)
        for handle in (thread, *files):
            driver.call("kernel32!CloseHandle", word(handle))

    def _open(self, path: str, access: int, creation: int) -> int:
        handle, _ = self._driver.call("kernel32!CreateFileA", text(path), word(access), word(_SHARED),
                                      "s" + _INHERITED, word(creation), word(0), word(0))
        handle &= 0xFFFFFFFF
        if handle == 0xFFFFFFFF:
            raise Fault(f"{path} cannot be opened")
        return handle

    def _open_output(self, path: Optional[pathlib.Path]) -> int:
        return self._open(windows_path(path), _WRITE, _ANEW) if path else self._open("NUL", _WRITE, _THERE)

    def communicate(self, timeout: float) -> Tuple[Optional[bytes], bytes]:
        waited, _ = self._driver.call("kernel32!WaitForSingleObject", word(self._handle), word(round(timeout * 1000)))
        if waited & 0xFFFFFFFF:
            raise Fault("a program does not end")
        _, (code,) = self._driver.call("kernel32!GetExitCodeProcess", word(self._handle), "b" + bytes(4).hex())
        self.returncode, = struct.unpack("<I", code)
        return self._told.read_bytes() if self._told else None, self._said.read_bytes()

    def send_signal(self, number: int) -> None:
        assert number == signal.SIGKILL
        self._driver.call("kernel32!TerminateProcess", word(self._handle), word(_EXIT_CODE))

    def kill(self) -> None:
        self.send_signal(signal.SIGKILL)
