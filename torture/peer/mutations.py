"""Changes to bytes, as a liar or a bad disk makes them."""
from __future__ import annotations

import random

_TELLING = (0x00, 0x01, 0x7D, 0x7E, 0x7F, 0x80, 0xFE, 0xFF)


def mutate(data: bytes, numbers: random.Random) -> bytes:
    """One to four changes: bytes, words, lengths, what is cut off, doubled or added."""
    for _ in range(numbers.randrange(1, 5)):
        data = _once(bytearray(data), numbers)
    return data


def _once(data: bytearray, numbers: random.Random) -> bytes:
    at = numbers.randrange(len(data) + 1)
    what = numbers.randrange(8)
    if what == 0:
        del data[at:]
    elif what == 1:
        del data[at:at + numbers.randrange(1, 9)]
    elif what == 2:
        data[at:at] = numbers.randbytes(numbers.randrange(1, 9))
    elif what == 3:
        data += bytes([numbers.choice(_TELLING)]) * numbers.choice((1, 4, 100, 4096))
    elif what == 4:
        data[at:at + 4] = numbers.choice((0, 1, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFF)).to_bytes(4, "little")
    elif what == 5:
        data[at:at] = data[at:at + numbers.randrange(1, 64)]
    elif at < len(data):
        data[at] = numbers.choice(_TELLING) if what == 6 else data[at] ^ 1 << numbers.randrange(8)
    return bytes(data)
