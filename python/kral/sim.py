"""A simulated handset in a process of its own: `kral sim`."""
from __future__ import annotations

import os
import pathlib
import shutil
import subprocess
import tempfile
from types import TracebackType
from typing import Any, Optional, Type

from kral._library import library_path


def find_tool() -> str:
    """The tool that simulates: KRAL_TOOL, else beside the library, else on the search path."""
    told = os.environ.get("KRAL_TOOL")
    if told:
        return told
    folder = pathlib.Path(library_path()).parent
    for path in (folder / "kral", folder / "bin" / "kral", folder.parent / "bin" / "kral"):
        if os.access(path, os.X_OK) and path.is_file():
            return str(path)
    found = shutil.which("kral")
    if found is None:
        raise FileNotFoundError("the tool kral is not installed; set KRAL_TOOL to its path")
    return found


class SimulatedHandset:
    """`with SimulatedHandset(7, "--esn", "1") as handset:` has a handset on COM port 7 of this process (Linux)."""

    def __init__(self, port: int, *options: str) -> None:
        self.port = port
        self.options = options
        self.device = ""
        self._process: Optional["subprocess.Popen[Any]"] = None

    def __enter__(self) -> "SimulatedHandset":
        with tempfile.TemporaryFile() as told:
            self._process = subprocess.Popen([find_tool(), "sim", *self.options], stdin=subprocess.DEVNULL,
                                             stdout=subprocess.PIPE, stderr=told, text=True)
            assert self._process.stdout is not None
            self.device = self._process.stdout.readline().strip()
            if not self.device:
                self._process.communicate()
                told.seek(0)
                raise RuntimeError("the simulated handset did not start: " + told.read().decode().strip())
        os.environ[f"KRAL_COM{self.port}"] = self.device
        return self

    def __exit__(self, kind: Optional[Type[BaseException]], value: Optional[BaseException],
                 trace: Optional[TracebackType]) -> None:
        self.end()

    def end(self) -> None:
        """Ends the handset, as unplugging does."""
        os.environ.pop(f"KRAL_COM{self.port}", None)
        if self._process is not None:
            self._process.terminate()
            self._process.communicate()
            self._process = None
