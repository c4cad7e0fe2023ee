"""Factory test mode."""
from __future__ import annotations

import contextlib
import ctypes
from typing import Iterator

from kral import _api
from kral._connection import Connection, Data, octets
from kral.errors import BadArgument


class Ftm:
    """The factory test commands of a handset: `phone.ftm`."""

    def __init__(self, connection: Connection) -> None:
        self._connection = connection

    @property
    def mode_id(self) -> int:
        """The dispatcher of the handset that receives commands (FtmModeId)."""
        return self._connection.number("KRAL_FTM_GET_MODE_ID", ctypes.c_uint16)

    @mode_id.setter
    def mode_id(self, value: int) -> None:
        self._connection.check("KRAL_FTM_SET_MODE_ID", value)

    @property
    def is_active(self) -> bool:
        """Whether the handset is in factory test mode."""
        return bool(self._connection.number("KRAL_IsFTM_Mode", ctypes.c_uint8))

    def enter(self) -> None:
        """Into factory test mode, while the handset runs."""
        self._connection.check("KRAL_ChangeFTM_ModeRuntime", 1)

    def leave(self) -> None:
        """Back online."""
        self._connection.check("KRAL_ChangeFTM_ModeRuntime", 0)

    @contextlib.contextmanager
    def active(self) -> Iterator["Ftm"]:
        """In factory test mode for a block; whatever happens in it, the transmitter is off afterwards."""
        self.enter()
        try:
            yield self
        finally:
            try:
                self.tx_off()
            finally:
                self.leave()

    def set_rf_mode(self, mode: int) -> None:
        """Technology and band: RfMode, or another number of the handset's."""
        self._connection.check("KRAL_FTM_SET_MODE", mode)

    def set_channel(self, channel: int) -> None:
        """The channel, by its number in the RF mode's band."""
        self._connection.check("KRAL_FTM_SET_CHAN", channel)

    def tx_on(self) -> None:
        """Switches the transmitter on."""
        self._connection.check("KRAL_FTM_SET_TX_ON")

    def tx_off(self) -> None:
        """Switches the transmitter off."""
        self._connection.check("KRAL_FTM_SET_TX_OFF")

    def send(self, name: str, payload: Data = b"") -> bytes:
        """A command by its name, such as "GET_RSSI": what the handset sent after the command id."""
        function = f"KRAL_FTM_{name}"
        prototype = _api.PROTOTYPES.get(function)
        if prototype is None or len(prototype[1]) != 5:
            raise BadArgument(f"{name} is no command with a payload; send_id takes any number")
        response = ctypes.create_string_buffer(_api.KRAL_LONGEST_REQUEST)
        size = ctypes.c_uint16(len(response))
        data = octets(payload)
        self._connection.check(function, data, len(data), response, ctypes.byref(size))
        return response.raw[:size.value]

    def send_id(self, command: int, payload: Data = b"") -> bytes:
        """A command by its number, to the dispatcher of `mode_id`."""
        response = ctypes.create_string_buffer(_api.KRAL_LONGEST_REQUEST)
        size = ctypes.c_uint16(len(response))
        data = octets(payload)
        self._connection.check("KRAL_FTM_SendCommand", command, data, len(data), response, ctypes.byref(size))
        return response.raw[:size.value]
