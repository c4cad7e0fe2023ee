"""Finds and loads the library, once, when it is first needed."""
from __future__ import annotations

import ctypes
import ctypes.util
import os
import pathlib
import sys
import threading
from typing import List, Optional

from kral._api import Api

_lock = threading.Lock()
_loaded: Optional[ctypes.CDLL] = None
_api: Optional[Api] = None
_path = ""


class LibraryNotFound(ImportError):
    """The library of kral could not be loaded; the message names the places that were tried."""


def _names() -> List[str]:
    return ["kral.dll"] if sys.platform == "win32" else ["libkral.so.6", "libkral.so"]


def _candidates() -> List[str]:
    """KRAL_LIBRARY alone if it is set; else beside this package or in its archive, else as the system finds it."""
    told = os.environ.get("KRAL_LIBRARY")
    if told:
        return [told]
    here = pathlib.Path(__file__).resolve().parent
    # Archives that are unpacked anywhere have python/kral and bin, or lib/python3/dist-packages/kral and lib.
    folders = [here, here.parents[1] / "bin", here.parents[2]]
    beside = [str(folder / name) for folder in folders for name in _names() if (folder / name).exists()]
    found = ctypes.util.find_library("kral")
    return beside + _names() + ([found] if found else [])


def _real_path(name: str) -> str:
    """The file behind a name that the system's loader has resolved."""
    if os.path.sep in name:
        return os.path.realpath(name)
    try:
        with open("/proc/self/maps", encoding="utf-8", errors="replace") as maps:
            for line in maps:
                if "libkral.so" in line:
                    return line[line.index("/"):].rstrip("\n")
    except OSError:
        pass
    return name


def load() -> Api:
    """The functions of the library. Raises LibraryNotFound."""
    global _api, _loaded, _path
    with _lock:
        if _api is None:
            reasons = []
            for name in _candidates():
                try:
                    _loaded = ctypes.CDLL(name)
                except OSError as error:
                    reasons.append(f"{name}: {error}")
                    continue
                _api, _path = Api(_loaded), _real_path(name)
                break
            else:
                raise LibraryNotFound("the library of kral cannot be loaded; set KRAL_LIBRARY to its path (tried "
                                      + "; ".join(reasons) + ")")
        return _api


def library_path() -> str:
    """The file of the library that is in use."""
    load()
    return _path


def library_version() -> str:
    """The version of the library that is in use, such as "6.0.29"."""
    number = load().KRAL_GetLibraryVersionNumber()
    return f"{number >> 16}.{number >> 8 & 255}.{number & 255}"
