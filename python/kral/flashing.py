"""Software download."""
from __future__ import annotations

import ctypes
import dataclasses
import os
from typing import Any, Callable, Optional, Sequence, Tuple, Union

from kral import _api
from kral._connection import Connection
from kral._library import load
from kral._work import Work
from kral.errors import BY_CODE, KralError, fail, last_error
from kral.files import LocalPath

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
    if not load().KRAL_IMAGE_GetInfo(os.fsencode(path), _api.KRAL_IMAGE_FORMAT_BY_CONTENT, ctypes.byref(info), None):
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
    api = load()
    handle = api.KRAL_Kivrat_ConnectServer(port)
    if not handle:
        fail(0, "KRAL_Kivrat_ConnectServer")
    connection = Connection(handle)
    pairs = [image if isinstance(image, tuple) else (0, image) for image in images]
    paths = (ctypes.c_char_p * len(pairs))(*(os.fsencode(path) for _, path in pairs))
    types = (ctypes.c_uint8 * len(pairs))(*(kind for kind, _ in pairs))
    result, failed = ctypes.c_uint32(), ctypes.c_uint32(_api.KRAL_FLASH_NO_IMAGE)

    def prepare(work: "Work[None]") -> None:
        connection.targets.set("download", lambda _handle, done, total, _value: work.report(done, total))
        connection.check("KRAL_ConfigureDownloadCallBack",
                         connection.targets.make("download", _api.KRAL_DOWNLOAD_PROGRESS_CALLBACK), 0)

    def write() -> None:
        if api.KRAL_Kivrat_FlashAll(connection.handle, os.fsencode(programmer), paths, types, len(pairs),
                                    ctypes.byref(result), ctypes.byref(failed)):
            return
        record = last_error(connection.handle)
        kind = BY_CODE.get(record.code, KralError) if record and record.function == _FLASH else KralError
        text = record.text if record and record.function == _FLASH else f"the download ended with {result.value}"
        if failed.value < len(pairs):
            text = f"{os.fspath(pairs[failed.value][1])}: {text}"
        raise kind(text, record)

    try:
        connection.check("KRAL_Kivrat_Configure", tries - 1, 500, 0)
        connection.long(write, prepare, progress)
    finally:
        connection.close()
