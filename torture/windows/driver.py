"""The DLL under Wine, called by name: stands in for `kral.api()`, so that the programs need not know.

`driver.c` is at the other end. Each thread of this process has one of its own there, so calls run beside each other.
"""
from __future__ import annotations

import ctypes
import os
import pathlib
import struct
import subprocess
import threading
from typing import Any, Dict, List, Tuple

from kral import _api

_TREE = pathlib.Path(__file__).resolve().parents[2]
_COMPILER = ("i686-w64-mingw32-gcc", "-O2", "-std=c11", "-Wall", "-Wextra", "-Werror")
_START_S = 60.0
_END_S = 10.0
_DLL = "kral.dll"
_WORD = 0xFFFFFFFF
# What a sleep there is always late by: two pipes and the timer, in seconds.
SLACK = 0.003
_POINTERS = (ctypes.c_char_p, ctypes.c_void_p)


class Fault(Exception):
    """The driver could not call the function, or is no more."""


class _Thread:
    """A thread of the driver, lent to one of ours for as long as that lives."""

    def __init__(self, free: List[int]) -> None:
        self._free = free
        self.number = free.pop()

    def __del__(self) -> None:
        self._free.append(self.number)


class Driver:
    """The process under Wine. Raw calls: results are the registers, outputs come back as bytes."""

    _THREADS = 128

    def __init__(self, folder: pathlib.Path, com_ports: Dict[int, str]) -> None:
        program = folder / "driver.exe"
        if not program.exists():
            subprocess.run([*_COMPILER, "-o", str(program), str(pathlib.Path(__file__).with_name("driver.c"))],
                           check=True)
        environment = {**os.environ, **{f"KRAL_COM{port}": link for port, link in com_ports.items()}}
        # The server of Wine lists on its way out what was left open.
        with open(folder / "driver.log", "wb") as log:
            self._process = subprocess.Popen([str(_TREE / "scripts" / "wine-run"), str(program)], cwd=folder,
                                             env=environment, stderr=log, stdin=subprocess.PIPE, stdout=subprocess.PIPE)
        self._write_lock = threading.Lock()
        self._mine = threading.local()
        self._free = list(range(self._THREADS - 1, -1, -1))
        self._answers: Dict[int, str] = {}
        self._arrived = [threading.Semaphore(0) for _ in range(self._THREADS)]
        self._ready = threading.Event()
        self._dead = False
        self.own_id = 0
        self._reader = threading.Thread(target=self._read, daemon=True)
        self._reader.start()
        if not self._ready.wait(_START_S) or self._dead:
            raise Fault("the driver did not start")

    def _read(self) -> None:
        assert self._process.stdout is not None
        for raw in self._process.stdout:
            first, _, rest = raw.decode().rstrip("\r\n").partition(" ")
            if first == "ready":
                self.own_id = int(rest, 16)
                self._ready.set()
            else:
                self._answers[int(first)] = rest
                self._arrived[int(first)].release()
        self._dead = True
        self._ready.set()
        for one in self._arrived:
            one.release()

    def call(self, function: str, *words: str) -> Tuple[int, List[bytes]]:
        """`function` is "module!name"; the words are arguments as driver.c reads them."""
        if not hasattr(self._mine, "thread"):
            self._mine.thread = _Thread(self._free)
        number = self._mine.thread.number
        line = " ".join((str(number), function, *words)) + "\n"
        try:
            with self._write_lock:
                assert self._process.stdin is not None
                self._process.stdin.write(line.encode())
                self._process.stdin.flush()
        except OSError as error:
            raise Fault(f"the driver is gone in front of {function}: {error}") from error
        self._arrived[number].acquire()
        answer = self._answers.pop(number, None)
        if answer is None:
            raise Fault(f"the driver ended in {function}, exit code {self._process.wait(_END_S)}")
        # An empty output leaves an empty word.
        low, high, *outputs = answer.split(" ")
        if low == "!":
            raise Fault(f"{function}: {' '.join([high, *outputs])}")
        return int(low, 16) | int(high, 16) << 32, [bytes.fromhex(one) for one in outputs]

    def sleep(self, seconds: float) -> None:
        self.call("kernel32!Sleep", word(round(seconds * 1000)))

    def load(self, name: str = _DLL) -> int:
        return self.call("kernel32!LoadLibraryA", text(name))[0] & _WORD

    def free(self, module: int) -> int:
        return self.call("kernel32!FreeLibrary", word(module))[0] & _WORD

    def is_loaded(self) -> bool:
        return self.call("kernel32!GetModuleHandleA", text(_DLL))[0] & _WORD != 0

    def state(self) -> Dict[str, int]:
        """Of its process, as the system outside sees it: memory in KiB, descriptors, threads; and its handles."""
        process = _process_of_driver()
        with open(f"/proc/{process}/status", encoding="ascii") as status:
            memory = next(int(line.split()[1]) for line in status if line.startswith("RssAnon"))
        return {"memory": memory, "descriptors": len(os.listdir(f"/proc/{process}/fd")),
                "threads": len(os.listdir(f"/proc/{process}/task")),
                "handles": self.call("-!handle_count")[0] & _WORD}

    def close(self) -> None:
        assert self._process.stdin is not None
        self._process.stdin.close()
        try:
            self._process.wait(_END_S)
        except subprocess.TimeoutExpired:
            self._process.kill()


def word(value: int) -> str:
    return f"i{value & _WORD:x}"


def text(value: str) -> str:
    return "s" + value.encode().hex()


def _object_of(argument: Any) -> Any:
    """What a pointer made by ctypes leads to: byref, cast of an array, or the array itself."""
    if hasattr(argument, "_obj"):
        return argument._obj  # pylint: disable=protected-access
    if isinstance(argument, (ctypes.Array, ctypes.Structure)):
        return argument
    address = ctypes.cast(argument, ctypes.c_void_p).value
    for kept in (argument._objects or {}).values():  # pylint: disable=protected-access
        if isinstance(kept, ctypes.Array) and ctypes.addressof(kept) == address:
            return kept
    raise TypeError(f"what {argument!r} leads to is not known")


def _number(kind: Any, value: Any) -> str:
    value = getattr(value, "value", value)
    if kind is ctypes.c_double:
        value, = struct.unpack("<Q", struct.pack("<d", value))
    if ctypes.sizeof(kind) == 8 and kind is not ctypes.c_size_t:
        return f"q{value & 0xFFFFFFFFFFFFFFFF:x}"
    return word(value)


class RemoteApi:
    """The exported functions, with the arguments that ctypes would take. Callbacks are not carried over."""

    def __init__(self, driver: Driver) -> None:
        self.driver = driver
        if not driver.load():
            raise Fault(f"{_DLL} cannot be loaded")

    def __getattr__(self, name: str) -> Any:
        result_kind, kinds = _api.PROTOTYPES[name]

        def function(*arguments: Any) -> Any:
            return self._call(name, result_kind, kinds, arguments)
        self.__dict__[name] = function
        return function

    def _call(self, name: str, result_kind: Any, kinds: List[Any], arguments: Tuple[Any, ...]) -> Any:
        words, outputs = [], []
        for kind, argument in zip(kinds, arguments):
            if hasattr(kind, "_type_") and kind not in _POINTERS and isinstance(kind._type_, str):
                words.append(_number(kind, argument))
            elif argument is None:
                words.append(word(0))
            elif isinstance(argument, bytes):
                words.append("s" + argument.hex())
            else:
                target = _object_of(argument)
                outputs.append(target)
                words.append("b" + bytes(target).hex())
        assert len(words) == len(kinds) == len(arguments), f"{name} has {len(kinds)} arguments"
        result, given = self.driver.call(f"{_DLL}!{name}", *words)
        for target, value in zip(outputs, given):
            ctypes.memmove(ctypes.addressof(target), value, len(value))
        return None if result_kind is None else result_kind(result & _WORD).value


def _process_of_driver() -> int:
    """Its number out here: the one below ours whose name is the driver's."""
    parents: Dict[int, Tuple[int, str]] = {}
    for one in pathlib.Path("/proc").glob("[0-9]*/stat"):
        try:
            number, _, rest = one.read_text(encoding="utf-8", errors="replace").partition(" (")
        except OSError:
            continue
        name, _, fields = rest.rpartition(") ")
        parents[int(number)] = int(fields.split()[1]), name

    def is_below(number: int) -> bool:
        while number in parents:
            if number == os.getpid():
                return True
            number = parents[number][0]
        return False
    found = [number for number, (_, name) in parents.items() if name == "driver.exe" and is_below(number)]
    if len(found) != 1:
        raise Fault(f"{len(found)} processes are the driver")
    return found[0]
