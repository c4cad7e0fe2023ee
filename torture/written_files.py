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

# The target is the old or the new file, whole. It grows from the start. Nothing of the PC is written.
REPLACED, GROWS, NONE = "replaced", "grows", "none"


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

    def command(self, port: int, words: Sequence[str] = ()) -> List[str]:
        if self.call and not words:
            return [sys.executable, "-c", _CALL.format(self.call), str(port)]
        return [os.environ["KRAL_TOOL"], "-p", str(port), *(words or self.words)]


_FILTER = f"""kral.api().KRAL_NV_LoadNVDefinitionFile(handle, b'{_EXAMPLES}/nv_definitions.xml') == 0
    and kral.api().KRAL_NV_CreateComplementNVFilter(handle, b'target') == 0"""
_BACK_UP = ("nv", "backup", "first", "--items", "0-80")
_DUMP = ("nv", "dump", "--items", "0-80")
_CAPTURE = ("log", "capture", "caught", "--on", "0x1001", "--count", "2000")

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
    "slots": Writer(("ports", "assign", "3", "7"), stays=("target.lock",)),
    "capture": Writer(("log", "capture", "target", "--on", "0x1001", "--count", "2000"), kind=GROWS),
    "text-log": Writer(("--log", "target", *_DUMP), kind=GROWS),
    "trace": Writer(("--trace", "target", *_DUMP), kind=GROWS),
    "failure-trace": Writer(("--trace-on-failure", "target", "fs", "get", ":/none", "first"), kind=GROWS,
                            exit_code=7),
    "item-file": Writer((), call="kral.api().KRAL_Efs2GetItem(handle, b'target', b'/nv/item_files/one', 9)"),
    "filter": Writer((), call=_FILTER),
}
