"""Frames on the wire: escapes, the frame check sequence, flags."""
from __future__ import annotations

from typing import List

FLAG = 0x7E
ESCAPE = 0x7D
_INVERT = 0x20


def _step(value: int) -> int:
    for _ in range(8):
        value = (value >> 1) ^ 0x8408 if value & 1 else value >> 1
    return value


_STEPS = [_step(value) for value in range(256)]


def check_sequence(data: bytes) -> int:
    """CRC-16/X-25."""
    value = 0xFFFF
    for byte in data:
        value = (value >> 8) ^ _STEPS[(value ^ byte) & 0xFF]
    return value ^ 0xFFFF


def escape(body: bytes) -> bytes:
    # The escape byte first: the other replacement makes new ones.
    return body.replace(b"\x7d", b"\x7d\x5d").replace(b"\x7e", b"\x7d\x5e")


def frame(payload: bytes, *, spoil: int = 0) -> bytes:
    """The frame of a packet; `spoil` is what its check sequence is wrong by."""
    body = payload + (check_sequence(payload) ^ spoil).to_bytes(2, "little")
    return escape(body) + bytes([FLAG])


class Deframer:
    """Bytes in any pieces to the packets whose check sequence is right."""

    def __init__(self) -> None:
        self._rest = bytearray()
        self.bad = 0

    def feed(self, data: bytes) -> List[bytes]:
        self._rest += data
        packets: List[bytes] = []
        while True:
            end = self._rest.find(FLAG)
            if end < 0:
                return packets
            body = self._unescape(bytes(self._rest[:end]))
            del self._rest[:end + 1]
            if not body:
                continue
            if len(body) < 3 or check_sequence(body[:-2]) != int.from_bytes(body[-2:], "little"):
                self.bad += 1
                continue
            packets.append(body[:-2])

    @staticmethod
    def _unescape(body: bytes) -> bytes:
        first, *others = body.split(bytes([ESCAPE]))
        return first + b"".join(bytes([part[0] ^ _INVERT]) + part[1:] for part in others if part)
