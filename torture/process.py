"""What this process has of the system."""
from __future__ import annotations

import ctypes
import gc
import os
from typing import Dict


class _Malloc(ctypes.Structure):
    """mallinfo2 of the C library."""

    _fields_ = [(name, ctypes.c_size_t) for name in (
        "arena", "free_chunks", "fast_chunks", "mapped_chunks", "mapped", "unused", "fast_free", "in_use", "free",
        "top")]


def allocated() -> int:
    """KiB that malloc and new have given out: what the process has beyond that, the allocator keeps for later."""
    gc.collect()
    function = ctypes.CDLL(None).mallinfo2
    function.restype = _Malloc
    info = function()
    return int(info.in_use + info.mapped) // 1024


def state() -> Dict[str, int]:
    """Memory in KiB, descriptors, threads."""
    gc.collect()
    with open("/proc/self/status", encoding="ascii") as status:
        memory = next(int(line.split()[1]) for line in status if line.startswith("RssAnon"))
    return {"memory": memory, "descriptors": len(os.listdir("/proc/self/fd")),
            "threads": len(os.listdir("/proc/self/task"))}
