"""What is in a backup file, read by other hands."""
from __future__ import annotations

import io
from typing import Dict

import olefile  # type: ignore[import]


def streams(file: bytes) -> Dict[str, bytes]:
    """By path. The storage around them may have time stamps."""
    with olefile.OleFileIO(io.BytesIO(file)) as storage:
        return {"/".join(path): storage.openstream(path).read() for path in storage.listdir()}


def same(first: bytes, second: bytes) -> bool:
    """Two files are the same, or are backups of the same."""
    if first == second:
        return True
    both_are = all(olefile.isOleFile(io.BytesIO(one)) for one in (first, second))
    return both_are and streams(first) == streams(second)
