"""Hostile files: mutated backups, images, definitions, sets, filters, captures and tables, under ASan and UBSan."""
from __future__ import annotations

import ctypes
import os
import pathlib
from typing import Any, Callable, Dict, List, Tuple

import kral
from kral import _api
from torture import calls
from torture.bench import MODES, Bench, check, connected, last_error
from torture.peer.line import CallerLine
from torture.peer.misbehaviours import silence
from torture.peer.mutations import mutate
from torture.peer.phone import Phone

NUMBER = 13
TITLE = "Hostile files do no harm"
SHORT = 9
AT_ONCE = 3
SANITIZER = "asan"
_TIME_OUT_MS = 20
_ROUNDS = 4000
_ROUNDS_SHORT = 200

# What is mutated, beside what is made here: inputs that once made trouble.
_CORPUS = pathlib.Path(__file__).resolve().parents[2] / "fuzz" / "corpus"
_TABLE = b"0x1000,one\n4097,two\n# three\n0x1002\tfour words of text\n"
_SET = b"""<?xml version="1.0"?>
<NvSource>
<NvItem id="10" subscriptionid="0" name="PREF" mapping="direct" encoding="dec" index="0">1,2,3</NvItem>
<NvItem id="11" subscriptionid="0" name="X" mapping="byteStream" encoding="hex" index="0">0102030405</NvItem>
<NvEfsItem fullpathname="/nv/item_files/one" name="one" mapping="byteStream" encoding="hex" index="0">AABB</NvEfsItem>
</NvSource>
"""
_FILTER = b"""<?xml version="1.0"?><NvFilter><NV>10</NV><NV>11</NV><NV_RANGE>1-100</NV_RANGE></NvFilter>"""


def _corpus(name: str) -> List[bytes]:
    return [path.read_bytes() for path in sorted((_CORPUS / name).iterdir())]


def _back_up(handle: int, file: bytes) -> List[bytes]:
    check(calls.back_up(handle, (300, 310), file) == 1, f"no backup: {last_error(handle)}")
    return [pathlib.Path(os.fsdecode(file)).read_bytes()]


def _read_backup(handle: int, file: bytes) -> None:
    status = ctypes.c_uint32()
    kral.api().KRAL_NV_LoadNVsFromPKV(handle, file)
    kral.api().KRAL_NV_PKV_Diff(handle, file, file, file + b".html")
    kral.api().KRAL_PKV_Verify(handle, file, ctypes.byref(status))


def _read_image(handle: int, file: bytes) -> None:
    info = _api.KRAL_IMAGE_INFO()
    kral.api().KRAL_IMAGE_GetInfo(file, _api.KRAL_IMAGE_FORMAT_BY_CONTENT, ctypes.byref(info), None)
    kral.api().KRAL_IMAGE_GetInfo(file, _api.KRAL_IMAGE_FORMAT_HEX, ctypes.byref(info), None)


def _read_definitions(handle: int, file: bytes) -> None:
    kral.api().KRAL_NV_LoadNVDefinitionFile(handle, file)
    kral.api().KRAL_NV_LoadNVDataTypeDictinary(handle, file)
    kral.api().KRAL_NV_ClearNVDefinition(handle)


def _play(handle: int, file: bytes) -> None:
    kral.api().KRAL_StartPlayback(handle, file, 0)
    kral.api().KRAL_StopPlayback(handle)


def _call(name: str, *arguments: Any) -> Callable[[int, bytes], Any]:
    return lambda handle, file: getattr(kral.api(), name)(handle, *arguments, file)


def _given(*files: bytes) -> Callable[[int, bytes], List[bytes]]:
    return lambda handle, file: list(files)


def _from(name: str) -> Callable[[int, bytes], List[bytes]]:
    return lambda handle, file: _corpus(name)


# Where the files come from, and what reads them.
_KINDS: Dict[str, Tuple[Callable[[int, bytes], List[bytes]], Callable[[int, bytes], Any]]] = {
    "backup": (_back_up, _read_backup),
    "backup-corpus": (_from("pkv"), _read_backup),
    "hex": (_from("hex"), _read_image),
    "definitions": (_from("nv_xml"), _read_definitions),
    "set": (_given(_SET), _call("KRAL_NV_LoadNVsFromSource")),
    "filter": (_given(_FILTER), _call("KRAL_NV_LoadReadFilter")),
    "capture": (_from("capture"), _play),
    "names": (_given(_TABLE), _call("KRAL_LoadNameTable", 0)),
    "allowed": (_given(_TABLE), _call("KRAL_LoadNameTable", 3)),
}


def cases(bench: Bench) -> List[str]:
    return list(_KINDS)


def run(bench: Bench, case: str) -> None:
    make, read = _KINDS[case]
    numbers = bench.random(case)
    phone = calls.prepare(Phone(calls.SERIAL))
    phone.set_item(300, bytes(range(128)))
    line = CallerLine(phone, bench.caller_port())
    path = bench.folder / f"hostile-{case}"
    file = os.fsencode(path)
    with connected(line, MODES["poll"], _TIME_OUT_MS) as handle:
        sources = make(handle, file)
        check(len(sources) > 0, "there is nothing to mutate")
        # From now on the handset is silent: what counts is the reading.
        line.behaviour = silence
        for _ in range(_ROUNDS_SHORT if bench.short else _ROUNDS):
            path.write_bytes(mutate(numbers.choice(sources), numbers))
            read(handle, file)
            bench.count("files")
