"""What a handset sends of its own accord: logs and events, as iterators."""
from __future__ import annotations

import ctypes
import dataclasses
import struct
import time
from typing import Any, Callable, Iterable, Iterator, Optional, TypeVar

from kral import _api
from kral._connection import Connection, array
from kral.errors import ErrorRecord, Lost

T = TypeVar("T")
_SLICE = 0.1  # seconds in the library at a time, so that Ctrl-C is noticed
_LOG = 16


@dataclasses.dataclass(frozen=True)
class Packet:
    """An unsolicited packet: a log, a message or an event report, as it came, without its frame check."""

    data: bytes

    @property
    def is_log(self) -> bool:
        return self.data[0] == _LOG

    @property
    def code(self) -> Optional[int]:
        """The log code; None for other packets."""
        return struct.unpack_from("<H", self.data, 6)[0] if self.is_log and len(self.data) >= 8 else None

    @property
    def payload(self) -> bytes:
        """What follows the head of a log packet: lengths, code and time stamp."""
        return self.data[16:] if self.is_log else self.data[1:]


@dataclasses.dataclass(frozen=True)
class Event:
    """An event of a report."""

    id: int
    time_stamp: bytes  # 8 bytes, or 2 of a truncated one
    payload: bytes


def _each(connection: Connection, take: Callable[[int], Optional[T]], wanted: Callable[[T], bool],
          timeout: Optional[float]) -> Iterator[T]:
    """Takes what is wanted, until none of that has come for `timeout` seconds; for ever without one."""
    last = time.monotonic()
    while True:
        left = _SLICE if timeout is None else min(_SLICE, max(0.0, last + timeout - time.monotonic()))
        taken = take(int(left * 1000))
        if taken is not None and wanted(taken):
            yield taken
            last = time.monotonic()
            continue
        if timeout is not None and time.monotonic() >= last + timeout:
            return
        state = ctypes.c_int32()
        if taken is None and connection.ask("KRAL_GetPortState", ctypes.byref(state)) and \
                state.value == _api.KRAL_PORT_GONE:
            text = "the handset or its port went away"
            raise Lost(text, ErrorRecord(_api.KRAL_ERROR_LOST, text, "", 0, 0, 0, None, None, None))


def logs(connection: Connection, codes: Iterable[int], timeout: Optional[float]) -> Iterator[Packet]:
    """Switches log codes on, and gives the packets as they come."""
    wanted = list(array(ctypes.c_uint16, sorted(set(codes))))
    connection.check("KRAL_DIAG_SetPhoneLoggingState", 1)
    for equipment in sorted({code >> 12 for code in wanted}):
        own = [code for code in wanted if code >> 12 == equipment]
        connection.check("KRAL_DIAG_AddExtendedLogCodes", equipment, array(ctypes.c_uint16, own), len(own))
    buffer = ctypes.create_string_buffer(_api.KRAL_LONGEST_PACKET)

    def take(wait_ms: int) -> Optional[Packet]:
        size = ctypes.c_uint16()
        if not connection.ask("KRAL_DIAG_WaitNextPhoneLog", ctypes.byref(size), buffer, wait_ms):
            return None
        return Packet(buffer.raw[:max(size.value - 2, 0)])

    # The queue holds messages, event reports and what was on before, too.
    return _each(connection, take, lambda packet: not wanted or packet.code in wanted, timeout)


def events(connection: Connection, ids: Optional[Iterable[int]], timeout: Optional[float]) -> Iterator[Event]:
    """Switches events on (all of them without ids), and gives them as they come."""
    if ids is None:
        connection.check("KRAL_DIAG_SetEntireEventMaskState", 1)
        wanted: Any = None
    else:
        wanted = sorted(set(ids))
        connection.check("KRAL_DIAG_SetEventMaskBits", array(ctypes.c_uint16, wanted), len(wanted), 1)

    def take(wait_ms: int) -> Optional[Event]:
        raw = _api.KRAL_EVENT()
        if not connection.ask("KRAL_DIAG_WaitNextEvent", ctypes.byref(raw), wait_ms):
            return None
        return Event(raw.event_id[0] | raw.event_id[1] << 8, bytes(raw.time_stamp[:raw.time_stamp_length]),
                     bytes(raw.payload[:raw.payload_length]))

    return _each(connection, take, lambda event: wanted is None or event.id in wanted, timeout)
