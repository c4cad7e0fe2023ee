"""Killed, full disk, names that lie: no file is lost.

The tool runs against a handset of ours and is stopped at random moments, by every signal that stops programs, or finds
no room on the disk. What it was to replace is then the old or the new file, whole; what can be tidied up has been.
"""
from __future__ import annotations

import ctypes
import os
import pathlib
import re
import resource
import shutil
import signal
import subprocess
import threading
import time
from typing import List, Optional, Union

from torture import calls
from torture.bench import LINUX, WINDOWS, Bench, check
from torture.peer.backups import same
from torture.peer.codec import frame
from torture.peer.line import PtyLine
from torture.peer.phone import Phone, log
from torture.windows.process import Process, windows_path
from torture.written_files import GROWS, NONE, REPLACED, WRITERS, Writer

NUMBER = 11
TITLE = "Killed, full disk, hostile names: nothing lost"
SHORT = 20
SHORT_WINDOWS = 2
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 2
_MOMENTS = 50
# A program takes seconds to start there.
_MOMENTS_WINDOWS = 10
_MOMENTS_SHORT = 3
_LONGEST_S = 60.0
_OLD = b"what was there before" * 50
_OLD_SLOTS = b"1 COM1\n"
_NEW = bytes(range(256)) * 150
# With every signal; the others are stopped by one that lets them tidy up, and by the one that does not.
_EVERY_SIGNAL = ("get", "put", "back-up", "capture")
_SIGNALS = ("INT", "TERM", "HUP", "QUIT", "KILL")
# These leave a program no time to tidy up.
_AT_ONCE_DEAD = ("QUIT", "KILL")
_LIBC = ctypes.CDLL(None)
_PR_CAPBSET_DROP, _CAP_DAC_OVERRIDE = 24, 1
_NAMES = ("../evil", "../../evil", "/evil", "..", ".", "a/../../evil", "evil\\..\\evil", "\x1b[31mevil", "evil\n",
          "x" * 300, "CON", "evil\x7f")


_Program = Union["subprocess.Popen[bytes]", Process]


class _Desk:
    """A folder of its own, a handset, and the tool."""

    def __init__(self, bench: Bench, port: int, name: str) -> None:
        self.writer = WRITERS.get(name.split("/")[0], Writer(()))
        self.folder = bench.folder / name.replace("/", "-")
        self.folder.mkdir()
        self.target = self.folder / "target"
        self.source = self.folder / "source"
        self.phone = calls.prepare(Phone(calls.SERIAL))
        self.phone.files.put("/data/large", _NEW)
        for item in range(60):
            self.phone.set_item(item, bytes([item]) * 128)
        self.phone.set_item(0, calls.SERIAL.to_bytes(4, "little"))
        self.line = PtyLine(self.phone, bench.ports, port)
        self.port = port
        self._driver = bench.driver
        self._inputs = {"source"}
        self.reset()

    def prepare(self) -> None:
        """What the run reads."""
        if any("capture" in words for words in (*self.writer.first, self.writer.words)):
            self.line.source = lambda: frame(log(0x1001, bytes(40))) * 4
        for words in self.writer.first:
            process = self.run(self.writer.command(self.port, words))
            text = finish(process)
            check(process.returncode == 0, f"{' '.join(words)} exited with {process.returncode}: {text[-300:]!r}")
        self._inputs |= {path.name for path in self.folder.iterdir()} - {"target"}
        if self.writer.kind != GROWS or "capture" not in self.writer.words:
            self.line.drop_pieces()

    def reset(self) -> None:
        self.target.write_bytes(_OLD_SLOTS if self.writer.words[:1] == ("ports",) else _OLD)
        self.source.write_bytes(_NEW)
        self.phone.files.put("/data/target", _OLD)

    def run(self, command: List[str], *, disk: Optional[int] = None) -> _Program:
        if self._driver is not None:
            tool = self.folder.parent / "kral.exe"
            if not tool.exists():
                shutil.copy(command[0], tool)
            return Process(self._driver, [windows_path(tool), *command[1:]], self.folder, {"KRAL_SLOTS": "target"})

        def limit() -> None:
            # The owner of a folder that may not be written is refused as others are, whoever that is.
            _LIBC.prctl(_PR_CAPBSET_DROP, _CAP_DAC_OVERRIDE)
            if disk is not None:
                signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
                resource.setrlimit(resource.RLIMIT_FSIZE, (disk, disk))
        return subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, stderr=subprocess.PIPE,
                                preexec_fn=limit, cwd=self.folder, env={**os.environ, "KRAL_SLOTS": "target"})

    def start(self, *, disk: Optional[int] = None) -> _Program:
        return self.run(self.writer.command(self.port), disk=disk)

    def whole_run(self) -> float:
        """Seconds that it takes when nothing disturbs it; the target is then the new one."""
        self.reset()
        begin = time.monotonic()
        process = self.start()
        text = finish(process)
        check(process.returncode == self.writer.exit_code,
              f"undisturbed it exited with {process.returncode}: {text.decode()[-300:]}")
        return time.monotonic() - begin

    def old(self) -> bytes:
        self.reset()
        return self.target.read_bytes()

    def left_over(self) -> List[str]:
        known = self._inputs | {"target", *self.writer.stays}
        return sorted(path.name for path in self.folder.iterdir() if path.name not in known)


def cases(bench: Bench) -> List[str]:
    if bench.driver is not None:  # where programs are killed, and no signal asks them to end
        return [f"{name}/KILL" for name, writer in WRITERS.items() if not writer.call]
    # A caller of the library that is no tool of ours has nothing that tidies up.
    killed = [f"{name}/{what}" for name, writer in WRITERS.items() for what in _SIGNALS
              if name in _EVERY_SIGNAL or what == "KILL" or (what == "TERM" and not writer.call)]
    full = [f"{name}/{what}" for name, writer in WRITERS.items() if writer.kind == REPLACED
            for what in ("full", "read-only")]
    return killed + full + ["names/get"]


def run(bench: Bench, case: str) -> None:
    operation, what = case.split("/")
    with bench.com_port() as port:
        desk = _Desk(bench, port, case)
        try:
            if operation == "names":
                _hostile_names(bench, desk)
                return
            desk.prepare()
            if what == "full":
                _full_disk(bench, desk)
            elif what == "read-only":
                _read_only_folder(bench, desk)
            else:
                _killed(bench, desk, operation, what)
        finally:
            desk.line.close()


def finish(process: _Program) -> bytes:
    try:
        return process.communicate(timeout=_LONGEST_S)[1]
    finally:
        process.kill()


def _killed(bench: Bench, desk: _Desk, operation: str, what: str) -> None:
    seconds = desk.whole_run()
    whole = desk.target.read_bytes()
    numbers = bench.random(f"{operation}/{what}")
    moments = _MOMENTS if bench.driver is None else _MOMENTS_WINDOWS
    for _ in range(_MOMENTS_SHORT if bench.short else moments):
        desk.reset()
        process = desk.start()
        moment = numbers.uniform(0, seconds)
        killer = threading.Timer(moment, process.send_signal, [getattr(signal, f"SIG{what}")])
        killer.start()
        text = finish(process)
        killer.cancel()
        where = f"SIG{what} after {moment * 1000:.0f} of {seconds * 1000:.0f} ms, exit code {process.returncode}"
        _judge(desk, what, whole, f"{where}: {text.decode(errors='replace')[-200:]}")
        bench.count("kills")
        bench.count("of them in time", int(process.returncode != desk.writer.exit_code))


def _judge(desk: _Desk, what: str, whole: bytes, where: str) -> None:
    target = desk.target.read_bytes()
    left = desk.left_over()
    old = desk.old()
    if desk.writer.kind == NONE:
        check(desk.source.read_bytes() == _NEW and target == old, f"a file of the PC has changed; {where}")
        on_handset = desk.phone.files.files.get("/data/target")
        # Killed at once, the tool cannot remove the part that is there.
        check(what in _AT_ONCE_DEAD or on_handset in (None, _OLD, _NEW),
              f"{len(on_handset or b'')} bytes of {len(_NEW)} are on the handset; {where}")
    elif desk.writer.kind == GROWS:
        check(target == old or _no_digits(whole[:8]).startswith(_no_digits(target[:8])),
              f"what is there does not begin as it should; {where}")
    else:
        check(target == old or same(target, whole),
              f"the target has {len(target)} bytes, neither the old nor the new ones; {where}")
    if "capture" in desk.writer.words and target != old and len(target) >= 16:
        desk.target.write_bytes(target)
        check(_is_readable(desk), f"the capture cannot be read; {where}")
    check(what in _AT_ONCE_DEAD or not left, f"{left} are left; {where}")
    for name in left:
        (desk.folder / name).unlink()


def _no_digits(text: bytes) -> bytes:
    """Times are others in every run."""
    return re.sub(rb"[0-9]", b"0", text)


def _is_readable(desk: _Desk) -> bool:
    process = desk.run(desk.writer.command(desk.port, ("log", "play", "target")))
    finish(process)
    return process.returncode == 0


def _full_disk(bench: Bench, desk: _Desk) -> None:
    """No file may become longer than so many bytes; the last limit is all but enough."""
    desk.whole_run()
    whole = desk.target.read_bytes()
    limits = {0, 1, 100, 516, 4096, len(whole) // 2, len(whole) - 1}
    for disk in sorted(limit for limit in limits if limit < len(whole)):
        _refused(desk, f"room for {disk} of {len(whole)} bytes", disk=disk)
        bench.count("full disks")


def _read_only_folder(bench: Bench, desk: _Desk) -> None:
    desk.whole_run()
    desk.reset()
    desk.folder.chmod(0o555)
    try:
        _refused(desk, "a folder that may not be written")
    finally:
        desk.folder.chmod(0o755)
    bench.count("read-only folders")


def _refused(desk: _Desk, what: str, *, disk: Optional[int] = None) -> None:
    old = desk.old()
    process = desk.start(disk=disk)
    text = finish(process)
    where = f"{what}, exit code {process.returncode}: {text.decode()[-200:]}"
    check(process.returncode is not None and process.returncode > 0, f"it says that all is well; {where}")
    check(desk.target.read_bytes() == old, f"the old file is lost; {where}")
    check(not desk.left_over(), f"{desk.left_over()} are left; {where}")


def _hostile_names(bench: Bench, desk: _Desk) -> None:
    """What the handset lists becomes names inside the folder that was named, or nothing."""
    desk.phone.files.put("/many/good", b"good")
    desk.phone.files.shown = {f"/many/{i}": name for i, name in enumerate(_NAMES)}
    for path in desk.phone.files.shown:
        desk.phone.files.put(path, b"evil")
    (desk.folder / "deep" / "inner").mkdir(parents=True)
    before = _everything(bench.folder, desk.folder / "deep" / "inner" / "out")
    text = finish(desk.run(desk.writer.command(desk.port, ("fs", "get", "-r", ":/many", "deep/inner/out"))))
    after = _everything(bench.folder, desk.folder / "deep" / "inner" / "out")
    check(before == after, f"{after - before} has come; {text.decode(errors='replace')[-300:]}")
    check(not pathlib.Path("/evil").exists(), "/evil has come")
    check(b"\x1b" not in text, "the terminal got an escape sequence of the handset's")
    bench.count("names", len(_NAMES))


def _everything(root: pathlib.Path, but: pathlib.Path) -> "set[str]":
    return {str(path) for path in root.rglob("*")
            if but not in path.parents and path != but and "ports" not in str(path)}
