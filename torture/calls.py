"""The calls that the programs make: each with its outputs as one value, and how many time-outs it may take.

`expected` of a call is what it gives with the handset of peer/phone.py as `prepare` leaves it.
"""
from __future__ import annotations

import ctypes
import dataclasses
import struct
from typing import Any, Callable, Dict, Optional, Tuple

import kral
from kral._api import KRAL_TRAFFIC_COUNTERS
from torture.peer.phone import EVENTS, Phone

SERIAL = 0x80000001
FILE = "/data/file"
FILE_BYTES = bytes(range(256)) * 8
ITEM_FILE = "/nv/item_files/one"
_ITEM = 906
_ITEM_BYTES = bytes(range(1, 129))
_ADDRESS = 0x1000

Outcome = Tuple[int, Any]


@dataclasses.dataclass(frozen=True)
class Call:
    run: Callable[[int], Outcome]
    expected: Any = None
    # Time-outs of commands that pass, at most, while the handset is silent.
    time_outs: int = 1
    # Milliseconds that are the call's own and cannot be set.
    fixed_ms: int = 0


def prepare(phone: Phone) -> Phone:
    phone.set_item(_ITEM, _ITEM_BYTES)
    phone.set_item(_ITEM, _ITEM_BYTES[::-1], 1)
    phone.set_item(300, _ITEM_BYTES)
    phone.files.put(FILE, FILE_BYTES)
    phone.files.put(ITEM_FILE, b"item file", item=True)
    return phone


def _api(name: str) -> Callable[..., int]:
    function: Callable[..., int] = getattr(kral.api(), name)
    return function


def counters(handle: int) -> KRAL_TRAFFIC_COUNTERS:
    counted = KRAL_TRAFFIC_COUNTERS()
    _api("KRAL_GetTrafficCounters")(handle, ctypes.byref(counted))
    return counted


def plain(name: str, *arguments: Any) -> Callable[[int], Outcome]:
    return lambda handle: (_api(name)(handle, *arguments), None)


def number(name: str, kind: Any, *arguments: Any) -> Callable[[int], Outcome]:
    def run(handle: int) -> Outcome:
        value = kind(0xA5)
        return _api(name)(handle, *arguments, ctypes.byref(value)), value.value
    return run


def buffer(name: str, size: int, *arguments: Any) -> Callable[[int], Outcome]:
    """The last output is a buffer."""
    def run(handle: int) -> Outcome:
        area = (ctypes.c_uint8 * size)()
        result = _api(name)(handle, *arguments, ctypes.cast(area, ctypes.c_void_p))
        return result, bytes(area)
    return run


def sized(name: str, kind: Any, size: int, *arguments: Any) -> Callable[[int], Outcome]:
    """A size in and out, then its buffer."""
    def run(handle: int) -> Outcome:
        room, area = kind(size), (ctypes.c_uint8 * size)()
        result = _api(name)(handle, *arguments, ctypes.byref(room), ctypes.cast(area, ctypes.c_void_p))
        return result, bytes(area[:room.value]) if result else b""
    return run


def _version(handle: int) -> Outcome:
    texts = [ctypes.create_string_buffer(16) for _ in range(5)]
    numbers = [kind() for kind in (ctypes.c_uint8,) * 3 + (ctypes.c_uint16,) + (ctypes.c_uint8,) * 3]
    result = _api("KRAL_DIAG_VERNO_F")(handle, *texts, *map(ctypes.byref, numbers))
    return result, (texts[4].value, [one.value for one in numbers])


def _build(handle: int) -> Outcome:
    numbers = ctypes.c_uint32(), ctypes.c_uint32()
    texts = ctypes.create_string_buffer(4096), ctypes.create_string_buffer(4096)
    result = _api("KRAL_DIAG_EXT_BUILD_ID_F")(handle, *map(ctypes.byref, numbers), *texts)
    return result, (numbers[0].value, numbers[1].value, texts[0].value, texts[1].value)


def read_item(handle: int, item: int = _ITEM) -> Outcome:
    data, status = (ctypes.c_uint8 * 128)(), ctypes.c_uint16()
    result = _api("KRAL_DIAG_NV_READ_F")(handle, item, ctypes.cast(data, ctypes.c_void_p), 128, ctypes.byref(status))
    return result, (bytes(data), status.value)


def read_item_of(handle: int, item: int = _ITEM, context: int = 1) -> Outcome:
    data, status = (ctypes.c_uint8 * 128)(), ctypes.c_uint16()
    result = _api("KRAL_DIAG_NV_READ_EXT_F")(handle, item, ctypes.cast(data, ctypes.c_void_p), context, 128,
                                             ctypes.byref(status))
    return result, (bytes(data), status.value)


def read_element(handle: int, item: int = _ITEM, index: int = 4) -> Outcome:
    data, status = (ctypes.c_uint8 * 8)(), ctypes.c_uint16()
    result = _api("KRAL_DIAG_NV_READ_ARRAY_F")(handle, item, index, ctypes.cast(data, ctypes.c_void_p), 8,
                                               ctypes.byref(status))
    return result, (bytes(data), status.value)


def write_item(handle: int, item: int = 907, data: bytes = b"\x01\x02\x03") -> Outcome:
    status = ctypes.c_uint16()
    return _api("KRAL_DIAG_NV_WRITE_F")(handle, item, data, len(data), ctypes.byref(status)), status.value


def write_file(handle: int, data: bytes = FILE_BYTES, path: bytes = b"/data/new") -> Outcome:
    return _api("KRAL_EfsWriteMem")(handle, data, len(data), path), None


def read_file(handle: int, path: str = FILE, room: int = 4096) -> Outcome:
    size, area = ctypes.c_uint32(room), ctypes.create_string_buffer(room)
    result = _api("KRAL_EfsReadMem")(handle, path.encode(), ctypes.cast(area, ctypes.c_void_p), ctypes.byref(size))
    return result, area.raw[:size.value] if result else b""


def status_of(handle: int, path: str = FILE) -> Outcome:
    words = [ctypes.c_uint32() for _ in range(7)]
    result = _api("KRAL_EFS2_DIAG_STAT")(handle, path.encode(), *map(ctypes.byref, words))
    return result, (words[0].value, words[2].value)


def back_up(handle: int, items: Tuple[int, int], file: bytes) -> int:
    """The first and the last of the items, and the files that go with them."""
    status = ctypes.c_uint32()
    _api("KRAL_PKV_ConfigureBackup")(handle, *items, 1)
    return _api("KRAL_BackupNVFromMobileToPKV")(handle, file, ctypes.byref(status))


def next_log(handle: int, time_out_ms: int) -> Optional[bytes]:
    size, area = ctypes.c_uint16(), ctypes.create_string_buffer(4096)
    result = _api("KRAL_DIAG_WaitNextPhoneLog")(handle, ctypes.byref(size), ctypes.cast(area, ctypes.c_void_p),
                                                time_out_ms)
    return area.raw[:size.value] if result else None


def list_folder(handle: int, path: bytes = b"/data") -> Outcome:
    count = ctypes.c_uint32()
    return _api("KRAL_EfsDirectory")(handle, path, 255, None, ctypes.byref(count)), count.value


def _put_item(handle: int) -> Outcome:
    return _api("KRAL_EfsPutItemFromMem")(handle, b"/nv/item_files/two", b"12345", 5), None


def send(name: str, request: bytes, time_out_ms: int) -> Callable[[int], Outcome]:
    def run(handle: int) -> Outcome:
        size, area = ctypes.c_uint16(4096), (ctypes.c_uint8 * 4096)()
        result = _api(name)(handle, len(request), request, ctypes.byref(size), ctypes.cast(area, ctypes.c_void_p),
                            time_out_ms)
        return result, bytes(area[:len(request)])
    return run


def _log_ranges(handle: int) -> Outcome:
    ranges = (ctypes.c_uint32 * 16)()
    return _api("KRAL_DIAG_GetLogRanges")(handle, ranges), (ranges[1], ranges[11])


def _event_mask(handle: int) -> Outcome:
    bits, size, area = ctypes.c_uint16(), ctypes.c_uint16(4096), (ctypes.c_uint8 * 4096)()
    result = _api("KRAL_DIAG_GetEventMask")(handle, ctypes.byref(bits), ctypes.byref(size),
                                            ctypes.cast(area, ctypes.c_void_p))
    return result, bits.value


def _poke(handle: int) -> Outcome:
    status = ctypes.c_uint8(0xA5)
    return _api("KRAL_DIAG_MEMORY_POKE_F")(handle, 0x8000, 4, b"abcd", ctypes.byref(status)), status.value


def peek(handle: int, address: int = _ADDRESS) -> Outcome:
    return buffer("KRAL_DIAG_MEMORY_PEEK_F", 8, address, 8)(handle)


def _memory(count: int) -> bytes:
    return bytes((_ADDRESS + i) * 7 & 0xFF for i in range(count))


def _peek_words(handle: int) -> Outcome:
    words = (ctypes.c_uint16 * 4)()
    return _api("KRAL_DIAG_MEMORY_PEEK_WORD_F")(handle, _ADDRESS, 4, words), bytes(words)


_PING = b"\x7b12345"

CALLS: Dict[str, Call] = {
    "version": Call(_version, (b"DIR_0001", list(range(7)))),
    "build": Call(_build, (7, 9, b"REVISION", b"MODEL")),
    "serial": Call(number("KRAL_DIAG_READ_ESN_F", ctypes.c_uint32), SERIAL),
    "peek": Call(peek, _memory(8)),
    "peek-words": Call(_peek_words, _memory(8)),
    "poke": Call(_poke, 0),
    "key": Call(plain("KRAL_DIAG_HS_KEY_F", 0, 5)),
    "get-switches": Call(number("KRAL_DIAG_GET_DIPSW_F", ctypes.c_uint16), 0x1234),
    "set-switches": Call(plain("KRAL_DIAG_SET_DIPSW_F", 0x1234)),
    "service-code": Call(number("KRAL_DIAG_SPC_F", ctypes.c_uint8, b"000000"), 1),
    "error-log": Call(sized("KRAL_DIAG_ERR_READ_F", ctypes.c_uint16, 6144), b"\x2a" + bytes(range(40))),
    "clear-error": Call(plain("KRAL_DIAG_ERR_CLEAR_F", 1)),
    "status": Call(sized("KRAL_DIAG_STATUS_F", ctypes.c_uint16, 6144),
                   struct.pack("<BBH", 75, 4, 14) + bytes(range(30))),
    "read-item": Call(read_item, (_ITEM_BYTES, 0)),
    "read-item-of": Call(read_item_of, (_ITEM_BYTES[::-1], 0)),
    "read-element": Call(read_element, (_ITEM_BYTES[4:12], 0)),
    "write-item": Call(write_item, 0),
    "channel": Call(plain("KRAL_FTM_SET_CHAN", 9750)),
    "transmit": Call(plain("KRAL_FTM_SET_TX_ON")),
    "file-status": Call(status_of, (0, len(FILE_BYTES))),
    "delete": Call(number("KRAL_EfsDelete", ctypes.c_uint32, b"/data/none"), 2),
    "put-item": Call(_put_item),
    "make-folder": Call(number("KRAL_EfsMkDir", ctypes.c_uint32, b"/data"), 6, time_outs=0, fixed_ms=2000),
    "read-file": Call(read_file, FILE_BYTES, time_outs=5),
    "send": Call(send("KRAL_SendSync", _PING, 200), _PING, time_outs=0, fixed_ms=200),
    "send-raw": Call(send("KRAL_SendRAW", _PING, 200), _PING, time_outs=0, fixed_ms=200),
    "log-ranges": Call(_log_ranges, (1001, 508)),
    "event-mask": Call(_event_mask, EVENTS),
    "is-connected": Call(plain("KRAL_IsPhoneConnected"), time_outs=2),
}
