"""Channel numbers and carrier frequencies; no handset is needed."""
from __future__ import annotations

import ctypes
import dataclasses
from typing import List, Optional, Tuple

from kral import _api
from kral._connection import call


@dataclasses.dataclass(frozen=True)
class Band:
    """A band with its name and its ranges of channel numbers, first and last included."""

    id: int
    name: str
    uplink: Tuple[Tuple[int, int], ...]
    downlink: Tuple[Tuple[int, int], ...]


def uplink(band: int, channel: int) -> Optional[float]:
    """The uplink carrier in MHz; None when the band has no such uplink channel."""
    return call("KRAL_Band_Helper_CalculateULFrequency", band, channel) or None


def downlink(band: int, channel: int) -> Optional[float]:
    """The downlink carrier in MHz; None when the band has no such downlink channel."""
    return call("KRAL_Band_Helper_CalculateDLFrequency", band, channel) or None


def _ranges(band: int, direction: int) -> Tuple[Tuple[int, int], ...]:
    found: List[Tuple[int, int]] = []
    first, last = ctypes.c_int32(), ctypes.c_int32()
    while call("KRAL_Band_Helper_GetBandRange", band, direction, len(found), ctypes.byref(first), ctypes.byref(last)):
        found.append((first.value, last.value))
    return tuple(found)


def get(band: int) -> Band:
    """One band by its id. KeyError when it has no channels."""
    text = ctypes.create_string_buffer(64)
    if not call("KRAL_Band_Helper_GetBandName", band, text, len(text)):
        raise KeyError(band)
    return Band(band, text.value.decode(), _ranges(band, _api.KRAL_BAND_UPLINK), _ranges(band, _api.KRAL_BAND_DOWNLINK))


def all() -> List[Band]:  # pylint: disable=redefined-builtin
    """Every band that has channels, by rising id."""
    found = []
    for index in range(call("KRAL_Band_Helper_GetBandCount")):
        number = ctypes.c_uint16()
        call("KRAL_Band_Helper_GetBand", index, ctypes.byref(number))
        found.append(get(number.value))
    return found
