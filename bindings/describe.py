#!/usr/bin/env python3
"""describe.py HEADER_FOLDER OUTPUT_FOLDER: makes from the public headers what other languages need.

    kral.json        the description itself
    _api.py          the low-level Python module
    Kral.cs          for C# (bindings/Phone.cs is its hand-written part)
    kral_labview.h   a flat header for LabVIEW

Fails, and says why, when a header leaves something open.
"""
import dataclasses
import json
import pathlib
import sys

import headers
import make_csharp
import make_labview
import make_python


def main() -> int:
    if len(sys.argv) != 3:
        print(__doc__, file=sys.stderr)
        return 2
    description, complaints = headers.read(pathlib.Path(sys.argv[1]))
    if complaints:
        print("\n".join(complaints), file=sys.stderr)
        return 1
    output = pathlib.Path(sys.argv[2])
    output.mkdir(parents=True, exist_ok=True)
    made = {
        "kral.json": json.dumps(dataclasses.asdict(description), indent=1) + "\n",
        "_api.py": make_python.make(description),
        "Kral.cs": make_csharp.make(description),
        "kral_labview.h": make_labview.make(description),
    }
    for name, text in made.items():
        (output / name).write_text(text, encoding="utf-8", newline="\n")
    return 0


if __name__ == "__main__":
    sys.exit(main())
