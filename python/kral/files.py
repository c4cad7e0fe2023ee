"""The handset's file system."""
from __future__ import annotations

import ctypes
import dataclasses
import os
import stat as _stat
from typing import Any, Callable, Iterator, List, Optional, Tuple, Union

from kral import _api
from kral._connection import Connection, null
from kral._work import Work
from kral.errors import ErrorRecord, Refused, fail, last_error

LocalPath = Union[str, "os.PathLike[str]"]
Progress = Callable[[int, int], Any]

_KINDS = {_api.KRAL_EFS_ENTRY_DIRECTORY: "directory", _api.KRAL_EFS_ENTRY_FILE: "file",
          _api.KRAL_EFS_ENTRY_LINK: "link"}


def _bytes(path: str) -> bytes:
    """What goes over the wire: names that are no text come from listings with their bytes escaped."""
    return path.encode("utf-8", "surrogateescape")


class FileError(Refused):
    """The handset's file system said no; `status` is its error number (KRAL_EFS_ERROR_...)."""


@dataclasses.dataclass(frozen=True)
class Entry:
    """An entry of a directory. Times are the handset's, in seconds."""

    path: str
    kind: str  # "file", "directory" or "link"
    mode: int
    size: int
    access_time: int
    modify_time: int
    change_time: int

    @property
    def name(self) -> str:
        return self.path.rstrip("/").rpartition("/")[2]

    @property
    def is_item(self) -> bool:
        """Whether it is an item file, which is read and written as a whole."""
        return self.mode & _api.KRAL_EFS_MODE_KIND == _api.KRAL_EFS_MODE_ITEM_FILE


@dataclasses.dataclass(frozen=True)
class Status:
    """The status of a file or directory. Times are the handset's, in seconds."""

    mode: int
    size: int
    link_count: int
    access_time: int
    modify_time: int
    change_time: int

    @property
    def is_directory(self) -> bool:
        return _stat.S_ISDIR(self.mode)


class Files:
    """Files of a handset: `phone.files`. Paths of the handset are texts, files of the PC texts or pathlib paths."""

    def __init__(self, connection: Connection) -> None:
        self._connection = connection

    # --- Whole files

    def get(self, path: str, to: Optional[LocalPath] = None, progress: Optional[Progress] = None) -> bytes:
        """Reads a file: gives its bytes, or copies it into a file of the PC and gives b""."""
        if to is not None:
            self._transfer("KRAL_EfsRead", progress, os.fsencode(to), _bytes(path))
            return b""
        size = max(self.stat(path).size, _api.KRAL_EFS_ITEM_SIZE) + 4096
        buffer = ctypes.create_string_buffer(size)
        count = ctypes.c_uint32(size)
        self._transfer("KRAL_EfsReadMem", progress, _bytes(path), buffer, ctypes.byref(count))
        return buffer.raw[:count.value]

    def put(self, source: Union[bytes, bytearray, LocalPath], path: str, progress: Optional[Progress] = None) -> None:
        """Writes bytes, or a file of the PC, to a file of the handset, replacing what is there."""
        if isinstance(source, (bytes, bytearray)):
            data = bytes(source)
            self._transfer("KRAL_EfsWriteMem", progress, data, len(data), _bytes(path))
        else:
            self._transfer("KRAL_EfsWrite", progress, os.fsencode(source), _bytes(path))

    def put_item(self, data: bytes, path: str) -> None:
        """Writes an item file: at most 1,024 bytes, in one request."""
        self._connection.check("KRAL_EfsPutItemFromMem", _bytes(path), data, len(data))

    def _transfer(self, name: str, progress: Optional[Progress], *arguments: Any) -> None:
        connection = self._connection

        def prepare(work: "Work[None]") -> None:
            def moved(_source: int, _target: int, _operation: int, _zero: int, done: int, total: int, _h: int) -> None:
                work.report(done, total)

            connection.targets.set("transfer", moved if progress is not None else None)
            if progress is not None:
                connection.check("KRAL_ConfigureEfs2CallBacks",
                                 connection.targets.make("transfer", _api.KRAL_EFS_TRANSFER_CALLBACK),
                                 null(_api.KRAL_EFS_DIRECTORY_CALLBACK))

        connection.long(lambda: connection.check(name, *arguments), prepare, progress)

    # --- Directories

    def listdir(self, path: str = "/") -> List[Entry]:
        """The entries of a directory, in the handset's order."""
        connection = self._connection
        room = 64
        while True:
            entries = (_api.KRAL_EFS_ENTRY * room)()
            count = ctypes.c_uint32(room)
            connection.long(lambda: connection.check("KRAL_EfsDirectory", _bytes(path), _api.KRAL_EFS_FILTER_ALL,
                                                     entries, ctypes.byref(count)))
            if count.value <= room:
                return [self._entry(entry) for entry in entries[:count.value]]
            room = count.value + 16

    @staticmethod
    def _entry(raw: Any) -> Entry:
        return Entry(raw.name.decode("utf-8", "surrogateescape"), _KINDS.get(raw.type, "file"), raw.mode, raw.size,
                     raw.access_time, raw.modify_time, raw.change_time)

    def walk(self, path: str = "/") -> Iterator[Tuple[str, List[Entry], List[Entry]]]:
        """Like os.walk: a directory, its directories and its other entries, top down. Links are not followed."""
        entries = self.listdir(path)
        folders = [entry for entry in entries if entry.kind == "directory"]
        yield path, folders, [entry for entry in entries if entry.kind != "directory"]
        for folder in folders:
            yield from self.walk(folder.path)

    def mkdir(self, path: str, parents: bool = False) -> None:
        """Makes a directory; one that is there already is none the worse for it."""
        parts = path.strip("/").split("/")
        first = 1 if parents else len(parts)
        for count in range(first, len(parts) + 1):
            self._numbered("KRAL_EfsMkDir", ("/" if path.startswith("/") else "") + "/".join(parts[:count]),
                           allowed=(0, _api.KRAL_EFS_ERROR_EXISTS))

    def rmdir(self, path: str) -> None:
        """Removes an empty directory."""
        self._numbered("KRAL_EfsRmDir", path)

    # --- Names and status

    def remove(self, path: str) -> None:
        """Removes a file, an item file or a link."""
        self._numbered("KRAL_EfsDelete", path)

    def rename(self, old: str, new: str) -> None:
        """Renames or moves."""
        self._numbered("KRAL_EFS2_DIAG_RENAME", old, _bytes(new))

    def link(self, target: str, path: str) -> None:
        """Makes a symbolic link at `path` that leads to `target`."""
        self._numbered("KRAL_EfsCreateLink", target, _bytes(path))

    def exists(self, path: str) -> bool:
        try:
            self.stat(path)
        except FileError as error:
            if error.status == _api.KRAL_EFS_ERROR_NO_SUCH_FILE:
                return False
            raise
        return True

    def stat(self, path: str) -> Status:
        """The status of what a path names, links followed."""
        values = [ctypes.c_uint32() for _ in range(6)]
        self._numbered("KRAL_EFS2_DIAG_STAT", path, after=[ctypes.byref(value) for value in values])
        return Status(*(value.value for value in values))

    def _numbered(self, name: str, path: str, *more: Any, after: Any = (), allowed: Tuple[int, ...] = (0,)) -> None:
        """A call that returns 1 whenever the handset answered, and its answer as an error number."""
        number = ctypes.c_uint32()
        handle = self._connection.handle
        answered = self._connection.call(name, _bytes(path), *more, ctypes.byref(number), *after)
        if not answered and not number.value:
            fail(handle, name)
        if number.value in allowed:
            return
        record = last_error(handle) if not answered else None
        text = f"{path}: the handset answered with error {number.value}"
        if record is None or record.function != name:
            record = ErrorRecord(_api.KRAL_ERROR_REFUSED, text, name, _api.KRAL_ERROR_STATUS_EFS, number.value, 0, None,
                                 None, None)
        raise FileError(record.text, record)
