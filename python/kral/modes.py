"""Operating modes."""
from __future__ import annotations

import enum

from kral import _api


class Mode(enum.IntEnum):
    """Operating modes of a handset."""

    OFFLINE_ANALOG = _api.KRAL_MODE_OFFLINE_ANALOG
    OFFLINE = _api.KRAL_MODE_OFFLINE_DIGITAL
    RESET = _api.KRAL_MODE_RESET
    FTM = _api.KRAL_MODE_FACTORY_TEST
    ONLINE = _api.KRAL_MODE_ONLINE
    LOW_POWER = _api.KRAL_MODE_LOW_POWER


# What a handset reports: its states have numbers of their own.
STATES = {1: Mode.FTM, 2: Mode.OFFLINE, 3: Mode.OFFLINE, 4: Mode.OFFLINE, 5: Mode.ONLINE, 6: Mode.LOW_POWER}
