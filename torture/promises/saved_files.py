"""Killed, full disk, names that lie: no file is lost.

The tool runs against a handset of ours and is stopped at random moments, by every signal that stops programs, or finds
no room on the disk. What it was to replace is then the old or the new file, whole; what can be tidied up has been.
"""
from __future__ import annotations

import os
import pathlib
import resource
import signal
import subprocess
import threading
import time
from typing import Callable, Dict, List, Optional

from torture import calls
from torture.bench import Bench, check
from torture.peer.codec import frame
from torture.peer.line import PtyLine
from torture.peer.phone import Phone, log

NUMBER = 11
TITLE = "Killed, full disk, hostile names: nothing lost"
SHORT = 12
AT_ONCE = 2
_MOMENTS = 50
_MOMENTS_SHORT = 3
_LONGEST_S = 60.0
_OLD = b"what was there before" * 50
_NEW = bytes(range(256)) * 150
_SIGNALS = ("INT", "TERM", "HUP", "QUIT", "KILL")
# These leave a program no time to tidy up.
_AT_ONCE_DEAD = ("QUIT", "KILL")
_NAMES = ("../evil", "../../evil", "/evil", "..", ".", "a/../../evil", "evil\\..\\evil", "\x1b[31mevil", "evil\n",
          "x" * 300, "CON", "evil\x7f")


class _Desk:
    """A folder of its own, a handset, and the tool."""

    def __init__(self, bench: Bench, port: int, name: str) -> None:
        self.folder = bench.folder / name.replace("/", "-")
        self.folder.mkdir(exist_ok=True)
        self.target = self.folder / "target"
        self.source = self.folder / "source"
        self.phone = calls.prepare(Phone(calls.SERIAL))
        self.phone.files.put("/data/large", _NEW)
        for item in range(60):
            self.phone.set_item(item, bytes([item]) * 128)
        self.phone.set_item(0, calls.SERIAL.to_bytes(4, "little"))
        self.line = PtyLine(self.phone, bench.ports, port)
        self._port = port

    def reset(self) -> None:
        self.target.write_bytes(_OLD)
        self.source.write_bytes(_NEW)
        self.phone.files.put("/data/target", _OLD)

    def start(self, *words: str, disk: Optional[int] = None) -> "subprocess.Popen[bytes]":
        def limit() -> None:
            if disk is not None:
                signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
                resource.setrlimit(resource.RLIMIT_FSIZE, (disk, disk))
        return subprocess.Popen([os.environ["KRAL_TOOL"], "-p", str(self._port), *words], stdin=subprocess.DEVNULL,
                                stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, preexec_fn=limit, cwd=self.folder)

    def left_over(self) -> List[str]:
        return sorted(path.name for path in self.folder.iterdir() if path.name not in ("target", "source"))


_OPERATIONS: Dict[str, Callable[[_Desk], List[str]]] = {
    "get": lambda desk: ["fs", "get", ":/data/large", "target"],
    "put": lambda desk: ["fs", "put", "source", ":/data/target"],
    "back-up": lambda desk: ["nv", "backup", "target", "--items", "0-80"],
    "capture": lambda desk: ["log", "capture", "target", "--on", "0x1001", "--count", "2000"],
}


def cases(bench: Bench) -> List[str]:
    killed = [f"{operation}/{name}" for operation in _OPERATIONS for name in _SIGNALS]
    return killed + [f"{operation}/full" for operation in ("get", "back-up")] + ["names/get"]


def run(bench: Bench, case: str) -> None:
    operation, what = case.split("/")
    with bench.com_port() as port:
        desk = _Desk(bench, port, case)
        try:
            if operation == "names":
                _hostile_names(bench, desk)
            elif what == "full":
                _full_disk(bench, desk, operation)
            else:
                _killed(bench, desk, operation, what)
        finally:
            desk.line.close()


def _finish(process: "subprocess.Popen[bytes]") -> bytes:
    try:
        return process.communicate(timeout=_LONGEST_S)[1]
    finally:
        process.kill()


def _whole_run(desk: _Desk, operation: str) -> float:
    """Seconds that it takes when nothing disturbs it; the target is then the new one."""
    desk.reset()
    begin = time.monotonic()
    process = desk.start(*_OPERATIONS[operation](desk))
    text = _finish(process)
    check(process.returncode == 0, f"undisturbed it exited with {process.returncode}: {text.decode()[-300:]}")
    return time.monotonic() - begin


def _flood(desk: _Desk, operation: str) -> None:
    """Something to capture."""
    if operation == "capture":
        desk.line.source = lambda: frame(log(0x1001, bytes(40))) * 4


def _killed(bench: Bench, desk: _Desk, operation: str, what: str) -> None:
    _flood(desk, operation)
    seconds = _whole_run(desk, operation)
    whole = desk.target.read_bytes()
    numbers = bench.random(f"{operation}/{what}")
    for _ in range(_MOMENTS_SHORT if bench.short else _MOMENTS):
        desk.reset()
        process = desk.start(*_OPERATIONS[operation](desk))
        moment = numbers.uniform(0, seconds)
        killer = threading.Timer(moment, process.send_signal, [getattr(signal, f"SIG{what}")])
        killer.start()
        text = _finish(process)
        killer.cancel()
        where = f"SIG{what} after {moment * 1000:.0f} of {seconds * 1000:.0f} ms, exit code {process.returncode}"
        _judge(desk, operation, what, whole, f"{where}: {text.decode(errors='replace')[-200:]}")
        bench.count("kills")


def _judge(desk: _Desk, operation: str, what: str, whole: bytes, where: str) -> None:
    target = desk.target.read_bytes()
    if operation == "put":
        check(desk.source.read_bytes() == _NEW and target == _OLD, f"a file of the PC has changed; {where}")
        on_handset = desk.phone.files.files.get("/data/target")
        # Killed at once, the tool cannot remove the part that is there.
        check(what in _AT_ONCE_DEAD or on_handset in (None, _OLD, _NEW),
              f"{len(on_handset or b'')} bytes of {len(_NEW)} are on the handset; {where}")
    elif operation == "capture":
        check(target == _OLD or whole[:8].startswith(target[:8]), f"the capture is not one; {where}")
        check(target == _OLD or len(target) < 16 or _is_readable(desk), f"the capture cannot be read; {where}")
    else:
        check(target in (_OLD, whole), f"the target has {len(target)} bytes, neither the old nor the new ones; {where}")
    left = desk.left_over()
    check(what in _AT_ONCE_DEAD or not left, f"{left} are left; {where}")
    for name in left:
        (desk.folder / name).unlink()


def _is_readable(desk: _Desk) -> bool:
    return subprocess.run([os.environ["KRAL_TOOL"], "log", "play", "target"], cwd=desk.folder, check=False,
                          stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL).returncode == 0


def _full_disk(bench: Bench, desk: _Desk, operation: str) -> None:
    """No file may become longer than so many bytes; the last limit is enough."""
    _whole_run(desk, operation)
    whole = desk.target.read_bytes()
    for disk in (0, 1, 100, 516, 4096, len(whole) // 2, len(whole) - 1):
        desk.reset()
        process = desk.start(*_OPERATIONS[operation](desk), disk=disk)
        text = _finish(process)
        where = f"room for {disk} of {len(whole)} bytes, exit code {process.returncode}: {text.decode()[-200:]}"
        check(process.returncode > 0, f"it says that all is well; {where}")
        check(desk.target.read_bytes() == _OLD, f"the old file is lost; {where}")
        check(not desk.left_over(), f"{desk.left_over()} are left; {where}")
        bench.count("full disks")


def _hostile_names(bench: Bench, desk: _Desk) -> None:
    """What the handset lists becomes names inside the folder that was named, or nothing."""
    desk.phone.files.put("/many/good", b"good")
    desk.phone.files.shown = {f"/many/{i}": name for i, name in enumerate(_NAMES)}
    for path in desk.phone.files.shown:
        desk.phone.files.put(path, b"evil")
    (desk.folder / "deep" / "inner").mkdir(parents=True)
    before = _everything(bench.folder, desk.folder / "deep" / "inner" / "out")
    text = _finish(desk.start("fs", "get", "-r", ":/many", "deep/inner/out"))
    after = _everything(bench.folder, desk.folder / "deep" / "inner" / "out")
    check(before == after, f"{after - before} has come; {text.decode(errors='replace')[-300:]}")
    check(not pathlib.Path("/evil").exists(), "/evil has come")
    check(b"\x1b" not in text, "the terminal got an escape sequence of the handset's")
    bench.count("names", len(_NAMES))


def _everything(root: pathlib.Path, but: pathlib.Path) -> "set[str]":
    return {str(path) for path in root.rglob("*")
            if but not in path.parents and path != but and "ports" not in str(path)}
