"""Software download."""
from __future__ import annotations

import ctypes
import dataclasses
import os
from typing import Any, Callable, Optional, Sequence, Tuple, Union

from kral import _api
from kral._connection import LocalPath, array, call, integer, local, open_connection
from kral._work import Work
from kral.errors import KralError, exception, fail, last_error

Image = Union[LocalPath, Tuple[int, LocalPath]]
Progress = Callable[[int, int], Any]
_FLASH = "KRAL_Kivrat_FlashAll"


@dataclasses.dataclass(frozen=True)
class ImageInfo:
    """What is in an image file: regions of (address, bytes), gaps included."""

    format: str  # "binary" or "hex"
    regions: Tuple[Tuple[int, int], ...]
    start_address: int
    payload: int


def image_info(path: LocalPath) -> ImageInfo:
    """Reads an image file from end to end; no handset is needed."""
    info = _api.KRAL_IMAGE_INFO()
    if not call("KRAL_IMAGE_GetInfo", local(path), _api.KRAL_IMAGE_FORMAT_BY_CONTENT, ctypes.byref(info), None):
        fail(0, "KRAL_IMAGE_GetInfo")
    return ImageInfo("hex" if info.format == _api.KRAL_IMAGE_FORMAT_HEX else "binary",
                     tuple((base, size) for base, size in zip(info.base, info.size) if size), info.start_address,
                     info.payload)


def flash(port: int, programmer: LocalPath, images: Sequence[Image], progress: Optional[Progress] = None,
          tries: int = 1) -> None:
    """Flashes a handset that is in its boot loader: flash programmer, then every image, opened, written and closed.

    An image is a path, or (type, path) where the handset tells images by type. Every file is looked at before the first
    byte is sent. progress(bytes, total) is called as bytes are acknowledged.
    """
    pairs = [image if isinstance(image, tuple) else (0, image) for image in images]
    paths = (ctypes.c_char_p * len(pairs))(*(local(path) for _, path in pairs))
    types = array(ctypes.c_uint8, (kind for kind, _ in pairs))
    first, retries = local(programmer), integer(tries) - 1
    connection = open_connection("KRAL_Kivrat_ConnectServer", port)
    result, failed = ctypes.c_uint32(), ctypes.c_uint32(_api.KRAL_FLASH_NO_IMAGE)

    def moved(work: "Work[None]", _handle: int, done: int, total: int, _value: int) -> None:
        work.report(done, total)

    def write() -> None:
        connection.check("KRAL_Kivrat_Configure", retries, 500, 0)
        if connection.ask(_FLASH, first, paths, types, len(pairs), ctypes.byref(result), ctypes.byref(failed)):
            return
        record = last_error(connection.handle)
        if record is not None and record.function != _FLASH:
            record = None  # another failure's
        text = record.text if record else f"the download ended with {result.value}"
        if failed.value < len(pairs):
            text = f"{os.fspath(pairs[failed.value][1])}: {text}"
        raise exception(record, text) if record else KralError(text)

    try:
        connection.long(write, progress, "download", moved)
    finally:
        connection.close()
