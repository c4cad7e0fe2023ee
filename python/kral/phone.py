"""A connected handset."""
from __future__ import annotations

import ctypes
import dataclasses
import os
import time
from types import TracebackType
from typing import Any, Callable, Iterable, Iterator, Optional, Type

from kral import _api, pkv, traffic
from kral._connection import Connection, Data, LocalPath, call, integer, local, milliseconds, octets, open_connection
from kral.commands import Commands
from kral.errors import BadArgument, BadFile, KralError, LinkError, NoAnswer, NoPort, PortBusy, fail
from kral.files import Files
from kral.ftm import Ftm
from kral.modes import STATES, Mode
from kral.nv import Nv

_MODE_QUERY = bytes([0x4B, 0x0F, 0x00, 0x00])
_STATE_OFFSET = 8


@dataclasses.dataclass(frozen=True)
class Identity:
    """Who a handset is."""

    serial: int
    model: str
    software: str
    hardware_version: int
    mobile_model: int
    compile_date: str
    compile_time: str
    release_date: str
    release_time: str
    version_directory: str


class Phone:
    """A handset on a port; `kral.connect` makes it. A context manager: the connection ends with the block."""

    def __init__(self, connection: Connection, port: int) -> None:
        self.port = port
        self._connection = connection
        self.cmd = Commands(connection)
        self.ftm = Ftm(connection)
        self.nv = Nv(connection)
        self.files = Files(connection)

    def __enter__(self) -> "Phone":
        return self

    def __exit__(self, kind: Optional[Type[BaseException]], value: Optional[BaseException],
                 trace: Optional[TracebackType]) -> None:
        self.close()

    def __repr__(self) -> str:
        return f"<kral.Phone on port {self.port}{'' if self._connection.is_open else ', closed'}>"

    @property
    def handle(self) -> int:
        """For functions of the C interface: `kral.api().KRAL_...(phone.handle, ...)`."""
        return self._connection.handle

    def close(self) -> None:
        """Ends the connection. A phone that is forgotten, or open when the program ends, is closed as well."""
        self._connection.close()

    # --- Identity, mode, requests

    @property
    def is_connected(self) -> bool:
        """Whether the handset answers now."""
        return self._connection.ask("KRAL_IsPhoneConnected")

    @property
    def identity(self) -> Identity:
        """Asks the handset who it is."""
        texts = [ctypes.create_string_buffer(size) for size in
                 (_api.KRAL_VERNO_DATE_SIZE, _api.KRAL_VERNO_TIME_SIZE, _api.KRAL_VERNO_DATE_SIZE,
                  _api.KRAL_VERNO_TIME_SIZE, _api.KRAL_VERNO_DIRECTORY_SIZE)]
        self._connection.check("KRAL_DIAG_VERNO_F", *texts, *[None] * 7)
        hardware, model_number = ctypes.c_uint32(), ctypes.c_uint32()
        software = ctypes.create_string_buffer(_api.KRAL_BUILD_ID_TEXT_SIZE)
        model = ctypes.create_string_buffer(_api.KRAL_BUILD_ID_TEXT_SIZE)
        self._connection.check("KRAL_DIAG_EXT_BUILD_ID_F", ctypes.byref(hardware), ctypes.byref(model_number), software,
                               model)
        serial = self._connection.number("KRAL_DIAG_READ_ESN_F", ctypes.c_uint32)

        def words(raw: bytes) -> str:
            return raw.split(b"\0")[0].decode("utf-8", "replace").strip()

        dates = [words(text.raw) for text in texts]
        return Identity(serial, words(model.raw), words(software.raw), hardware.value, model_number.value, *dates)

    @property
    def mode(self) -> Mode:
        """The operating mode, as the handset reports it."""
        reply = self.request(_MODE_QUERY)
        if len(reply) < _STATE_OFFSET + 4:
            raise LinkError("the reply to the operating-mode query is too short for a mode")
        state = int.from_bytes(reply[_STATE_OFFSET:_STATE_OFFSET + 4], "little")
        if state not in STATES:
            raise LinkError(f"the handset reports state {state}, which is no mode")
        return STATES[state]

    @mode.setter
    def mode(self, value: int) -> None:
        """Switches the operating mode and waits for it."""
        try:
            mode = Mode(integer(value))
        except ValueError as error:
            raise BadArgument(str(error)) from None
        self._connection.check("KRAL_DIAG_CONTROL_F", int(mode))

    def request(self, data: Data, timeout: float = 4.0) -> bytes:
        """Sends a request, command code first, and gives the reply."""
        reply = ctypes.create_string_buffer(_api.KRAL_LONGEST_REQUEST + 3)
        size = ctypes.c_uint16(len(reply))
        content, wait = octets(data), milliseconds(timeout)
        self._connection.check("KRAL_SendSync", len(content), content, ctypes.byref(size), reply, wait)
        return reply.raw[:size.value]

    def set_timeout(self, which: int, seconds: float) -> None:
        """Sets one of the time-outs (TimeOut)."""
        self._connection.check("KRAL_ConfigureTimeOut", which, milliseconds(seconds))

    def unlock(self, code: str) -> bool:
        """Sends the service programming code, six digits; whether the handset accepted it."""
        if len(code) != _api.KRAL_SERVICE_CODE_SIZE or not code.isascii():
            raise ValueError("a service programming code has six digits")
        return self._connection.number("KRAL_DIAG_SPC_F", ctypes.c_uint8, code.encode("ascii")) == 1

    # --- Backups

    def backup(self, path: LocalPath, progress: Optional[pkv.Progress] = None, items: range = range(10000),
               subscriptions: int = 1) -> pkv.PkvResult:
        """Reads NV items and files into a PKV file. progress(done, total, item) sees each of them.

        Raises the exception of the outcome, whose `result` has the counts and what was refused: Refused means that the
        file is written, without what the handset refused.
        """
        if not isinstance(items, range) or items.step != 1 or not items:
            raise BadArgument("items of a backup are a range without gaps, such as range(10000)")
        return pkv.run(self._connection, "KRAL_BackupNVFromMobileToPKV", path, progress,
                       (items[0], items[-1], subscriptions))

    def restore(self, path: LocalPath, progress: Optional[pkv.Progress] = None) -> pkv.PkvResult:
        """Writes a PKV file to the handset, and reads back what it wrote."""
        return pkv.run(self._connection, "KRAL_RestoreNVFromPKV", path, progress)

    def verify(self, path: LocalPath, progress: Optional[pkv.Progress] = None) -> pkv.PkvResult:
        """Compares a PKV file with the handset. Raises Mismatch when they differ."""
        return pkv.run(self._connection, "KRAL_PKV_Verify", path, progress)

    # --- Logs, events, the text log

    def logs(self, codes: Iterable[int], timeout: Optional[float] = None) -> Iterator[traffic.Packet]:
        """Switches log codes on, and gives the packets as they come. Ends when none came for `timeout` seconds."""
        return traffic.logs(self._connection, codes, timeout)

    def events(self, ids: Optional[Iterable[int]] = None, timeout: Optional[float] = None) -> Iterator[traffic.Event]:
        """Switches events on (all without ids), and gives them as they come. Ends as `logs` does."""
        return traffic.events(self._connection, ids, timeout)

    def text_log(self, path: Optional[LocalPath] = None, flags: int = _api.KRAL_LOG_DEFAULT_MASK,
                 line: Optional[Callable[[str], Any]] = None) -> None:
        """Writes what the library does to a file, or gives each line to a function, or both; without either, neither.

        The function is called on threads of the library, and must not use the phone.
        Other phones of the port have functions and categories of their own, but there is one file: it is refused while
        another phone has one, and has the categories of all.
        """
        def told(_size: int, record: int, _handle: int) -> None:
            category = int.from_bytes(ctypes.string_at(record, 2), "little")
            if category & flags:  # others may ask for more
                text = ctypes.string_at(record + 8, 999).split(b"\0")[0]
                line(text.decode("utf-8", "replace"))  # type: ignore[misc]

        encoded = None if path is None else local(path)
        if path is not None:
            _try_file(path)
        self._connection.log_to(encoded, flags, None if line is None else told)


def _try_file(path: LocalPath) -> None:
    """The library opens a text log with its first line, and does not tell that it could not. Pipes have to wait."""
    if os.path.exists(path) and not os.path.isfile(path) and not os.path.isdir(path):
        return
    try:
        with open(path, "ab"):
            pass
    except OSError as error:
        raise BadFile(f"the text log cannot be written: {error}") from None


_PORT_FAILURES = {
    _api.KRAL_PORT_NOT_FOUND: (NoPort, "there is no port {}"),
    _api.KRAL_PORT_BUSY: (PortBusy, "another program holds port {}"),
    _api.KRAL_PORT_NOT_PERMITTED: (PortBusy, "this user may not open port {}"),
    _api.KRAL_PORT_FAILED: (NoPort, "port {} cannot be opened"),
}


def connect(port: int, wait: float = 0.0) -> Phone:
    """Connects to the handset on a port, by its COM number.

    Tries for `wait` seconds. Raises NoPort, PortBusy, or NoAnswer when the port is there and nobody answers.
    """
    if not 0 < integer(port) <= 0xFFFF:
        raise BadArgument(f"{port} is no number of a port")
    call("KRAL_SetDefaultReceiveMode", _api.KRAL_RECEIVE_MODE_WAKE)
    deadline = time.monotonic() + wait
    while True:
        connection = open_connection("KRAL_ConnectServer", port)
        # An interrupt leaves an answer on its way, which the next request must not take for its own.
        connection.ask("KRAL_SetResynchronise", 1)
        if connection.ask("KRAL_IsPhoneConnected"):
            return Phone(connection, port)
        failure = _no_handset(connection, port)
        connection.close()
        if time.monotonic() >= deadline:
            raise failure
        time.sleep(min(0.1, max(0.0, deadline - time.monotonic())))


def _no_handset(connection: Connection, port: int) -> KralError:
    state = ctypes.c_int32()
    connection.ask("KRAL_GetPortState", ctypes.byref(state))
    record = connection.last_error()
    if state.value in _PORT_FAILURES:
        kind, text = _PORT_FAILURES[state.value]
        return kind(text.format(port), record)
    return NoAnswer(f"no handset answers on port {port}", record)


def ports() -> "list[int]":
    """The serial ports of this machine, by COM number. None is opened."""
    count = ctypes.c_uint16(1024)
    found = (ctypes.c_uint16 * 1024)()
    if not call("KRAL_GetAllPortList", ctypes.byref(count), found):
        fail(0, "KRAL_GetAllPortList")
    return list(found[:count.value])
