"""A flash programmer: takes the stream of an image into its flash, and acknowledges each packet by its address."""
from __future__ import annotations

import struct
from typing import Dict, Optional

from torture.peer.phone import Phone

_WRITE, _WRITTEN = 0x07, 0x08
_OPEN, _OPENED = 0x1B, 0x1C
_CLOSE, _CLOSED = 0x15, 0x16


class Programmer(Phone):
    """Packets that come again are written again: an acknowledgement may have been lost."""

    def __init__(self, serial: int = 0x80000001) -> None:
        super().__init__(serial)
        self.flash: Dict[int, bytes] = {}

    def answer(self, request: bytes) -> Optional[bytes]:
        if request[0] == _OPEN:
            self.flash.clear()
            return bytes([_OPENED, 0])
        if request[0] == _WRITE and len(request) > 5:
            address, = struct.unpack_from("<I", request, 1)
            self.flash[address] = request[5:]
            return bytes([_WRITTEN]) + request[1:5]
        if request[0] == _CLOSE:
            return bytes([_CLOSED])
        return super().answer(request)

    def image(self, address: int) -> bytes:
        """What is in flash from there, up to the first gap."""
        data = bytearray()
        while address + len(data) in self.flash:
            data += self.flash[address + len(data)]
        return bytes(data)
