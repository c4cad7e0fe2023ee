#!/usr/bin/env python3
"""exports.py [--update] HEADER_FOLDER LIST: the interface in the headers and the checked-in list of it must agree.

The list has one line for each function, callback, record and constant, with everything that a compiled program relies
on. --update adds lines for what is new; a line that is there is changed or taken out by hand only, because that breaks
programs.
"""
import pathlib
import sys
import typing

import headers


def lines_of(description: headers.Description) -> typing.List[str]:
    rows = [f"function {function.signature()}" for function in description.functions]
    rows += [f"callback {callback.signature()}" for callback in description.callbacks]
    for record in description.records:
        fields = (f"{field.name}@{field.offset['32']}:{field.type}" + (f"[{field.count}]" if field.count else "")
                  for field in record.fields)
        rows.append(f"record {record.name} {record.size['32']} {' '.join(fields)}")
    # The version is what every release changes.
    rows += [f"constant {constant.name} {constant.value}" for constant in description.constants
             if not constant.name.startswith("KRAL_VERSION_")]
    return sorted(rows)


def compare(present: typing.List[str], path: pathlib.Path, update: bool) -> int:
    """The exit code; says what differs."""
    listed = path.read_text(encoding="utf-8").splitlines() if path.exists() else []
    gone = sorted(set(listed) - set(present))
    new = sorted(set(present) - set(listed))
    for line in gone:
        print(f"in the list, and not in the headers: {line}")
    if update and not gone:
        path.write_text("".join(f"{line}\n" for line in present), encoding="utf-8")
        print(f"{path.name}: {len(new)} added, {len(present)} lines")
        return 0
    for line in new:
        print(f"in the headers, and not in the list: {line}")
    if gone:
        print("Programs that were built before rely on what has gone or changed. If it must be, edit the list by hand.")
    elif new:
        print("scripts/check-exports --update adds what is new.")
    print(f"{path.name}: {len(listed)} lines, {len(gone)} broken, {len(new)} not listed")
    return 1 if gone or new or not listed else 0


def main() -> int:
    words = [word for word in sys.argv[1:] if word != "--update"]
    if len(words) != 2:
        print("usage: exports.py [--update] HEADER_FOLDER LIST", file=sys.stderr)
        return 2
    description, complaints = headers.read(pathlib.Path(words[0]))
    print("".join(f"{complaint}\n" for complaint in complaints), end="")
    return compare(lines_of(description), pathlib.Path(words[1]), "--update" in sys.argv) or int(bool(complaints))


if __name__ == "__main__":
    sys.exit(main())
