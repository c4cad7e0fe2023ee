"""A program started beside the DLL's, under the same Wine: what the promises need of subprocess.Popen."""
from __future__ import annotations

import pathlib
import signal
import struct
from typing import Dict, List, Optional, Tuple

from torture.windows.driver import Driver, Fault, text, word

_NO_WINDOW = 0x08000000
_USE_HANDLES = 0x100
_STARTUP_INFO = struct.Struct("<I40xI20x")  # size, flags; no handles are given, so nothing is printed
_EXIT_CODE = 137


def windows_path(path: pathlib.Path) -> str:
    return "Z:" + str(path).replace("/", "\\")


class Process:
    """It can be waited for and killed; what it prints goes nowhere."""

    def __init__(self, driver: Driver, command: List[str], folder: pathlib.Path, environment: Dict[str, str]) -> None:
        self._driver = driver
        self.returncode: Optional[int] = None
        for name, value in environment.items():
            driver.call("kernel32!SetEnvironmentVariableA", text(name), text(value))
        line = " ".join(f'"{one}"' for one in command)
        startup = _STARTUP_INFO.pack(_STARTUP_INFO.size, _USE_HANDLES)
        made, (info,) = driver.call("kernel32!CreateProcessA", word(0), text(line), word(0), word(0), word(0),
                                    word(_NO_WINDOW), word(0), text(windows_path(folder)), "s" + startup.hex(),
                                    "b" + bytes(16).hex())
        if not made & 0xFFFFFFFF:
            raise Fault(f"{command[0]} cannot be started")
        self._handle, thread = struct.unpack_from("<II", info)
        driver.call("kernel32!CloseHandle", word(thread))

    def communicate(self, timeout: float) -> Tuple[None, bytes]:
        waited, _ = self._driver.call("kernel32!WaitForSingleObject", word(self._handle), word(round(timeout * 1000)))
        if waited & 0xFFFFFFFF:
            raise Fault("a program does not end")
        _, (code,) = self._driver.call("kernel32!GetExitCodeProcess", word(self._handle), "b" + bytes(4).hex())
        self.returncode, = struct.unpack("<I", code)
        return None, b""

    def send_signal(self, number: int) -> None:
        assert number == signal.SIGKILL
        self._driver.call("kernel32!TerminateProcess", word(self._handle), word(_EXIT_CODE))

    def kill(self) -> None:
        self.send_signal(signal.SIGKILL)
