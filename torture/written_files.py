"""Every way in which the library and the tool write a file of the PC: what is run, and what it may leave behind."""
from __future__ import annotations

import dataclasses
import os
import pathlib
import sys
from typing import Dict, List, Sequence, Tuple

_EXAMPLES = pathlib.Path(__file__).resolve().parents[1] / "examples"
# What only the library has, in a process of its own.
_CALL = "import kral, sys; handle = kral.api().KRAL_ConnectServer(int(sys.argv[1])); sys.exit(not ({}))"

# Each target is the old or the new file, whole. It grows from the start. The same in files behind those of former runs,
# which stay. Nothing of the PC is written.
REPLACED, GROWS, SERIES, NONE = "replaced", "grows", "series", "none"


@dataclasses.dataclass(frozen=True)
class Writer:
    """The words of a run, behind the tool's name and its port; `first` are runs that make what it reads."""

    words: Sequence[str]
    kind: str = REPLACED
    first: Tuple[Sequence[str], ...] = ()
    exit_code: int = 0
    # Of a process of Python, not the tool's.
    call: str = ""
    # What it keeps beside the file.
    stays: Sequence[str] = ()
    # What it writes, as a pattern, and which of that is there before.
    writes: str = "target"
    before: Sequence[str] = ("target",)
    # How many files of a series are left.
    keep: int = 0

    def command(self, port: int, words: Sequence[str] = ()) -> List[str]:
        if self.call and not words:
            return [sys.executable, "-c", _CALL.format(self.call), str(port)]
        return [os.environ["KRAL_TOOL"], "-p", str(port), *(words or self.words)]


_FILTER = f"""kral.api().KRAL_NV_LoadNVDefinitionFile(handle, b'{_EXAMPLES}/nv_definitions.xml') == 0
    and kral.api().KRAL_NV_CreateComplementNVFilter(handle, b'target') == 0"""
_BACK_UP = ("nv", "backup", "first", "--items", "0-80")
_DUMP = ("nv", "dump", "--items", "0-80")
_TO_CAPTURE = ("--on", "0x1001", "--count", "2000")
_CAPTURE = ("log", "capture", "caught", *_TO_CAPTURE)
# Five files of the least size.
_ROTATED = ("log", "capture", "target", "--on", "0x1001", "--count", "4500", "--rotate", "64K")

WRITERS: Dict[str, Writer] = {
    "get": Writer(("fs", "get", ":/data/large", "target")),
    "put": Writer(("fs", "put", "source", ":/data/target"), kind=NONE),
    "back-up": Writer(("nv", "backup", "target", "--items", "0-80")),
    "dump-source": Writer(("nv", "dump", "--items", "0-80", "--source", "target")),
    "dump-backup": Writer(("nv", "dump", "--items", "0-80", "--pkv", "target")),
    "compare": Writer(("nv", "diff", "first", "second", "target"),
                      first=(_BACK_UP, ("nv", "backup", "second", "--items", "0-60"))),
    "to-binary": Writer(("flash", "hex", "image.hex", "target"), first=(("flash", "hex", "source", "image.hex"),)),
    "to-hex": Writer(("flash", "hex", "source", "target")),
    "export": Writer(("log", "export", "caught", "target"), first=(_CAPTURE,)),
    "import": Writer(("log", "import", "exported", "target"),
                     first=(_CAPTURE, ("log", "export", "caught", "exported"))),
    "page": Writer(("log", "stats", "caught", "--html", "target"), first=(_CAPTURE,)),
    "header": Writer(("cmd", "header", f"{_EXAMPLES}/commands.xml", "--output", "target")),
    "manual": Writer(("help", "--man", "."), writes="kral*.1", before=("kral.1", "kral-fs.1", "kral-sim.1")),
    "report": Writer(("--report", "target", "info")),
    "slots": Writer(("ports", "assign", "3", "7"), stays=("target.lock",)),
    "capture": Writer(("log", "capture", "target", *_TO_CAPTURE), kind=GROWS),
    "compressed": Writer(("log", "capture", "target", *_TO_CAPTURE, "--compress"), kind=GROWS),
    "rotated": Writer(_ROTATED, kind=SERIES, writes="target-*", before=("target-00001",)),
    "kept": Writer((*_ROTATED, "--keep", "3"), kind=SERIES, writes="target-*", keep=3,
                   before=("target-00001", "target-00002", "target-00003")),
    "text-log": Writer(("--log", "target", *_DUMP), kind=GROWS),
    "trace": Writer(("--trace", "target", *_DUMP), kind=GROWS),
    "failure-trace": Writer(("--trace-on-failure", "target", "fs", "get", ":/none", "first"), kind=GROWS,
                            exit_code=7),
    "item-file": Writer((), call="kral.api().KRAL_Efs2GetItem(handle, b'target', b'/nv/item_files/one', 9)"),
    "filter": Writer((), call=_FILTER),
}
