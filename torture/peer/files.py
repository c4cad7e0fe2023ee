"""The handset's file system, flat: a folder is every path that begins with it."""
from __future__ import annotations

import struct
from typing import Callable, Dict, List, Optional, Set, Tuple

_OK = 0
_NO_SUCH_FILE = 2
_BAD_DESCRIPTOR = 9
_EXISTS = 6
_TRUNCATE = 0x200
_FILE = 0x81B6
_ITEM = 0xE1B6
_FOLDER = 0x41FF
_OUT_OF_SYNC = 1


def _text(request: bytes, at: int) -> str:
    return request[at:].split(b"\0")[0].decode("latin-1")


def _words(*values: int) -> bytes:
    return struct.pack(f"<{len(values)}I", *values)


class FileSystem:
    """Answers the requests of the file-system subsystem."""

    def __init__(self) -> None:
        self.files: Dict[str, bytes] = {}
        self.items: Set[str] = set()
        self.folders: Set[str] = {"/"}
        # Names that a listing shows instead of the files' own.
        self.shown: Dict[str, str] = {}
        self.open_files: Dict[int, str] = {}
        self._open_folders: Dict[int, List[str]] = {}
        self._next = 1
        self._commands: Dict[int, Callable[[bytes], bytes]] = {
            2: self._open, 3: self._close, 4: self._read, 5: self._write, 8: self._unlink, 9: self._make_folder,
            11: self._open_folder, 12: self._read_folder, 13: self._close_folder, 15: self._status, 19: self._room,
            38: self._put_item, 39: self._get_item,
            48: lambda request: _words(_OK, _OUT_OF_SYNC), 49: lambda request: _words(_OK, _OUT_OF_SYNC),
        }

    def answer(self, request: bytes, command: int) -> Optional[bytes]:
        handler = self._commands.get(command)
        return request[:4] + handler(request) if handler else b"\x13" + request

    def start_anew(self) -> None:
        """What was open is so no longer."""
        self.open_files.clear()
        self._open_folders.clear()

    def put(self, path: str, data: bytes, item: bool = False) -> None:
        self.files[path] = data
        parent = path.rpartition("/")[0]
        while parent:
            self.folders.add(parent)
            parent = parent.rpartition("/")[0]
        (self.items.add if item else self.items.discard)(path)

    def _number(self) -> int:
        self._next += 1
        return self._next

    def _open(self, request: bytes) -> bytes:
        flags, _ = struct.unpack_from("<II", request, 4)
        path = _text(request, 12)
        if flags & _TRUNCATE:
            self.put(path, b"")
        if path not in self.files:
            return _words(0xFFFFFFFF, _NO_SUCH_FILE)
        descriptor = self._number()
        self.open_files[descriptor] = path
        return _words(descriptor, _OK)

    def _close(self, request: bytes) -> bytes:
        known = self.open_files.pop(struct.unpack_from("<I", request, 4)[0], None)
        return _words(_OK if known is not None else _BAD_DESCRIPTOR)

    def _read(self, request: bytes) -> bytes:
        descriptor, count, offset = struct.unpack_from("<III", request, 4)
        path = self.open_files.get(descriptor)
        if path is None:
            return _words(descriptor, offset, 0, _BAD_DESCRIPTOR)
        data = self.files.get(path, b"")[offset:offset + count]
        return _words(descriptor, offset, len(data), _OK) + data

    def _write(self, request: bytes) -> bytes:
        descriptor, offset = struct.unpack_from("<II", request, 4)
        path = self.open_files.get(descriptor)
        data: bytes = request[12:]
        if path is None:
            return _words(descriptor, offset, 0, _BAD_DESCRIPTOR)
        old = self.files.get(path, b"").ljust(offset, b"\0")
        self.files[path] = old[:offset] + data + old[offset + len(data):]
        return _words(descriptor, offset, len(data), _OK)

    def _unlink(self, request: bytes) -> bytes:
        path = _text(request, 4)
        self.items.discard(path)
        return _words(_OK if self.files.pop(path, None) is not None else _NO_SUCH_FILE)

    def _make_folder(self, request: bytes) -> bytes:
        path = _text(request, 6)
        if path in self.folders or path in self.files:
            return _words(_EXISTS)
        self.folders.add(path)
        return _words(_OK)

    def _open_folder(self, request: bytes) -> bytes:
        path = _text(request, 4).rstrip("/") or "/"
        if path not in self.folders:
            return _words(0, _NO_SUCH_FILE)
        root = path.rstrip("/") + "/"
        inside = {name[len(root):].split("/")[0] for name in [*self.files, *self.folders] if name.startswith(root)}
        number = self._number()
        self._open_folders[number] = [root + name for name in sorted(inside) if name]
        return _words(number, _OK)

    def _kind(self, path: str) -> Tuple[int, int, int]:
        """Type of a directory entry, mode, size."""
        if path in self.files:
            return 0, _ITEM if path in self.items else _FILE, len(self.files[path])
        return 1, _FOLDER, 0

    def _read_folder(self, request: bytes) -> bytes:
        number, sequence = struct.unpack_from("<II", request, 4)
        entries = self._open_folders.get(number)
        if entries is None or not 0 < sequence <= len(entries):
            return _words(number, sequence, _BAD_DESCRIPTOR if entries is None else _OK) + bytes(24) + b"\0"
        path = entries[sequence - 1]
        name = self.shown.get(path, path.rpartition("/")[2]).encode("latin-1")
        return b"".join((_words(number, sequence, _OK, *self._kind(path), 1, 2, 3), name, b"\0"))

    def _close_folder(self, request: bytes) -> bytes:
        known = self._open_folders.pop(struct.unpack_from("<I", request, 4)[0], None)
        return _words(_OK if known is not None else _BAD_DESCRIPTOR)

    def _status(self, request: bytes) -> bytes:
        path = _text(request, 4)
        if path not in self.files and path not in self.folders:
            return _words(_NO_SUCH_FILE, 0, 0, 0, 0, 0, 0)
        _, mode, size = self._kind(path)
        return _words(_OK, mode, size, 1, 1, 2, 3)

    def _room(self, request: bytes) -> bytes:
        return _words(_OK, 1, 2, 4096, 100000, 90000, 90000, 0x7FFFFFFF, len(self.files), 10000)

    def _put_item(self, request: bytes) -> bytes:
        length, = struct.unpack_from("<I", request, 4)
        self.put(_text(request, 14 + length), request[14:14 + length], item=True)
        return request[12:14] + _words(_OK)

    def _get_item(self, request: bytes) -> bytes:
        wanted, _, sequence = struct.unpack_from("<IIH", request, 4)
        data = self.files.get(_text(request, 14))
        if data is None:
            return _words(0, _NO_SUCH_FILE) + struct.pack("<H", sequence)
        data = data[:wanted]
        return _words(len(data), _OK) + struct.pack("<H", sequence) + data
