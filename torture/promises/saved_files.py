"""Killed, full disk, names that lie: no file is lost.

The tool runs against a handset of ours and is stopped at random moments, by every signal that stops programs, or finds
no room on the disk. What it was to replace is then the old or the new file, whole; what can be tidied up has been.
"""
from __future__ import annotations

import ctypes
import json
import os
import pathlib
import re
import resource
import shutil
import signal
import subprocess
import threading
import time
from typing import Dict, List, Optional, Tuple, Union

from torture import calls
from torture.bench import LINUX, WINDOWS, Bench, check
from torture.peer.backups import same
from torture.peer.codec import frame
from torture.peer.line import PtyLine
from torture.peer.phone import Phone, log
from torture.windows.process import Process, windows_path
from torture.written_files import GROWS, NONE, REPLACED, SERIES, WRITERS, Writer

NUMBER = 11
TITLE = "Killed, full disk, hostile names: nothing lost"
SHORT = 20
SHORT_WINDOWS = 2
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 2
_MOMENTS = 50
_MOMENTS_SHORT = 3
_LONGEST_S = 60.0
_OLD = b"what was there before" * 50
_OLD_SLOTS = b"1 COM1\n"
_CAPTURE_BEGIN = b"KRALCAP\x1a"
_NEW = bytes(range(256)) * 150
# With every signal; the others are stopped by one that lets them tidy up, and by the one that does not.
_EVERY_SIGNAL = ("get", "put", "back-up", "capture")
_SIGNALS = ("INT", "TERM", "HUP", "QUIT", "KILL")
# These leave a program no time to tidy up.
_AT_ONCE_DEAD = ("QUIT", "KILL")
# An exit code, and the bytes without which a file is none.
_BAD_FILE, _LONGEST_HEAD = 10, 256
_TOO_LITTLE = (b"cannot be written", b"lines are lost", b"does not hold everything", b"of the packets are not in")
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
        self._inputs |= {path.name for path in self.folder.iterdir()} - set(self.targets())
        if "capture" not in self.writer.words:
            self.line.drop_pieces()

    def reset(self) -> None:
        for name in self.targets():
            (self.folder / name).unlink()
        for name in self.writer.before:
            (self.folder / name).write_bytes(_OLD_SLOTS if self.writer.words[:1] == ("ports",) else _OLD)
        self.source.write_bytes(_NEW)
        self.phone.files.put("/data/target", _OLD)

    def run(self, command: List[str], *, disk: Optional[int] = None, stdout: int = subprocess.DEVNULL) -> _Program:
        if self._driver is not None:
            tool = self.folder.parent / "kral.exe"
            if not tool.exists():
                shutil.copy(command[0], tool)
            words = [windows_path(pathlib.Path(word)) if word.startswith("/") else word for word in command[1:]]
            return Process(self._driver, [windows_path(tool), *words], self.folder, {"KRAL_SLOTS": "target"},
                           stdout=stdout)

        def limit() -> None:
            # The owner of a folder that may not be written is refused as others are, whoever that is.
            _LIBC.prctl(_PR_CAPBSET_DROP, _CAP_DAC_OVERRIDE)
            if disk is not None:
                signal.signal(signal.SIGXFSZ, signal.SIG_IGN)
                resource.setrlimit(resource.RLIMIT_FSIZE, (disk, disk))
        return subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=stdout, stderr=subprocess.PIPE,
                                preexec_fn=limit, cwd=self.folder, env={**os.environ, "KRAL_SLOTS": "target"})

    def start(self, *, disk: Optional[int] = None) -> _Program:
        return self.run(self.writer.command(self.port), disk=disk,
                        stdout=subprocess.PIPE if "capture" in self.writer.words else subprocess.DEVNULL)

    def whole_run(self) -> float:
        """Seconds that it takes when nothing disturbs it; the target is then the new one."""
        self.reset()
        begin = time.monotonic()
        process = self.start()
        text = finish(process)
        check(process.returncode == self.writer.exit_code,
              f"undisturbed it exited with {process.returncode}: {text.decode()[-300:]}")
        return time.monotonic() - begin

    def targets(self) -> Dict[str, bytes]:
        """What it writes, as far as it is there."""
        found = sorted(path for path in self.folder.glob(self.writer.writes) if not path.name.endswith(".tmp"))
        return {path.name: path.read_bytes() for path in found}

    def old(self) -> Dict[str, bytes]:
        self.reset()
        return self.targets()

    def left_over(self) -> List[str]:
        known = self._inputs | {*self.targets(), *self.writer.stays}
        return sorted(path.name for path in self.folder.iterdir() if path.name not in known)


def cases(bench: Bench) -> List[str]:
    if bench.driver is not None:  # where programs are killed, and no signal asks them to end
        return [f"{name}/KILL" for name, writer in WRITERS.items() if not writer.call]
    # A caller of the library that is no tool of ours has nothing that tidies up.
    killed = [f"{name}/{what}" for name, writer in WRITERS.items() for what in _SIGNALS
              if name in _EVERY_SIGNAL or what == "KILL" or (what == "TERM" and not writer.call)]
    full = [f"{name}/{what}" for name, writer in WRITERS.items() if writer.kind != NONE
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
    return outputs(process)[1]


def outputs(process: _Program) -> Tuple[Optional[bytes], bytes]:
    """What it printed, where that is looked at, and what it said."""
    try:
        return process.communicate(timeout=_LONGEST_S)
    finally:
        process.kill()


def _packets_told(output: bytes) -> int:
    """What a capture that came to its end says is in its files."""
    told = re.match(rb"([0-9]+) packets? in ", output)
    check(told is not None, f"a capture ended with {output!r}")
    return int(told[1]) if told else 0


def _killed(bench: Bench, desk: _Desk, operation: str, what: str) -> None:
    seconds = desk.whole_run()
    whole = desk.targets()
    numbers = bench.random(f"{operation}/{what}")
    for _ in range(_MOMENTS_SHORT if bench.short else _MOMENTS):
        desk.reset()
        process = desk.start()
        moment = numbers.uniform(0, seconds)
        killer = threading.Timer(moment, process.send_signal, [getattr(signal, f"SIG{what}")])
        killer.start()
        told, text = outputs(process)
        killer.cancel()
        packets = _packets_told(told) if process.returncode == 0 and told is not None else None
        where = f"SIG{what} after {moment * 1000:.0f} of {seconds * 1000:.0f} ms, exit code {process.returncode}"
        _judge(desk, what, whole, f"{where}: {text.decode(errors='replace')[-200:]}", packets)
        bench.count("kills")
        bench.count("of them in time", int(process.returncode != desk.writer.exit_code))


def _judge(desk: _Desk, what: str, whole: Dict[str, bytes], where: str, told: Optional[int] = None) -> None:
    targets = desk.targets()
    left = desk.left_over()
    old = desk.old()
    at_once = what in _AT_ONCE_DEAD
    if desk.writer.kind == NONE:
        check(desk.source.read_bytes() == _NEW and targets == old, f"a file of the PC has changed; {where}")
        on_handset = desk.phone.files.files.get("/data/target")
        # Killed at once, the tool cannot remove the part that is there.
        check(at_once or on_handset in (None, _OLD, _NEW),
              f"{len(on_handset or b'')} bytes of {len(_NEW)} are on the handset; {where}")
    elif desk.writer.kind == REPLACED:
        _judge_replaced(targets, old, whole, where)
    else:
        there = _judge_grown(desk, targets, old, whole, where, may_be_cut=at_once)
        # Of those that are kept the first ones have gone.
        check(told in (None, there) or desk.writer.keep > 0, f"{there} packets are there, not {told}; {where}")
    check(at_once or not left, f"{left} are left; {where}")
    for name in left:
        (desk.folder / name).unlink()


def _judge_replaced(targets: Dict[str, bytes], old: Dict[str, bytes], whole: Dict[str, bytes], where: str, *,
                    disk: Optional[int] = None) -> None:
    """`disk`: a file that is longer has not come."""
    check(set(old) <= set(targets), f"{set(old) - set(targets)} are no longer there; {where}")
    for name, bytes_there in targets.items():
        may_be_new = name in whole and (disk is None or len(whole[name]) <= disk)
        check(bytes_there == old.get(name) or (may_be_new and _same(bytes_there, whole[name])),
              f"{name} has {len(bytes_there)} bytes, neither the old nor the new ones; {where}")


def _judge_grown(desk: _Desk, targets: Dict[str, bytes], old: Dict[str, bytes], whole: Dict[str, bytes], where: str, *,
                 may_be_cut: bool) -> int:
    """The packets of captures that are new."""
    begin = _no_digits(next(iter(whole.values()))[:8]) if desk.writer.kind == GROWS else _CAPTURE_BEGIN
    new = {name: there for name, there in targets.items() if there != old.get(name)}
    if desk.writer.kind == SERIES:
        _judge_series(desk, targets, old, where)
    packets = 0
    for name, there in new.items():
        check(begin.startswith(_no_digits(there[:8])), f"{name} does not begin as it should; {where}")
        # Only the last of a series may still have been written.
        if "capture" in desk.writer.words and (len(there) >= 16 or name != max(new)):
            packets += _check_capture(desk, there, f"{name}; {where}", may_be_cut=may_be_cut and name == max(new))
    return packets


def _judge_series(desk: _Desk, targets: Dict[str, bytes], old: Dict[str, bytes], where: str) -> None:
    """All of former runs is there, or what is to be kept of all, the latest, and no number is missing."""
    numbers = [int(name.rpartition("-")[2]) for name in targets]
    check(numbers == list(range(numbers[0], numbers[0] + len(numbers))), f"{list(targets)} are there; {where}")
    check(all(targets.get(name, there) == there for name, there in old.items()), f"one of before is another; {where}")
    if desk.writer.keep == 0:
        check(set(old) <= set(targets), f"one of before is no longer there; {where}")
    else:  # the next file begins before the oldest goes
        check(desk.writer.keep <= len(targets) <= desk.writer.keep + 1, f"{list(targets)} are there; {where}")


def _check_capture(desk: _Desk, capture: bytes, where: str, *, may_be_cut: bool) -> int:
    """How many packets are in it."""
    file = desk.folder / "looked-at"
    file.write_bytes(capture)
    process = desk.run(desk.writer.command(desk.port, ("--json", "log", "play", file.name)), stdout=subprocess.PIPE)
    told, text = outputs(process)
    file.unlink()
    check(process.returncode == 0, f"the capture cannot be read: {text[-200:]!r}; {where}")
    check(may_be_cut or b"is cut" not in text, f"the capture is cut; {where}")
    return int(json.loads((told or b"").splitlines()[-1])["packets"])


def _same(first: bytes, second: bytes) -> bool:
    """A report has the times of its run, and is written of one that was interrupted, too: it is whole."""
    ends = (b"<title>kral info</title>", b"</html>\n")
    return same(first, second) or (ends[0] in first and first.endswith(ends[1]))


def _no_digits(text: bytes) -> bytes:
    """Times are others in every run."""
    return re.sub(rb"[0-9]", b"0", text)


def _full_disk(bench: Bench, desk: _Desk) -> None:
    """No file may become longer than so many bytes; the last limit is all but enough, for what has one length."""
    desk.whole_run()
    whole = {name: there for name, there in desk.targets().items() if there != _OLD}
    length = max(map(len, whole.values()))
    # What grows or has the times of its run is not of the same length twice.
    has_one_length = desk.writer.kind == REPLACED and "--report" not in desk.writer.words
    limits = {0, 1, 100, 516, 4096, length // 2, *([length - 1] if has_one_length else [])}
    for disk in sorted(limit for limit in limits if limit < length):
        what = f"room for {disk} of {length} bytes"
        if desk.writer.kind == REPLACED:
            _refused(desk, whole, what, disk=disk)
        else:
            _has_too_little(desk, whole, what, disk)
        bench.count("full disks")


def _has_too_little(desk: _Desk, whole: Dict[str, bytes], what: str, disk: int) -> None:
    """What there is room for is there, and it is told that it is not all."""
    desk.reset()
    process = desk.start(disk=disk)
    text = finish(process)
    where = f"{what}, exit code {process.returncode}: {text.decode()[-200:]}"
    is_all = "capture" in desk.writer.words
    # What accompanies a command is refused if it cannot even begin.
    expected = ([] if is_all else [desk.writer.exit_code]) + ([_BAD_FILE] if is_all or disk < _LONGEST_HEAD else [])
    check(process.returncode in expected, f"another exit code; {where}")
    check(any(said in text for said in _TOO_LITTLE), f"it does not say that something is missing; {where}")
    _judge_grown(desk, desk.targets(), desk.old(), whole, where, may_be_cut=True)


def _read_only_folder(bench: Bench, desk: _Desk) -> None:
    desk.whole_run()
    whole = desk.targets()
    desk.reset()
    desk.folder.chmod(0o555)
    try:
        if desk.writer.kind == GROWS:
            _written_anyway(desk, whole)
        else:
            _refused(desk, whole, "a folder that may not be written", disk=-1)
    finally:
        desk.folder.chmod(0o755)
    bench.count("read-only folders")


def _written_anyway(desk: _Desk, whole: Dict[str, bytes]) -> None:
    process = desk.start()
    text = finish(process)
    targets = desk.targets()
    where = f"a folder that may not be written, exit code {process.returncode}: {text.decode()[-200:]}"
    check(process.returncode == desk.writer.exit_code, f"another exit code; {where}")
    desk.folder.chmod(0o755)
    _judge_grown(desk, targets, desk.old(), whole, where, may_be_cut=False)


def _refused(desk: _Desk, whole: Dict[str, bytes], what: str, *, disk: int) -> None:
    """Files cannot be longer than `disk`; with -1 none can be made."""
    old = desk.old()
    process = desk.start(disk=disk if disk >= 0 else None)
    text = finish(process)
    where = f"{what}, exit code {process.returncode}: {text.decode()[-200:]}"
    check(process.returncode is not None and process.returncode > 0, f"it says that all is well; {where}")
    _judge_replaced(desk.targets(), old, whole, where, disk=disk)
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
