"""A handset that keeps what it is given: identity, memory, NV items, factory test commands, masks, files.

It answers packets with packets; what becomes of those on the way is the line's business.
"""
from __future__ import annotations

import struct
from typing import Callable, Dict, Optional, Tuple

from torture.peer.files import FileSystem

_SUBSYSTEM = 75
_FILES = 19
_NV = 48
_FTM = 11
_STATUS = 4
_MODE = 15
_ITEM_SIZE = 128
_DONE = 0
_NEVER_WRITTEN = 5
_LAST_ITEMS = {0: 80, 1: 1001, 4: 1104, 11: 508}
EVENTS = 300
# What is told in each mode.
_STATES = {0: 2, 1: 3, 3: 1, 4: 5, 5: 6}
_ONLINE = 5


class Phone:
    """The model. `answer` gives the reply to a request, or None where the handset is silent."""

    def __init__(self, serial: int = 0x80000001) -> None:
        self.items: Dict[Tuple[int, int], bytes] = {(0, 0): struct.pack("<I", serial).ljust(_ITEM_SIZE, b"\0")}
        self.memory: Dict[int, int] = {}
        self.switches = 0x1234
        self.state = _ONLINE
        self.files = FileSystem()
        self.log_masks: Dict[int, bytes] = {}
        self.event_mask = bytes((EVENTS + 7) // 8)
        self._plain: Dict[int, Callable[[bytes], Optional[bytes]]] = {
            0: lambda request: b"\0Jan 01 202600:00:00Jan 02 202600:00:01DIR_0001" + struct.pack("<BBBHBBB", *range(7)),
            2: lambda request: self._peek(request, 1),
            3: lambda request: self._peek(request, 2),
            4: lambda request: self._peek(request, 4),
            5: self._poke,
            6: self._poke,
            7: self._poke,
            32: lambda request: request,
            38: self._read_item,
            39: self._write_item,
            41: self._switch,
            42: lambda request: b"\x2a" + bytes(range(40)),
            43: lambda request: request,
            47: lambda request: b"\x2f" + struct.pack("<H", self.switches),
            48: self._set_switches,
            65: lambda request: b"\x41\x01",
            112: lambda request: b"\x70" + bytes(20),
            115: self._log_config,
            123: lambda request: request,
            124: lambda request: b"\x7c\0\0\0" + struct.pack("<II", 7, 9) + b"REVISION\0MODEL\0",
            129: lambda request: b"\x81\0\0\0" + struct.pack("<H", EVENTS) + self.event_mask,
            130: self._set_event_mask,
        }

    def answer(self, request: bytes) -> Optional[bytes]:
        if request[0] == _SUBSYSTEM and len(request) >= 4:
            return self._subsystem(request)
        handler = self._plain.get(request[0])
        return handler(request) if handler else b"\x13" + request

    def item(self, number: int, context: int = 0) -> Tuple[bytes, int]:
        value = self.items.get((number, context))
        return (bytes(_ITEM_SIZE), _NEVER_WRITTEN) if value is None else (value, _DONE)

    def set_item(self, number: int, value: bytes, context: int = 0) -> None:
        self.items[number, context] = value.ljust(_ITEM_SIZE, b"\0")

    def _subsystem(self, request: bytes) -> Optional[bytes]:
        subsystem, command = struct.unpack_from("<BH", request, 1)
        if subsystem == _FILES:
            return self.files.answer(request, command)
        if subsystem == _NV and command == 0:
            return self._write_items(request)
        if subsystem == _NV and command in (1, 2):
            number, context = struct.unpack_from("<HH", request, 4)
            if command == 2:
                self.set_item(number, request[8:8 + _ITEM_SIZE], context)
            value, status = self.item(number, context)
            return request[:8] + value + struct.pack("<H", status)
        if subsystem == _FTM:
            return request
        if subsystem == _STATUS:
            return request + bytes(range(30))
        if subsystem == _MODE:
            return request[:4] + struct.pack("<II", 0, self.state)
        return b"\x13" + request

    def _peek(self, request: bytes, width: int) -> bytes:
        address, count = struct.unpack_from("<IH", request, 1)
        return request[:7] + bytes(self.memory.get(address + i, (address + i) * 7 & 0xFF) for i in range(count * width))

    def _poke(self, request: bytes) -> bytes:
        address, = struct.unpack_from("<I", request, 1)
        for i, byte in enumerate(request[7:]):
            self.memory[address + i] = byte
        return request[:7] + b"\0"

    def _read_item(self, request: bytes) -> bytes:
        number, = struct.unpack_from("<H", request, 1)
        value, status = self.item(number)
        if len(request) == 4:  # an element of an array: the index is repeated, then comes what it holds
            index = request[3]
            return request + value[index:index + 8].ljust(8, b"\0") + struct.pack("<H", status)
        return request[:3] + value + struct.pack("<H", status)

    def _write_item(self, request: bytes) -> bytes:
        number, = struct.unpack_from("<H", request, 1)
        self.set_item(number, request[3:3 + _ITEM_SIZE])
        return request[:3 + _ITEM_SIZE] + struct.pack("<H", _DONE)

    def _write_items(self, request: bytes) -> bytes:
        results, at = b"", 10
        while at + 4 <= len(request):
            size, number, _ = struct.unpack_from("<BHB", request, at)
            value = request[at + 4:at + 4 + size]
            self.set_item(number, value)
            results += struct.pack("<BHB", size, number, _DONE) + value
            at += 4 + size
        return request[:8] + struct.pack("<H", _DONE) + results

    def _switch(self, request: bytes) -> bytes:
        self.state = _STATES.get(request[1], self.state)
        return request

    def _set_switches(self, request: bytes) -> bytes:
        self.switches, = struct.unpack_from("<H", request, 1)
        return request

    def _log_config(self, request: bytes) -> bytes:
        operation, = struct.unpack_from("<I", request, 4)
        head = request[:8] + struct.pack("<I", 0)
        if operation == 1:
            return head + b"".join(struct.pack("<I", _LAST_ITEMS.get(i, 0)) for i in range(16))
        equipment, = struct.unpack_from("<I", request, 8)
        last = _LAST_ITEMS.get(equipment, 0)
        if operation == 3:
            self.log_masks[equipment] = request[16:]
        mask = self.log_masks.get(equipment, b"").ljust((last + 7) // 8, b"\0")
        return head + struct.pack("<II", equipment, last) + mask

    def _set_event_mask(self, request: bytes) -> bytes:
        self.event_mask = request[6:].ljust(len(self.event_mask), b"\0")
        return b"\x82\0\0\0" + request[4:]


def log(code: int, payload: bytes, number: int = 0) -> bytes:
    """A log packet: its lengths, the code, a time stamp that is the packet's number, the payload."""
    size = 12 + len(payload)
    return b"\x10\0" + struct.pack("<HHHQ", size, size, code, number) + payload
